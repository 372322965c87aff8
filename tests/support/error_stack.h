/*
 * The calling thread's error stack as tests read it. Header-only: the
 * program links the library (tessel or tessel_objects) itself.
 */
#ifndef TESSEL_TESTS_SUPPORT_ERROR_STACK_H
#define TESSEL_TESTS_SUPPORT_ERROR_STACK_H

#include <string>
#include <vector>

#include <json/value.h>

#include "tessel_error.h"

namespace tessel_test {

/* Empties the stack, so that the next check sees only what follows. */
inline void ErrClear() { TesselErrMsgGet() = Json::Value(Json::arrayValue); }

/* The "msg" of every frame, the first (where the failure started) first. */
inline std::vector<std::string> ErrMsgs() {
    std::vector<std::string> msgs;
    for (const Json::Value &jFrame : TesselErrMsgGet()) {
        msgs.push_back(jFrame["msg"].asString());
    }
    return msgs;
}

/* The code of the first frame: 0 when the stack is empty. */
inline int ErrCode() { return TesselErrCodeGet(); }

}  // namespace tessel_test

#endif /* TESSEL_TESTS_SUPPORT_ERROR_STACK_H */
