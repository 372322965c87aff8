// The version operations on real objects of the file-system store: one
// version (latest and older), the history page by page with its totals, the
// comparison of two versions, and their hash-parameter forms.
#include <unistd.h>

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "version_test_util.h"

using namespace version_test;

namespace {

TEST_F(VersionApi, GetReadsTheLatestOrTheNamedVersion) {
    TESSEL_OBJECT_VERSION ver;
    ASSERT_TRUE(ver.Get(Ask(kUidAlice))) << Frames();
    EXPECT_EQ(Expected(2), Shown(&ver));
    // An older one, read by bob, whom the acl lets read; nothing of the
    // record's earlier content stays.
    ASSERT_TRUE(ver.Get(Ask(kUidBob, R"("version": ")" + s_ver[0] + "\""))) << Frames();
    EXPECT_EQ(Expected(0), Shown(&ver));

    // The holder form; a failed read leaves the earlier record in place.
    TESSEL_OBJECT_VERSION_LIST list;
    ASSERT_TRUE(list.GetVersion(Ask(kUidBob, R"("version": ")" + s_ver[1] + "\""))) << Frames();
    EXPECT_EQ(Expected(1), Shown(list.head()));
    TESSEL_OBJECT_VERSION *pEarlier = list.head();
    EXPECT_FALSE(list.GetVersion(Ask(kUidBob, R"("version": ")" + std::string(40, 'f') + "\"")));
    // A version the repository does not have: not-found from the commit
    // look-up, each layer's frame above it.
    EXPECT_EQ(TESSEL_ERR_NOT_EXISTS, ErrCode());
    EXPECT_EQ((Msgs{"git_commit_lookup(&commit, repo, &commit_id)",
                    "GIT_OK != GitGetCommitInfo(m_jPathInfo[TESSEL_VERSION].asCString(), szVersion, jCommitInfo)",
                    "!mf_GetVersionGit(pVersion)", "!pBackendFs->VersionGet(jParm, this)", "!pVer->Get(jParm)"}),
              ErrMsgs());
    EXPECT_EQ(pEarlier, list.head());
    EXPECT_EQ(Expected(1), Shown(list.head()));
}

TEST_F(VersionApi, ListPagesThroughTheHistoryWithItsTotals) {
    const std::pair<const char *, std::vector<int>> cases[] = {
        {"", {2, 1, 0}},
        {R"("sort_direction": "asc")", {0, 1, 2}},
        {R"("limit": 1, "offset": 1)", {1}},
        {R"("limit": 2, "offset": 2)", {0}},
    };
    for (const auto &c : cases) {
        std::vector<std::string> expected;
        for (int i : c.second) {
            expected.push_back(s_ver[i]);
        }
        unsigned total = 0, listable = 0;
        TESSEL_OBJECT_VERSION *pHead = nullptr;
        EXPECT_EQ((int)expected.size(), TesselObjectVersionList(Ask(kUidAlice, c.first), &pHead, total, listable))
            << c.first << Frames();
        EXPECT_EQ(expected, Versions(pHead)) << c.first;
        EXPECT_EQ(3u, total) << c.first;
        EXPECT_EQ(2u, listable) << c.first;
        TesselObjectVersionFreeList(pHead);
    }

    // The holder; a refused page leaves it as it was.
    TESSEL_OBJECT_VERSION_LIST list;
    unsigned total = 0, listable = 0;
    ASSERT_EQ(3, list.ListVersion(Ask(kUidBob), total, listable)) << Frames();
    EXPECT_EQ(Expected(1), Shown(list.head()->next));
    TESSEL_OBJECT_VERSION *pEarlier = list.head();
    ErrClear();
    EXPECT_EQ(-1, list.ListVersion(Ask(kUidBob, R"("limit": "2")"), total, listable));
    EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
    EXPECT_EQ((Msgs{"jParm.isMember(\"limit\") && !jParm[\"limit\"].isIntegral()",
                    "0 > (count = TesselObjectVersionList(jParm, &pHead, total, listable_total))"}),
              ErrMsgs());
    EXPECT_EQ(pEarlier, list.head());
}

TEST_F(VersionApi, DiffNamesChangedTextFieldsAndBinaries) {
    TESSEL_OBJECT_VERSION ver;
    Json::Value jDiff(Json::objectValue);
    ASSERT_TRUE(ver.Diff(Ask(kUidBob, R"("old_version": ")" + s_ver[0] + "\""), jDiff)) << Frames();
    EXPECT_EQ(Parse(R"({"text": {"title": "modified", "body": "deleted", "extra": "created"},
                        "binary": {"a.bin": "created"}})"),
              jDiff);
    jDiff = Json::Value(Json::objectValue);
    ASSERT_TRUE(ver.Diff(Ask(kUidBob, R"("old_version": ")" + s_ver[0] + R"(", "new_version": ")" + s_ver[1] + "\""),
                         jDiff)) << Frames();
    EXPECT_EQ(Parse(R"({"text": {"title": "modified"}})"), jDiff);
}

// The hash-parameter forms, called by an application that dropped its
// privileges (bob, whom the acl lets read alice's object): the store is
// read as root, the caller keeps its own ids.
TEST_F(VersionApi, HashFormsForACallerRunningAsAUser) {
    EXPECT_EQ(0, RunAsUser(kUidBob, kGidUsers, [] {
                  TESSEL_OBJECT_VERSION ver;
                  Hash get({{"ns", "ledger"}, {"id", s_id}, {"requester", "1002"}, {"version", s_ver[0]}});
                  EXPECT_EQ(0, TesselObjectVersionGet(get.p, &ver)) << Frames();
                  EXPECT_EQ(Expected(0), Shown(&ver));

                  Hash list({{"ns", "ledger"}, {"id", s_id}, {"requester", "1002"}, {"offset", "1"}, {"limit", "1"}});
                  TESSEL_OBJECT_VERSION *pHead = nullptr;
                  unsigned t = 0, l = 0;
                  EXPECT_EQ(1, TesselObjectVersionList(list.p, &pHead, &t, &l)) << Frames();
                  EXPECT_EQ(std::vector<std::string>{s_ver[1]}, Versions(pHead));
                  EXPECT_EQ(3u, t);
                  EXPECT_EQ(2u, l);
                  TesselObjectVersionFreeList(pHead);

                  Hash diff({{"ns", "ledger"}, {"id", s_id}, {"requester", "1002"}, {"old_version", s_ver[1]}});
                  Hash text, binary;
                  EXPECT_EQ(0, TesselObjectVersionDiff(diff.p, &text.p, &binary.p)) << Frames();
                  EXPECT_EQ(2, QLIBCSzHashCount(text.p));
                  EXPECT_STREQ("deleted", QLIBCSzHashGetValue(text.p, "body"));
                  EXPECT_STREQ("created", QLIBCSzHashGetValue(text.p, "extra"));
                  EXPECT_EQ(1, QLIBCSzHashCount(binary.p));
                  EXPECT_STREQ("created", QLIBCSzHashGetValue(binary.p, "a.bin"));

                  EXPECT_EQ(kUidBob, geteuid());
                  return ::testing::Test::HasFailure() ? 1 : 0;
              }));
}

}  // namespace
