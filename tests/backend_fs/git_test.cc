// The Git version store on real repositories, read back with the git tool as
// an independent reader: every repository must pass `git fsck --strict` and
// show exactly the commits, parents, branches, trees and files intended.
#include <stdio.h>
#include <sys/wait.h>
#include <syslog.h>
#include <time.h>
#include <unistd.h>

#include <filesystem>
#include <map>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include <git2.h>
#include <gtest/gtest.h>
#include <quor/qlib.h>

#include "support/error_stack.h"
#include "support/json_text.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_git.h"

using namespace tessel_test;
namespace fs = std::filesystem;

namespace {

using Msgs = std::vector<std::string>;
using Pairs = std::vector<std::pair<std::string, std::string>>;
using Files = std::map<std::string, std::string>;
constexpr char kHome[] = "/tmp/git-test-home";
constexpr char kEdit[] = R"({"commit_msg":{"kind":"edit"}})";

// A string table filled in the given order.
class Table {
public:
    explicit Table(const Pairs &pairs = {}) {
        for (const auto &kv : pairs) {
            QLIBCSzHashSetValue(p_, kv.first.c_str(), kv.second.c_str());
        }
    }
    ~Table() { QLIBCSzHashFree(p_); }
    Table(const Table &) = delete;
    Table &operator=(const Table &) = delete;
    QLIBSZHASH *get() { return p_; }
    Files Contents() const {
        Files out;
        QLIBSZLIST *pKeys = QLIBCSzListAlloc(16);
        QLIBCSzHashEnumKey(p_, &pKeys);
        for (int i = 0; i < QLIBCSzListCount(pKeys); ++i) {
            out[QLIBCSzListGet(pKeys, i)] = QLIBCSzHashGetValue(p_, QLIBCSzListGet(pKeys, i));
        }
        QLIBCSzListFree(pKeys);
        return out;
    }

private:
    QLIBSZHASH *p_ = QLIBCSzHashAlloc(16);
};

// The regular files under dir (its .git folder aside) with their contents.
Files FilesIn(const std::string &dir) {
    Files files;
    for (auto it = fs::recursive_directory_iterator(dir); it != fs::recursive_directory_iterator(); ++it) {
        if (it->path().filename() == ".git") {
            it.disable_recursion_pending();
        } else if (it->is_regular_file()) {
            files[fs::relative(it->path(), dir).string()] = ReadFile(it->path().string());
        }
    }
    return files;
}

const Files kBaseFiles = {{"text/a", "alpha\n"}, {"text/b", "beta\n"}, {"binary/x", "\x01\x02"}, {"binary/sub/y", "y"}};

class GitStore : public ::testing::Test {
protected:
    static void SetUpTestSuite() {
        git_libgit2_init();
        // Neither the library nor the git tool may read the host's settings.
        fs::create_directories(kHome);
        for (int level : {GIT_CONFIG_LEVEL_SYSTEM, GIT_CONFIG_LEVEL_XDG, GIT_CONFIG_LEVEL_GLOBAL}) {
            git_libgit2_opts(GIT_OPT_SET_SEARCH_PATH, level, kHome);
        }
    }
    static void TearDownTestSuite() { git_libgit2_shutdown(); }

    void SetUp() override {
        ASSERT_TRUE(scratch_.ok());
        fs::create_directories(src_);
        ErrClear();
    }
    void TearDown() override { Git("fsck --strict --no-progress --no-dangling"); }

    // A file on disk holding content, for an add table.
    std::string Src(const std::string &name, const std::string &content) {
        EXPECT_TRUE(WriteFile(src_ + "/" + name, content));
        return src_ + "/" + name;
    }

    // Standard output of `git -C <repo> args`; a test failure unless it exits 0.
    std::string Git(const std::string &args) {
        std::string cmd = "env -i PATH=/usr/bin:/bin HOME=" + std::string(kHome) + " GIT_CONFIG_NOSYSTEM=1 git -C " +
                          repo_ + " " + args + " 2>&1";
        FILE *pipe = popen(cmd.c_str(), "r");
        std::string out;
        char buf[4096];
        for (size_t n; nullptr != pipe && 0 < (n = fread(buf, 1, sizeof(buf), pipe));) {
            out.append(buf, n);
        }
        int status = (nullptr == pipe) ? -1 : pclose(pipe);
        EXPECT_TRUE(WIFEXITED(status) && 0 == WEXITSTATUS(status)) << cmd << "\n" << out;
        return out;
    }

