// Changing objects: the checks and their exact reports (the object, its
// version and its index row untouched when they refuse), changes that reach
// the files, the index and the hooks, the word after a change, moves and
// parent resets, the lock chosen by children, and the list form.
#include <memory>

#include <quor/qlib.h>

#include "change_fixture.h"
#include "support/process_holding.h"
#include "tessel_backend.h"
#include "tessel_id.h"
#include "tessel_lock.h"
#include "tessel_ns.h"

using namespace tessel_test;
using namespace change_test;

namespace {

const char kPrepare[] = "!PrepareSetParm(jParm, tmpOldObj.get_ref_acl(), &tmpOldObj)";

class Set : public ChangeFixture {
protected:
    // A set request of requester on id with further members.
    static Json::Value SetReq(unsigned requester, const std::string &strId, const std::string &strMembers) {
        Json::Value jParm = Req(requester, strMembers);
        jParm["id"] = strId;
        return jParm;
    }
    static std::string IndexRow(const std::string &strId) {
        return Sql("SELECT version || '|' || parent_id || '|' || metatext::text || '|' || acl::text FROM object "
                   "WHERE id = '" + strId + "'");
    }
};

TEST_F(Set, RefusedChangesLeaveTheObjectAsItWas) {
    const std::string strId =
        Made(kUidAlice, R"("preset_acl": true, "acl": {"enabled": true, "zem_user": {"1002": {"perm": "ro"}}})");
    const std::string strBobs = Made(kUidBob);
    const Json::Value jBefore = Stored(strId);
    const std::string strRow = IndexRow(strId);
    const std::string strVer = jBefore["version"].asString();
    struct Case {
        Json::Value jParm;
        int code;
        Msgs msgs;
    } cases[] = {
        {Json::Value("x"), TESSEL_ERR_USER_INPUT,
         {"!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"id\") || "
          "!jParm[\"id\"].isString() || !jParm.isMember(\"requester\") || !jParm[\"requester\"].isIntegral()"}},
        {SetReq(kUidAlice, strId, R"("mtime": 5)"), TESSEL_ERR_USER_INPUT,
         {"!jParm.isMember(\"ctime\") && !jParm.isMember(\"parent_id\") && !jParm.isMember(\"reset_parent_id\") && "
          "!jParm.isMember(\"person\") && !jParm.isMember(\"metatext\") && !jParm.isMember(\"text\") && "
          "!jParm.isMember(\"metabinary_files\") && !jParm.isMember(\"binary_files\")",
          kPrepare}},
        {SetReq(kUidAlice, strId, R"("text": {"a": 1})"), TESSEL_ERR_USER_INPUT,
         {"(jParm.isMember(\"text\") || jParm.isMember(\"binary_files\")) && (!jParm.isMember(\"version\") || "
          "!jParm[\"version\"].isString())",
          kPrepare}},
        {SetReq(kUidAlice, strId, R"("metatext": {}, "mtime": "x")"), TESSEL_ERR_USER_INPUT,
         {"!jParm[\"mtime\"].isIntegral()", kPrepare}},
        {SetReq(kUidAlice, strId, R"("metatext": [])"), TESSEL_ERR_USER_INPUT,
         {"jParm.isMember(\"metatext\") && !jParm[\"metatext\"].isObject()", kPrepare}},
        {SetReq(kUidAlice, strId, R"("person": 1)"), TESSEL_ERR_USER_INPUT,
         {"jParm.isMember(\"person\") && !jParm[\"person\"].isObject()", kPrepare}},
        {SetReq(kUidAlice, strId, R"("metatext": {}, "commit_msg": [])"), TESSEL_ERR_USER_INPUT,
         {"!jParm[\"commit_msg\"].isObject()", kPrepare}},
        {SetReq(kUidAlice, strId, R"("metabinary_files": {})"), TESSEL_ERR_USER_INPUT,
         {"!jParm[\"metabinary_files\"].isArray()", kPrepare}},
        {SetReq(kUidAlice, strId, R"("parent_id": 5)"), TESSEL_ERR_USER_INPUT,
         {"!jParm[\"parent_id\"].isString()", kPrepare}},
        {SetReq(kUidAlice, strId, "\"parent_id\": \"" + strBobs + "\""), TESSEL_ERR_USER_INPUT,
         {"owner != TesselObjectGetOwnerByID(jParm[\"parent_id\"].asString())", kPrepare}},
        {SetReq(kUidAlice, strId, "\"parent_id\": \"" + strId + "\""), TESSEL_ERR_USER_INPUT,
         {"jParm[\"parent_id\"].asString() == jParm[\"id\"].asString()", kPrepare}},
        {SetReq(kUidAlice, strId, R"("reset_parent_id": true, "parent_id": "")"), TESSEL_ERR_USER_INPUT,
         {"jParm.isMember(\"parent_id\") && jParm.isMember(\"reset_parent_id\")", kPrepare}},
        {SetReq(kUidAlice, strId, R"("reset_parent_id": true, "mtime": 1)"), TESSEL_ERR_USER_INPUT,
         {"jBasic[\"auto_mtime\"][\"parent_id\"].asInt64() > mtime", kPrepare}},
        {SetReq(kUidBob, strId, R"("metatext": {"k": "x"})"), TESSEL_ERR_NO_PERMISSION,
         {"rw != tmpOldObj.get_ref_perm() && owner != tmpOldObj.get_ref_perm() [ro]"}},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(Json::writeString(Json::StreamWriterBuilder(), c.jParm));
        ErrClear();
        TESSEL_OBJECT obj;
        EXPECT_FALSE(obj.Set(c.jParm));
        EXPECT_EQ(c.code, ErrCode());
        EXPECT_EQ(c.msgs, ErrMsgs());
    }
    char szVer[64] = "";
    ErrClear();
    EXPECT_EQ(-1, TesselObjectSet(NULL, szVer, sizeof(szVer)));
    EXPECT_EQ((Msgs{"NULL == pParmHash"}), ErrMsgs());
    QLIBSZHASH *pHash = QLIBCSzHashAlloc(8);
    QLIBCSzHashSetValue(pHash, "ns", "ledger");
    QLIBCSzHashSetValue(pHash, "id", strId.c_str());
    QLIBCSzHashSetValue(pHash, "requester", "1001x");
    EXPECT_EQ(-1, TesselObjectSet(pHash, szVer, sizeof(szVer)));
    EXPECT_EQ((Msgs{"endPtr && *endPtr"}), ErrMsgs());
    QLIBCSzHashFree(pHash);

    EXPECT_EQ(jBefore, Stored(strId));
    EXPECT_EQ(strRow, IndexRow(strId));
    EXPECT_EQ(4u, HookLines().size()) << "only the two creates reached the hooks";
}

TEST_F(Set, ChangesReachFilesIndexAndHooks) {
    const std::string strId = Made(kUidAlice, R"("text": {"title": "one"}, "metatext": {"k": "v"})");
    const std::string strOld = Stored(strId)["version"].asString();
    // A plain change is based on the version read and makes no new one.
    TESSEL_OBJECT obj;
    ASSERT_TRUE(obj.Set(SetReq(kUidAlice, strId, R"("metatext": {"k": "w"}, "delegate_perm": "ro")")))
        << ::testing::PrintToString(ErrMsgs());
    EXPECT_EQ(strOld, obj.get_version());
    EXPECT_EQ(Parse(R"({"k": "w"})"), obj.get_metatext());
    EXPECT_EQ("ro", obj.get_perm());
    std::string strNew;
    ASSERT_TRUE(obj.Set(SetReq(kUidAlice, strId, "\"version\": \"" + strOld + R"(", "text": {"title": "two"})"),
                        strNew))
        << ::testing::PrintToString(ErrMsgs());
    EXPECT_NE(strOld, strNew);
    EXPECT_EQ(Parse(R"({"title": "two"})"), Stored(strId)["text"]);
    EXPECT_EQ(strNew + "|1001_#00000000|w|two",
              Sql("SELECT version || '|' || parent_id || '|' || (metatext->>'k') || '|' || (text->>'title') "
                  "FROM object WHERE id = '" + strId + "'"));
    const std::vector<std::string> lines = HookLines();
    ASSERT_EQ(6u, lines.size());
    const std::string strAt = strId + "/1001_#00000000/";
    EXPECT_EQ("set-pre - " + strAt + strOld, lines[2]);
    EXPECT_EQ("set-post - " + strAt + strOld, lines[3]);
    EXPECT_EQ("set-pre - " + strAt + strOld, lines[4]);
    EXPECT_EQ("set-post - " + strAt + strNew, lines[5]);
    // The hash form, its structured members as JSON text.
    QLIBSZHASH *pHash = QLIBCSzHashAlloc(8);
    QLIBCSzHashSetValue(pHash, "ns", "ledger");
    QLIBCSzHashSetValue(pHash, "id", strId.c_str());
    QLIBCSzHashSetValue(pHash, "requester", "1001");
    QLIBCSzHashSetValue(pHash, "metatext", "{\"k\": \"hash\"}");
    char szVer[64] = "";
    EXPECT_EQ(0, TesselObjectSet(pHash, szVer, sizeof(szVer))) << ::testing::PrintToString(ErrMsgs());
    QLIBCSzHashFree(pHash);
    EXPECT_EQ(strNew, szVer);
    EXPECT_EQ("hash", Stored(strId)["metatext"]["k"].asString());
}

TEST_F(Set, AWordLostByTheChangeReadsNA) {
    const std::string strId =
        Made(kUidAlice, R"("preset_acl": true, "acl": {"enabled": true, "zem_user": {"1002": {"perm": "rw"}}})");
    TESSEL_OBJECT obj;
    ErrClear();
    ASSERT_TRUE(obj.Set(SetReq(kUidBob, strId, R"("metatext": {"k": 1}, "acl": {"enabled": false})")))
        << ::testing::PrintToString(ErrMsgs());
    EXPECT_EQ("NA", obj.get_perm());
    EXPECT_EQ(0, ErrCode());
    EXPECT_EQ("false", Sql("SELECT acl->>'enabled' FROM object WHERE id = '" + strId + "'"));
}

TEST_F(Set, MovesTakeTheNewParentsAclAndChildrenChooseTheLock) {
    const std::string strFolder = Made(
        kUidAlice, R"("preset_acl": true, "acl": {"enabled": true, "zem_group": {"1100": {"perm": "ro"}}})");
    const std::string strId = Made(kUidAlice, R"("preset_acl": true, "acl": {"enabled": false,
                                    "public": {"perm": "ro", "inherit": true}, "zem_user": {"1002": {"perm": "rw"}}})");
    TESSEL_OBJECT obj;
    ASSERT_TRUE(obj.Set(SetReq(kUidAlice, strId, "\"parent_id\": \"" + strFolder + R"(", "acl_inherit": true)")))
        << ::testing::PrintToString(ErrMsgs());
    // The old inherited entry goes; the object's own entry stays on top.
    const Json::Value jAcl = Parse(R"({"enabled": true, "zem_group": {"1100": {"perm": "ro", "inherit": true}},
                                        "zem_user": {"1002": {"perm": "rw"}}})");
    EXPECT_EQ(jAcl, Stored(strId)["acl"]);
    EXPECT_EQ(strFolder, Sql("SELECT parent_id FROM object WHERE id = '" + strId + "'"));

    std::unique_ptr<TESSEL_BACKEND_OP> pPgsql(RegisterBackend::New("pgsql"));
    Json::Value jAsk = Req(kUidAlice);
    jAsk["id"] = strFolder;
    EXPECT_TRUE(pPgsql->HasChildren(jAsk));
    jAsk["id"] = strId;
    EXPECT_FALSE(pPgsql->HasChildren(jAsk));
    // A backup job excludes changes of objects with children only.
    {
        TESSEL_LOCKER_BACKUP *pBackup = nullptr;
        ProcessHolding backup([&] { return (pBackup = new TESSEL_LOCKER_BACKUP("ledger"))->WriteLock(0); });
        ASSERT_TRUE(backup.ready());
        EXPECT_TRUE(obj.Set(SetReq(kUidAlice, strId, R"("metatext": {"n": 1})")));
        ErrClear();
        EXPECT_FALSE(obj.Set(SetReq(kUidAlice, strFolder, R"("metatext": {"n": 1})")));
        EXPECT_EQ(TESSEL_ERR_LOCK_BACKUP, ErrCode());
        EXPECT_EQ((Msgs{"!m_impl->pBackupLock_ || !m_impl->pBackupLock_->ReadLock(0)",
                        "!locker.ReadLock(TESSEL_LOCK_ALL, jParm[\"ns\"].asString(), jParm[\"id\"])"}),
                  ErrMsgs());
    }
    // The parent gone, its children go back to the top level, acl kept.
    ASSERT_TRUE(TesselResetParentID("ledger", strId)) << ::testing::PrintToString(ErrMsgs());
    const Json::Value jReset = Stored(strId);
    EXPECT_EQ("1001_#00000000", jReset["parent_id"].asString());
    EXPECT_EQ(jAcl, jReset["acl"]);
    EXPECT_EQ("1001_#00000000", Sql("SELECT parent_id FROM object WHERE id = '" + strId + "'"));
}

TEST_F(Set, ListChangesEveryRecordOrNone) {
    const std::string strA = Made(kUidAlice);
    const std::string strB = Made(kUidAlice, R"("metatext": {"k": "b"})");
    const std::string strShared =
        Made(kUidAlice, R"("preset_acl": true, "acl": {"enabled": true, "zem_user": {"1002": {"perm": "ro"}}})");
    unlink(kHookLog.c_str());
    TESSEL_OBJECT_LIST list;
    Json::Value jsResult(Json::objectValue);
    Json::Value jParm = Req(kUidAlice, R"("metatext": {"k": "new"})");
    jParm["id"].append(strA);
    jParm["id"].append(strB);
    ASSERT_TRUE(list.Set(jParm, jsResult)) << ::testing::PrintToString(ErrMsgs());
    EXPECT_EQ(Parse("{\"" + strA + "\": true, \"" + strB + "\": true}"), jsResult);
    EXPECT_EQ("new|new", Sql("SELECT string_agg(metatext->>'k', '|') FROM object WHERE id IN ('" + strA + "', '" +
                             strB + "')"));
    for (TESSEL_OBJECT *p = list.head(); p; p = p->next) {
        EXPECT_EQ("owner", p->get_perm());
    }
    ASSERT_EQ(2u, HookLines().size());
    EXPECT_EQ(0u, HookLines()[1].find("batch-set-post - " + strA + "/")) << HookLines()[1];

    struct Case {
        std::string strIds;
        Json::Value jVersion;
        int code;
        Msgs msgs;
    } cases[] = {
        {"\"" + strA + "\"", Json::Value(), TESSEL_ERR_USER_INPUT, {"!jParm[\"id\"].isArray()", "!PrepareList(jParm, &m_head)"}},
        {"[\"" + strA + "\"]", Json::Value(5), TESSEL_ERR_USER_INPUT, {"version format is invalid."}},
        {"[\"" + strShared + "\"]", Json::Value(), TESSEL_ERR_NO_PERMISSION,
         {"rw != (*ppObj)->get_ref_perm() && owner != (*ppObj)->get_ref_perm() [ro]", "!PreCheck(jParm, this)"}},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.strIds);
        Json::Value jBad = Req(kUidBob, R"("metatext": {"k": "bob"})");
        jBad["id"] = Parse(c.strIds);
        if (!c.jVersion.isNull()) {
            jBad["version"] = c.jVersion;
        }
        TESSEL_OBJECT_LIST bad;
        ErrClear();
        EXPECT_FALSE(bad.Set(jBad, jsResult));
        EXPECT_EQ(c.code, ErrCode());
        EXPECT_EQ(c.msgs, ErrMsgs());
    }
    EXPECT_EQ("new", Stored(strA)["metatext"]["k"].asString());
}

}  // namespace
