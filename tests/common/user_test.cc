// Users and groups of the sandbox's account files, their never-forgetting
// caches, and the shallow JSON merge. Because the caches never forget, carol
// is first looked up in the non-root child, frank, dave and nogroup in the
// cache scenario's child.
#include <string.h>
#include <syslog.h>
#include <unistd.h>

#include <ostream>
#include <string>
#include <utility>

#include <gtest/gtest.h>
#include <quor/quor.h>

#include "common/tessel_json.h"
#include "support/json_text.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_id.h"
#include "tessel_user.h"

namespace Json {
void PrintTo(const Value &jVal, std::ostream *os) { *os << tessel::toString(jVal); }
}  // namespace Json

namespace {

namespace tt = tessel_test;
using tessel_test::Parse;


TEST(Users, Information) {
    struct Case {
        unsigned int uid;
        const char *info;
        const char *mail;  // from TesselGetUserNameAndMail
    } cases[] = {
        {UID_ERR, R"({"name": "Anonymous", "mail": "", "exist": false, "expire": true})", "Anonymous@localhost"},
        {tt::kUidUnknown, R"({"name": "Deleted user #4242", "mail": "Deleted user #4242@localhost", "gid": -1,
                              "exist": false, "expire": true})", "Deleted user #4242@localhost"},
        {tt::kUidAlice, R"({"name": "alice", "mail": "alice@example.com", "gid": 100, "exist": true,
                            "expire": false})", "alice@example.com"},
        {tt::kUidBob, R"({"name": "bob", "mail": "bob@localhost", "gid": 100, "exist": true, "expire": false})",
         "bob@localhost"},
        {tt::kUidErin, R"({"name": "Erin Example", "mail": "erin@example.com", "gid": 100, "exist": true,
                           "expire": false})", "erin@example.com"},
        {tt::kUidGrace, R"({"name": "grace@example.com", "mail": "grace@example.com@localhost", "gid": 100,
                            "exist": true, "expire": false})", "grace@example.com@localhost"},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.uid);
        const Json::Value jsWant = Parse(c.info);
        Json::Value jsInfo;
        std::string strName, strMail;
        int gid = 77;
        ASSERT_TRUE(TesselGetUserInfo(c.uid, jsInfo, false) && TesselGetGID(c.uid, gid, false) &&
                    TesselGetUserNameAndMail(c.uid, strName, strMail, false));
        EXPECT_EQ(jsWant, jsInfo);
        EXPECT_EQ(jsWant["name"].asString() + " " + c.mail + " " + std::to_string(jsWant.get("gid", -1).asInt()),
                  strName + " " + strMail + " " + std::to_string(gid));
        EXPECT_EQ(jsWant["exist"].asBool(), TesselCheckUID(c.uid));
    }
}

TEST(Users, MustExistRefusesWithoutTouchingOutputs) {
    for (unsigned int uid : {UID_ERR, tt::kUidUnknown}) {
        Json::Value jsOut = "untouched";
        std::string strName = "untouched", strMail = "untouched";
        int gid = 77;
        EXPECT_FALSE(TesselGetUserInfo(uid, jsOut, true) || TesselGetAllGID(uid, jsOut, true) ||
                     TesselGetUserName(uid, strName, true) || TesselGetGID(uid, gid, true) ||
                     TesselGetUserNameAndMail(uid, strName, strMail, true)) << uid;
        EXPECT_EQ("untouched untouched untouched 77",
                  jsOut.asString() + " " + strName + " " + strMail + " " + std::to_string(gid));
    }
}

// The shadow file is root's: a correct expiry for a user caller proves the
// privileged section, which must hand the caller its own ids back.
TEST(Users, ExpiryIsReadAsRootForAUserCaller) {
    EXPECT_EQ(0, tt::RunAsUser(tt::kUidAlice, tt::kGidUsers, [] {
        EXPECT_EQ("", tt::ReadFile("/etc/shadow"));
        Json::Value jsCarol, jsFrank;
        EXPECT_TRUE(TesselGetUserInfo(tt::kUidCarol, jsCarol, true) && TesselGetUserInfo(tt::kUidFrank, jsFrank, true));
        EXPECT_EQ(Parse(R"({"name": "carol", "mail": "carol@example.com", "gid": 100, "exist": true,
                            "expire": true})"), jsCarol);
        EXPECT_FALSE(jsFrank["expire"].asBool());  // expires only in the far future
        EXPECT_EQ(tt::kUidAlice, geteuid());
        EXPECT_EQ(tt::kGidUsers, getegid());
        return ::testing::Test::HasFailure() ? 1 : 0;
    }));
}

TEST(Groups, MembershipAndNames) {
    const std::pair<unsigned int, const char *> gidCases[] = {
        {tt::kUidAlice, "[100, 1100, 1101]"}, {tt::kUidBob, "[100, 1101]"}, {UID_ERR, "[]"}, {tt::kUidUnknown, "[]"}};
    for (const auto &c : gidCases) {
        // The second answer comes from the cache, still as numbers.
        for (int i = 0; i < 2; ++i) {
            Json::Value jsGid;
            ASSERT_TRUE(TesselGetAllGID(c.first, jsGid, false));
            EXPECT_EQ(Parse(c.second), jsGid) << c.first;
        }
    }
    struct Case {
        unsigned int gid;
        bool mustExist;
        const char *name;  // "untouched": refused
    } cases[] = {
        {tt::kGidUsers, true, "users"}, {tt::kGidStaff, true, "staff"}, {tt::kGidEmpty, true, "empty"},
        {tt::kGidUnknown, false, "Deleted group #4343"}, {tt::kGidUnknown, true, "untouched"},
    };
    for (const Case &c : cases) {
        std::string strName = "untouched";
        EXPECT_EQ(std::string("untouched") != c.name, TRUE == TesselGetGroupName(c.gid, strName, c.mustExist));
        EXPECT_EQ(c.name, strName) << c.gid;
    }
}

