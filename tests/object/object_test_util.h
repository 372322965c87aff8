// Helpers shared by the object tests: JSON text both ways, and the check of
// a bad-argument report (log line and platform error state).
#ifndef TESSEL_TESTS_OBJECT_OBJECT_TEST_UTIL_H
#define TESSEL_TESTS_OBJECT_OBJECT_TEST_UTIL_H

#include <syslog.h>

#include <memory>
#include <string>

#include <gtest/gtest.h>
#include <json/reader.h>
#include <json/value.h>
#include <json/writer.h>
#include <quor/qlib.h>

#include "support/json_text.h"
#include "support/sandbox.h"

namespace object_test {

using tessel_test::Parse;

inline std::string Text(const Json::Value &jVal) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    builder["emitUTF8"] = true;
    return Json::writeString(builder, jVal);
}


// The platform error names module and a line, and the log has, at LOG_ERR,
// "<module>:<that line> Invaild Argument (<condition>)=[<value>]".
inline void ExpectBadArgument(size_t mark, const std::string &strModule, const std::string &strCondition,
                              int value) {
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    EXPECT_EQ(strModule, QLIBCErrFileGet());
    std::string strExpected = strModule + ":" + std::to_string(QLIBCErrLineGet()) + " Invaild Argument (" +
                              strCondition + ")=[" + std::to_string(value) + "]";
    auto line = tessel_test::WaitForSyslog(strExpected, mark, LOG_USER | LOG_ERR);
    EXPECT_TRUE(line.has_value()) << "no log line " << strExpected;
    if (line) {
        EXPECT_EQ(0u, line->message.find(strExpected)) << line->message;
    }
}

}  // namespace object_test

#endif  // TESSEL_TESTS_OBJECT_OBJECT_TEST_UTIL_H
