// The settings file: each check's code and condition texts, exact files after
// writers, a user caller, the writer lock across processes, and the two caches
// that never forget.
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "common/tessel_json.h"
#include "support/json_text.h"
#include "support/error_stack.h"
#include "support/process_holding.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_conf.h"
#include "tessel_id.h"

namespace {

using namespace tessel_test;
using Msgs = std::vector<std::string>;

const char kConf[] = "/usr/quor/etc/tessel.conf";
const std::string kNotRead = "!jConf.fromFile(SZF_TESSEL_CONF_PATH)";
const std::string kAcNs = "FALSE == TesselSettingsAccessGetEx(jConf, szNameSpace)";
const std::string kAcNull = "FALSE == TesselSettingsAccessGetEx(jConf, NULL)";
const std::string kShNs = "FALSE == TesselSettingsSharingGetEx(jConf, szNameSpace, owner)";
const std::string kShNull = "FALSE == TesselSettingsSharingGetEx(jConf, NULL, owner)";


// The first frame's code and every frame's condition text; then a clean stack.
void ExpectStack(int code, const Msgs &msgs) {
    EXPECT_EQ(code, ErrCode());
    EXPECT_EQ(msgs, ErrMsgs());
    ErrClear();
}

// Runs fn in a fresh child (as a user when uid is given); the child's
// GoogleTest failures come back as its status.
void ExpectInChild(const std::function<void()> &fn, unsigned uid = 0, unsigned gid = 0) {
    auto checked = [&fn] {
        fn();
        return ::testing::Test::HasFailure() ? 1 : 0;
    };
    EXPECT_EQ(0, 0 == uid ? RunInChild(checked) : RunAsUser(uid, gid, checked)) << "see the child's failures above";
}

void Put(const char *text) {  // nullptr: no file
    if (nullptr == text) {
        unlink(kConf);
    } else {
        ASSERT_TRUE(WriteFile(kConf, text));
    }
}

class Conf : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(InSandbox()) << "run through ctest: this test writes " << kConf;
        Put(nullptr);
        ErrClear();
    }
    void TearDown() override { Put(nullptr); }
};

enum Op { kAccessCheck, kAccessGet, kSettingsGet, kSharingCheck, kSharingGet };

BOOL Call(Op op, const char *ns, unsigned uid) {
    Json::Value jOut;
    switch (op) {
        case kAccessCheck: return TesselAccessCheck(ns);
        case kAccessGet: return TesselSettingsAccessGet(ns);
        case kSettingsGet: return TesselSettingsGet(ns, jOut);
        case kSharingCheck: return TesselSharingCheck(ns, uid);
        case kSharingGet: return TesselSettingsSharingGet(ns, uid);
    }
    return -1;
}

