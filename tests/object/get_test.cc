// Reading one object: who gets which word, what a reader is shown, the
// request's checks in their order, and the hash-parameter form.
#include <syslog.h>
#include <unistd.h>

#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <quor/qlib.h>

#include "get_fixture.h"
#include "tessel_id.h"

using namespace tessel_test;
using get_test::GetFixture;
using get_test::Msgs;

namespace {

const char kPermFrame[] =
    "!TesselObjectPermCalculate((uid_t)jParm[\"requester\"].asInt64(), m_impl->owner, m_impl->acl, m_impl->perm)";
const char kShared[] = R"({"enabled": true, "zem_user": {"1002": {"perm": "ro"}}, "zem_group": {"1100": {"perm": "rw"}},
                           "public": {"perm": ""}})";

class Get : public GetFixture {};

// The record as left by a refused or failed read: nothing of the object.
void ExpectNothingRead(const TESSEL_OBJECT &obj) {
    EXPECT_EQ("", obj.get_id());
    EXPECT_EQ("", obj.get_category());
    EXPECT_EQ(UID_ERR, obj.get_owner());
    EXPECT_TRUE(obj.get_acl().empty());
    EXPECT_TRUE(obj.get_metatext().empty());
    EXPECT_EQ("", obj.get_perm());
}

TEST_F(Get, WordsOfEveryRequesterKind) {
    const std::string strId = Create(kUidAlice, kShared);
    const std::string strAnon = Create(kUidAlice, R"({"enabled": true, "public": {"perm": "ro"}})");
    struct Row {
        const char *name;
        unsigned requester;
        std::string id;
        const char *word;
    };
    const std::vector<Row> rows = {
        {"owner", kUidAlice, strId, "owner"},
        {"root", 0, strId, "rw"},
        {"user entry", kUidBob, strId, "ro"},
        {"member of a group", kUidCarol, strId, "rw"},
        {"anonymous, public entry", 4294967295u, strAnon, "ro"},
    };
    for (const Row &row : rows) {
        SCOPED_TRACE(row.name);
        TESSEL_OBJECT obj;
        obj.set_perm("stale");
        ErrClear();
        ASSERT_TRUE(obj.Get(Req(row.requester, row.id, R"({"field": {"metatext": true}})")))
            << ::testing::PrintToString(ErrMsgs());
        EXPECT_EQ(row.word, obj.get_perm());
        EXPECT_EQ("ledger", obj.get_ns());
        EXPECT_EQ(row.id, obj.get_id());
        EXPECT_EQ(kUidAlice, obj.get_owner());
        EXPECT_EQ("note", obj.get_category());
        EXPECT_EQ(Parse(R"({"k": "v"})"), obj.get_metatext());
        // Not asked for: hidden from everybody, the owner included.
        EXPECT_EQ(Json::Value(Json::objectValue), obj.get_acl());
    }
}

TEST_F(Get, AclOnlyWhenAskedAndOwnerWordDelegated) {
    const std::string strId = Create(kUidAlice, kShared);
    TESSEL_OBJECT obj;
    ASSERT_TRUE(obj.Get(Req(kUidAlice, strId, R"({"field": {"acl": true}, "delegate_perm": "ro"})")));
    EXPECT_EQ(Parse(kShared), obj.get_acl());
    EXPECT_EQ("ro", obj.get_perm());

    // Only "owner" is delegated; an asked-for acl that is not the bool true
    // counts as not asked.
    ASSERT_TRUE(obj.Get(Req(kUidBob, strId, R"({"field": {"acl": 1}, "delegate_perm": "rw"})")));
    EXPECT_EQ(Json::Value(Json::objectValue), obj.get_acl());
    EXPECT_EQ("ro", obj.get_perm());

    // A record asked to leave the acl out still gets its word from it.
    ASSERT_TRUE(obj.Get(Req(kUidBob, strId, R"({"field": {"acl": false}})")));
    EXPECT_EQ("ro", obj.get_perm());
    EXPECT_EQ(Json::Value(Json::objectValue), obj.get_acl());
}

TEST_F(Get, StrangersGetNothing) {
    const std::string strShared = Create(kUidAlice, kShared);
    const std::string strPrivate = Create(kUidAlice, "null");
    const std::string strOff = Create(kUidAlice, R"({"enabled": false, "public": {"perm": "rw"}})");
    struct Row {
        const char *name;
        unsigned requester;
        std::string id;
        int code;
        Msgs msgs;
    };
    const std::vector<Row> rows = {
        {"stranger", kUidDave, strShared, 1023, {"Requester no permission: 1004", kPermFrame}},
        {"anonymous without public word", 4294967295u, strShared, 1023, {"strPublicPerm.empty()", kPermFrame}},
        {"never shared", kUidBob, strPrivate, -1, {kPermFrame}},
        {"sharing switched off", kUidBob, strOff, 1020, {"!jACL[\"enabled\"].asBool()", kPermFrame}},
    };
    for (const Row &row : rows) {
        SCOPED_TRACE(row.name);
        TESSEL_OBJECT obj;
        obj.set_perm("stale");
        ErrClear();
        EXPECT_FALSE(obj.Get(Req(row.requester, row.id, R"({"field": {"acl": true, "metatext": true}})")));
        EXPECT_EQ(row.code, ErrCode());
        EXPECT_EQ(row.msgs, ErrMsgs());
        ExpectNothingRead(obj);
    }
}