    // Each local branch with its tip, then where HEAD points.
    std::string Refs() {
        return Git("for-each-ref --format='%(refname) %(objectname)' refs/heads") + "HEAD " + Git("symbolic-ref HEAD");
    }

    std::string CreateBase() {
        Table add({{"text/a", Src("a1", "alpha\n")}, {"text/b", Src("b1", "beta\n")},
                   {"binary/x", Src("x1", "\x01\x02")}, {"binary/sub/y", Src("y1", "y")}});
        std::string strVer;
        EXPECT_EQ(0, GitCreateRepository(repo_.c_str(), 1000, add.get(), nullptr, "alice", "alice@example.com",
                                         R"({"commit_msg":{"kind":"create","n":1}})", strVer));
        return strVer;
    }

    std::string Commit(const std::string &base, long long mtime, const Pairs &adds, const Pairs &dels = {},
                       const Pairs &renames = {}, const char *szMsg = kEdit) {
        Table add(adds), del(dels), ren(renames);
        std::string strVer;
        EXPECT_EQ(0, GitCommit(repo_.c_str(), base.c_str(), mtime, add.get(), del.get(), ren.get(), "bob",
                               "bob@example.com", szMsg, strVer))
            << ::testing::PrintToString(ErrMsgs());
        return strVer;
    }

    // fn fails with ret, leaving the frame and log line of the failed libgit2
    // call: its text, result (logged, when it is not ret) and message.
    template <typename Fn>
    void ExpectGitFailure(Fn fn, int ret, int code, const std::string &call, int logged = 0) {
        ErrClear();
        size_t mark = SyslogMark();
        EXPECT_EQ(ret, fn());
        EXPECT_EQ(code, ErrCode());
        EXPECT_EQ(Msgs{call}, ErrMsgs());
        EXPECT_EQ("tessel_git", TesselErrMsgGet()[0u]["file"].asString());
        std::string head = "tessel_git:" + std::to_string(TesselErrMsgGet()[0u]["line"].asInt()) + " Failed [" + call +
                           "][" + std::to_string(logged ? logged : ret) + "][" + git_error_last()->message + "], err=";
        auto line = WaitForSyslog(head, mark, LOG_USER | LOG_ERR);
        ASSERT_TRUE(line.has_value()) << head;
        EXPECT_EQ(0u, line->message.find(head)) << line->message;
    }

    ScratchDir scratch_;
    std::string repo_ = scratch_.file("repo"), src_ = scratch_.file("src");
};

TEST_F(GitStore, CreateRepositoryMakesOneRootCommitAndChecksItOut) {
    Table add({{"text/a", Src("a", "alpha\n")}, {"binary/x", Src("x", "bin")}, {"top", Src("t", "t")}});
    Table del(Pairs{{"ghost", ""}});
    size_t mark = SyslogMark();
    std::string strVer;
    ASSERT_EQ(0, GitCreateRepository(repo_.c_str(), 1234567890, add.get(), del.get(), "Alice Able",
                                     "alice@example.com", R"({"commit_msg":{"kind":"create"}})", strVer));
    EXPECT_EQ(strVer + " | Alice Able <alice@example.com> 1234567890 +0000\n",
              Git("log --all --format='%H |%P %an <%ae> %ad' --date=raw"));
    EXPECT_EQ("100644 blob binary/x\n100644 blob text/a\n100644 blob top\n",
              Git("ls-tree -r --format='%(objectmode) %(objecttype) %(path)' HEAD"));
    EXPECT_EQ((Files{{"text/a", "alpha\n"}, {"binary/x", "bin"}, {"top", "t"}}), FilesIn(repo_));
    EXPECT_EQ("refs/heads/master " + strVer + "\nHEAD refs/heads/master\n", Refs());
    EXPECT_EQ("", Git("status --porcelain"));
    // Removing what is not there is logged and skipped.
    auto line = WaitForSyslog(" fail to git_treebuilder_remove [ghost] (", mark, LOG_USER | LOG_ERR);
    ASSERT_TRUE(line.has_value());
    int logLine = 0, used = 0;
    EXPECT_EQ(1, sscanf(line->message.c_str(), "tessel_git:%d%n", &logLine, &used)) << line->message;
    EXPECT_EQ(static_cast<size_t>(used), line->message.find(" fail to git_treebuilder_remove [ghost] ("));

    Json::Value jInfo;
    ASSERT_EQ(0, GitGetCommitInfo(repo_.c_str(), nullptr, jInfo));
    Json::Value jWant = Parse(R"({"auther": "Alice Able", "email": "alice@example.com", "mtime": 1234567890,
                                  "msg": {"commit_msg": {"kind": "create"}}, "parent": []})");
    jWant["version"] = strVer;
    EXPECT_EQ(jWant, jInfo);
}

