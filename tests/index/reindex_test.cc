// Emptying and rebuilding the index against the sandbox's server, with real
// objects laid out by the file-system store in namespaces "ledger" (filter:
// meta-text member "hidden" and text members starting with tmp_ stay out)
// and "other"; each object has text committed into its repository, so
// version, commit message and modification time come from its history. Every
// insert statement the server runs is counted by a statement trigger of the
// test's own, so batch sizes are seen from the server's side.
#include <sys/stat.h>
#include <syslog.h>

#include <filesystem>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <json/writer.h>

#include "index/index_test_util.h"
#include "support/error_stack.h"
#include "support/json_text.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "support/versioned_fields.h"
#include "tessel_backend.h"
#include "tessel_index.h"

namespace {

using namespace index_test;
using namespace tessel_test;

using Msgs = std::vector<std::string>;

constexpr char kRepo[] = "/volume1/@Tessel";
constexpr char kLinks[] = "/usr/quor/etc/tessel/ns";

// The tables' storage files: VACUUM FULL writes both anew.
const char kStorage[] = "SELECT 'object'::regclass::oid, pg_relation_filenode('object'), "
                        "pg_relation_filenode('person')";

// JSON text as the library writes its columns: compact, UTF-8 as it is.
std::string Compact(const Json::Value &jVal) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    builder["emitUTF8"] = true;
    return Json::writeString(builder, jVal);
}

class ReindexTest : public ::testing::Test {
protected:
    static void SetUpTestSuite() {
        ASSERT_TRUE(HasPostgres());
        ASSERT_TRUE(WriteFile(kConf, R"({"Access":{"enable":true,"enable_ns_ledger":true,"enable_ns_other":true},)"
                                     R"("Index":{"ledger":{"text":{"prefix":["tmp_"]},"metatext":{"key":["hidden"]}}}})"));
        for (const std::string ns : {"ledger", "other"}) {
            ASSERT_EQ(0, system(("mkdir -p " + std::string(kRepo) + "/" + ns + " " + kLinks + " && ln -sfn " + kRepo +
                                 "/" + ns + " " + kLinks + "/" + ns)
                                    .c_str()));
        }
        ASSERT_NE(nullptr, TesselOpenConn());
        // Rows per insert statement, in the order the statements ran.
        ASSERT_TRUE(Exec("CREATE TABLE insert_log(seq serial, tbl text, nrows int);"
                         "CREATE FUNCTION log_insert() RETURNS trigger LANGUAGE plpgsql AS $$ BEGIN "
                         "INSERT INTO insert_log(tbl, nrows) SELECT TG_TABLE_NAME, count(*) FROM new_rows; "
                         "RETURN NULL; END $$;"
                         "CREATE TRIGGER object_ins AFTER INSERT ON object REFERENCING NEW TABLE AS new_rows "
                         "FOR EACH STATEMENT EXECUTE FUNCTION log_insert();"
                         "CREATE TRIGGER person_ins AFTER INSERT ON person REFERENCING NEW TABLE AS new_rows "
                         "FOR EACH STATEMENT EXECUTE FUNCTION log_insert();"));
    }
    void SetUp() override {
        for (const std::string ns : {"ledger", "other"}) {
            for (const auto &entry : std::filesystem::directory_iterator(std::string(kRepo) + "/" + ns)) {
                std::filesystem::remove_all(entry.path());
            }
        }
        ASSERT_TRUE(Exec("TRUNCATE object, person, insert_log"));
        ErrClear();
    }

