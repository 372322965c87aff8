// The plain-function accessors through the shared library, as applications
// call them: buffer handling, argument checks and their reports.
#include <string.h>

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "object_test_util.h"
#include "support/sandbox.h"
#include "tessel_error.h"
#include "tesselobject.h"
#include "tesselobjectgetter.h"
#include "tesselobjectsetter.h"

using object_test::ExpectBadArgument;

namespace {

const char kGetter[] = "include/tesselobjectgetter";
const char kSetter[] = "include/tesselobjectsetter";

typedef int (*TextGetter)(char *, int, const TESSEL_OBJECT *);
typedef int (*TextSetter)(TESSEL_OBJECT *, const char *);

// A text or JSON field: its getter and setter, the text stored and the text
// the getter gives back (JSON comes back in compact form).
struct ItemCase {
    const char *name;
    TextGetter get;
    TextSetter set;
    bool json;
    std::string stored;
    std::string expected;
};

const char kJsonIn[] = "{ \"title\" : \"T\", \"list\" : [1, 2, \"\\u00e9\"] }";
const char kJsonOut[] = "{\"list\":[1,2,\"\xc3\xa9\"],\"title\":\"T\"}";

std::vector<ItemCase> Items() {
    return {
        {"ns", TesselObjectItemGetNameSpace, TesselObjectItemSetNameSpace, false, "notes", "notes"},
        {"id", TesselObjectItemGetID, TesselObjectItemSetID, false, "1001_ABCDEF", "1001_ABCDEF"},
        {"category", TesselObjectItemGetCategory, TesselObjectItemSetCategory, false, "memo", "memo"},
        {"version", TesselObjectItemGetVersion, TesselObjectItemSetVersion, false, std::string(40, 'a'),
         std::string(40, 'a')},
        {"perm", TesselObjectItemGetPerm, TesselObjectItemSetPerm, false, "rw", "rw"},
        {"parent_id", TesselObjectItemGetParentID, TesselObjectItemSetParentID, false, std::string(5000, 'p'),
         std::string(5000, 'p')},
        {"commit_msg", TesselObjectItemGetCommitMsg, TesselObjectItemSetCommitMsg, true, kJsonIn, kJsonOut},
        {"metatext", TesselObjectItemGetMetaText, TesselObjectItemSetMetaText, true, kJsonIn, kJsonOut},
        {"text", TesselObjectItemGetText, TesselObjectItemSetText, true, kJsonIn, kJsonOut},
        {"metabinary_info", TesselObjectItemGetMetaBinary_info, TesselObjectItemSetMetaBinaryInfo, true, "[1, 2]",
         "[1,2]"},
        {"binary_info", TesselObjectItemGetBinary_info, TesselObjectItemSetBinaryInfo, true, kJsonIn, kJsonOut},
        {"path_info", TesselObjectItemGetPath_info, TesselObjectItemSetPathInfo, true, kJsonIn, kJsonOut},
        {"acl", TesselObjectItemGetACL, TesselObjectItemSetACL, true, "{\"1002\":\"ro\"}", "{\"1002\":\"ro\"}"},
        {"extra_info", TesselObjectItemGetExtraInfo, TesselObjectItemSetExtraInfo, true, "\"just text\"",
         "\"just text\""},
        {"person", TesselObjectItemGetPerson, TesselObjectItemSetPerson, true, kJsonIn, kJsonOut},
        {"err", TesselObjectItemGetErr, TesselObjectItemSetErr, true, "{\"code\":1008}", "{\"code\":1008}"},
    };
}

// Every text getter answers as for an empty field: "null" for JSON, "" else.
void ExpectEmptyGetters(const TESSEL_OBJECT *pObject) {
    for (const ItemCase &c : Items()) {
        char szBuf[16];
        memset(szBuf, '#', sizeof(szBuf));
        EXPECT_EQ(0, c.get(szBuf, sizeof(szBuf), pObject)) << c.name;
        EXPECT_STREQ(c.json ? "null" : "", szBuf) << c.name;
    }
}

// A heap buffer of exactly n bytes, so that the sanitizer sees any write
// past its end; filled with a marker to see what was written.
std::unique_ptr<char[]> Buffer(size_t n) {
    std::unique_ptr<char[]> buf(new char[n]);
    memset(buf.get(), '#', n);
    return buf;
}

class ObjectItem : public ::testing::Test {
protected:
    void SetUp() override {
        m_pObject = TesselObjectAlloc();
        ASSERT_NE(nullptr, m_pObject);
        // The accessors must leave the library's own error stack alone.
        TesselErrSetEx(1008, "tests/object", 1, "%s", "sentinel");
        QLIBCErrClear();
    }
    void TearDown() override {
        EXPECT_EQ(1008, TesselErrCodeGet()) << "the library's error stack was touched";
        TesselObjectFreeList(m_pObject);
    }
    TESSEL_OBJECT *m_pObject = nullptr;
};

TEST_F(ObjectItem, GettersFillExactAndShortBuffers) {
    for (const ItemCase &c : Items()) {
        ASSERT_EQ(0, c.set(m_pObject, c.stored.c_str())) << c.name;
        const size_t len = c.expected.size();

        auto exact = Buffer(len + 1);
        EXPECT_EQ(0, c.get(exact.get(), static_cast<int>(len + 1), m_pObject)) << c.name;
        EXPECT_EQ(c.expected, std::string(exact.get())) << c.name;

        auto shortBuf = Buffer(len);
        EXPECT_EQ(0, c.get(shortBuf.get(), static_cast<int>(len), m_pObject)) << c.name;
        EXPECT_EQ(c.expected.substr(0, len - 1), std::string(shortBuf.get())) << c.name << ": cut and terminated";

        auto one = Buffer(1);
        EXPECT_EQ(0, c.get(one.get(), 1, m_pObject)) << c.name;
        EXPECT_EQ('\0', one[0]) << c.name;
    }
    EXPECT_EQ(0, QLIBCErrGet()) << "no bad argument, no platform error";
}

TEST_F(ObjectItem, GettersOfANewRecord) { ExpectEmptyGetters(m_pObject); }

TEST_F(ObjectItem, GettersRefuseBadArgumentsInOrder) {
    const struct {
        bool nullBuf;
        int cbBuf;
        bool nullObject;
        const char *condition;
        int value;
    } cases[] = {
        {true, 8, false, "__null != szBuf", 0},
        {false, 0, false, "0 < cbBuf", 0},
        {false, -3, false, "0 < cbBuf", -3},
        {false, -2147483647 - 1, false, "0 < cbBuf", -2147483647 - 1},
        {false, 8, true, "NULL != pObject", 0},
        {true, 0, true, "__null != szBuf", 0},
        {false, -1, true, "0 < cbBuf", -1},
    };
    for (const ItemCase &item : Items()) {
        ASSERT_EQ(0, item.set(m_pObject, item.stored.c_str())) << item.name;
        for (const auto &c : cases) {
            auto buf = Buffer(8);
            QLIBCErrClear();
            size_t mark = tessel_test::SyslogMark();
            EXPECT_EQ(-1, item.get(c.nullBuf ? nullptr : buf.get(), c.cbBuf, c.nullObject ? nullptr : m_pObject))
                << item.name << ": " << c.condition;
            ExpectBadArgument(mark, kGetter, c.condition, c.value);
            EXPECT_EQ(std::string(8, '#'), std::string(buf.get(), 8)) << item.name << ": buffer written";
        }
    }
}

TEST_F(ObjectItem, IntegerGetters) {
    ASSERT_EQ(0, TesselObjectItemSetOwner(m_pObject, 4294967295UL));
    ASSERT_EQ(0, TesselObjectItemSetCreateTime(m_pObject, -1));
    ASSERT_EQ(0, TesselObjectItemSetModifyTime(m_pObject, 1700000000L));
    unsigned long owner = 0;
    long ctime = 0, mtime = 0;
    EXPECT_EQ(0, TesselObjectItemGetOwner(&owner, m_pObject) + TesselObjectItemGetCreateTime(&ctime, m_pObject) +
                     TesselObjectItemGetModifyTime(&mtime, m_pObject));
    EXPECT_EQ(4294967295UL, owner);
    EXPECT_EQ(-1L, ctime);
    EXPECT_EQ(1700000000L, mtime);

    // Values wider than the 32-bit fields keep their low bits.
    ASSERT_EQ(0, TesselObjectItemSetOwner(m_pObject, 0x100000000UL + 1002));
    EXPECT_EQ(0, TesselObjectItemGetOwner(&owner, m_pObject));
    EXPECT_EQ(1002UL, owner);
}

// The integer setters check only the record, with their own condition text.
TEST_F(ObjectItem, IntegerAccessorsRefuseBadArguments) {
    unsigned long owner = 77;
    long t = 77;
    const struct {
        std::function<int()> call;
        const char *module;
        const char *condition;
    } cases[] = {
        {[&] { return TesselObjectItemGetOwner(nullptr, m_pObject); }, kGetter, "__null != pVal"},
        {[&] { return TesselObjectItemGetOwner(&owner, nullptr); }, kGetter, "NULL != pObject"},
        {[&] { return TesselObjectItemGetOwner(nullptr, nullptr); }, kGetter, "__null != pVal"},
        {[&] { return TesselObjectItemGetCreateTime(nullptr, m_pObject); }, kGetter, "__null != pVal"},
        {[&] { return TesselObjectItemGetCreateTime(&t, nullptr); }, kGetter, "NULL != pObject"},
        {[&] { return TesselObjectItemGetModifyTime(nullptr, m_pObject); }, kGetter, "__null != pVal"},
        {[&] { return TesselObjectItemGetModifyTime(&t, nullptr); }, kGetter, "NULL != pObject"},
        {[] { return TesselObjectItemSetOwner(nullptr, 1001); }, kSetter, "__null != pObject"},
        {[] { return TesselObjectItemSetCreateTime(nullptr, 1); }, kSetter, "__null != pObject"},
        {[] { return TesselObjectItemSetModifyTime(nullptr, 1); }, kSetter, "__null != pObject"},
    };
    for (const auto &c : cases) {
        QLIBCErrClear();
        size_t mark = tessel_test::SyslogMark();
        EXPECT_EQ(-1, c.call()) << &c - cases;
        ExpectBadArgument(mark, c.module, c.condition, 0);
    }
    EXPECT_EQ(77UL, owner);
    EXPECT_EQ(77L, t);
}

TEST_F(ObjectItem, SettersRefuseBadArgumentsAndKeepTheField) {
    for (const ItemCase &item : Items()) {
        ASSERT_EQ(0, item.set(m_pObject, item.stored.c_str())) << item.name;
        const struct {
            TESSEL_OBJECT *pObject;
            const char *szVal;
            const char *condition;
        } cases[] = {
            {m_pObject, nullptr, "__null != szVal"},
            {nullptr, "{}", "NULL != pObject"},
            {nullptr, nullptr, "__null != szVal"},
        };
        for (const auto &c : cases) {
            QLIBCErrClear();
            size_t mark = tessel_test::SyslogMark();
            EXPECT_EQ(-1, item.set(c.pObject, c.szVal)) << item.name << ": " << c.condition;
            ExpectBadArgument(mark, kSetter, c.condition, 0);
        }
        std::vector<char> buf(item.expected.size() + 1);
        ASSERT_EQ(0, item.get(buf.data(), static_cast<int>(buf.size()), m_pObject));
        EXPECT_EQ(item.expected, std::string(buf.data())) << item.name << " changed by a refused set";
    }
}

TEST_F(ObjectItem, JsonSettersStoreWhatAFailedParseLeaves) {
    for (const ItemCase &item : Items()) {
        if (!item.json) {
            continue;
        }
        ASSERT_EQ(0, item.set(m_pObject, item.stored.c_str())) << item.name;
        EXPECT_EQ(0, item.set(m_pObject, "{\"unclosed\": ")) << item.name;
        char szBuf[16];
        ASSERT_EQ(0, item.get(szBuf, sizeof(szBuf), m_pObject));
        EXPECT_STREQ("null", szBuf) << item.name;
    }
    EXPECT_EQ(0, QLIBCErrGet()) << "not a bad argument";
}

TEST_F(ObjectItem, ARecordWithoutDataBlock) {
    for (const ItemCase &item : Items()) {
        ASSERT_EQ(0, item.set(m_pObject, item.stored.c_str())) << item.name;
    }
    TESSEL_OBJECT_PRIVATE *pImpl = m_pObject->m_impl;
    m_pObject->m_impl = nullptr;
    ExpectEmptyGetters(m_pObject);
    for (const ItemCase &item : Items()) {
        EXPECT_EQ(-1, item.set(m_pObject, "x")) << item.name;
    }
    unsigned long owner = 77;
    EXPECT_EQ(0, TesselObjectItemGetOwner(&owner, m_pObject));
    EXPECT_EQ(0UL, owner);
    EXPECT_EQ(-1, TesselObjectItemSetOwner(m_pObject, 1));
    EXPECT_EQ(0, QLIBCErrGet()) << "no argument was wrong";
    m_pObject->m_impl = pImpl;
}

}  // namespace
