// Object identifiers: their form, their uniqueness, the owner parsers and the
// existence check inside a namespace.
#include <sys/stat.h>
#include <unistd.h>

#include <mutex>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "support/error_stack.h"
#include "support/sandbox.h"
#include "tessel_id.h"

using namespace tessel_test;

namespace {

TEST(ObjectId, DefaultIdsNameTheOwner) {
    EXPECT_EQ("0_#00000000", TesselObjectDefaultID(0));
    EXPECT_EQ("1026_#00000000", TesselObjectDefaultID(1026));
    EXPECT_EQ("4294967295_#00000000", TesselObjectDefaultID(UID_ERR));
}

TEST(ObjectId, GeneratedIdsAreOwnerAndNinetySixHexDigits) {
    std::string strId = TesselObjectGenerateID(1026, "ledger");
    EXPECT_EQ("1026_", strId.substr(0, 5));
    EXPECT_EQ(std::string::npos, strId.find_first_not_of("0123456789ABCDEF", 5)) << strId;
    EXPECT_EQ(4u + 97u, strId.size());
    // Three independent digests, not one repeated.
    EXPECT_NE(strId.substr(5, 32), strId.substr(37, 32));
    EXPECT_NE(strId.substr(37, 32), strId.substr(69, 32));
    EXPECT_EQ(1026u, TesselObjectGetOwnerByID(strId));
    EXPECT_EQ(1026, TesselExtractUid(strId.c_str()));
    EXPECT_EQ(1u + 97u, TesselObjectGenerateID(0, "").size());
}

TEST(ObjectId, GeneratedIdsDifferAcrossCallsAndThreads) {
    // Many ids within one clock tick, in several threads at once: the
    // per-thread counter and the thread id in the seed keep them apart.
    std::set<std::string> ids;
    std::mutex mutex;
    std::vector<std::thread> threads;
    for (int t = 0; t < 6; ++t) {
        threads.emplace_back([&]() {
            std::vector<std::string> mine;
            for (int i = 0; i < 300; ++i) {
                mine.push_back(TesselObjectGenerateID(1001, "ledger"));
            }
            std::lock_guard<std::mutex> lock(mutex);
            ids.insert(mine.begin(), mine.end());
        });
    }
    for (std::thread &thread : threads) {
        thread.join();
    }
    EXPECT_EQ(6u * 300u, ids.size());
}

TEST(ObjectId, OwnerByIdTakesTheTextBeforeTheFirstUnderscore) {
    ErrClear();
    EXPECT_EQ(1026u, TesselObjectGetOwnerByID("1026_ABC"));
    EXPECT_EQ(1026u, TesselObjectGetOwnerByID("1026"));
    EXPECT_EQ(1026u, TesselObjectGetOwnerByID("1026_ABC_DEF"));
    EXPECT_EQ(0u, TesselObjectGetOwnerByID(""));
    EXPECT_EQ(0u, TesselObjectGetOwnerByID("_abc"));
    EXPECT_EQ(0, ErrCode());

    EXPECT_EQ(UID_ERR, TesselObjectGetOwnerByID("x_1"));
    EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
    EXPECT_EQ(std::vector<std::string>{"Bad ID [x_1]"}, ErrMsgs());

    // Past 32 bits the number would wrap onto someone else's uid.
    ErrClear();
    EXPECT_EQ(UID_ERR, TesselObjectGetOwnerByID("4294968322_ABC"));
    EXPECT_EQ(std::vector<std::string>{"Bad ID [4294968322_ABC]"}, ErrMsgs());
}

TEST(ObjectId, ExtractUidHasExplicitLimits) {
    ErrClear();
    EXPECT_EQ(-1, TesselExtractUid(NULL));
    EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, ErrCode());
    EXPECT_EQ(std::vector<std::string>{"NULL == id"}, ErrMsgs());

    const std::string strDigits31 = std::string(27, '0') + "1026";
    EXPECT_EQ(1026, TesselExtractUid(strDigits31.c_str()));
    EXPECT_EQ(1026, TesselExtractUid((strDigits31 + "_ABC").c_str()));

    ErrClear();
    EXPECT_EQ(-1, TesselExtractUid(("0" + strDigits31).c_str()));
    EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
    EXPECT_EQ(std::vector<std::string>{"32 <= i"}, ErrMsgs());

    ErrClear();
    EXPECT_EQ(-1, TesselExtractUid("12a_x"));
    EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
    EXPECT_EQ(std::vector<std::string>{"endPtr && 0 != *endPtr"}, ErrMsgs());
}

// The namespace "ledger" linked the way a placed namespace is, with the link
// directory readable by root alone.
void LinkLedger(const std::string &strTarget) {
    ASSERT_EQ(0, system(("mkdir -p " + strTarget + " /usr/quor/etc/tessel/ns && chmod 0700 " + strTarget +
                         " /usr/quor/etc/tessel/ns && ln -sfn " + strTarget + " /usr/quor/etc/tessel/ns/ledger")
                            .c_str()));
}

TEST(ObjectId, ExistenceIsTheObjectDirectoryInItsNamespace) {
    LinkLedger("/volume1/@Tessel/ledger");
    const std::string strId = TesselObjectGenerateUniqueID(kUidAlice, "ledger");
    ASSERT_EQ(0, mkdir(("/volume1/@Tessel/ledger/" + strId).c_str(), 0700));
    ASSERT_EQ(0, mkdir("/volume1/@Tessel/outside", 0700));
    // Asked by a user who cannot see into the namespace: the answer comes
    // from inside the privilege-raising section, and the caller's ids are
    // back afterwards, on the refusals too.
    int rc = RunAsUser(kUidAlice, kGidUsers, [&]() {
        EXPECT_TRUE(TesselIDIsExist("ledger", strId));
        EXPECT_FALSE(TesselIDIsExist("ledger", TesselObjectDefaultID(kUidAlice)));
        EXPECT_EQ(kUidAlice, geteuid());
        EXPECT_EQ(kGidUsers, getegid());

        for (const std::string &strBad : {std::string(".."), std::string("../outside"), std::string("."),
                                          std::string("a/b"), std::string("outside\0x", 9)}) {
            ErrClear();
            EXPECT_FALSE(TesselIDIsExist("ledger", strBad)) << strBad;
            EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode()) << strBad;
            EXPECT_EQ(std::vector<std::string>{"!TesselIsPathComponent(strId)"}, ErrMsgs()) << strBad;
        }

        ErrClear();
        EXPECT_FALSE(TesselIDIsExist("nowhere", strId));
        std::vector<std::string> msgs = ErrMsgs();
        EXPECT_EQ("!TesselGetNSPath(strNs, strNSPath)", msgs.empty() ? "" : msgs.back());
        EXPECT_EQ(kUidAlice, geteuid());
        EXPECT_EQ(kGidUsers, getegid());
        return ::testing::Test::HasFailure() ? 1 : 0;
    });
    EXPECT_EQ(0, rc);
}

TEST(ObjectId, UniqueIdsAreFreeInTheirNamespace) {
    LinkLedger("/volume1/@Tessel/ledger");
    for (int i = 0; i < 20; ++i) {
        std::string strId = TesselObjectGenerateUniqueID(kUidBob, "ledger");
        EXPECT_EQ(kUidBob, TesselObjectGetOwnerByID(strId));
        ASSERT_FALSE(TesselIDIsExist("ledger", strId));
        ASSERT_EQ(0, mkdir(("/volume1/@Tessel/ledger/" + strId).c_str(), 0700));
        EXPECT_TRUE(TesselIDIsExist("ledger", strId));
    }
}

}  // namespace