    // A stored object of alice's, its first version committed at 1700000000 + n
    // with text "title" and "tmp_draft"; returns its id.
    std::string Create(const std::string &ns, int n) {
        Json::Value jParm = Parse(R"({"owner": 1001, "requester": 1001, "ctime": 1700000000,
                                      "acl": {"enabled": false}, "metatext": {"m": 2, "hidden": 1},
                                      "commit_msg": {"note": "first"}})");
        jParm["ns"] = ns;
        jParm["category"] = "c" + std::to_string(n);
        jParm["mtime"] = 1700000000 + n;
        jParm["text"]["title"] = "note " + std::to_string(n);
        jParm["text"]["tmp_draft"] = n;
        std::string strId, strVer;
        EXPECT_TRUE(fs_->Create(jParm, strId, strVer)) << ::testing::PrintToString(ErrMsgs());
        EXPECT_EQ(40u, strVer.size());
        versions_[strId] = strVer;
        return strId;
    }

    // What the store holds of an object's versioned fields.
    Json::Value Stored(const std::string &ns, const std::string &strId) {
        Json::Value jParm = Parse(R"({"requester": 1001, "owner": 1001,
                                      "field": {"text": true, "commit_msg": true}})");
        jParm["ns"] = ns;
        jParm["id"] = strId;
        TESSEL_OBJECT obj;
        EXPECT_TRUE(fs_->Get(jParm, &obj)) << ::testing::PrintToString(ErrMsgs());
        return VersionedFields(obj);
    }

    std::unique_ptr<TESSEL_BACKEND_OP> fs_{RegisterBackend::New("fs")};
    std::map<std::string, std::string> versions_;
};