TEST_F(Conf, ChecksInOrderWithTheirCodes) {
    const char *kUsers = R"({"Sharing":{"1026":{"disable":true,"disable_ns_ledger":false},)"
                         R"("1027":{"disable_ns_ledger":true},"1028":true,"1029":{"disable":"no"}}})";
    struct Case {
        const char *file;
        Op op;
        const char *ns;
        unsigned uid;
        int code;  // 0: allowed, nothing reported
        Msgs msgs;
    } cases[] = {
        {nullptr, kAccessCheck, "ledger", 0, 1027, {"FALSE == QLIBCFileExist(SZF_TESSEL_CONF_PATH)"}},
        {R"({"Access":{"enable":true}})",
         kAccessCheck,
         "ledger",
         0,
         1012,
         {"!jConf[\"Access\"].isMember(szNSKey)", kAcNs}},
        {R"({"Access":{"enable":true}})",
         kAccessGet,
         "ledger",
         0,
         1012,
         {"!jConf[\"Access\"].isMember(szNSKey)", kAcNs}},
        {R"({"Access":{"enable":true}})", kAccessGet, nullptr, 0, 0, {}},
        {R"({"Access":{"enable":false,"enable_ns_ledger":true}})", kAccessGet, "ledger", 0, 0, {}},
        {R"({"Access":{"enable":false,"enable_ns_ledger":true}})",
         kAccessCheck,
         "ledger",
         0,
         1027,
         {"!jConf[\"Access\"][\"enable\"].asBool()", kAcNull}},
        {R"({"Access":{"enable":"yes"}})",
         kAccessCheck,
         nullptr,
         0,
         1026,
         {"!jConf[\"Access\"][\"enable\"].isBool()", kAcNull}},
        {R"({"Access":{"enable":true,"enable_ns_ledger":1}})",
         kAccessCheck,
         "ledger",
         0,
         1026,
         {"!jConf[\"Access\"][szNSKey].isBool()", kAcNs}},
        {"[]", kAccessGet, nullptr, 0, 1026, {"!jConf.isObject()", kAcNs}},
        {"{", kAccessCheck, nullptr, 0, 1026, {"!ReadConfFile(jConf)"}},
        {R"({"Access":{"enable_ns_ledger":0}})", kSettingsGet, "ledger", 0, 0, {}},  // only the key's presence counts
        {R"({"x":1})", kSettingsGet, "ledger", 0, 1026, {"!jConf[\"Access\"].isObject()"}},
        {nullptr, kSharingCheck, "ledger", 1026, 0, {}},
        {kUsers, kSharingGet, "ledger", 1026, 0, {}},
        {kUsers, kSharingCheck, "ledger", 1026, 1020, {"jConf[\"Sharing\"][szUid][\"disable\"].asBool()", kShNull}},
        {kUsers, kSharingCheck, "ledger", 1027, 1020, {"jConf[\"Sharing\"][szUid][szNSKey].asBool()", kShNs}},
        {kUsers, kSharingCheck, "other", 1027, 0, {}},
        {kUsers, kSharingCheck, nullptr, 1028, 1026, {"!jConf[\"Sharing\"][szUid].isObject()", kShNull}},
        {kUsers, kSharingGet, nullptr, 1029, 1026, {"!jConf[\"Sharing\"][szUid][\"disable\"].isBool()", kShNs}},
        {kUsers, kSharingGet, "ledger", UID_ERR, 1015, {"UID_ERR == owner", kShNs}},
        {"{", kSharingCheck, "ledger", 1026, 1026, {"!ReadConfFile(jConf)"}},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE("case " + std::to_string(&c - cases));
        Put(c.file);
        EXPECT_EQ(0 == c.code, Call(c.op, c.ns, c.uid));
        ExpectStack(c.code, c.msgs);
        EXPECT_EQ(c.file ? c.file : "", ReadFile(kConf));  // readers change nothing
    }
    // Reads that fail without failing the call still report.
    EXPECT_TRUE(TesselSettingsSharingGet("ledger", 1026));  // the file is "{"
    ExpectStack(1026, {kNotRead});
    Put(nullptr);
    Json::Value jOut;
    EXPECT_TRUE(TesselSettingsIndexGet("ledger", jOut));
    EXPECT_EQ(Json::Value(Json::objectValue), jOut);
    ExpectStack(1026, {kNotRead});
    EXPECT_FALSE(TesselSettingsGet(nullptr, jOut));
    ExpectStack(1000, {"NULL == szNameSpace"});
}

TEST_F(Conf, NoSharingListInKeyOrderEachUserOnce) {
    QLIBSZLIST *pList = QLIBCSzListAlloc(1);
    QLIBCSzListPush(&pList, "kept");
    EXPECT_EQ(0, TesselSettingsNoSharingUserList("ledger", &pList));  // no file
    Put(R"({"Sharing":{"2000":{"disable":true,"disable_ns_ledger":true},"1026":{"disable_ns_ledger":true},)"
        R"("1500":{"disable_ns_other":true},"1600":{"disable":false},"300":{"disable":true},"400":true}})");
    EXPECT_EQ(0, TesselSettingsNoSharingUserList("ledger", &pList));
    Msgs listed;
    for (int i = 0; i < QLIBCSzListCount(pList); ++i) {
        listed.push_back(QLIBCSzListGet(pList, i));
    }
    EXPECT_EQ((Msgs{"kept", "1026", "2000", "300"}), listed);
    QLIBCSzListFree(pList);
    EXPECT_EQ(-1, TesselSettingsNoSharingUserList("ledger", nullptr));
    ExpectStack(1015, {"NULL == ppList || NULL == *ppList"});
}

