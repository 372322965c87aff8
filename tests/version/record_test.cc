// The version record through the shared library, as applications use it:
// life cycle, member accessors, the plain-function accessors with their
// bad-argument reports, and the JSON form with the author by name.
#include <string.h>

#include <functional>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "object/object_test_util.h"
#include "support/error_stack.h"
#include "support/sandbox.h"
#include "tessel_error.h"
#include "tesselobjectversion.h"
#include "tesselobjectversiongetter.h"
#include "tesselobjectversionsetter.h"

using object_test::ExpectBadArgument;
using object_test::Text;
using tessel_test::Parse;

namespace {

const char kGetter[] = "include/tesselobjectversiongetter";
const char kSetter[] = "include/tesselobjectversionsetter";
const char kVer[] = "0123456789abcdef0123456789abcdef01234567";

typedef int (*TextGetter)(char *, int, const TESSEL_OBJECT_VERSION *);
typedef int (*TextSetter)(TESSEL_OBJECT_VERSION *, const char *);

struct ItemCase {
    const char *name;
    TextGetter get;
    TextSetter set;
    const char *fresh;     // what a new record gives
    std::string stored;
    std::string expected;  // JSON comes back compact
};

std::vector<ItemCase> Items() {
    return {
        {"ns", TesselObjectVersionItemGetNameSpace, TesselObjectVersionItemSetNameSpace, "", "notes", "notes"},
        {"id", TesselObjectVersionItemGetID, TesselObjectVersionItemSetID, "", "1001_ABC", "1001_ABC"},
        {"version", TesselObjectVersionItemGetVersion, TesselObjectVersionItemSetVersion, "", kVer, kVer},
        {"commit_msg", TesselObjectVersionItemGetCommitMsg, TesselObjectVersionItemSetCommitMsg, "null",
         "{ \"listable\" : true, \"note\" : \"\\u00e9\" }", "{\"listable\":true,\"note\":\"\xc3\xa9\"}"},
        {"last_version", TesselObjectVersionItemGetLastVersion, TesselObjectVersionItemSetLastVersion, "[]",
         std::string("[\"") + kVer + "\"]", std::string("[\"") + kVer + "\"]"},
        {"extra_info", TesselObjectVersionItemGetExtraInfo, TesselObjectVersionItemSetExtraInfo, "null",
         "\"just text\"", "\"just text\""},
    };
}

std::string Get(const ItemCase &c, const TESSEL_OBJECT_VERSION *pVer) {
    std::vector<char> buf(c.expected.size() + 8, '#');
    EXPECT_EQ(0, c.get(buf.data(), static_cast<int>(buf.size()), pVer)) << c.name;
    return buf.data();
}

class VersionItem : public ::testing::Test {
protected:
    void SetUp() override {
        m_pVer = TesselObjectVersionAlloc();
        ASSERT_NE(nullptr, m_pVer);
        // The accessors report to the platform's error state only.
        TesselErrSetEx(1008, "tests/version", 1, "%s", "sentinel");
        QLIBCErrClear();
    }
    void TearDown() override {
        EXPECT_EQ(1008, TesselErrCodeGet()) << "the library's error stack was touched";
        TesselObjectVersionFreeList(m_pVer);
    }
    TESSEL_OBJECT_VERSION *m_pVer = nullptr;
};

TEST_F(VersionItem, GettersOfNewAndFilledRecordsCutAndTerminate) {
    for (const ItemCase &c : Items()) {
        EXPECT_EQ(c.fresh, Get(c, m_pVer)) << c.name;
        ASSERT_EQ(0, c.set(m_pVer, c.stored.c_str())) << c.name;
        EXPECT_EQ(c.expected, Get(c, m_pVer)) << c.name;
        const int len = static_cast<int>(c.expected.size());
        std::vector<char> shortBuf(len, '#');
        EXPECT_EQ(0, c.get(shortBuf.data(), len, m_pVer)) << c.name;
        EXPECT_EQ(c.expected.substr(0, len - 1), std::string(shortBuf.data())) << c.name;
        char one = '#';
        EXPECT_EQ(0, c.get(&one, 1, m_pVer)) << c.name;
        EXPECT_EQ('\0', one) << c.name;
    }
    unsigned long author = 7;
    long mtime = 7;
    EXPECT_EQ(0, TesselObjectVersionItemGetAuthor(&author, m_pVer));
    EXPECT_EQ(0, TesselObjectVersionItemGetModifyTime(&mtime, m_pVer));
    EXPECT_EQ(0UL, author);
    EXPECT_EQ(0L, mtime);
    // The fields are 32 bits wide: a wider author keeps its low bits.
    ASSERT_EQ(0, TesselObjectVersionItemSetAuthor(m_pVer, 0x100000000UL + 1002));
    ASSERT_EQ(0, TesselObjectVersionItemSetModifyTime(m_pVer, -5));
    EXPECT_EQ(0, TesselObjectVersionItemGetAuthor(&author, m_pVer));
    EXPECT_EQ(0, TesselObjectVersionItemGetModifyTime(&mtime, m_pVer));
    EXPECT_EQ(1002UL, author);
    EXPECT_EQ(-5L, mtime);
    // Text that is not JSON is stored as what the parse left.
    EXPECT_EQ(0, TesselObjectVersionItemSetCommitMsg(m_pVer, "{\"unclosed\": "));
    char szBuf[8];
    EXPECT_EQ(0, TesselObjectVersionItemGetCommitMsg(szBuf, sizeof(szBuf), m_pVer));
    EXPECT_STREQ("null", szBuf);
    EXPECT_EQ(0, QLIBCErrGet()) << "no bad argument, no platform error";
}

TEST_F(VersionItem, BadArgumentsAreReportedInOrderAndChangeNothing) {
    char buf[8];
    unsigned long author = 77;
    long mtime = 77;
    struct Case {
        std::function<int()> call;
        const char *module;
        const char *condition;
        int value;
    };
    std::vector<Case> cases;
    for (const ItemCase &c : Items()) {
        ASSERT_EQ(0, c.set(m_pVer, c.stored.c_str())) << c.name;
        cases.push_back({[&, c] { return c.get(nullptr, 8, m_pVer); }, kGetter, "__null != szBuf", 0});
        cases.push_back({[&, c] { return c.get(buf, 0, nullptr); }, kGetter, "0 < cbBuf", 0});
        cases.push_back({[&, c] { return c.get(buf, -3, m_pVer); }, kGetter, "0 < cbBuf", -3});
        cases.push_back({[&, c] { return c.get(buf, 8, nullptr); }, kGetter, "NULL != pObject", 0});
        cases.push_back({[&, c] { return c.set(m_pVer, nullptr); }, kSetter, "__null != szVal", 0});
        cases.push_back({[&, c] { return c.set(nullptr, "{}"); }, kSetter, "NULL != pObject", 0});
    }
    cases.push_back({[&] { return TesselObjectVersionItemGetAuthor(nullptr, nullptr); }, kGetter,
                     "__null != pVal", 0});
    cases.push_back({[&] { return TesselObjectVersionItemGetAuthor(&author, nullptr); }, kGetter,
                     "NULL != pObject", 0});
    cases.push_back({[&] { return TesselObjectVersionItemGetModifyTime(nullptr, m_pVer); }, kGetter,
                     "__null != pVal", 0});
    cases.push_back({[&] { return TesselObjectVersionItemGetModifyTime(&mtime, nullptr); }, kGetter,
                     "NULL != pObject", 0});
    cases.push_back({[] { return TesselObjectVersionItemSetAuthor(nullptr, 1001); }, kSetter,
                     "__null != pObject", 0});
    cases.push_back({[] { return TesselObjectVersionItemSetModifyTime(nullptr, 1); }, kSetter,
                     "__null != pObject", 0});
    for (const Case &c : cases) {
        memset(buf, '#', sizeof(buf));
        QLIBCErrClear();
        size_t mark = tessel_test::SyslogMark();
        EXPECT_EQ(-1, c.call()) << c.condition;
        ExpectBadArgument(mark, c.module, c.condition, c.value);
        EXPECT_EQ(std::string(8, '#'), std::string(buf, 8)) << c.condition << ": buffer written";
    }
    EXPECT_EQ(77UL, author);
    EXPECT_EQ(77L, mtime);
    for (const ItemCase &c : Items()) {
        EXPECT_EQ(c.expected, Get(c, m_pVer)) << c.name << " changed by a refused set";
    }
}

TEST(VersionRecord, ClearChainsAndMissingDataBlock) {
    TESSEL_OBJECT_VERSION ver;
    EXPECT_TRUE(ver.get_ref_last_version().isArray());
    ver.set_ns("notes");
    ver.set_id("1001_ABC");
    ver.set_author(1001);
    ver.set_mtime(1700000000);
    ver.set_version(kVer);
    ver.set_commit_msg(Parse(R"({"listable": true})"));
    ver.set_last_version(Parse(R"(["a", "b"])"));
    ver.set_extra_info(Json::Value("text"));
    Json::Value jSwap = Parse(R"({"k": 1})");
    EXPECT_TRUE(ver.swap_extra_info(jSwap));
    EXPECT_EQ("\"text\"", Text(jSwap));

    TesselObjectVersionClear(&ver);
    TesselObjectVersionClear(nullptr);
    EXPECT_EQ("", ver.get_ns() + ver.get_id() + ver.get_version());
    EXPECT_EQ(0UL, ver.get_author());
    EXPECT_EQ(0L, ver.get_mtime());
    EXPECT_EQ("{}", Text(ver.get_commit_msg())) << "emptied, keeps its type";
    EXPECT_EQ("[]", Text(ver.get_last_version()));
    EXPECT_EQ("{}", Text(ver.get_extra_info()));
    ver.set_last_version(Json::Value("not an array"));
    ver.clear();
    EXPECT_EQ("[]", Text(ver.get_last_version())) << "a reset history is an empty array";

    // A chain of three, freed from its head; the holder frees its own.
    TESSEL_OBJECT_VERSION *pHead = TesselObjectVersionAlloc();
    ASSERT_NE(nullptr, pHead);
    pHead->next = TesselObjectVersionAlloc();
    pHead->next->next = TesselObjectVersionAlloc();
    EXPECT_EQ(pHead->next->next, TesselObjectVersionNext(TesselObjectVersionNext(pHead)));
    EXPECT_EQ(nullptr, TesselObjectVersionNext(pHead->next->next));
    EXPECT_EQ(nullptr, TesselObjectVersionNext(nullptr));
    TESSEL_OBJECT_VERSION_LIST list;
    list.m_head = pHead;
    list.clear();
    EXPECT_EQ(nullptr, list.head());
    TesselObjectVersionFreeList(nullptr);

    // Without its data block a record answers empty and stores nothing.
    TESSEL_OBJECT_VERSION_PRIVATE *pImpl = ver.m_impl;
    ver.m_impl = nullptr;
    EXPECT_FALSE(ver.set_ns("x") || ver.set_author(1) || ver.set_commit_msg(Json::Value(1)));
    EXPECT_TRUE(ver.get_ref_last_version().isNull());
    unsigned long author = 7;
    EXPECT_EQ(0, TesselObjectVersionItemGetAuthor(&author, &ver));
    EXPECT_EQ(0UL, author);
    EXPECT_EQ(-1, TesselObjectVersionItemSetID(&ver, "x"));
    ver.m_impl = pImpl;
}

std::string ToJson(const TESSEL_OBJECT_VERSION &ver, const Json::Value &jField) {
    Json::Value jRet(Json::objectValue);
    EXPECT_TRUE(ver.toJson(jField, jRet));
    return Text(jRet);
}

TEST(VersionToJson, SelectionsAndAuthorNames) {
    TESSEL_OBJECT_VERSION ver;
    ver.set_ns("notes");
    ver.set_id("1001_ABC");
    ver.set_author(tessel_test::kUidAlice);
    ver.set_mtime(1700000000);
    ver.set_version(kVer);
    ver.set_commit_msg(Parse(R"({"listable":true})"));
    ver.set_last_version(Parse(R"(["fedcba9876543210fedcba9876543210fedcba98"])"));
    ver.set_extra_info(Parse(R"({"hidden":1})"));
    const std::string strDefaults = std::string(R"({"author":"alice","commit_msg":{"listable":true},)") +
                                    R"("last_version":["fedcba9876543210fedcba9876543210fedcba98"],)" +
                                    R"("mtime":1700000000,"version":")" + kVer + "\"}";
    EXPECT_EQ(strDefaults, ToJson(ver, Json::Value()));
    EXPECT_EQ(strDefaults, ToJson(ver, Parse("{}")));
    EXPECT_EQ(strDefaults, ToJson(ver, Parse(R"({"ns": false, "id": 0, "extra_info": true})")));
    EXPECT_EQ(R"({"id":"1001_ABC","mtime":1700000000,"ns":"notes"})",
              ToJson(ver, Parse(R"({"ns": true, "id": "yes", "version": false, "author": 0,)"
                                R"( "commit_msg": false, "last_version": null})")));

