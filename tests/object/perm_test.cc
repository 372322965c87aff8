// Permission words: requester kinds against acl shapes (groups from the
// sandbox's group file), the ranks, and acl edits by sharing requests.
#include <syslog.h>

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "object/object_perm.h"
#include "support/error_stack.h"
#include "support/json_text.h"
#include "support/sandbox.h"

using namespace tessel_test;

namespace {

using Msgs = std::vector<std::string>;

constexpr unsigned kAnonymous = 4294967295u;
const char kSpecificFrame[] = "!get_specific_perm(Requester, owner, jACL, strSpecificPerm)";
const char kGroupMaxFrame[] = "!max_perm(strSpecificPerm, acl[\"zem_group\"][strGid][\"perm\"].asString())";

struct PermRow {
    const char *name;
    unsigned requester;
    const char *acl;    // JSON text; "null" for no acl
    const char *word;   // expected word, or "" for a refusal
    int code;           // refusal: frame 0's code (0: empty stack)
    Msgs msgs;          // refusal: every frame's message
};

// Objects of alice (1001). bob (1002) is in users (100) and eng (1101); alice
// also in staff (1100); dave (1004) only in his own group.
const std::vector<PermRow> kPermRows = {
    {"owner, no acl", kUidAlice, "null", "owner", 0, {}},
    {"owner, sharing off", kUidAlice, R"({"enabled": false})", "owner", 0, {}},
    {"root, no acl", 0, "null", "rw", 0, {}},
    {"root, malformed acl", 0, R"("x")", "rw", 0, {}},
    {"user, no acl", kUidBob, "null", "", 0, {}},
    {"user, acl not an object", kUidBob, "[1]", "", 1020, {"!jACL.isObject()"}},
    {"user, no switch", kUidBob, R"({"public": {"perm": "rw"}})", "", 1020, {"!jACL.isMember(\"enabled\")"}},
    {"user, switch not bool", kUidBob, R"({"enabled": 1})", "", 1020, {"!jACL[\"enabled\"].isBool()"}},
    {"user, sharing off", kUidBob, R"({"enabled": false, "public": {"perm": "rw"}})", "", 1020,
     {"!jACL[\"enabled\"].asBool()"}},
    {"anonymous, public", kAnonymous, R"({"enabled": true, "public": {"perm": "ro"}})", "ro", 0, {}},
    {"anonymous, only app and user entries", kAnonymous,
     R"({"enabled": true, "zem_app": {"perm": "rw"}, "zem_user": {"4294967295": {"perm": "rw"}}})", "", 1023,
     {"strPublicPerm.empty()"}},
    {"anonymous, public word not text", kAnonymous, R"({"enabled": true, "public": {"perm": 2}})", "", 1015,
     {"!acl[\"public\"][\"perm\"].isString()", "!get_public_perm(jACL, strPublicPerm)"}},
    {"app rw ends the search", kUidBob,
     R"({"enabled": true, "zem_app": {"perm": "rw"}, "zem_user": {"1002": {"perm": "ro"}}})", "rw", 0, {}},
    {"public raises app and user", kUidBob,
     R"({"enabled": true, "zem_app": {"perm": "ro"}, "zem_user": {"1002": {"perm": "ro"}},
         "public": {"perm": "rw"}})",
     "rw", 0, {}},
    {"user entry replaces app", kUidBob,
     R"({"enabled": true, "zem_app": {"perm": "ro"}, "zem_user": {"1002": {"perm": ""}}})", "", 1023,
     {"Requester no permission: 1002"}},
    {"group raises user", kUidBob,
     R"({"enabled": true, "zem_app": {"perm": "ro"}, "zem_user": {"1002": {"perm": "ro"}},
         "zem_group": {"1101": {"perm": "rw"}}})",
     "rw", 0, {}},
    {"user owner entry is final", kUidBob,
     R"({"enabled": true, "zem_app": {"perm": "ro"}, "zem_user": {"1002": {"perm": "owner"}},
         "zem_group": {"1101": {"perm": "rw"}}})",
     "owner", 0, {}},
    {"highest of the member's groups", kUidBob,
     R"({"enabled": true, "zem_group": {"100": {"perm": "ro"}, "1101": {"perm": "rw"}, "1100": {"perm": "ro"}}})",
     "rw", 0, {}},
    {"groups the requester is not in", kUidBob,
     R"({"enabled": true, "zem_group": {"1100": {"perm": "rw"}, "1004": {"perm": "rw"}}})", "", 1023,
     {"Requester no permission: 1002"}},
    {"empty group word skipped", kUidBob,
     R"({"enabled": true, "zem_group": {"100": {"perm": ""}, "1101": {"perm": "ro"}}})", "ro", 0, {}},
    {"group owner word", kUidBob, R"({"enabled": true, "zem_group": {"100": {"perm": "owner"}}})", "", 1015,
     {"-1 == PermissionOrder::GetOrder(added_perm) [owner]", kGroupMaxFrame, kSpecificFrame}},
    {"group unknown word", kUidBob,
     R"({"enabled": true, "zem_app": {"perm": "ro"}, "zem_group": {"1101": {"perm": "admin"}}})", "", 1015,
     {"-1 == (order2 = PermissionOrder::GetOrder(added_perm))", kGroupMaxFrame, kSpecificFrame}},
    {"unknown requester with group entries", kUidUnknown,
     R"({"enabled": true, "zem_group": {"100": {"perm": "ro"}}})", "", 1022,
     {"!TesselGetAllGID(Requester, jsGid, true)", kSpecificFrame}},
    {"unknown requester, public", kUidUnknown, R"({"enabled": true, "public": {"perm": "ro"}})", "ro", 0, {}},
    {"stranger", kUidDave,
     R"({"enabled": true, "zem_user": {"1002": {"perm": "rw"}}, "zem_group": {"100": {"perm": "rw"}}})", "", 1023,
     {"Requester no permission: 1004"}},
    {"public word without rank", kUidBob,
     R"({"enabled": true, "zem_app": {"perm": "ro"}, "public": {"perm": "all"}})", "", 1023,
     {"Requester no permission: 1002"}},
    {"app entry not an object", kUidBob, R"({"enabled": true, "zem_app": "rw"})", "", 1015,
     {"!acl[\"zem_app\"].isObject()", kSpecificFrame}},
    {"user entry without word", kUidBob, R"({"enabled": true, "zem_user": {"1002": {"inherit": true}}})", "", 1015,
     {"!acl[\"zem_user\"][szUid].isMember(\"perm\")", kSpecificFrame}},
    {"group entries not an object", kUidBob, R"({"enabled": true, "zem_group": ["100"]})", "", 1015,
     {"!acl[\"zem_group\"].isObject()", kSpecificFrame}},
};