TEST_F(GitStore, CommitsBranchFromOlderVersionsAndCheckoutFollowsTheLatest) {
    std::string v1 = CreateBase();
    std::string v2 = Commit(v1, 2000, {{"text/a", Src("a2", "alpha 2\n")}});
    EXPECT_EQ(v1 + "\n", Git("rev-parse " + v2 + "^"));
    EXPECT_EQ("refs/heads/master " + v2 + "\nHEAD refs/heads/master\n", Refs());
    EXPECT_EQ("alpha 2\n", ReadFile(repo_ + "/text/a"));

    // The same content again: the base comes back and nothing is written.
    std::string before = Refs() + Git("rev-list --all --count");
    EXPECT_EQ(v2, Commit(v2, 2500, {{"text/a", Src("a2same", "alpha 2\n")}}, {{"text/none", ""}}));
    EXPECT_EQ(before, Refs() + Git("rev-list --all --count"));

    // Changes on v1 from a fresh thread, whose branch names count from 0; v4
    // is older than v3, so it is recorded but not checked out.
    std::string v3, v4, names[2];
    unsigned long long t0 = time(nullptr), t1 = 0;
    unsigned tid = 0;
    std::thread([&] {
        tid = static_cast<unsigned>(gettid());
        v3 = Commit(v1, 3000, {{"text/c", Src("c3", "gamma\n")}});
        v4 = Commit(v1, 1500, {}, {{"text/b", ""}});
        t1 = time(nullptr);
    }).join();
    for (unsigned i = 0; i < 2; ++i) {
        std::string tip = (0 == i) ? v3 : v4;
        names[i] = Git("for-each-ref --points-at " + tip + " --format='%(refname)' refs/heads");
        unsigned long long secs = 0;
        unsigned pid = 0, thread = 0, count = 0;
        ASSERT_EQ(4, sscanf(names[i].c_str(), "refs/heads/branch_%llu_%u_%u_%u", &secs, &pid, &thread, &count));
        EXPECT_EQ("refs/heads/branch_" + std::to_string(secs) + "_" + std::to_string(getpid()) + "_" +
                      std::to_string(tid) + "_" + std::to_string(i) + "\n",
                  names[i]);
        EXPECT_TRUE(t0 <= secs && secs <= t1) << names[i];
        EXPECT_EQ(v1 + "\n", Git("rev-parse " + tip + "^"));
        names[i].pop_back();
    }
    EXPECT_EQ(v1 + "\n", Git("rev-list --max-parents=0 --all"));
    EXPECT_EQ(names[0] + " " + v3 + "\n" + names[1] + " " + v4 + "\nrefs/heads/master " + v2 + "\nHEAD " + names[0] +
                  "\n",
              Refs());
    Files files = kBaseFiles;
    files["text/c"] = "gamma\n";
    EXPECT_EQ(files, FilesIn(repo_));
    Json::Value jInfo;
    ASSERT_EQ(0, GitGetCommitInfo(repo_.c_str(), nullptr, jInfo));
    EXPECT_EQ(v3, jInfo["version"].asString());

    // The latest is restored over a spoiled work tree; HEAD stays.
    ASSERT_TRUE(WriteFile(repo_ + "/stray", "junk") && WriteFile(repo_ + "/text/a", "spoiled"));
    fs::remove(repo_ + "/text/c");
    ASSERT_EQ(0, GitRestoreLastestCommit(repo_.c_str()));
    EXPECT_EQ(files, FilesIn(repo_));

    // A change on the latest tip extends its branch.
    std::string v5 = Commit(v3, 4000, {{"text/c", Src("c5", "gamma 5\n")}});
    EXPECT_EQ(names[0] + " " + v5 + "\n" + names[1] + " " + v4 + "\nrefs/heads/master " + v2 + "\nHEAD " + names[0] +
                  "\n",
              Refs());
    EXPECT_EQ("gamma 5\n", ReadFile(repo_ + "/text/c"));
}

