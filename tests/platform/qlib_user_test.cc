// Users and groups as the name service and the shadow database answer them:
// the sandbox's passwd, group and shadow files (tests/sandbox/etc).
#include <unistd.h>

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "quor/quor.h"
#include "support/sandbox.h"

namespace {

using namespace tessel_test;

class Users : public ::testing::Test {
protected:
    void SetUp() override {
        if (!InSandbox()) {
            GTEST_SKIP() << "needs the sandbox's users";
        }
        QLIBCErrClear();
    }
};

struct UserRecord {
    std::string name, realName, mail, home, shell;
    unsigned uid = 0, gid = 0;
};

bool ByUid(unsigned uid, UserRecord *pRec) {
    QUORUSER *pUser = reinterpret_cast<QUORUSER *>(1);
    if (0 != QUORUserGetByUID(uid, &pUser)) {
        EXPECT_EQ(nullptr, pUser);
        return false;
    }
    *pRec = {pUser->szName, pUser->szRealName, pUser->szMail, pUser->szHomeDir, pUser->szShell, pUser->uid, pUser->gid};
    QUORUserFree(pUser);
    return true;
}

bool ByName(const std::string &name, UserRecord *pRec) {
    QUORUSER *pUser = NULL;
    if (0 != QUORUserGet(name.c_str(), &pUser)) {
        EXPECT_EQ(nullptr, pUser);
        return false;
    }
    *pRec = {pUser->szName, pUser->szRealName, pUser->szMail, pUser->szHomeDir, pUser->szShell, pUser->uid, pUser->gid};
    QUORUserFree(pUser);
    return true;
}

std::string RealName(const std::string &name) {
    char buf[256];
    return (0 == QLIBUserRealNameGet(name.c_str(), buf, sizeof(buf))) ? std::string(buf) : std::string("<failed>");
}

TEST_F(Users, RecordsSplitTheGecosField) {
    UserRecord rec;
    ASSERT_TRUE(ByUid(kUidAlice, &rec));
    EXPECT_EQ("alice", rec.name);
    EXPECT_EQ(kUidAlice, rec.uid);
    EXPECT_EQ(kGidUsers, rec.gid);
    EXPECT_EQ("Alice Able", rec.realName);  // not the room or phone parts
    EXPECT_EQ("alice@example.com", rec.mail);
    EXPECT_EQ("/volume1/homes/alice", rec.home);
    EXPECT_EQ("/bin/bash", rec.shell);

    ASSERT_TRUE(ByName("bob", &rec));
    EXPECT_EQ(kUidBob, rec.uid);
    EXPECT_EQ("Bob Baker", rec.realName);
    EXPECT_EQ("", rec.mail);

    ASSERT_TRUE(ByUid(kUidDave, &rec));
    EXPECT_EQ("", rec.realName);
    EXPECT_EQ("", rec.mail);
    EXPECT_EQ(1004u, rec.gid);

    // "PostgreSQL administrator,,,": the last part is empty, so no mail.
    ASSERT_TRUE(ByUid(kUidPostgres, &rec));
    EXPECT_EQ("PostgreSQL administrator", rec.realName);
    EXPECT_EQ("", rec.mail);

    ASSERT_TRUE(ByUid(kUidErin, &rec));
    EXPECT_EQ("EXAMPLE\\erin", rec.name);
    EXPECT_EQ("Erin Example", rec.realName);
    EXPECT_EQ("erin@example.com", rec.mail);

    // A login name that looks like a mail address is not the mail address.
    ASSERT_TRUE(ByName("grace@example.com", &rec));
    EXPECT_EQ(kUidGrace, rec.uid);
    EXPECT_EQ("Grace Green", rec.realName);
    EXPECT_EQ("", rec.mail);

    ASSERT_TRUE(ByUid(kUidNobody, &rec));
    EXPECT_EQ("nobody", rec.name);
}

TEST_F(Users, UnknownUsersAreNotFound) {
    UserRecord rec;
    EXPECT_FALSE(ByUid(kUidUnknown, &rec));
    EXPECT_EQ(QLIBC_ERR_NOT_FOUND, QLIBCErrGet());
    EXPECT_FALSE(ByName("nosuchuser", &rec));
    EXPECT_FALSE(ByName("Alice", &rec));  // names are exact
    EXPECT_FALSE(ByName("erin", &rec));   // the domain prefix belongs to the name

    QLIBCErrClear();
    EXPECT_EQ(-1, QUORUserGet(NULL, NULL));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORUserGetByUID(kUidAlice, NULL));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    QUORUserFree(NULL);
}