TEST(Perm, EveryRequesterKindAgainstEveryAclShape) {
    for (const PermRow &row : kPermRows) {
        SCOPED_TRACE(row.name);
        const Json::Value jACL = Parse(row.acl);
        const Json::Value jBefore = jACL;
        std::string strPerm = "unset";
        ErrClear();
        const bool ok = TesselObjectPermCalculate(row.requester, kUidAlice, jACL, strPerm);
        EXPECT_EQ(jBefore, jACL);
        if (*row.word) {
            EXPECT_TRUE(ok) << ::testing::PrintToString(ErrMsgs());
            EXPECT_EQ(row.word, strPerm);
            EXPECT_TRUE(ErrMsgs().empty());
        } else {
            EXPECT_FALSE(ok) << strPerm;
            EXPECT_EQ("unset", strPerm);
            EXPECT_EQ(row.code, ErrCode());
            EXPECT_EQ(row.msgs, ErrMsgs());
        }
    }
}

TEST(Perm, RefusalsAreReportedByThisModule) {
    const size_t mark = SyslogMark();
    std::string strPerm;
    ErrClear();
    ASSERT_FALSE(TesselObjectPermCalculate(kUidDave, kUidAlice, Parse(R"({"enabled": true})"), strPerm));
    ASSERT_EQ(1u, TesselErrMsgGet().size());
    const Json::Value &jFrame = TesselErrMsgGet()[0];
    EXPECT_EQ("object/object_perm", jFrame["file"].asString());
    const std::string strLine = "object/object_perm:" + std::to_string(jFrame["line"].asInt()) +
                                " Failed [Requester no permission: 1004], err=";
    EXPECT_TRUE(WaitForSyslog(strLine, mark, LOG_USER | LOG_ERR).has_value()) << strLine;
}

TEST(Perm, RanksAndRaising) {
    EXPECT_EQ(1, PermissionOrder::GetOrder("ro"));
    EXPECT_EQ(2, PermissionOrder::GetOrder("rw"));
    EXPECT_EQ(-1, PermissionOrder::GetOrder("owner"));
    EXPECT_EQ(-1, PermissionOrder::GetOrder(""));

    struct Row {
        std::string final_perm, added, result;
        Msgs msgs;
    };
    const std::vector<Row> rows = {
        {"", "ro", "ro", {}},
        {"ro", "rw", "rw", {}},
        {"rw", "ro", "rw", {}},
        {"ro", "ro", "ro", {}},
        {"", "owner", "", {"-1 == PermissionOrder::GetOrder(added_perm) [owner]"}},
        {"owner", "ro", "owner", {"-1 == (order1 = PermissionOrder::GetOrder(final_perm))"}},
        {"rw", "RW", "rw", {"-1 == (order2 = PermissionOrder::GetOrder(added_perm))"}},
    };
    for (const Row &row : rows) {
        SCOPED_TRACE(row.final_perm + " + " + row.added);
        std::string strFinal = row.final_perm;
        ErrClear();
        EXPECT_EQ(row.msgs.empty(), max_perm(strFinal, row.added));
        EXPECT_EQ(row.result, strFinal);
        EXPECT_EQ(row.msgs, ErrMsgs());
        EXPECT_EQ(row.msgs.empty() ? 0 : 1015, ErrCode());
    }
}

