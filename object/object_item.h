/*
 * The bad-argument report of the plain-function accessors (and of fromJson):
 * one log line "<module>:<line> Invaild Argument (<condition>)=[<value>]" at
 * LOG_ERR, then the platform's error state QLIBC_ERR_BAD_PARAMETERS (0xD00).
 * Applications that use these functions read QLIBCErrGet(), so the library's
 * own error stack is left alone.
 */
#ifndef TESSEL_OBJECT_OBJECT_ITEM_H
#define TESSEL_OBJECT_OBJECT_ITEM_H

#include <stdio.h>

#include <string>

#include <json/value.h>

#include "common/tessel_json.h"

namespace tessel {

/* Reports and returns -1. */
int ReportBadArgument(const char *szModule, int line, const char *szCondition, int value);

}  // namespace tessel

/* When ok does not hold: report (condition text, offending value) and return -1. */
#define TESSEL_ITEM_CHECK(module, ok, text, value)                                   \
    do {                                                                             \
        if (!(ok)) {                                                                 \
            return ::tessel::ReportBadArgument((module), __LINE__, (text), (value)); \
        }                                                                            \
    } while (0)


namespace tessel {

/*
 * The plain-function accessors of a record type R (the object record, the
 * version record): each exported function names the member it reads or
 * writes and the header (Getter / Setter module) its reports carry.
 */
template <typename R, const char *Getter, const char *Setter>
struct ItemAccess {
    typedef const std::string &(R::*TextRef)() const;
    typedef const Json::Value &(R::*JsonRef)() const;
    typedef bool (R::*TextSet)(const std::string &);
    typedef bool (R::*JsonSwap)(Json::Value &);

    static int CheckBuffer(const char *szBuf, int cbBuf, const R *pObject) {
        TESSEL_ITEM_CHECK(Getter, NULL != szBuf, "__null != szBuf", 0);
        TESSEL_ITEM_CHECK(Getter, 0 < cbBuf, "0 < cbBuf", cbBuf);
        TESSEL_ITEM_CHECK(Getter, NULL != pObject, "NULL != pObject", 0);
        return 0;
    }

    static int GetText(char *szBuf, int cbBuf, const R *pObject, TextRef get) {
        if (0 != CheckBuffer(szBuf, cbBuf, pObject)) {
            return -1;
        }
        snprintf(szBuf, static_cast<size_t>(cbBuf), "%s", (pObject->*get)().c_str());
        return 0;
    }

    static int GetJson(char *szBuf, int cbBuf, const R *pObject, JsonRef get) {
        if (0 != CheckBuffer(szBuf, cbBuf, pObject)) {
            return -1;
        }
        snprintf(szBuf, static_cast<size_t>(cbBuf), "%s", ::tessel::toString((pObject->*get)()).c_str());
        return 0;
    }

    template <typename T, typename GetterFn>
    static int GetInteger(T *pVal, const R *pObject, GetterFn get) {
        TESSEL_ITEM_CHECK(Getter, NULL != pVal, "__null != pVal", 0);
        TESSEL_ITEM_CHECK(Getter, NULL != pObject, "NULL != pObject", 0);
        *pVal = (pObject->*get)();
        return 0;
    }

    // A record without its data block cannot hold the value: -1 without a
    // report, since no argument was wrong.
    static int SetText(R *pObject, const char *szVal, TextSet set) {
        TESSEL_ITEM_CHECK(Setter, NULL != szVal, "__null != szVal", 0);
        TESSEL_ITEM_CHECK(Setter, NULL != pObject, "NULL != pObject", 0);
        return (pObject->*set)(szVal) ? 0 : -1;
    }

    // Text that is not JSON is stored as what the parse left (null), without a
    // report: these setters guard only against missing arguments.
    static int SetJson(R *pObject, const char *szVal, JsonSwap swap) {
        TESSEL_ITEM_CHECK(Setter, NULL != szVal, "__null != szVal", 0);
        TESSEL_ITEM_CHECK(Setter, NULL != pObject, "NULL != pObject", 0);
        Json::Value jVal;
        ::tessel::fromString(jVal, szVal);
        return (pObject->*swap)(jVal) ? 0 : -1;
    }

    template <typename T, typename SetterFn>
    static int SetInteger(R *pObject, T val, SetterFn set) {
        TESSEL_ITEM_CHECK(Setter, NULL != pObject, "__null != pObject", 0);
        return (pObject->*set)(val) ? 0 : -1;
    }
};

}  // namespace tessel

#endif /* TESSEL_OBJECT_OBJECT_ITEM_H */