TEST_F(Conf, WritersChangeOnlyTheirMembers) {
    Put(R"({"other":{"k":[1,2]},"Access":{"enable":true},"Index":{"notes":{"text":1}}})");
    EXPECT_EQ(0, TesselSettingsAccessSet("ledger", nullptr, 2));
    EXPECT_EQ(R"({"Access":{"enable":true,"enable_ns_ledger":false},"Index":{"notes":{"text":1}},"other":{"k":[1,2]}})",
              ReadFile(kConf));
    EXPECT_EQ(0, TesselSettingsAccessSet("ledger", "LedgerApp", 1));
    EXPECT_EQ(0, TesselSettingsAccessSet(nullptr, "Unused", 0));
    EXPECT_EQ(0, TesselSettingsSharingSet(nullptr, 1026, 0));
    EXPECT_EQ(0, TesselSettingsSharingSet("ledger", 1026, 1));
    EXPECT_EQ(0, TesselSettingsSharingSet("ledger", 4242, 2));
    EXPECT_TRUE(TesselSettingsIndexSet("ledger", Parse(R"({"text":{"title":true},"other":1})")));
    EXPECT_TRUE(TesselSettingsIndexSet("notes", Parse(R"({"metatext":{"m":1}})")));
    ExpectStack(0, {});
    const std::string kAll =
        R"({"Access":{"enable":false,"enable_ns_ledger":true},)"
        R"("Index":{"ledger":{"text":{"title":true}},"notes":{"metatext":{"m":1}}},)"
        R"("Sharing":{"1026":{"disable":true,"disable_ns_ledger":false},)"
        R"("4242":{"disable_ns_ledger":true}},"other":{"k":[1,2]},"pkg_id":{"ledger":"LedgerApp"}})";
    EXPECT_EQ(kAll, ReadFile(kConf));
    EXPECT_FALSE(TesselSettingsIndexSet("", Parse(R"({"text":1})")));
    ExpectStack(-1, {"strNs.empty() || !jsFilter.isObject()"});
    EXPECT_FALSE(TesselSettingsIndexSet("ledger", Parse(R"({"other":1})")));
    ExpectStack(-1, {"!jsFilter.isMember(\"text\") && !jsFilter.isMember(\"metatext\")"});
    EXPECT_EQ(kAll, ReadFile(kConf));
    // What cannot be read is started afresh; a member in the way is replaced.
    Put("{");
    EXPECT_EQ(0, TesselSettingsSharingSet(nullptr, 7, 1));
    ExpectStack(1026, {kNotRead});
    Put(R"({"Sharing":{"7":5},"x":1})");
    EXPECT_EQ(0, TesselSettingsSharingSet(nullptr, 7, 1));
    EXPECT_EQ(R"({"Sharing":{"7":{"disable":false}},"x":1})", ReadFile(kConf));
}

TEST_F(Conf, UserCallerReachesRootOnlyFilesAndKeepsItsIds) {
    Put(R"({"Access":{"enable":true,"enable_ns_ledger":true}})");
    const char *kDesc = "/usr/local/libexec/tessel//ledger.lib";
    ASSERT_TRUE(WriteFile(kDesc, R"({"lib":"/x.so","app priv":"LEDGER_PRIV"})"));
    ASSERT_EQ(0, chmod(kDesc, 0600));
    ASSERT_EQ(0, chmod(kConf, 0600));
    ExpectInChild([] {
        EXPECT_EQ(-1, open(kConf, O_RDONLY));  // not on its own
        auto as = [](bool answer) {  // each call hands back the caller's ids
            EXPECT_EQ(kUidAlice, geteuid());
            EXPECT_EQ(kGidUsers, getegid());
            return answer;
        };
        Json::Value jOut;
        EXPECT_TRUE(as(TesselAccessCheck("ledger")));
        EXPECT_TRUE(as(!TesselAccessCheck("notes")));
        EXPECT_TRUE(as(0 == TesselSettingsAccessSet("notes", "NotesApp", 1)));
        EXPECT_TRUE(as(0 == TesselSettingsSharingSet("notes", kUidAlice, 0)));
        EXPECT_TRUE(as(TesselSettingsIndexSet("notes", Parse(R"({"text":{}})"))));
        EXPECT_TRUE(as(!TesselSettingsIndexSet("notes", Parse("{}"))));
        EXPECT_TRUE(as(!TesselSharingCheck("notes", kUidAlice)));
        EXPECT_TRUE(as(TesselSettingsGet("notes", jOut) && TesselSettingsIndexGet("notes", jOut)));
        EXPECT_EQ(Parse(R"({"text":{}})"), jOut);
        EXPECT_TRUE(as("LEDGER_PRIV" == TesselAppPrivName("ledger") && TesselAppPrivName("absent").empty()));
        EXPECT_TRUE(as(TesselAppPrivName("..").empty()));
        ExpectStack(1007, {"!TesselIsPathComponent(strNs)"});
    }, kUidAlice, kGidUsers);
    EXPECT_EQ(R"({"Access":{"enable":true,"enable_ns_ledger":true,"enable_ns_notes":true},"Index":{"notes":)"
              R"({"text":{}}},"Sharing":{"1001":{"disable_ns_notes":true}},"pkg_id":{"notes":"NotesApp"}})",
              ReadFile(kConf));
    struct stat st;
    ASSERT_EQ(0, stat(kConf, &st));
    EXPECT_EQ(0u, st.st_uid);
    EXPECT_EQ(0600u, st.st_mode & 07777);
}

