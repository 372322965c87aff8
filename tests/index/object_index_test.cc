// Indexing object records into the sandbox's server: every column read back
// with libpq, hostile text stored verbatim or refused, batches replacing rows
// in one execution. Namespace "ledger" filters text and metatext; namespace
// "plain" has no filter. The settings file is written once, before anything
// reads the process-wide filter cache.
#include <syslog.h>

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "index/index_test_util.h"
#include "support/error_stack.h"
#include "support/json_text.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_index.h"
#include "tesselobject.h"

namespace {

using namespace index_test;
using namespace tessel_test;

const std::string kIdA = "1001_" + std::string(96, 'a');
const std::string kIdB = "1002_" + std::string(96, 'b');
const std::string kIdC = "1001_" + std::string(96, 'c');

// A record whose every field differs from the defaults; tag tells records
// apart and may hold any text.
TESSEL_OBJECT *Record(const std::string &id, const std::string &ns, const std::string &tag) {
    TESSEL_OBJECT *pObj = TesselObjectAlloc();
    pObj->set_id(id);
    pObj->set_ns(ns);
    pObj->set_owner(kUidAlice);
    pObj->set_category("cat-" + tag);
    pObj->set_parent_id("parent-" + tag);
    pObj->set_version(std::string(40, 'f'));
    Json::Value jCommit = Parse(R"({"author_uid":1001})");
    jCommit["commit_msg"] = tag;
    pObj->set_commit_msg(jCommit);
    pObj->set_acl(Parse(R"({"enabled":true,"rules":[{"uid":1002,"perm":"ro"}]})"));
    Json::Value jText = Parse(R"({"secret":"s","tmp_a":1,"tmp_":2,"tmp":3,"Tmp_b":4})");
    jText["title"] = tag;
    pObj->set_text(jText);
    Json::Value jMeta = Parse(R"({"note":"n"})");
    jMeta["tag"] = tag;
    pObj->set_metatext(jMeta);
    pObj->set_binary_info(Parse(R"({"a.png":{"format":"png","md5":"0123"}})"));
    pObj->set_metabinary_info(Parse(R"({"m.txt":{"format":"txt","md5":"4567"}})"));
    pObj->set_ctime(1700000000);
    pObj->set_mtime(1700000123);
    Json::Value jExtra(Json::objectValue);
    jExtra["app"] = tag;
    pObj->set_extra_info(jExtra);
    pObj->set_person(Parse(R"({"1001":{"mtime":1700000123}})"));
    return pObj;
}

// The object row Record(id, ns, tag) must give, text and metatext filtered
// as namespace ns asks.
std::vector<std::string> RowOf(const std::string &id, const std::string &ns, const std::string &tag) {
    const bool blFiltered = ("ledger" == ns);
    return {id,
            ns,
            "1001",
            "cat-" + tag,
            "parent-" + tag,
            std::string(40, 'f'),
            R"({"author_uid":1001,"commit_msg":")" + tag + "\"}",
            R"({"enabled":true,"rules":[{"perm":"ro","uid":1002}]})",
            blFiltered ? R"({"Tmp_b":4,"title":")" + tag + R"(","tmp":3})"
                       : R"({"Tmp_b":4,"secret":"s","title":")" + tag + R"(","tmp":3,"tmp_":2,"tmp_a":1})",
            blFiltered ? R"({"tag":")" + tag + "\"}" : R"({"note":"n","tag":")" + tag + "\"}",
            R"({"a.png":{"format":"png","md5":"0123"}})",
            R"({"m.txt":{"format":"txt","md5":"4567"}})",
            "1700000000",
            "1700000123",
            R"({"app":")" + tag + "\"}"};
}

const char kPersonOfRecord[] = R"({"1001":{"mtime":1700000123}})";

class ObjectIndexTest : public ::testing::Test {
protected:
    static void SetUpTestSuite() {
        ASSERT_TRUE(HasPostgres());
        ASSERT_TRUE(WriteFile(kConf, R"({"Access":{"enable":true},"Index":{"ledger":{)"
                                     R"("text":{"key":["secret"],"prefix":["tmp_"]},"metatext":{"key":["note"]}}}})"));
        ASSERT_NE(nullptr, TesselOpenConn());
    }
    void SetUp() override {
        ASSERT_TRUE(Exec("TRUNCATE object, person"));
        ErrClear();
    }
    void TearDown() override { TesselObjectFreeList(pList_); }