TEST_F(GitStore, TreeEditsNestFoldersDropEmptyOnesAndRenameByEntry) {
    std::string v1 = CreateBase();
    size_t mark = SyslogMark();
    std::string v2 = Commit(v1, 2000, {{"a/b/c", Src("c", "deep")}, {"text/b", Src("b2", "beta 2\n")}},
                            {{"binary/x", ""}, {"binary/sub/y", ""}, {"nothere/zz", ""}, {"text/nothere", ""}},
                            {{"text/a", "text/moved/a2"}, {"binary/x", "top_x"}});
    EXPECT_EQ("tree a\ntree a/b\nblob a/b/c\ntree text\nblob text/b\ntree text/moved\nblob text/moved/a2\nblob top_x\n",
              Git("ls-tree -r -t --format='%(objecttype) %(path)' " + v2));
    // A rename moves the entry itself.
    EXPECT_EQ(Git("rev-parse " + v1 + ":text/a"), Git("rev-parse " + v2 + ":text/moved/a2"));
    EXPECT_EQ(Git("rev-parse " + v1 + ":binary/x"), Git("rev-parse " + v2 + ":top_x"));
    EXPECT_EQ((Files{{"a/b/c", "deep"}, {"text/b", "beta 2\n"}, {"text/moved/a2", "alpha\n"}, {"top_x", "\x01\x02"}}),
              FilesIn(repo_));
    EXPECT_TRUE(WaitForSyslog(" entry not exist, skip", mark, LOG_USER | LOG_ERR).has_value());

    Table diff, back;
    ASSERT_EQ(0, GitDiff(repo_.c_str(), v1.c_str(), nullptr, diff.get()));
    EXPECT_EQ((Files{{"a/b/c", "created"}, {"binary/sub/y", "deleted"}, {"binary/x", "deleted"}, {"text/a", "deleted"},
                     {"text/b", "modified"}, {"text/moved/a2", "created"}, {"top_x", "created"}}),
              diff.Contents());
    ASSERT_EQ(0, GitDiff(repo_.c_str(), v2.c_str(), v1.c_str(), back.get()));
    EXPECT_EQ("created", back.Contents()["binary/sub/y"]);
    EXPECT_EQ("deleted", back.Contents()["a/b/c"]);

    // A rename whose source the base lacks fails the commit: nothing new.
    std::string count = Git("rev-list --all --count"), strOut = "unchanged";
    Table none, ren(Pairs{{"text/missing", "text/m2"}});
    ExpectGitFailure(
        [&] {
            return GitCommit(repo_.c_str(), v2.c_str(), 3000, none.get(), none.get(), ren.get(), "bob",
                             "bob@example.com", "{}", strOut);
        },
        GIT_ENOTFOUND, TESSEL_ERR_NOT_EXISTS, "git_tree_entry_bypath(&entry, base_tree, szSrc)");
    EXPECT_EQ("unchanged", strOut);
    EXPECT_EQ(count, Git("rev-list --all --count"));
}