struct EditRow {
    const char *name;
    const char *acl;      // before
    const char *request;  // the sharing request
    int result;           // -1, 0 or 1 (sign of prepare_acl's result)
    const char *after;    // acl afterwards (unchanged on a refusal)
    Msgs msgs;            // refusal frames (code 1007 unless the acl is the fault)
};

const std::vector<EditRow> kEditRows = {
    {"global on", "null", R"({"type": "global", "op": "set", "enabled": true})", 1, R"({"enabled": true})", {}},
    {"global unchanged", R"({"enabled": true})", R"({"type": "global", "op": "set", "enabled": true})", 0,
     R"({"enabled": true})", {}},
    {"global without switch", R"({"enabled": true})", R"({"type": "global", "op": "set"})", -1,
     R"({"enabled": true})", {"!jsParm.isMember(\"enabled\") || !jsParm[\"enabled\"].isBool()"}},
    {"public set", R"({"enabled": true})", R"({"type": "public", "op": "set", "perm": "ro"})", 1,
     R"({"enabled": true, "public": {"perm": "ro", "inherit": false}})", {}},
    {"public set again", R"({"public": {"perm": "ro", "inherit": false}})",
     R"({"type": "public", "op": "set", "perm": "ro"})", 0, R"({"public": {"perm": "ro", "inherit": false}})", {}},
    {"own entry made over an inherited one", R"({"zem_app": {"perm": "rw", "inherit": true}})",
     R"({"type": "app", "op": "set", "perm": "ro"})", 1, R"({"zem_app": {"perm": "ro", "inherit": false}})", {}},
    {"recursive set into an inherited entry", R"({"zem_app": {"perm": "ro", "inherit": true}})",
     R"({"type": "app", "op": "set", "perm": "rw", "recursive": true})", 1,
     R"({"zem_app": {"perm": "rw", "inherit": true}})", {}},
    {"recursive set lower than own entry", R"({"zem_user": {"1002": {"perm": "rw", "inherit": false}}})",
     R"({"type": "user", "op": "set", "perm": "ro", "uid": 1002, "recursive": true})", 0,
     R"({"zem_user": {"1002": {"perm": "rw", "inherit": false}}})", {}},
    {"recursive set equal to own entry", R"({"zem_user": {"1002": {"perm": "ro"}}})",
     R"({"type": "user", "op": "set", "perm": "ro", "uid": 1002, "recursive": true})", 0,
     R"({"zem_user": {"1002": {"perm": "ro"}}})", {}},
    {"recursive set higher than own entry", R"({"zem_user": {"1002": {"perm": "ro", "inherit": false}}})",
     R"({"type": "user", "op": "set", "perm": "rw", "uid": 1002, "recursive": true})", 1,
     R"({"zem_user": {"1002": {"perm": "rw", "inherit": false}}})", {}},
    {"recursive set forced over own entry", R"({"zem_group": {"100": {"perm": "rw", "inherit": false}}})",
     R"({"type": "group", "op": "set", "perm": "ro", "gid": 100, "recursive": true, "force_inherit": true})", 1,
     R"({"zem_group": {"100": {"perm": "ro", "inherit": true}}})", {}},
    {"recursive set of a new entry", R"({"enabled": true})",
     R"({"type": "group", "op": "set", "perm": "ro", "gid": 1101, "recursive": true})", 1,
     R"({"enabled": true, "zem_group": {"1101": {"perm": "ro", "inherit": true}}})", {}},
    {"delete", R"({"public": {"perm": "ro"}, "enabled": true})", R"({"type": "public", "op": "delete"})", 1,
     R"({"enabled": true})", {}},
    {"delete of nothing", R"({"enabled": true})", R"({"type": "app", "op": "delete"})", 0, R"({"enabled": true})", {}},
    {"recursive delete spares own entry", R"({"zem_user": {"1002": {"perm": "ro", "inherit": false}}})",
     R"({"type": "user", "op": "delete", "uid": 1002, "recursive": true})", 0,
     R"({"zem_user": {"1002": {"perm": "ro", "inherit": false}}})", {}},
    {"recursive delete of inherited entry", R"({"zem_user": {"1002": {"perm": "ro", "inherit": true}}})",
     R"({"type": "user", "op": "delete", "uid": 1002, "recursive": true})", 1, R"({"zem_user": {}})", {}},
    {"recursive delete forced", R"({"zem_group": {"100": {"perm": "ro"}}})",
     R"({"type": "group", "op": "delete", "gid": 100, "recursive": true, "force_inherit": true})", 1,
     R"({"zem_group": {}})", {}},
    {"break an inherited entry", R"({"zem_app": {"perm": "ro", "inherit": true}})",
     R"({"type": "app", "op": "break"})", 1, R"({"zem_app": {"perm": "ro", "inherit": false}})", {}},
    {"break an own entry", R"({"zem_app": {"perm": "ro", "inherit": false}})", R"({"type": "app", "op": "break"})",
     0, R"({"zem_app": {"perm": "ro", "inherit": false}})", {}},
    {"unknown type", "null", R"({"type": "everyone", "op": "set", "perm": "ro"})", -1, "null",
     {"Unknown type [everyone] for permission setting"}},
    {"unknown op", "null", R"({"type": "public", "op": "grant", "perm": "ro"})", -1, "null",
     {"Unknown op [grant] for permission setting"}},
    {"set without word", "null", R"({"type": "public", "op": "set"})", -1, "null", {"!jsParm.isMember(\"perm\")"}},
    {"set word not text", "null", R"({"type": "public", "op": "set", "perm": 2})", -1, "null",
     {"!jsParm[\"perm\"].isString()"}},
    {"set of owner", "null", R"({"type": "user", "op": "set", "perm": "owner", "uid": 1002})", -1, "null",
     {"\"ro\" != jsParm[\"perm\"].asString() && \"rw\" != jsParm[\"perm\"].asString()"}},
    {"user without uid", "null", R"({"type": "user", "op": "delete"})", -1, "null", {"!jsParm.isMember(\"uid\")"}},
    {"uid not integral", "null", R"({"type": "user", "op": "delete", "uid": "1002"})", -1, "null",
     {"!jsParm[\"uid\"].isIntegral()"}},
    {"entry for the owner", "null", R"({"type": "user", "op": "set", "perm": "rw", "uid": 1001})", -1, "null",
     {"(uid_t)jsParm[\"uid\"].asInt64() == owner"}},
    {"group without gid", "null", R"({"type": "group", "op": "break"})", -1, "null", {"!jsParm.isMember(\"gid\")"}},
    {"gid not integral", "null", R"({"type": "group", "op": "break", "gid": 1.5})", -1, "null",
     {"!jsParm[\"gid\"].isIntegral()"}},
};