// Another process holding the writer lock, as another writer would: when it
// lets go (after holdMs, or at Release()) it first writes its whole file.
std::unique_ptr<ProcessHolding> HoldWriterLock(int holdMs, const std::string &writes) {
    auto held = std::make_shared<std::unique_ptr<ConfMutex>>();
    return std::make_unique<ProcessHolding>(
        [held] {
            held->reset(new ConfMutex());
            int fd = open("/tmp/.tessel_conf.lock", O_RDONLY);
            return 0 <= fd && 0 != flock(fd, LOCK_EX | LOCK_NB);
        },
        holdMs,
        [held, writes] {
            WriteFile(kConf, writes);
            held->reset();
        });
}

TEST_F(Conf, WriterLockSerialisesWritersAcrossProcesses) {
    auto holder = HoldWriterLock(1000, R"({"pkg_id":{"held":"yes"}})");
    ASSERT_TRUE(holder->ready());
    EXPECT_EQ(0, TesselSettingsSharingSet("ledger", 1026, 0));
    EXPECT_EQ(0, holder->Release());
    EXPECT_EQ(R"({"Sharing":{"1026":{"disable_ns_ledger":true}},"pkg_id":{"held":"yes"}})", ReadFile(kConf));
    // A holder that never lets go delays a writer by the wait, no more.
    auto stuck = HoldWriterLock(-1, "{}");
    ASSERT_TRUE(stuck->ready());
    size_t mark = SyslogMark();
    EXPECT_EQ(0, TesselSettingsSharingSet(nullptr, 1026, 0));
    EXPECT_EQ(R"({"Sharing":{"1026":{"disable":true,"disable_ns_ledger":true}},"pkg_id":{"held":"yes"}})",
              ReadFile(kConf));
    auto line =
        WaitForSyslog("Failed [1 != QLIBCFileLockTimeByFile(m_strPath.c_str(), 1, 5000000, &m_fd)], err=", mark);
    ASSERT_TRUE(line.has_value());
    EXPECT_EQ(0u, line->message.rfind("common/tessel_conf:", 0)) << line->message;
}

// Both caches are process-wide and never forget: each scenario runs whole in
// a fresh child. The sandbox's user files are restored afterwards.
class ConfCache : public Conf {
protected:
    void SetUp() override {
        Conf::SetUp();
        shadow_ = ReadFile("/etc/shadow");
        passwd_ = ReadFile("/etc/passwd");
    }
    void TearDown() override {
        WriteFile("/etc/shadow", shadow_);
        WriteFile("/etc/passwd", passwd_);
        unlink("/usr/quor/etc/platform.conf");
        Conf::TearDown();
    }
    static void Replace(const char *path, const std::string &from, const std::string &to) {
        std::string text = ReadFile(path);
        size_t at = text.find(from);
        ASSERT_NE(std::string::npos, at) << from;
        ASSERT_TRUE(WriteFile(path, text.replace(at, from.size(), to)));
    }
    void Scenario();
    std::string shadow_, passwd_;
};