TEST_F(ReindexTest, DeletingOneNamespaceTakesItsPersonsAndEveryOrphanAndRewritesBothTables) {
    ASSERT_TRUE(Exec("INSERT INTO object (id, ns) VALUES ('l1', 'ledger'), ('l2', 'ledger'), ('o1', 'other'),"
                     "('q1', 'x''); DELETE FROM object; --');"
                     "INSERT INTO person (id, person) VALUES ('l1', '{}'), ('o1', '{}'), ('orphan', '{}'),"
                     "('q1', '{}')"));
    Table storage = Rows(kStorage);
    ASSERT_TRUE(TesselDeleteIndex(Parse(R"({"ns": "ledger"})")));
    EXPECT_EQ(Table({{"o1", "other"}, {"q1", "x'); DELETE FROM object; --"}}), Rows("SELECT id, ns FROM object ORDER BY id"));
    EXPECT_EQ(Table({{"o1"}, {"q1"}}), Rows("SELECT id FROM person ORDER BY id"));
    EXPECT_NE(storage[0][1], Rows(kStorage)[0][1]);
    EXPECT_NE(storage[0][2], Rows(kStorage)[0][2]);

    // A hostile name is a name like any other.
    ASSERT_TRUE(TesselDeleteIndex(Parse(R"({"ns": "x'); DELETE FROM object; --"})")));
    EXPECT_EQ(Table({{"o1"}, {"o1"}}), Rows("SELECT id FROM object UNION ALL SELECT id FROM person"));

    // Parameters that name no scope are refused and delete nothing.
    Json::Value jNul(Json::objectValue);
    jNul["ns"] = std::string("other\0x", 7);
    struct Case {
        Json::Value jParam;
        int code;
        std::string msg;
    } cases[] = {
        {Parse(R"({"ns": 5})"), TESSEL_ERR_USER_INPUT, "!jParam[\"ns\"].isString()"},
        {Parse(R"("other")"), TESSEL_ERR_USER_INPUT, "!jParam.isObject()"},
        {jNul, TESSEL_ERR_OPERATION_FAILED, "NULL == szSQLDelete"},
    };
    for (const Case &c : cases) {
        ErrClear();
        EXPECT_FALSE(TesselDeleteIndex(c.jParam));
        EXPECT_EQ(c.code, ErrCode());
        EXPECT_EQ(Msgs({c.msg, "!clear_index(pConn, jParam)"}), ErrMsgs());
        EXPECT_FALSE(TesselReindex(c.jParam));
        EXPECT_EQ(Msgs({c.msg, "!clear_index(pConn, jParam)"}), ErrMsgs());
    }
    EXPECT_EQ(Table({{"o1"}, {"o1"}}), Rows("SELECT id FROM object UNION ALL SELECT id FROM person"));

    storage = Rows(kStorage);
    ASSERT_TRUE(TesselDeleteIndex(Parse("{}")));
    EXPECT_EQ(Table({{"0", "0"}}), Rows("SELECT (SELECT count(*) FROM object), (SELECT count(*) FROM person)"));
    EXPECT_NE(storage, Rows(kStorage));
}

TEST_F(ReindexTest, ReindexRebuildsWhatTheStoreHoldsInBatchesOfThirtyAndSkipsWhatItCannotRead) {
    std::vector<std::string> ledger;
    for (int n = 0; n < 61; ++n) {
        ledger.push_back(Create("ledger", n));
    }
    const std::string strOther = Create("other", 100);
    // Entries that are no readable object: an object directory whose
    // "basic.json" is not JSON, and a directory whose name holds no owner.
    const std::string strEmpty = "1002_" + std::string(96, 'e');
    ASSERT_EQ(0, mkdir((std::string(kRepo) + "/other/" + strEmpty).c_str(), 0700));
    ASSERT_TRUE(WriteFile(std::string(kRepo) + "/other/" + strEmpty + "/basic.json", "{not json"));
    ASSERT_EQ(0, mkdir((std::string(kRepo) + "/other/junk").c_str(), 0700));
    ASSERT_TRUE(Exec("INSERT INTO object (id, ns) VALUES ('stale', 'ledger'), ('kept', 'third');"
                     "INSERT INTO person (id, person) VALUES ('stale', '{}')"));
    ASSERT_TRUE(Exec("TRUNCATE insert_log"));

    ASSERT_TRUE(TesselReindex(Parse(R"({"ns": "ledger"})")));
    EXPECT_EQ(Table({{"object", "30"}, {"person", "30"}, {"object", "30"}, {"person", "30"}, {"object", "1"},
                     {"person", "1"}}),
              Rows("SELECT tbl, nrows FROM insert_log ORDER BY seq"));
    EXPECT_EQ(Table({{"kept", "third"}}), Rows("SELECT id, ns FROM object WHERE ns <> 'ledger'"));
    EXPECT_EQ(Table({{"61", "61"}}),
              Rows("SELECT count(*), count(p.id) FROM object o LEFT JOIN person p USING (id) WHERE ns = 'ledger'"));

    // One row column by column: what the store holds, text and metatext
    // through the filter.
    const std::string strId = ledger[7];
    const Json::Value jStored = Stored("ledger", strId);
    EXPECT_EQ(Parse(R"({"text": {"title": "note 7", "tmp_draft": 7}, "commit_msg": {"note": "first"},
                        "mtime": 1700000007, "version": ")" + versions_[strId] + "\"}"),
              jStored);
    EXPECT_EQ(Table({{strId, "ledger", "1001", "c7", "", versions_[strId], Compact(jStored["commit_msg"]),
                      R"({"enabled":false})", R"({"title":"note 7"})", R"({"m":2})", "{}", "{}", "1700000000",
                      jStored["mtime"].asString(), "{}"}}),
              Rows(std::string(kObjectColumns) + " WHERE id = '" + strId + "'"));
    const std::string strLedgerRows = std::string(kObjectColumns) + " WHERE ns = 'ledger' ORDER BY id";
    const Table snapshot = Rows(strLedgerRows);
    const Table persons = Rows("SELECT id, person FROM person ORDER BY id");

    // Rows lost or changed by hand come back exactly as the store implies.
    ASSERT_TRUE(Exec("DELETE FROM object WHERE id IN ('" + ledger[0] + "', '" + ledger[60] + "');"
                     "DELETE FROM person WHERE id = '" + ledger[30] + "';"
                     "UPDATE object SET category = 'tampered', text = '{}' WHERE id = '" + ledger[5] + "'"));
    ASSERT_TRUE(TesselReindex(Parse(R"({"ns": "ledger"})")));
    EXPECT_EQ(snapshot, Rows(strLedgerRows));
    EXPECT_EQ(persons, Rows("SELECT id, person FROM person ORDER BY id"));

    // Everything: every namespace folder, the unreadable entries logged by
    // name and owner and left out; rows of namespaces without a folder go.
    const size_t mark = SyslogMark();
    ASSERT_TRUE(Exec("TRUNCATE insert_log"));
    ASSERT_TRUE(TesselReindex(Parse("{}")));
    EXPECT_TRUE(WaitForSyslog("fail to reindex object ns=other, id=" + strEmpty + ", owner=1002", mark,
                              LOG_USER | LOG_ERR)
                    .has_value());
    EXPECT_TRUE(WaitForSyslog("fail to reindex object ns=other, id=junk, owner=4294967295", mark, LOG_USER | LOG_ERR)
                    .has_value());
    EXPECT_EQ(Table({{"object", "30"}, {"person", "30"}, {"object", "30"}, {"person", "30"}, {"object", "1"},
                     {"person", "1"}, {"object", "1"}, {"person", "1"}}),
              Rows("SELECT tbl, nrows FROM insert_log ORDER BY seq"));
    EXPECT_EQ(snapshot, Rows(strLedgerRows));
    // Namespace "other" has no filter: its text keeps every member.
    EXPECT_EQ(Table({{strOther, "other", "c100", R"({"title":"note 100","tmp_draft":100})", "1700000100"}}),
              Rows("SELECT id, ns, category, text, mtime FROM object WHERE ns <> 'ledger'"));
    EXPECT_EQ(Table({{"62"}}), Rows("SELECT count(*) FROM person"));
}

TEST_F(ReindexTest, IndexingByIdReadsTheStoredObject) {
    const std::string strId = Create("ledger", 1);
    const std::string kVersioned = "SELECT id, category, metatext, version, commit_msg, text, mtime FROM object";
    ASSERT_TRUE(TesselObjectIndex(strId.c_str(), "ledger", 1001));
    EXPECT_EQ(Table({{strId, "c1", R"({"m":2})", versions_[strId], R"({"note":"first"})", R"({"title":"note 1"})",
                      "1700000001"}}),
              Rows(kVersioned));
    EXPECT_EQ(Table({{strId}}), Rows("SELECT id FROM person"));

    // A second version: the row follows the store to its latest commit.
    Json::Value jSet = Parse(R"({"ns": "ledger", "requester": 1001, "mtime": 1700000500,
                                 "text": {"title": "note one", "body": "b", "tmp_draft": null},
                                 "commit_msg": {"note": "second"}})");
    jSet["id"] = strId;
    jSet["version"] = versions_[strId];
    std::string strVer2;
    ASSERT_TRUE(fs_->Set(jSet, strVer2)) << ::testing::PrintToString(ErrMsgs());
    ASSERT_NE(versions_[strId], strVer2);
    EXPECT_EQ(strVer2, Stored("ledger", strId)["version"].asString());
    ASSERT_TRUE(TesselObjectIndex(strId.c_str(), "ledger", 1001));
    EXPECT_EQ(Table({{strId, "c1", R"({"m":2})", strVer2, R"({"note":"second"})",
                      R"({"body":"b","title":"note one"})", "1700000500"}}),
              Rows(kVersioned));

    // The parameter's own object is upserted once more after the namespace:
    // its insert statements find the row there and add none.
    ASSERT_TRUE(Exec("TRUNCATE insert_log"));
    ASSERT_TRUE(TesselReindex(Parse("{\"ns\": \"ledger\", \"id\": \"" + strId + "\"}")));
    EXPECT_EQ(Table({{"object", "1"}, {"person", "1"}, {"object", "0"}, {"person", "0"}}),
              Rows("SELECT tbl, nrows FROM insert_log ORDER BY seq"));
    EXPECT_EQ(Table({{strId, "c1", R"({"m":2})", strVer2, R"({"note":"second"})", R"({"body":"b","title":"note one"})",
                      "1700000500"}}),
              Rows(kVersioned));

    const std::string strMissing = "1001_" + std::string(96, '0');
    ErrClear();
    EXPECT_FALSE(TesselObjectIndex(strMissing.c_str(), "ledger", 1001));
    Msgs msgs = ErrMsgs();
    ASSERT_LE(2u, msgs.size());
    EXPECT_EQ(Msgs({"!Object.Get(jGetParm)", "!TesselObjectIndexEx(pConn, szID, szNs, requester)"}),
              Msgs(msgs.end() - 2, msgs.end()));
    EXPECT_EQ(Table({{"1"}}), Rows("SELECT count(*) FROM object"));
    ErrClear();
    EXPECT_FALSE(TesselObjectIndex(nullptr, "ledger", 1001));
    EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, ErrCode());
    EXPECT_EQ(Msgs({"NULL == szID || NULL == szNs", "!TesselObjectIndexEx(pConn, szID, szNs, requester)"}), ErrMsgs());
}

}  // namespace