TEST_F(Get, RequestChecksInTheirOrder) {
    const std::string strId = Create(kUidAlice, kShared);
    const std::string strCarols = Create(kUidCarol, R"({"enabled": true, "public": {"perm": "ro"}})");
    const std::string kTypes =
        "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"id\") || "
        "!jParm[\"id\"].isString() || !jParm.isMember(\"requester\") || !jParm[\"requester\"].isIntegral()";
    const std::string kOwnerFrame = "UID_ERR == (owner = TesselObjectGetOwnerByID(jParm[\"id\"].asCString()))";
    struct Row {
        const char *name;
        Json::Value jParm;
        const char *conf;  // settings file for the call
        int code;
        std::string last;  // the frame this module added
    };
    Json::Value jNoNs = Req(kUidBob, strId);
    jNoNs.removeMember("ns");
    Json::Value jIdArray = Req(kUidBob, strId);
    jIdArray["id"] = Parse("[\"x\"]");
    Json::Value jRequesterText = Req(kUidBob, strId);
    jRequesterText["requester"] = "1002";
    Json::Value jWide = Req(kUidBob, strId);
    jWide["requester"] = Json::UInt64(4294967296ull);
    const std::vector<Row> rows = {
        {"no ns", jNoNs, get_test::kConfOpen, 1007, kTypes},
        {"id not text", jIdArray, get_test::kConfOpen, 1007, kTypes},
        {"requester not integral", jRequesterText, get_test::kConfOpen, 1007, kTypes},
        {"requester wider than a uid", jWide, get_test::kConfOpen, 1007, "!jParm[\"requester\"].isUInt()"},
        {"version not text", Req(kUidBob, strId, R"({"version": 3})"), get_test::kConfOpen, 1007,
         "jParm.isMember(\"version\") && !jParm[\"version\"].isString()"},
        {"field not an object", Req(kUidBob, strId, R"({"field": ["acl"]})"), get_test::kConfOpen, 1007,
         "jParm.isMember(\"field\") && !jParm[\"field\"].isObject()"},
        {"namespace switched off", Req(kUidBob, strId),
         R"({"Access": {"enable": true, "enable_ns_ledger": false}})", 1012,
         "FALSE == TesselAccessCheck(jParm[\"ns\"].asCString())"},
        {"owner not a number", Req(kUidBob, "x_1"), get_test::kConfOpen, 1007, kOwnerFrame},
        {"root, owner not a number", Req(0, "x_1"), get_test::kConfOpen, 1007, kOwnerFrame},
        {"owner expired", Req(kUidBob, strCarols), get_test::kConfOpen, 1030,
         "FALSE == TesselObjectOwnerIsValid(owner)"},
        {"owner's sharing switched off", Req(kUidBob, strId),
         R"({"Access": {"enable": true, "enable_ns_ledger": true}, "Sharing": {"1001": {"disable": true}}})", 1020,
         "FALSE == TesselSharingCheck(jParm[\"ns\"].asCString(), owner)"},
        {"no such object", Req(kUidBob, "1001_0123"), get_test::kConfOpen, 1008, "!pBackendFs->Get(jParm, this)"},
    };
    for (const Row &row : rows) {
        SCOPED_TRACE(row.name);
        ASSERT_TRUE(WriteFile(get_test::kConf, row.conf));
        TESSEL_OBJECT obj;
        ErrClear();
        EXPECT_FALSE(obj.Get(row.jParm));
        EXPECT_EQ(row.code, ErrCode());
        ASSERT_FALSE(ErrMsgs().empty());
        EXPECT_EQ(row.last, ErrMsgs().back());
        EXPECT_EQ("object/object_get", TesselErrMsgGet()[TesselErrMsgGet().size() - 1]["file"].asString());
    }

    // The owner reads past the switches that guard sharing; root past all.
    ASSERT_TRUE(WriteFile(get_test::kConf, R"({"Access": {"enable": true, "enable_ns_ledger": true},
                                               "Sharing": {"1001": {"disable": true}}})"));
    TESSEL_OBJECT obj;
    EXPECT_TRUE(obj.Get(Req(kUidAlice, strId)));
    ASSERT_TRUE(WriteFile(get_test::kConf, R"({"Access": {"enable": false}})"));
    EXPECT_TRUE(obj.Get(Req(0, strCarols)));
    EXPECT_EQ("rw", obj.get_perm());
}