    // The author by name: login name, a domain user's display name, a
    // directory-style name, a removed account, no user at all.
    const std::pair<unsigned long, const char *> authors[] = {
        {tessel_test::kUidErin, "Erin Example"},
        {tessel_test::kUidGrace, "grace@example.com"},
        {tessel_test::kUidUnknown, "Deleted user #4242"},
        {4294967295UL, "Anonymous"},
    };
    for (const auto &a : authors) {
        ver.set_author(a.first);
        EXPECT_EQ(std::string("{\"author\":\"") + a.second + "\"}",
                  ToJson(ver, Parse(R"({"version":false,"mtime":false,"commit_msg":false,"last_version":false})")));
    }
}

TEST(VersionToJson, RefusesAResultThatIsNotAnObject) {
    TESSEL_OBJECT_VERSION ver;
    for (const char *szRet : {"null", "[]", "7"}) {
        Json::Value jRet = Parse(szRet);
        tessel_test::ErrClear();
        size_t mark = tessel_test::SyslogMark();
        EXPECT_FALSE(ver.toJson(Json::Value(), jRet)) << szRet;
        EXPECT_EQ(szRet, Text(jRet)) << "left as it was";
        EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, tessel_test::ErrCode());
        EXPECT_EQ(std::vector<std::string>{"!jRet.isObject()"}, tessel_test::ErrMsgs());
        const Json::Value &jFrame = TesselErrMsgGet()[0u];
        EXPECT_EQ("version/version_json", jFrame["file"].asString());
        std::string strLine = "version/version_json:" + std::to_string(jFrame["line"].asInt()) +
                              " Failed [!jRet.isObject()], err=";
        EXPECT_TRUE(tessel_test::WaitForSyslog(strLine, mark, LOG_USER | LOG_ERR).has_value()) << strLine;
    }
}

}  // namespace