TEST_F(GitStore, LoadCommitFillsAnotherDirectoryAndLeavesTheRepositoryAlone) {
    std::string v1 = CreateBase();
    std::string v2 = Commit(v1, 2000, {{"text/c", Src("c", "gamma\n")}}, {{"binary/sub/y", ""}});
    std::string dir = scratch_.file("load");
    fs::create_directories(dir + "/binary/sub");
    ASSERT_TRUE(WriteFile(dir + "/binary/sub/stray", "junk"));
    Json::Value jInfo;
    ASSERT_EQ(0, GitLoadCommit(repo_.c_str(), v1.c_str(), dir.c_str(), jInfo));
    EXPECT_EQ(kBaseFiles, FilesIn(dir));
    Json::Value jWant = Parse(R"({"auther": "alice", "email": "alice@example.com", "mtime": 1000,
                                  "msg": {"commit_msg": {"kind": "create", "n": 1}}, "parent": []})");
    jWant["version"] = v1;
    EXPECT_EQ(jWant, jInfo);
    EXPECT_EQ(v2 + "\n", Git("rev-parse HEAD"));
    EXPECT_EQ("gamma\n", ReadFile(repo_ + "/text/c"));
    EXPECT_FALSE(fs::exists(repo_ + "/binary/sub"));
    EXPECT_EQ("", Git("status --porcelain"));

    ASSERT_EQ(0, GitGetCommitInfo(repo_.c_str(), v2.c_str(), jInfo));
    EXPECT_EQ(Parse("[\"" + v1 + "\"]"), jInfo["parent"]);
    EXPECT_EQ("bob", jInfo["auther"].asString());
}

TEST_F(GitStore, HistoryListsAllBranchesByTimeWithOffsetLimitAndFilter) {
    std::string v1 = CreateBase();
    std::string v2 = Commit(v1, 2000, {{"text/a", Src("a2", "2")}}, {}, {}, R"({"commit_msg":{"kind":"edit","n":2}})");
    std::string v3 = Commit(v1, 3000, {{"text/a", Src("a3", "3")}}, {}, {}, R"({"commit_msg":{"kind":"edit","n":3}})");
    std::string v4 = Commit(v2, 4000, {{"text/a", Src("a4", "4")}}, {}, {}, R"({"commit_msg":{"kind":"note"}})");
    std::string v5 = Commit(v3, 5000, {{"text/a", Src("a5", "5")}}, {}, {}, R"({"other":1})");
    using Ids = std::vector<std::string>;
    Json::Value jOut;
    auto list = [&](unsigned limit, unsigned offset, bool reverse, const char *szFilter) {
        int n = GitListCommitHistory(repo_.c_str(), limit, offset, reverse, Parse(szFilter), jOut);
        Ids ids;
        for (const Json::Value &jInfo : jOut) {
            ids.push_back(jInfo["version"].asString());
        }
        EXPECT_EQ(static_cast<int>(ids.size()), n);
        return ids;
    };
    EXPECT_EQ((Ids{v5, v4, v3, v2, v1}), list(0, 0, false, "null"));
    EXPECT_EQ(Parse("[\"" + v3 + "\"]"), jOut[0u]["parent"]);
    EXPECT_EQ(v5 + "\n" + v4 + "\n" + v3 + "\n" + v2 + "\n" + v1 + "\n", Git("log --all --date-order --format=%H"));
    EXPECT_EQ((Ids{v3, v2, v1}), list(0, 2, false, "{}"));
    EXPECT_EQ((Ids{v2, v3}), list(2, 1, true, "null"));
    EXPECT_EQ((Ids{}), list(0, 9, false, "null"));
    EXPECT_EQ((Ids{v3, v2}), list(0, 0, false, R"({"kind": "edit"})"));
    EXPECT_EQ((Ids{v3}), list(1, 0, true, R"({"kind": "edit", "n": 3})"));
    // A member the message lacks excludes the commit; so does a value of another type.
    EXPECT_EQ((Ids{}), list(0, 0, false, R"({"kind": "note", "n": 4})"));
    EXPECT_EQ((Ids{}), list(0, 0, false, R"({"n": "2"})"));
}