// An application that dropped its privileges: the object's directory is
// alice's alone (0700), and the read still works, as root for its duration.
TEST_F(Get, UserCallerReadsAsRootForTheDuration) {
    const std::string strId = Create(kUidAlice, kShared);
    const size_t mark = SyslogMark();
    EXPECT_EQ(0, RunAsUser(kUidBob, 100, [&] {
        TESSEL_OBJECT obj;
        EXPECT_TRUE(obj.Get(Req(kUidBob, strId))) << ::testing::PrintToString(ErrMsgs());
        EXPECT_EQ("ro", obj.get_perm());
        EXPECT_EQ("note", obj.get_category());
        EXPECT_EQ(1002u, geteuid());
        return ::testing::Test::HasFailure() ? 1 : 0;
    }));
    // This module's own section: raised before the store is read, restored
    // after. The child has exited, so every line is on its way already.
    std::vector<std::string> lines;
    for (int attempt = 0; attempt < 100 && lines.size() < 4; ++attempt) {
        lines.clear();
        for (const SyslogLine &line : SyslogSince(mark)) {
            if (0 == line.message.find("object/object_get:") && (LOG_AUTH | LOG_INFO) == line.priority) {
                lines.push_back(line.message.substr(line.message.find(' ') + 1));
            }
        }
        usleep(lines.size() < 4 ? 20000 : 0);
    }
    EXPECT_EQ((std::vector<std::string>{"WARNING: setresgid(-1, 0, -1)", "WARNING: setresuid(-1, 0, -1)",
                                        "WARNING: setresgid(-1, 100, -1)", "WARNING: setresuid(-1, 1002, -1)"}),
              lines);
}

TEST_F(Get, HashFormKeepsItsReturnValues) {
    const std::string strId = Create(kUidAlice, kShared);
    QLIBSZHASH *pHash = QLIBCSzHashAlloc(8);
    ASSERT_NE(nullptr, pHash);
    TESSEL_OBJECT obj;
    auto fill = [&](const char *szNs, const char *szId, const char *szRequester) {
        QLIBCSzHashRemove(pHash, "ns");
        QLIBCSzHashRemove(pHash, "id");
        QLIBCSzHashRemove(pHash, "requester");
        if (szNs) QLIBCSzHashSetValue(pHash, "ns", szNs);
        if (szId) QLIBCSzHashSetValue(pHash, "id", szId);
        if (szRequester) QLIBCSzHashSetValue(pHash, "requester", szRequester);
        ErrClear();
    };

    // A successful read answers -1 with a filled record and one frame.
    fill("ledger", strId.c_str(), "1002");
    EXPECT_EQ(-1, TesselObjectGet(pHash, &obj));
    EXPECT_EQ("ro", obj.get_perm());
    EXPECT_EQ("note", obj.get_category());
    EXPECT_EQ(Msgs{"pObject->Get(jParm)"}, ErrMsgs());

    // A failed read answers 0, the read's frames on the stack.
    fill("ledger", strId.c_str(), "1004");
    EXPECT_EQ(0, TesselObjectGet(pHash, &obj));
    EXPECT_EQ(1023, ErrCode());
    EXPECT_EQ((Msgs{"Requester no permission: 1004", kPermFrame}), ErrMsgs());
    ExpectNothingRead(obj);

    struct Row {
        const char *ns, *id, *requester;
        int code;
        const char *msg;
    };
    const std::vector<Row> rows = {
        {nullptr, "1001_1", "1002", 1007, "NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"ns\"))"},
        {"ledger", nullptr, "1002", 1007, "NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"id\"))"},
        {"ledger", "1001_1", nullptr, 1007, "NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"requester\"))"},
        {"ledger", "1001_1", "12x", 1007, "endPtr && *endPtr"},
        {"ledger", "1001_1", "", 1007, "endPtr == pParm"},
        {"ledger", "1001_1", "4294967296", 1007, "requester > UID_ERR"},
    };
    for (const Row &row : rows) {
        SCOPED_TRACE(row.msg);
        fill(row.ns, row.id, row.requester);
        EXPECT_EQ(-1, TesselObjectGet(pHash, &obj));
        EXPECT_EQ(row.code, ErrCode());
        EXPECT_EQ(Msgs{row.msg}, ErrMsgs());
    }
    ErrClear();
    EXPECT_EQ(-1, TesselObjectGet(nullptr, &obj));
    EXPECT_EQ(Msgs{"NULL == pParmHash"}, ErrMsgs());
    EXPECT_EQ(1015, ErrCode());
    ErrClear();
    EXPECT_EQ(-1, TesselObjectGet(pHash, nullptr));
    EXPECT_EQ(Msgs{"NULL == pObject"}, ErrMsgs());
    QLIBCSzHashFree(pHash);
}

}  // namespace