TEST_F(Users, RealNameFallsBackToTheLoginName) {
    EXPECT_EQ("Alice Able", RealName("alice"));
    EXPECT_EQ("Erin Example", RealName("EXAMPLE\\erin"));
    EXPECT_EQ("dave", RealName("dave"));  // empty GECOS
    EXPECT_EQ("<failed>", RealName("nosuchuser"));
    EXPECT_EQ(QLIBC_ERR_NOT_FOUND, QLIBCErrGet());

    // The name and its terminator fit exactly, or the call fails whole.
    char exact[11];
    ASSERT_EQ(0, QLIBUserRealNameGet("alice", exact, sizeof(exact)));
    EXPECT_STREQ("Alice Able", exact);
    char shortBuf[10];
    QLIBCErrClear();
    EXPECT_EQ(-1, QLIBUserRealNameGet("alice", shortBuf, sizeof(shortBuf)));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    EXPECT_STREQ("", shortBuf);
}

TEST_F(Users, AccountExpiryComesFromTheShadowDatabase) {
    EXPECT_EQ(1, QUORUserCheckExpired("carol"));  // expired on day 1
    EXPECT_EQ(0, QUORUserCheckExpired("frank"));  // expires in the far future
    EXPECT_EQ(0, QUORUserCheckExpired("alice"));  // no expiry date
    EXPECT_EQ(0, QUORUserCheckExpired("EXAMPLE\\erin"));
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORUserCheckExpired("nosuchuser"));
    EXPECT_EQ(QLIBC_ERR_NOT_FOUND, QLIBCErrGet());
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORUserCheckExpired(NULL));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());

    // An ordinary user cannot read the shadow database: unknown, not "no".
    ASSERT_EQ(0u, geteuid()) << "the sandbox runs tests as root";
    int asBob = RunInChild([] {
        if (0 != setgid(kGidUsers) || 0 != setuid(kUidBob)) {
            return 10;
        }
        return QUORUserCheckExpired("carol") + 1;  // -1 → 0
    });
    EXPECT_EQ(0, asBob);
}

TEST_F(Users, GroupsByGid) {
    const struct {
        unsigned gid;
        const char *name;
    } known[] = {{kGidUsers, "users"}, {kGidStaff, "staff"}, {kGidEng, "eng"}, {kGidEmpty, "empty"},
                 {65534, "nogroup"}, {0, "root"}};
    for (const auto &group : known) {
        QUORGROUP *pGroup = NULL;
        ASSERT_EQ(0, QUORGroupGetByGID(group.gid, &pGroup)) << group.gid;
        EXPECT_STREQ(group.name, pGroup->szName);
        EXPECT_EQ(group.gid, pGroup->gid);
        QUORGroupFree(pGroup);
    }
    QUORGROUP *pGroup = reinterpret_cast<QUORGROUP *>(1);
    EXPECT_EQ(-1, QUORGroupGetByGID(kGidUnknown, &pGroup));
    EXPECT_EQ(nullptr, pGroup);
    EXPECT_EQ(QLIBC_ERR_NOT_FOUND, QLIBCErrGet());
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORGroupGetByGID(kGidUsers, NULL));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    QUORGroupFree(NULL);
}

std::vector<std::string> GroupList(const std::string &user, int *pRet) {
    QLIBSZLIST *list = QLIBCSzListAlloc(1);  // small: the call must grow it
    *pRet = QLIBGroupInfoListGet(user.c_str(), &list);
    std::vector<std::string> gids;
    for (int i = 0; i < QLIBCSzListCount(list); ++i) {
        gids.push_back(QLIBCSzListGet(list, i));
    }
    QLIBCSzListFree(list);
    return gids;
}

TEST_F(Users, GroupListHasThePrimaryGroupFirst) {
    int ret = 0;
    EXPECT_EQ((std::vector<std::string>{"100", "1100", "1101"}), GroupList("alice", &ret));
    EXPECT_EQ(3, ret);
    EXPECT_EQ((std::vector<std::string>{"100", "1101"}), GroupList("bob", &ret));
    EXPECT_EQ((std::vector<std::string>{"100", "1100"}), GroupList("carol", &ret));
    // Primary group only; it names no members, and is listed once.
    EXPECT_EQ((std::vector<std::string>{"1004"}), GroupList("dave", &ret));
    EXPECT_EQ(1, ret);
    EXPECT_EQ((std::vector<std::string>{"104"}), GroupList("postgres", &ret));

    EXPECT_TRUE(GroupList("nosuchuser", &ret).empty());
    EXPECT_EQ(-1, ret);
    EXPECT_EQ(QLIBC_ERR_NOT_FOUND, QLIBCErrGet());

    // Pushed after what the list already holds.
    QLIBSZLIST *list = QLIBCSzListAlloc(4);
    QLIBCSzListPush(&list, "keep");
    EXPECT_EQ(2, QLIBGroupInfoListGet("bob", &list));
    ASSERT_EQ(3, QLIBCSzListCount(list));
    EXPECT_STREQ("keep", QLIBCSzListGet(list, 0));
    EXPECT_STREQ("100", QLIBCSzListGet(list, 1));
    QLIBCSzListFree(list);

    QLIBCErrClear();
    EXPECT_EQ(-1, QLIBGroupInfoListGet("alice", NULL));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
}