// A fresh process looks frank, dave and nogroup up; then frank is deleted,
// dave expires and nogroup is renamed. The platform sees every change, the
// process keeps its first answers.
TEST(Caches, KeepTheFirstAnswerForTheLifeOfTheProcess) {
    const std::string files[] = {"/etc/passwd", "/etc/shadow", "/etc/group"};
    const char *const edits[][2] = {
        {"frank:x:1006:100:Frank Fisher,,,,frank@example.com:/volume1/homes/frank:/bin/sh\n", ""},
        {"\ndave:!:19000:0:99999:7:::\n", "\ndave:!:19000:0:99999:7::1:\n"},
        {"\nnogroup:", "\nvacant:"},
    };
    std::string saved[3], edited[3];
    for (int i = 0; i < 3; ++i) {
        saved[i] = edited[i] = tt::ReadFile(files[i]);
        size_t pos = edited[i].find(edits[i][0]);
        ASSERT_NE(std::string::npos, pos) << files[i];
        edited[i].replace(pos, strlen(edits[i][0]), edits[i][1]);
    }
    int status = tt::RunInChild([&] {
        Json::Value jsFrank, jsDave, jsInfo;
        std::string strGroup;
        EXPECT_TRUE(TesselGetUserInfo(tt::kUidFrank, jsFrank, true) && TesselGetUserInfo(tt::kUidDave, jsDave, true) &&
                    TesselGetGroupName(65534, strGroup, true));
        for (int i = 0; i < 3; ++i) {
            EXPECT_TRUE(tt::WriteFile(files[i], edited[i]));
        }
        QUORUSER *pUser = NULL;
        QUORGROUP *pGroup = NULL;
        EXPECT_EQ(-1, QUORUserGetByUID(tt::kUidFrank, &pUser));
        EXPECT_EQ(1, QUORUserCheckExpired("dave"));
        EXPECT_EQ(0, QUORGroupGetByGID(65534, &pGroup));
        EXPECT_STREQ("vacant", NULL == pGroup ? "" : pGroup->szName);
        QUORGroupFree(pGroup);

        EXPECT_TRUE(TesselGetUserInfo(tt::kUidFrank, jsInfo, true) && TesselCheckUID(tt::kUidFrank));
        EXPECT_EQ(jsFrank, jsInfo);
        EXPECT_TRUE(TesselGetUserInfo(tt::kUidDave, jsInfo, true));
        EXPECT_EQ(Parse(R"({"name": "dave", "mail": "dave@localhost", "gid": 1004, "exist": true, "expire": false})"),
                  jsInfo);
        EXPECT_TRUE(TesselGetGroupName(65534, strGroup, true));
        EXPECT_EQ("nogroup", strGroup);
        return ::testing::Test::HasFailure() ? 1 : 0;
    });
    for (int i = 0; i < 3; ++i) {
        EXPECT_TRUE(tt::WriteFile(files[i], saved[i]));
    }
    EXPECT_EQ(0, status);
}

TEST(MergeJsonObject, NullRemovesOthersReplaceShallowly) {
    const char *cases[][3] = {
        {R"({"a": 1, "b": 2})", R"({"b": null, "c": 3})", R"({"a": 1, "c": 3})"},
        {R"({"t": {"x": 1, "y": 2}})", R"({"t": {"y": 3}, "gone": null})", R"({"t": {"y": 3}})"},
        {R"({"t": {"x": 1}, "s": [1]})", R"({"t": {"x": null}, "s": "s"})", R"({"t": {"x": null}, "s": "s"})"},
        {R"({})", R"({})", R"({})"},
    };
    for (const auto &c : cases) {
        Json::Value jsDest = Parse(c[0]);
        ASSERT_TRUE(mergeJsonObject(jsDest, Parse(c[1])));
        EXPECT_EQ(Parse(c[2]), jsDest) << c[0] << " <- " << c[1];
    }
}

TEST(MergeJsonObject, NonObjectsAreRefusedAndLogged) {
    const Json::Value object = Parse(R"({"a": 1})");
    const Json::Value cases[][2] = {
        {Json::Value(Json::arrayValue), object}, {Json::Value(), object}, {Json::Value("{}"), object},
        {object, Json::Value()}, {object, Json::Value(Json::arrayValue)},
    };
    for (const auto &c : cases) {
        size_t mark = tt::SyslogMark();
        Json::Value jsDest = c[0];
        EXPECT_FALSE(mergeJsonObject(jsDest, c[1]));
        EXPECT_EQ(c[0], jsDest);
        auto line = tt::WaitForSyslog("Failed [!jsDest.isObject() || !jsSrc.isObject()], err=", mark);
        ASSERT_TRUE(line.has_value());
        EXPECT_EQ(0u, line->message.rfind("common/tessel_common:", 0)) << line->message;
        EXPECT_EQ(LOG_ERR, line->priority & 7);
    }
}

}  // namespace