    // Records freed after the test.
    TESSEL_OBJECT *Keep(TESSEL_OBJECT *pObj) {
        pObj->next = pList_;
        pList_ = pObj;
        return pObj;
    }

    TESSEL_OBJECT *pList_ = nullptr;
};

TEST_F(ObjectIndexTest, OneRecordIsInsertedThenUpdatedInPlaceWithFilteredText) {
    TESSEL_OBJECT *pObj = Keep(Record(kIdA, "ledger", "first"));
    ASSERT_TRUE(TesselObjectIndex(pObj));
    EXPECT_EQ(Table({RowOf(kIdA, "ledger", "first")}), Rows(kObjectColumns));
    EXPECT_EQ(Table({{kIdA, kPersonOfRecord}}), Rows("SELECT id, person FROM person"));

    // Emptied fields become "{}", the row keeps its identity (an update, not
    // a second insert), and an unfiltered namespace keeps every member.
    TESSEL_OBJECT *pNew = Keep(Record(kIdA, "plain", "second"));
    pNew->set_acl(Json::Value(Json::objectValue));
    pNew->set_text(Json::Value());
    pNew->set_extra_info(Json::Value(Json::arrayValue));
    pNew->set_person(Json::Value(Json::objectValue));
    ASSERT_TRUE(TesselObjectIndexEx(TesselOpenConn(), pNew));
    std::vector<std::string> want = RowOf(kIdA, "plain", "second");
    want[7] = want[8] = want[14] = "{}";
    EXPECT_EQ(Table({want}), Rows(kObjectColumns));
    EXPECT_EQ(Table({{kIdA, "{}"}}), Rows("SELECT id, person FROM person"));
    EXPECT_EQ(Table({{"1"}}), Rows("SELECT count(*) FROM object"));

    TESSEL_OBJECT *pPlain = Keep(Record(kIdB, "plain", "third"));
    ASSERT_TRUE(TesselObjectIndex(pPlain));
    EXPECT_EQ(RowOf(kIdB, "plain", "third"), Rows(std::string(kObjectColumns) + " WHERE id = '" + kIdB + "'").at(0));

    EXPECT_FALSE(TesselObjectIndexEx(nullptr, pObj));
    EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, ErrCode());
    EXPECT_EQ(std::vector<std::string>({"NULL == pConn"}), ErrMsgs());
    EXPECT_FALSE(TesselObjectIndex(nullptr));
    EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, ErrCode());
    EXPECT_EQ(std::vector<std::string>({"NULL == pObj", "!TesselObjectIndexEx(pConn, pObj)"}), ErrMsgs());
}