struct Collected {
    std::vector<std::string> names;
    std::vector<std::string> mails;
    size_t stopAfter = 0;  // 0: never stop
};

int Collect(const QUORUSER *pUser, void *pData) {
    Collected *c = static_cast<Collected *>(pData);
    c->names.push_back(pUser->szName);
    c->mails.push_back(pUser->szMail);
    return (c->stopAfter > 0 && c->names.size() >= c->stopAfter) ? -1 : 0;
}

Collected Enumerate(const char *query, int offset, int limit, int *pRet, size_t stopAfter = 0) {
    Collected c;
    c.stopAfter = stopAfter;
    *pRet = QLIBUserInfoEnum(AUTH_LOCAL, query, offset, limit, Collect, &c);
    return c;
}

TEST_F(Users, EnumeratesLocalAccountsInPasswdOrder) {
    const std::vector<std::string> all = {"root",         "postgres", "alice", "bob", "carol", "dave",
                                          "EXAMPLE\\erin", "frank",   "grace@example.com", "nobody"};
    int ret = 0;
    Collected c = Enumerate(NULL, 0, -1, &ret);
    EXPECT_EQ(all, c.names);
    EXPECT_EQ(static_cast<int>(all.size()), ret);
    EXPECT_EQ("alice@example.com", c.mails[2]);
    EXPECT_EQ("", c.mails[3]);

    c = Enumerate(NULL, 2, 3, &ret);
    EXPECT_EQ((std::vector<std::string>{"alice", "bob", "carol"}), c.names);
    EXPECT_EQ(3, ret);
    c = Enumerate(NULL, 8, 5, &ret);
    EXPECT_EQ((std::vector<std::string>{"grace@example.com", "nobody"}), c.names);
    c = Enumerate(NULL, 10, -1, &ret);
    EXPECT_TRUE(c.names.empty());
    EXPECT_EQ(0, ret);
    c = Enumerate(NULL, 0, 0, &ret);
    EXPECT_EQ(0, ret);
}

TEST_F(Users, EnumerationFiltersPagesAndStops) {
    int ret = 0;
    // Names containing "a" in either case; the offset counts matches only.
    EXPECT_EQ((std::vector<std::string>{"alice", "carol", "dave", "EXAMPLE\\erin", "frank", "grace@example.com"}),
              Enumerate("A", 0, -1, &ret).names);
    EXPECT_EQ((std::vector<std::string>{"EXAMPLE\\erin", "frank"}), Enumerate("a", 3, 2, &ret).names);
    EXPECT_EQ((std::vector<std::string>{"EXAMPLE\\erin"}), Enumerate("\\", 0, -1, &ret).names);
    EXPECT_TRUE(Enumerate("zzz", 0, -1, &ret).names.empty());
    EXPECT_EQ(0, ret);

    // A negative callback result stops; that user was handed over.
    Collected c = Enumerate(NULL, 0, -1, &ret, 2);
    EXPECT_EQ((std::vector<std::string>{"root", "postgres"}), c.names);
    EXPECT_EQ(2, ret);

    Collected none;
    for (int authType : {AUTH_DOMAIN, AUTH_LDAP, AUTH_LOCAL | AUTH_DOMAIN, 0}) {
        QLIBCErrClear();
        EXPECT_EQ(-1, QLIBUserInfoEnum(authType, NULL, 0, -1, Collect, &none)) << authType;
        EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    }
    EXPECT_EQ(-1, QLIBUserInfoEnum(AUTH_LOCAL, NULL, -1, -1, Collect, &none));
    EXPECT_EQ(-1, QLIBUserInfoEnum(AUTH_LOCAL, NULL, 0, -2, Collect, &none));
    EXPECT_EQ(-1, QLIBUserInfoEnum(AUTH_LOCAL, NULL, 0, -1, NULL, &none));
    EXPECT_TRUE(none.names.empty());
}

}  // namespace