TEST_F(ConfCache, FiltersAndOwnerVerdictsOutliveChanges) {
    Put(R"({"Index":{"ledger":{"text":{"old":true}}}})");
    ExpectInChild([this] { Scenario(); });
    ExpectInChild([] {  // while a fresh process sees the expiry
        EXPECT_FALSE(TesselObjectOwnerIsValid(kUidAlice));
        ExpectStack(1030, {"jsInfo[\"expire\"].asBool()"});
    });
}

void ConfCache::Scenario() {
    Json::Value jOut;
    EXPECT_TRUE(TesselSettingsIndexGetFromCache("ledger", jOut));
    EXPECT_TRUE(TesselSettingsIndexGetFromCache("notes", jOut));  // an empty filter is kept too
    EXPECT_TRUE(TesselSettingsIndexSet("ledger", Parse(R"({"text":{"new":true}})")));
    EXPECT_TRUE(TesselSettingsIndexSet("notes", Parse(R"({"text":{"new":true}})")));
    EXPECT_TRUE(TesselSettingsIndexGetFromCache("ledger", jOut));
    EXPECT_EQ(Parse(R"({"text":{"old":true}})"), jOut);
    EXPECT_TRUE(TesselSettingsIndexGetFromCache("notes", jOut));
    EXPECT_EQ(Json::Value(Json::objectValue), jOut);
    ErrClear();
    EXPECT_FALSE(TesselSettingsIndexGetFromCache("", jOut));
    ExpectStack(-1, {"strNs.empty()", "!TesselSettingsIndexGet(strNs, jsFilter)"});

    EXPECT_FALSE(TesselObjectOwnerIsValid(UID_ROOT));
    ExpectStack(1007, {"UID_ROOT == owner || UID_ERR == owner"});
    EXPECT_FALSE(TesselObjectOwnerIsValid(kUidCarol));
    ExpectStack(1030, {"jsInfo[\"expire\"].asBool()"});
    EXPECT_FALSE(TesselObjectOwnerIsValid(kUidUnknown));
    ExpectStack(1022, {"!TesselGetUserInfo(owner, jsInfo, true)"});
    EXPECT_TRUE(TesselObjectOwnerIsValid(kUidAlice));
    Replace("/etc/shadow", "alice:!:19000:0:99999:7:::", "alice:!:19000:0:99999:7::1:");
    EXPECT_TRUE(TesselObjectOwnerIsValid(kUidAlice));
    TesselErrSetEx(1000, "marker", 1, "marker");
    EXPECT_FALSE(TesselObjectOwnerIsValid(kUidCarol));  // a remembered refusal reports nothing
    ExpectStack(1000, {"marker"});

    EXPECT_FALSE(TesselObjectIDIsValid(nullptr));
    ExpectStack(1015, {"NULL == szID"});
    EXPECT_TRUE(TesselObjectIDIsValid("1001_#00000000"));
    EXPECT_FALSE(TesselObjectIDIsValid("1003_#00000000"));
    ExpectStack(-1, {"FALSE == TesselObjectOwnerIsValid(owner)"});
    EXPECT_FALSE(TesselObjectIDIsValid("x1_#00000000"));
    EXPECT_EQ(1007, ErrCode());
    EXPECT_EQ("UID_ERR == (owner = TesselObjectGetOwnerByID(szID))", ErrMsgs().back());
}

TEST_F(ConfCache, UserHomeSwitchFollowsTheFormOfTheName) {
    // Without a display name, the domain user is known by "EXAMPLE\erin".
    Replace("/etc/passwd", "Erin Example,,,,erin@example.com", "");
    struct Case {
        const char *conf;
        unsigned refused, accepted;
    } cases[] = {{"userhome_ldap=\"no\"\n", kUidGrace, kUidAlice},
                 {"userhome_local=\"no\"\n", kUidAlice, kUidGrace},
                 {"userhome_domain=\"no\"\n", kUidErin, kUidAlice}};
    for (const Case &c : cases) {
        SCOPED_TRACE(c.conf);
        ASSERT_TRUE(WriteFile("/usr/quor/etc/platform.conf", c.conf));
        ExpectInChild([&c] {
            EXPECT_FALSE(TesselObjectOwnerIsValid(c.refused));
            ExpectStack(1011, {"FALSE == QUORServiceUserHomeIsEnabled(authType, NULL)"});
            EXPECT_TRUE(TesselObjectOwnerIsValid(c.accepted));
        });
    }
}

}  // namespace
