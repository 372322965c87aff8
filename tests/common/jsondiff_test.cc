// The one-level difference of two JSON objects.
#include <string>
#include <thread>

#include <gtest/gtest.h>

#include "common/tessel_json.h"
#include "tessel_error.h"
#include "support/json_text.h"
#include "tessel_file.h"

namespace {

using tessel_test::Parse;


TEST(JsonDiff, Differences) {
    struct Case {
        const char *oldText;
        const char *newText;
        const char *diff;  // nullptr: no difference, output left as it was
    } cases[] = {
        {R"({"a": 1, "b": 2})", R"({"a": 1, "b": 3, "c": 4})",
         R"([{"key": "b", "type": "sub", "old_value": 2, "new_value": 3},
             {"key": "c", "type": "ins", "value": 4}])"},
        // Removals and changes in the old object's member order, insertions after.
        {R"({"z": 1, "a": 2, "m": 3})", R"({"b": 5, "a": 2, "m": 4})",
         R"([{"key": "m", "type": "sub", "old_value": 3, "new_value": 4},
             {"key": "z", "type": "del", "value": 1},
             {"key": "b", "type": "ins", "value": 5}])"},
        // One level deep: a changed sub-member is a change of the whole member.
        {R"({"t": {"x": 1, "y": [1, 2]}})", R"({"t": {"x": 1, "y": [2, 1]}})",
         R"([{"key": "t", "type": "sub", "old_value": {"x": 1, "y": [1, 2]},
              "new_value": {"x": 1, "y": [2, 1]}}])"},
        {R"({"n": 1})", R"({"n": "1"})", R"([{"key": "n", "type": "sub", "old_value": 1, "new_value": "1"}])"},
        {R"({"gone": null})", R"({})", R"([{"key": "gone", "type": "del", "value": null}])"},
        {R"({})", R"({"new": {}})", R"([{"key": "new", "type": "ins", "value": {}}])"},
        {R"({"a": [1, {"b": true}], "s": "x"})", R"({"s": "x", "a": [1, {"b": true}]})", nullptr},
        {R"({})", R"({})", nullptr},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(std::string(c.oldText) + " -> " + c.newText);
        Json::Value jOut = "untouched";
        ASSERT_TRUE(TesselJsonDiff(Parse(c.oldText), Parse(c.newText), jOut));
        EXPECT_EQ(nullptr == c.diff ? Json::Value("untouched") : Parse(c.diff), jOut);
    }
}

TEST(JsonDiff, NonObjectsAreBadParameters) {
    struct Case {
        Json::Value old;
        Json::Value now;
        const char *condition;
    } cases[] = {
        {Json::Value(Json::arrayValue), Json::Value(Json::objectValue), "!jData1.isObject()"},
        {Json::Value(), Json::Value(Json::objectValue), "!jData1.isObject()"},
        {Json::Value("{}"), Json::Value(), "!jData1.isObject()"},
        {Json::Value(Json::objectValue), Json::Value(7), "!jData2.isObject()"},
        {Json::Value(Json::objectValue), Json::Value(Json::arrayValue), "!jData2.isObject()"},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.condition);
        Json::Value jOut = "untouched";
        bool result = true;
        Json::Value jStack;
        std::thread t([&] {
            result = TesselJsonDiff(c.old, c.now, jOut);
            jStack = TesselErrMsgGet();
        });
        t.join();
        EXPECT_FALSE(result);
        ASSERT_EQ(1u, jStack.size());
        EXPECT_EQ(1015, jStack[0u]["code"].asInt());
        EXPECT_EQ(c.condition, jStack[0u]["msg"].asString());
        EXPECT_EQ("untouched", jOut.asString());
    }
}

}  // namespace
