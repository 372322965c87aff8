// Creating objects: the checks and their exact reports (nothing written when
// they refuse), files and index rows of a new object made by a user, the
// parent rules, hooks, the list form, and namespaces shared by processes.
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <quor/qlib.h>

#include "change_fixture.h"
#include "support/process_holding.h"
#include "tessel_id.h"
#include "tessel_lock.h"

using namespace tessel_test;
using namespace change_test;

namespace {

const char kTypes[] =
    "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"category\") || "
    "!jParm[\"category\"].isString() || !jParm.isMember(\"requester\") || !jParm[\"requester\"].isIntegral()";
const char kPrepare[] = "!PrepareCreateParm(jParm)";
const char kFolderAcl[] = R"({"enabled": true, "public": {"perm": "ro"}, "zem_user": {"1002": {"perm": "rw"}}})";

class Create : public ChangeFixture {};

Json::Value With(Json::Value jParm, const char *szKey, const Json::Value &jVal) {
    jParm[szKey] = jVal;
    return jParm;
}

TEST_F(Create, RefusedRequestsWriteNothing) {
    const std::string strTaken = Made(kUidAlice);
    const std::string strBobs = TesselObjectGenerateID(kUidBob, "ledger");
    struct Case {
        Json::Value jParm;
        int code;
        Msgs msgs;
    } cases[] = {
        {Json::Value(Json::arrayValue), TESSEL_ERR_USER_INPUT, {kTypes}},
        {Req(kUidAlice), TESSEL_ERR_USER_INPUT, {kTypes}},
        {Req(0, R"("category": "note")"), TESSEL_ERR_USER_INPUT, {"!jParm.isMember(\"owner\")"}},
        {With(Req(0, R"("category": "note")"), "requester", -1), TESSEL_ERR_USER_INPUT,
         {"!jParm[\"requester\"].isUInt()"}},
        {Req(0, R"("category": "note", "owner": "alice")"), TESSEL_ERR_USER_INPUT,
         {"!jParm[\"owner\"].isUInt()", kPrepare}},
        {Req(kUidAlice, R"("category": "note", "parent_id": 5)"), TESSEL_ERR_USER_INPUT,
         {"!jParm[\"parent_id\"].isString()", kPrepare}},
        {Req(kUidAlice, "\"category\": \"note\", \"parent_id\": \"" + strBobs + "\""), TESSEL_ERR_USER_INPUT,
         {"owner != TesselObjectGetOwnerByID(jParm[\"parent_id\"].asString())", kPrepare}},
        {Req(kUidAlice, "\"category\": \"note\", \"id\": \"" + strBobs + "\""), TESSEL_ERR_USER_INPUT,
         {"owner != TesselObjectGetOwnerByID(jParm[\"id\"].asString())", kPrepare}},
        {Req(kUidAlice, "\"category\": \"note\", \"id\": \"" + strTaken + "\""), TESSEL_ERR_ID_EXISTS,
         {"TesselIDIsExist(jParm[\"ns\"].asString(), jParm[\"id\"].asString())", kPrepare}},
        {Req(kUidAlice, R"("category": "note", "id": "1001_x/y")"), TESSEL_ERR_USER_INPUT,
         {"!TesselIsPathComponent(jParm[\"id\"].asString())", kPrepare}},
        {Req(kUidAlice, R"("category": "note", "ctime": "now")"), TESSEL_ERR_USER_INPUT,
         {"!jParm[\"ctime\"].isIntegral()", kPrepare}},
        {Req(kUidAlice, R"("category": "note", "text": [])"), TESSEL_ERR_USER_INPUT,
         {"!jParm[\"text\"].isObject()", kPrepare}},
        {Req(kUidAlice, R"("category": "note", "binary_files": {})"), TESSEL_ERR_USER_INPUT,
         {"!jParm[\"binary_files\"].isArray()", kPrepare}},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(Json::writeString(Json::StreamWriterBuilder(), c.jParm));
        ErrClear();
        TESSEL_OBJECT obj;
        EXPECT_FALSE(obj.Create(c.jParm));
        EXPECT_EQ(c.code, ErrCode());
        EXPECT_EQ(c.msgs, ErrMsgs());
    }
    // An expired owner: the settings' verdict, passed up.
    ErrClear();
    TESSEL_OBJECT expired;
    EXPECT_FALSE(expired.Create(Req(0, R"("category": "note", "owner": 1003)")));
    EXPECT_EQ(TESSEL_ERR_OWNER_INVALID, ErrCode());
    const Msgs msgs = ErrMsgs();
    ASSERT_LE(2u, msgs.size());
    EXPECT_EQ((Msgs{"FALSE == TesselObjectOwnerIsValid((uid_t)jParm[\"owner\"].asInt64())", kPrepare}),
              Msgs(msgs.end() - 2, msgs.end()));

    // The hash form never reads its hash.
    char szId[128] = "", szVer[64] = "";
    ErrClear();
    EXPECT_EQ(-1, TesselObjectCreate(NULL, szId, sizeof(szId), szVer, sizeof(szVer)));
    EXPECT_EQ((Msgs{"NULL == pParmHash"}), ErrMsgs());
    QLIBSZHASH *pHash = QLIBCSzHashAlloc(8);
    QLIBCSzHashSetValue(pHash, "ns", "ledger");
    QLIBCSzHashSetValue(pHash, "category", "note");
    QLIBCSzHashSetValue(pHash, "requester", "1001");
    EXPECT_EQ(-1, TesselObjectCreate(pHash, szId, sizeof(szId), szVer, sizeof(szVer)));
    QLIBCSzHashFree(pHash);
    EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
    EXPECT_EQ((Msgs{kTypes, "!tmpNewObj.Create(jsParm)", "!TESSEL_OBJECT::Create(jParm, strNewID, strNewVer)"}),
              ErrMsgs());

    EXPECT_EQ((std::set<std::string>{strTaken}), ObjectDirs());
    EXPECT_EQ("1", Sql("SELECT count(*) FROM object"));
    EXPECT_EQ(2u, HookLines().size()) << "only the first create reached the hooks";
}

TEST_F(Create, ByAUserAtTheTopLevel) {
    std::string strId;
    ASSERT_EQ(0, RunAsUser(kUidAlice, kGidUsers, [&] {
        TESSEL_OBJECT obj;
        EXPECT_TRUE(obj.Create(Req(kUidAlice, R"("category": "note", "ctime": 100, "text": {"title": "t"},
                                                 "metatext": {"k": "v"}, "acl": {"enabled": true})")))
            << ::testing::PrintToString(ErrMsgs());
        EXPECT_TRUE(kUidAlice == geteuid() && kGidUsers == getegid());
        const std::string strVer = obj.get_version();
        EXPECT_TRUE(40 == strVer.size() && std::string::npos == strVer.find_first_not_of("0123456789abcdef"))
            << strVer;
        EXPECT_EQ("owner", obj.get_perm());
        EXPECT_EQ(100, obj.get_mtime());
        return ::testing::Test::HasFailure() ? 1 : 0;
    }));
    ASSERT_EQ(1u, ObjectDirs().size());
    strId = *ObjectDirs().begin();
    EXPECT_EQ(kUidAlice, TesselObjectGetOwnerByID(strId));
    struct stat st;
    ASSERT_EQ(0, stat((kNsDir + "/" + strId).c_str(), &st));
    EXPECT_EQ(kUidAlice, st.st_uid);
    EXPECT_EQ(kGidUsers, st.st_gid);
    EXPECT_EQ(0700u, st.st_mode & 07777);
    // Without a parent a given acl is dropped, unless it is a preset.
    Json::Value jBasic = ReadJson(kNsDir + "/" + strId + "/basic.json");
    jBasic.removeMember("auto_mtime");
    EXPECT_EQ(Parse(R"({"category": "note", "parent_id": "1001_#00000000", "ctime": 100, "acl": {}})"), jBasic);
    EXPECT_EQ("1001|1001_#00000000|note|100|t",
              Sql("SELECT owner || '|' || parent_id || '|' || category || '|' || mtime || '|' || (text->>'title') "
                  "FROM object "
                  "WHERE id = '" + strId + "'"));
    const std::string strPreset = Made(kUidAlice, R"("preset_acl": true, "acl": {"enabled": true})");
    EXPECT_EQ(Parse(R"({"enabled": true})"), Stored(strPreset)["acl"]);
}

TEST_F(Create, UnderASharedParentBelongsToItsOwner) {
    const std::string strFolder = Made(kUidAlice, std::string(R"("preset_acl": true, "acl": )") + kFolderAcl);
    const std::string strChild = Made(kUidBob, "\"parent_id\": \"" + strFolder + "\"");
    EXPECT_EQ(kUidAlice, TesselObjectGetOwnerByID(strChild));
    const Json::Value jChild = Stored(strChild);
    EXPECT_EQ(strFolder, jChild["parent_id"].asString());
    EXPECT_EQ(Parse(R"({"enabled": true, "public": {"perm": "ro", "inherit": true},
                        "zem_user": {"1002": {"perm": "rw", "inherit": true}}})"),
              jChild["acl"]);
    EXPECT_EQ("1001", Sql("SELECT owner FROM object WHERE id = '" + strChild + "'"));
    // An acl of the creator's own keeps everything but an entry for the owner.
    const std::string strOwn =
        Made(kUidBob, "\"parent_id\": \"" + strFolder +
                          R"(", "acl": {"enabled": true, "zem_user": {"1001": {"perm": "ro"}, "1002": {"perm": "rw"}}})");
    EXPECT_EQ(Parse(R"({"enabled": true, "zem_user": {"1002": {"perm": "rw"}}})"), Stored(strOwn)["acl"]);
    // A reader of the parent may not create in it.
    ErrClear();
    TESSEL_OBJECT obj;
    EXPECT_FALSE(obj.Create(Req(kUidDave, "\"category\": \"note\", \"parent_id\": \"" + strFolder + "\"")));
    EXPECT_EQ(TESSEL_ERR_NO_PERMISSION, ErrCode());
    EXPECT_EQ((Msgs{"\"rw\" != obj.get_ref_perm() && \"owner\" != obj.get_ref_perm()", kPrepare}), ErrMsgs());
    EXPECT_EQ(3u, ObjectDirs().size());
    // Hooks: completed parameters before, the new object after.
    const std::vector<std::string> lines = HookLines();
    ASSERT_EQ(6u, lines.size());
    EXPECT_EQ("create-pre " + strFolder + " null", lines[2]);
    EXPECT_EQ("create-post " + strFolder + " " + strChild + "/" + strFolder + "/" + jChild["version"].asString(),
              lines[3]);
}

TEST_F(Create, ListDealsRecordsToWorkersAndIndexesThemTogether) {
    Json::Value jParm = Req(kUidAlice, R"("category": "note", "id": [])");
    std::vector<std::string> ids;
    for (int i = 0; i < 31; ++i) {
        ids.push_back(TesselObjectGenerateID(kUidAlice, "ledger"));
        jParm["id"].append(ids.back());
    }
    TESSEL_OBJECT_LIST list;
    Json::Value jsResult(Json::objectValue);
    ASSERT_TRUE(list.Create(jParm, jsResult)) << ::testing::PrintToString(ErrMsgs());
    EXPECT_EQ(Json::Value(Json::objectValue), jsResult);
    std::vector<std::string> got;
    for (TESSEL_OBJECT *p = list.head(); p; p = p->next) {
        got.push_back(p->get_id());
        EXPECT_EQ("owner", p->get_perm());
        EXPECT_EQ(Json::Value(false), p->get_err());
    }
    EXPECT_EQ(ids, got);
    EXPECT_EQ("31", Sql("SELECT count(*) FROM object WHERE owner = 1001 AND category = 'note'"));
    const std::vector<std::string> lines = HookLines();
    ASSERT_EQ(2u, lines.size());
    EXPECT_EQ(0u, lines[0].rfind("batch-create-pre - " + ids[0] + "//,", 0)) << lines[0];
    EXPECT_EQ(0u, lines[1].rfind("batch-create-post - " + ids[0] + "/1001_#00000000/", 0)) << lines[1];

    // Copies name their source; the result maps each source to its copy.
    TESSEL_OBJECT_LIST copies;
    for (const char *szSource : {"src-b", "src-a"}) {
        TESSEL_OBJECT *p = TesselObjectAlloc();
        p->m_param["copy_from_object"] = szSource;
        p->next = copies.m_head;
        copies.m_head = p;
    }
    jsResult = Json::Value(Json::objectValue);
    ASSERT_TRUE(copies.Create(Req(kUidAlice, R"("category": "copy")"), jsResult));
    EXPECT_EQ(copies.head()->get_id(), jsResult["src-a"].asString());
    EXPECT_EQ(copies.head()->next->get_id(), jsResult["src-b"].asString());
    // One taken id stops the whole call before anything is written.
    ErrClear();
    TESSEL_OBJECT_LIST refused;
    jParm["id"] = Json::Value(Json::arrayValue);
    jParm["id"].append(TesselObjectGenerateID(kUidAlice, "ledger"));
    jParm["id"].append(ids[5]);
    EXPECT_FALSE(refused.Create(jParm, jsResult));
    EXPECT_EQ(TESSEL_ERR_ID_EXISTS, ErrCode());
    EXPECT_EQ((Msgs{"TesselIDIsExist(jParm[\"ns\"].asString(), jParm[\"id\"].asString())",
                    "!PrepareCreateParm(pObj->m_param)"}),
              ErrMsgs());
    EXPECT_EQ(33u, ObjectDirs().size());
}

// Creates and sets from two processes at once; a backup job's lock stops
// every create at once.
TEST_F(Create, ProcessesShareTheNamespaceUntilABackupRuns) {
    const std::string strFolder = Made(kUidAlice);
    auto work = [&] {
        for (int i = 0; i < 4; ++i) {
            TESSEL_OBJECT obj;
            if (!obj.Create(Req(kUidAlice, "\"category\": \"note\", \"parent_id\": \"" + strFolder + "\"")) ||
                !obj.Set(Req(kUidAlice, "\"id\": \"" + obj.get_id() + R"(", "metatext": {"n": 1})"))) {
                return 1;
            }
        }
        return 0;
    };
    pid_t first = fork();
    if (0 == first) {
        _exit(work());
    }
    EXPECT_EQ(0, work());
    int status = -1;
    ASSERT_EQ(first, waitpid(first, &status, 0));
    EXPECT_EQ(0, status);
    EXPECT_EQ("8", Sql("SELECT count(*) FROM object WHERE parent_id = '" + strFolder + "'"));

    TESSEL_LOCKER_BACKUP *pBackup = nullptr;
    ProcessHolding backup([&] { return (pBackup = new TESSEL_LOCKER_BACKUP("ledger"))->WriteLock(0); });
    ASSERT_TRUE(backup.ready());
    ErrClear();
    TESSEL_OBJECT obj;
    EXPECT_FALSE(obj.Create(Req(kUidAlice, R"("category": "note")")));
    EXPECT_EQ(TESSEL_ERR_LOCK_BACKUP, ErrCode());
    EXPECT_EQ((Msgs{"!m_impl->pBackupLock_ || !m_impl->pBackupLock_->ReadLock(0)",
                    "!locker.ReadLock(TESSEL_LOCK_ALL, jParm[\"ns\"].asString(), Json::nullValue)"}),
              ErrMsgs());
    EXPECT_EQ(9u, ObjectDirs().size());
}

}  // namespace