TEST_F(GitStore, FailuresReportNotFoundAsObjectMissingAndTheRestAsGitFailures) {
    std::string v1 = CreateBase();
    std::string count = Git("rev-list --all --count"), strOut;
    Table none, dotGit(Pairs{{".git", Src("g", "g")}}), missing(Pairs{{"text/a", src_ + "/no-such-file"}}),
        tooLong(Pairs{{"text/" + std::string(4090, 'p'), Src("l", "l")}});
    Json::Value jInfo, jOut = Parse("[1]");
    auto commit = [&](Table &add) {
        return GitCommit(repo_.c_str(), v1.c_str(), 2000, add.get(), none.get(), none.get(), "bob", "b@x", "{}",
                         strOut);
    };

    ExpectGitFailure([&] { return GitCommit(repo_.c_str(), std::string(40, 'e').c_str(), 2000, none.get(),
                                            none.get(), none.get(), "bob", "b@x", "{}", strOut); },
                     GIT_ENOTFOUND, TESSEL_ERR_NOT_EXISTS, "git_commit_lookup(&base_commit, repo, &base_commit_id)");
    ExpectGitFailure([&] { return GitLoadCommit(repo_.c_str(), "not-an-id", scratch_.file("d").c_str(), jInfo); },
                     GIT_ENOTFOUND, TESSEL_ERR_NOT_EXISTS, "git_commit_lookup(&commit, repo, &commit_id)");
    EXPECT_FALSE(fs::exists(scratch_.file("d")));
    ExpectGitFailure([&] { return GitListCommitHistory(src_.c_str(), 0, 0, false, Json::Value(), jOut); }, -1,
                     TESSEL_ERR_NOT_EXISTS, "git_repository_open(&repo, szRepoPath)", GIT_ENOTFOUND);
    EXPECT_EQ(Json::Value(Json::arrayValue), jOut);
    ExpectGitFailure([&] { return commit(missing); }, GIT_ENOTFOUND, TESSEL_ERR_NOT_EXISTS,
                     "git_blob_create_fromdisk(&oid_blob, repo, szFile)");
    // A name Git refuses inside a tree; a second first commit.
    ExpectGitFailure([&] { return commit(dotGit); }, GIT_ERROR, TESSEL_ERR_GIT,
                     "git_treebuilder_insert(NULL, tree_bld, szEntryName, &oid_blob, GIT_FILEMODE_BLOB )");
    ExpectGitFailure(
        [&] { return GitCreateRepository(repo_.c_str(), 3000, none.get(), none.get(), "bob", "b@x", "{}", strOut); },
        GIT_EMODIFIED, TESSEL_ERR_GIT,
        "git_commit_create(&commit_id, repo, \"HEAD\", me, me, \"UTF-8\", szCommitMsg, tree, 0, NULL)");

    // A path longer than a path buffer is refused, not cut.
    EXPECT_EQ(GIT_ERROR, commit(tooLong));
    EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
    EXPECT_EQ(Msgs{"strlen(szPath) >= 4095"}, ErrMsgs());

    size_t mark = SyslogMark();
    EXPECT_EQ(GIT_ERROR, GitDiff(repo_.c_str(), "xyz", v1.c_str(), none.get()));
    auto line = WaitForSyslog(" fail to git_oid_fromstr (", mark, LOG_USER | LOG_ERR);
    ASSERT_TRUE(line.has_value());
    EXPECT_EQ("tessel_git:" + std::to_string(TesselErrMsgGet()[0u]["line"].asInt()) + " fail to git_oid_fromstr (" +
                  git_error_last()->message + ")",
              line->message);
    EXPECT_EQ(TESSEL_ERR_GIT, ErrCode());
    mark = SyslogMark();
    EXPECT_EQ(GIT_ERROR, GitDiff(repo_.c_str(), v1.c_str(), v1.c_str(), nullptr));
    EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, ErrCode());
    EXPECT_EQ(Msgs{"bad parameter"}, ErrMsgs());
    line = WaitForSyslog(" bad parameter", mark, LOG_USER | LOG_ERR);
    ASSERT_TRUE(line.has_value());
    EXPECT_EQ("tessel_git:" + std::to_string(TesselErrMsgGet()[0u]["line"].asInt()) + " bad parameter", line->message);

    EXPECT_EQ(count, Git("rev-list --all --count"));
    EXPECT_EQ(kBaseFiles, FilesIn(repo_));
}

}  // namespace