TEST(Perm, SharingRequestsEditOneEntry) {
    for (const EditRow &row : kEditRows) {
        SCOPED_TRACE(row.name);
        Json::Value jACL = Parse(row.acl);
        ErrClear();
        const int ret = prepare_acl(kUidAlice, Parse(row.request), jACL);
        EXPECT_EQ(row.result, ret < 0 ? -1 : (ret > 0 ? 1 : 0));
        EXPECT_EQ(Parse(row.after), jACL);
        EXPECT_EQ(row.msgs, ErrMsgs());
        EXPECT_EQ(row.msgs.empty() ? 0 : 1007, ErrCode());
    }
}

TEST(Perm, FilterKeepsSharingKeysAndAtKeys) {
    Json::Value jParm;
    ASSERT_TRUE(FilterParam(Parse(R"({"ns": "ledger", "id": ["a"], "type": "user", "op": "set", "requester": 1001,
                                      "break": false, "apply_all_children": true, "uid": 1002, "gid": 100,
                                      "enabled": true, "perm": "ro", "recursive": true, "force_inherit": false,
                                      "@hook": {"x": 1}, "text": "dropped", "acl": {}, "field": {"acl": true}})"),
                            jParm));
    EXPECT_EQ(Parse(R"({"ns": "ledger", "id": ["a"], "type": "user", "op": "set", "requester": 1001,
                        "break": false, "apply_all_children": true, "uid": 1002, "gid": 100,
                        "enabled": true, "perm": "ro", "recursive": true, "force_inherit": false,
                        "@hook": {"x": 1}})"),
              jParm);

    for (const char *szInput : {R"({"text": "t", "owner": 1001})", "[1, 2]", "null"}) {
        SCOPED_TRACE(szInput);
        ErrClear();
        jParm = Parse(R"({"stale": 1})");
        EXPECT_FALSE(FilterParam(Parse(szInput), jParm));
        EXPECT_EQ(Json::Value(Json::objectValue), jParm);
        EXPECT_EQ(Msgs{"jParm.empty()"}, ErrMsgs());
    }
}

}  // namespace