TEST_F(ObjectIndexTest, HostileTextIsStoredVerbatimOrRefusedWithTheTablesIntact) {
    const std::string strId = "1001_'); DROP TABLE object; --";
    TESSEL_OBJECT *pObj = Keep(Record(strId, "plain", "it's \\'; DROP TABLE person; --"));
    pObj->set_parent_id("x''y\\\\z");
    pObj->set_text(Parse(R"({"k'ey\\":"v\\'al'); DELETE FROM object; --"})"));
    ASSERT_TRUE(TesselObjectIndex(pObj));
    Table rows = Rows(std::string(kObjectColumns) + " WHERE ns = 'plain'");
    ASSERT_EQ(1u, rows.size());
    EXPECT_EQ(strId, rows[0][0]);
    EXPECT_EQ("cat-it's \\'; DROP TABLE person; --", rows[0][3]);
    EXPECT_EQ("x''y\\\\z", rows[0][4]);
    EXPECT_EQ(R"({"k'ey\\":"v\\'al'); DELETE FROM object; --"})", rows[0][8]);
    EXPECT_EQ(Table({{strId}}), Rows("SELECT id FROM person"));
    const Table before = Rows("SELECT * FROM object JOIN person USING (id)");

    // What the wrapper cannot carry whole is refused before anything runs.
    const std::string strNul("1001_a\0b", 8);
    struct Bad {
        std::string what;
        TESSEL_OBJECT *pObj;
    } bad[] = {
        {"NUL in the id", Record(strNul, "plain", "x")},
        {"NUL in the category", Record(kIdA, "plain", "x")},
        {"invalid UTF-8 in the version", Record(kIdA, "plain", "x")},
        {"invalid UTF-8 in a text value", Record(kIdA, "plain", "x")},
        {"overlong encoding in a text key", Record(kIdA, "plain", "x")},
    };
    bad[1].pObj->set_category(std::string("a\0'b", 4));
    bad[2].pObj->set_version("\xff\xfe");
    {
        Json::Value jText(Json::objectValue);
        jText["title"] = "caf\xc3";
        bad[3].pObj->set_text(jText);
        Json::Value jKey(Json::objectValue);
        jKey["\xc0\xaf"] = 1;
        bad[4].pObj->set_text(jKey);
    }
    for (Bad &b : bad) {
        Keep(b.pObj);
        const size_t mark = SyslogMark();
        ErrClear();
        EXPECT_FALSE(TesselObjectIndex(b.pObj)) << b.what;
        EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode()) << b.what;
        EXPECT_EQ(std::vector<std::string>({"!szSQLUpsert", "!TesselObjectIndexEx(pConn, pObj)"}), ErrMsgs()) << b.what;
        EXPECT_TRUE(WaitForSyslog("Failed [!szSQLUpsert], err=", mark, LOG_USER | LOG_ERR).has_value()) << b.what;
    }
    EXPECT_EQ(before, Rows("SELECT * FROM object JOIN person USING (id)"));
    EXPECT_EQ(Table({{"1", "1"}}), Rows("SELECT (SELECT count(*) FROM object), (SELECT count(*) FROM person)"));
}

TEST_F(ObjectIndexTest, BatchReplacesTheRowsOfItsIdsInOneExecution) {
    // Stale rows of two ids in the batch (one person row without its object)
    // and one unrelated row that must stay.
    ASSERT_TRUE(Exec("INSERT INTO object (id, ns, owner, category, text) VALUES ('" + kIdA +
                     "', 'old', 7, 'stale', '{\"x\":1}'), ('keep', 'other', 8, 'kept', NULL);"
                     "INSERT INTO person (id, person) VALUES ('" + kIdB + "', '{\"old\":1}'), ('keep', '{}')"));
    TESSEL_OBJECT *pHead = Record(kIdA, "ledger", "one");
    pHead->next = Record(kIdB, "plain", "two");
    pHead->next->next = Record(kIdC, "ledger", "three");
    pHead->next->next->set_person(Json::Value());
    ASSERT_TRUE(TesselObjectBatchIndex(pHead));
    EXPECT_EQ(Table({RowOf(kIdA, "ledger", "one"), RowOf(kIdC, "ledger", "three"), RowOf(kIdB, "plain", "two"),
                     {"keep", "other", "8", "kept", "<null>", "<null>", "<null>", "<null>", "<null>", "<null>",
                      "<null>", "<null>", "<null>", "<null>", "<null>"}}),
              Rows(std::string(kObjectColumns) + " ORDER BY id"));
    EXPECT_EQ(Table({{kIdA, kPersonOfRecord}, {kIdC, "{}"}, {kIdB, kPersonOfRecord}, {"keep", "{}"}}),
              Rows("SELECT id, person FROM person ORDER BY id"));

    // A chain naming one id twice fails as a whole: the deletes of the same
    // execution are undone with it.
    const Table before = Rows(std::string(kObjectColumns) + " ORDER BY id");
    TESSEL_OBJECT *pTwice = Record(kIdA, "plain", "again");
    pTwice->next = Record(kIdA, "plain", "again");
    EXPECT_FALSE(TesselObjectBatchIndexEx(TesselOpenConn(), pTwice));
    EXPECT_EQ(TESSEL_ERR_OPERATION_FAILED, ErrCode());
    EXPECT_EQ(std::vector<std::string>({"(0 != QUORDBExecute(pConn, (strSQL + \";\" + strPerson).c_str(), NULL))"}),
              ErrMsgs());
    EXPECT_EQ(before, Rows(std::string(kObjectColumns) + " ORDER BY id"));

    // A record the wrapper refuses stops the batch before it runs.
    ErrClear();
    pTwice->next->set_id(std::string("x\0y", 3));
    EXPECT_FALSE(TesselObjectBatchIndex(pTwice));
    EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
    EXPECT_EQ(std::vector<std::string>({"!szSQLUpsert", "!CreateValues(strObjectValue, strPersonValue, pObj, jFilter)",
                                        "!TesselObjectBatchIndexEx(pConn, pList)"}),
              ErrMsgs());
    EXPECT_EQ(before, Rows(std::string(kObjectColumns) + " ORDER BY id"));
    TesselObjectFreeList(pTwice);

    // An empty chain deletes nothing and inserts nothing.
    EXPECT_TRUE(TesselObjectBatchIndex(nullptr));
    EXPECT_EQ(before, Rows(std::string(kObjectColumns) + " ORDER BY id"));
    EXPECT_EQ(Table({{"4"}}), Rows("SELECT count(*) FROM person"));
    ErrClear();
    EXPECT_FALSE(TesselObjectBatchIndexEx(nullptr, pHead));
    EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, ErrCode());
    EXPECT_EQ(std::vector<std::string>({"NULL == pConn"}), ErrMsgs());
    TesselObjectFreeList(pHead);
}

TEST_F(ObjectIndexTest, InListsAreEscapedAndRefuseWhatTheyCannotHold) {
    std::string strOut = "untouched";
    ASSERT_TRUE(TesselObjectEscapeStringArray(strOut, Parse(R"(["a", "b'c", "d\\'); DROP TABLE object; --"])")));
    EXPECT_EQ("('a','b''c','d\\''); DROP TABLE object; --')", strOut);
    // The list is SQL the server reads back as exactly those strings.
    EXPECT_EQ(Table({{"a"}, {"b'c"}, {"d\\'); DROP TABLE object; --"}}),
              Rows("SELECT x FROM unnest(ARRAY['a', 'b''c', 'd\\''); DROP TABLE object; --']) AS x WHERE x IN " +
                   strOut));
    ASSERT_TRUE(TesselObjectEscapeUIntArray(strOut, Parse("[1001, 0, 4294967295, 9223372036854775807]")));
    EXPECT_EQ("(1001,0,4294967295,9223372036854775807)", strOut);
    ASSERT_TRUE(TesselObjectEscapeStringArray(strOut, Json::Value(Json::arrayValue)));
    EXPECT_EQ("('')", strOut);
    strOut = "untouched";
    ASSERT_TRUE(TesselObjectEscapeUIntArray(strOut, Json::Value(Json::arrayValue)));
    EXPECT_EQ("('')", strOut);

    struct Case {
        bool (*fn)(std::string &, const Json::Value &);
        Json::Value jIn;
        int code;
        std::string msg;
    } cases[] = {
        {TesselObjectEscapeStringArray, Parse(R"({"a":"b"})"), TESSEL_ERR_BAD_PARAMETERS, "!jsArray.isArray()"},
        {TesselObjectEscapeUIntArray, Json::Value(), TESSEL_ERR_BAD_PARAMETERS, "!jsArray.isArray()"},
        {TesselObjectEscapeStringArray, Parse(R"(["a", 5])"), TESSEL_ERR_USER_INPUT, "!szSQL"},
        {TesselObjectEscapeStringArray, Json::Value(Json::arrayValue), TESSEL_ERR_USER_INPUT, "!szSQL"},
        {TesselObjectEscapeUIntArray, Parse("[1, -1]"), TESSEL_ERR_USER_INPUT, "NULL == szSQL"},
        {TesselObjectEscapeUIntArray, Parse(R"(["1001"])"), TESSEL_ERR_USER_INPUT, "NULL == szSQL"},
        {TesselObjectEscapeUIntArray, Parse("[9223372036854775808]"), TESSEL_ERR_USER_INPUT, "NULL == szSQL"},
    };
    cases[3].jIn.append("ok");
    cases[3].jIn.append("bad \xe2\x82");
    for (const Case &c : cases) {
        strOut = "untouched";
        ErrClear();
        EXPECT_FALSE(c.fn(strOut, c.jIn)) << c.jIn.toStyledString();
        EXPECT_EQ("untouched", strOut);
        EXPECT_EQ(c.code, ErrCode()) << c.jIn.toStyledString();
        EXPECT_EQ(std::vector<std::string>({c.msg}), ErrMsgs()) << c.jIn.toStyledString();
    }
}

}  // namespace
