// The version record through the shared library, as applications use it:
// life cycle, accessors with their bad-argument reports, and the JSON form
// with the author by name.
#include <string.h>

#include <functional>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "object/object_test_util.h"
#include "support/error_stack.h"
#include "support/sandbox.h"
#include "tesselobjectversion.h"
#include "tesselobjectversiongetter.h"
#include "tesselobjectversionsetter.h"

using object_test::ExpectBadArgument;
using object_test::Text;
using tessel_test::Parse;

namespace {

const char kGetter[] = "include/tesselobjectversiongetter";
const char kSetter[] = "include/tesselobjectversionsetter";
const std::string kVer = "0123456789abcdef0123456789abcdef01234567";

struct ItemCase {
    const char *name;
    int (*get)(char *, int, const TESSEL_OBJECT_VERSION *);
    int (*set)(TESSEL_OBJECT_VERSION *, const char *);
    const char *fresh;  // what a new record gives
    std::string stored, expected;
};

const ItemCase kItems[] = {
    {"ns", TesselObjectVersionItemGetNameSpace, TesselObjectVersionItemSetNameSpace, "", "notes", "notes"},
    {"id", TesselObjectVersionItemGetID, TesselObjectVersionItemSetID, "", "1001_ABC", "1001_ABC"},
    {"version", TesselObjectVersionItemGetVersion, TesselObjectVersionItemSetVersion, "", kVer, kVer},
    {"commit_msg", TesselObjectVersionItemGetCommitMsg, TesselObjectVersionItemSetCommitMsg, "null",
     "{ \"note\" : \"\\u00e9\" }", "{\"note\":\"\xc3\xa9\"}"},
    {"last_version", TesselObjectVersionItemGetLastVersion, TesselObjectVersionItemSetLastVersion, "[]",
     "[\"" + kVer + "\"]", "[\"" + kVer + "\"]"},
    {"extra_info", TesselObjectVersionItemGetExtraInfo, TesselObjectVersionItemSetExtraInfo, "null", "\"t\"", "\"t\""},
};

std::string Get(const ItemCase &c, const TESSEL_OBJECT_VERSION *pVer, int cbBuf = 64) {
    std::vector<char> buf(cbBuf, '#');
    EXPECT_EQ(0, c.get(buf.data(), cbBuf, pVer)) << c.name;
    return std::string(buf.data(), strnlen(buf.data(), cbBuf));
}

TEST(VersionItem, AccessorsCutTerminateAndReportBadArgumentsToThePlatform) {
    TESSEL_OBJECT_VERSION *pVer = TesselObjectVersionAlloc();
    ASSERT_NE(nullptr, pVer);
    // The accessors leave the library's own error stack alone.
    TesselErrSetEx(1008, "tests/version", 1, "%s", "sentinel");
    char buf[8];
    std::vector<std::function<int()>> calls;
    std::vector<std::pair<const char *, std::string>> reports;  // module, condition
    for (const ItemCase &c : kItems) {
        EXPECT_EQ(c.fresh, Get(c, pVer)) << c.name;
        ASSERT_EQ(0, c.set(pVer, c.stored.c_str())) << c.name;
        EXPECT_EQ(c.expected, Get(c, pVer)) << c.name;
        EXPECT_EQ(c.expected.substr(0, c.expected.size() - 1), Get(c, pVer, (int)c.expected.size())) << c.name;
        EXPECT_EQ("", Get(c, pVer, 1)) << c.name;
        calls.push_back([c] { return c.get(nullptr, 8, nullptr); });
        calls.push_back([&buf, c] { return c.get(buf, -3, nullptr); });
        calls.push_back([&buf, c] { return c.get(buf, 8, nullptr); });
        calls.push_back([c, pVer] { return c.set(pVer, nullptr); });
        calls.push_back([c] { return c.set(nullptr, "{}"); });
        reports.insert(reports.end(), {{kGetter, "__null != szBuf"}, {kGetter, "0 < cbBuf"},
                                       {kGetter, "NULL != pObject"}, {kSetter, "__null != szVal"},
                                       {kSetter, "NULL != pObject"}});
    }
    // 32-bit fields; text that is not JSON is stored as what the parse left.
    ASSERT_EQ(0, TesselObjectVersionItemSetAuthor(pVer, 0x100000000UL + 1002));
    ASSERT_EQ(0, TesselObjectVersionItemSetModifyTime(pVer, -5));
    ASSERT_EQ(0, TesselObjectVersionItemSetCommitMsg(pVer, "{\"unclosed\": "));
    unsigned long author = 0;
    long mtime = 0;
    EXPECT_EQ(0, TesselObjectVersionItemGetAuthor(&author, pVer));
    EXPECT_EQ(0, TesselObjectVersionItemGetModifyTime(&mtime, pVer));
    EXPECT_EQ(1002UL, author);
    EXPECT_EQ(-5L, mtime);
    EXPECT_EQ("null", Get(kItems[3], pVer));
    EXPECT_EQ(0, QLIBCErrGet()) << "no bad argument yet";

    calls.push_back([&] { return TesselObjectVersionItemGetAuthor(nullptr, nullptr); });
    calls.push_back([&] { return TesselObjectVersionItemGetModifyTime(&mtime, nullptr); });
    calls.push_back([] { return TesselObjectVersionItemSetAuthor(nullptr, 1001); });
    calls.push_back([] { return TesselObjectVersionItemSetModifyTime(nullptr, 1); });
    reports.insert(reports.end(), {{kGetter, "__null != pVal"}, {kGetter, "NULL != pObject"},
                                   {kSetter, "__null != pObject"}, {kSetter, "__null != pObject"}});
    for (size_t i = 0; i < calls.size(); ++i) {
        memset(buf, '#', sizeof(buf));
        QLIBCErrClear();
        size_t mark = tessel_test::SyslogMark();
        EXPECT_EQ(-1, calls[i]()) << reports[i].second;
        ExpectBadArgument(mark, reports[i].first, reports[i].second, reports[i].second == "0 < cbBuf" ? -3 : 0);
        EXPECT_EQ(std::string(8, '#'), std::string(buf, 8)) << reports[i].second;
    }
    EXPECT_EQ(-5L, mtime);
    EXPECT_EQ(kVer, Get(kItems[2], pVer)) << "changed by a refused set";
    EXPECT_EQ(1008, TesselErrCodeGet()) << "the library's error stack was touched";
    TesselObjectVersionFreeList(pVer);
}

TEST(VersionRecord, ClearAndChains) {
    TESSEL_OBJECT_VERSION ver;
    ver.set_ns("notes");
    ver.set_author(1001);
    ver.set_mtime(1700000000);
    ver.set_version(kVer);
    ver.set_commit_msg(Parse(R"({"listable": true})"));
    ver.set_last_version(Parse(R"(["a"])"));
    ver.set_extra_info(Json::Value("text"));
    TesselObjectVersionClear(&ver);
    TesselObjectVersionClear(nullptr);
    EXPECT_EQ("", ver.get_ns() + ver.get_version());
    EXPECT_EQ(0UL, ver.get_author());
    EXPECT_EQ(0L, ver.get_mtime());
    EXPECT_EQ("{}[]null", Text(ver.get_commit_msg()) + Text(ver.get_last_version()) + Text(ver.get_extra_info()));
    ver.set_last_version(Json::Value("not an array"));
    ver.clear();
    EXPECT_EQ("[]", Text(ver.get_last_version())) << "a reset history is an empty array";

    // A chain of three freed from its head (the sanitizer sees a leak).
    TESSEL_OBJECT_VERSION_LIST list;
    list.m_head = TesselObjectVersionAlloc();
    list.m_head->next = TesselObjectVersionAlloc();
    list.m_head->next->next = TesselObjectVersionAlloc();
    EXPECT_EQ(list.m_head->next->next, TesselObjectVersionNext(TesselObjectVersionNext(list.m_head)));
    EXPECT_EQ(nullptr, TesselObjectVersionNext(list.m_head->next->next));
    EXPECT_EQ(nullptr, TesselObjectVersionNext(nullptr));
    list.clear();
    EXPECT_EQ(nullptr, list.head());
    TesselObjectVersionFreeList(nullptr);
}

std::string ToJson(const TESSEL_OBJECT_VERSION &ver, const std::string &strField) {
    Json::Value jRet(Json::objectValue);
    EXPECT_TRUE(ver.toJson(strField.empty() ? Json::Value() : Parse(strField), jRet)) << strField;
    return Text(jRet);
}

TEST(VersionToJson, SelectionsAuthorNamesAndAResultThatIsNotAnObject) {
    TESSEL_OBJECT_VERSION ver;
    ver.set_ns("notes");
    ver.set_id("1001_ABC");
    ver.set_author(tessel_test::kUidAlice);
    ver.set_mtime(1700000000);
    ver.set_version(kVer);
    ver.set_commit_msg(Parse(R"({"listable":true})"));
    ver.set_last_version(Parse(R"(["fedcba98"])"));
    ver.set_extra_info(Parse(R"({"hidden":1})"));
    const std::string strDefaults = R"({"author":"alice","commit_msg":{"listable":true},"last_version":["fedcba98"],)"
                                    R"("mtime":1700000000,"version":")" + kVer + "\"}";
    EXPECT_EQ(strDefaults, ToJson(ver, ""));
    EXPECT_EQ(strDefaults, ToJson(ver, R"({"ns": false, "id": 0, "extra_info": true})"));
    EXPECT_EQ(R"({"id":"1001_ABC","mtime":1700000000,"ns":"notes"})",
              ToJson(ver, R"({"ns": true, "id": "yes", "version": false, "author": 0, "commit_msg": false,)"
                          R"( "last_version": null})"));
    // The name comes from the user look-up, whatever it answers: here, for
    // an account that no longer exists.
    ver.set_author(tessel_test::kUidUnknown);
    EXPECT_EQ(R"({"author":"Deleted user #4242"})",
              ToJson(ver, R"({"version":false,"mtime":false,"commit_msg":false,"last_version":false})"));

    Json::Value jRet(Json::arrayValue);
    size_t mark = tessel_test::SyslogMark();
    EXPECT_FALSE(ver.toJson(Json::Value(), jRet));
    EXPECT_EQ("[]", Text(jRet)) << "left as it was";
    EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, tessel_test::ErrCode());
    EXPECT_EQ(std::vector<std::string>{"!jRet.isObject()"}, tessel_test::ErrMsgs());
    const Json::Value &jFrame = TesselErrMsgGet()[0u];
    EXPECT_EQ("version/version_json", jFrame["file"].asString());
    std::string strLine = "version/version_json:" + jFrame["line"].asString() + " Failed [!jRet.isObject()], err=";
    EXPECT_TRUE(tessel_test::WaitForSyslog(strLine, mark, LOG_USER | LOG_ERR).has_value()) << strLine;
}

}  // namespace
