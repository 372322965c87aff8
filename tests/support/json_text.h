/*
 * JSON as tests write it: expected values from text, stored files read back.
 * Header-only and on jsoncpp alone, so that programs linking only the
 * exported library can use it too.
 */
#ifndef TESSEL_TESTS_SUPPORT_JSON_TEXT_H
#define TESSEL_TESTS_SUPPORT_JSON_TEXT_H

#include <fstream>
#include <memory>
#include <sstream>
#include <string>

#include <gtest/gtest.h>
#include <json/reader.h>
#include <json/value.h>

namespace tessel_test {

/* The value of strText; a test failure when it is not JSON. */
inline Json::Value Parse(const std::string &strText) {
    Json::CharReaderBuilder builder;
    std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    Json::Value jVal;
    std::string strErrs;
    EXPECT_TRUE(reader->parse(strText.data(), strText.data() + strText.size(), &jVal, &strErrs))
        << strText << ": " << strErrs;
    return jVal;
}

/* The JSON file at strPath; a test failure when it cannot be read. */
inline Json::Value ReadJson(const std::string &strPath) {
    std::ifstream in(strPath);
    EXPECT_TRUE(in.good()) << strPath;
    std::stringstream text;
    text << in.rdbuf();
    return Parse(text.str());
}

}  // namespace tessel_test

#endif /* TESSEL_TESTS_SUPPORT_JSON_TEXT_H */
