// Whole-file writes and reads: atomic replacement that keeps owner and mode,
// no leftovers, and serialisation with other processes through flock.
#include <dirent.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "support/process_holding.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_error.h"
#include "tessel_file.h"

namespace {

using tessel_test::ReadFile;
using tessel_test::WriteFile;
using Names = std::vector<std::string>;

// The last frame of this thread's stack, or "" when it is empty.
std::string LastFrameMsg() {
    const Json::Value &jStack = TesselErrMsgGet();
    return jStack.empty() ? std::string() : jStack[jStack.size() - 1]["msg"].asString();
}

// fn's result, the stack it left and how long it took, run on a fresh thread
// so that the stack holds only its own frames.
struct Outcome {
    bool ok = false;
    Json::Value jStack;
    double seconds = 0;
};
template <typename Fn>
Outcome OnFreshThread(Fn fn) {
    Outcome out;
    std::thread t([&] {
        const auto t0 = std::chrono::steady_clock::now();
        out.ok = fn();
        out.seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - t0).count();
        out.jStack = TesselErrMsgGet();
    });
    t.join();
    return out;
}

// Another process holding flock(op) on a file, until Release() or, with
// holdMs >= 0, for that long.
class LockHolder : public tessel_test::ProcessHolding {
public:
    LockHolder(const std::string &path, int op, int holdMs = -1)
        : ProcessHolding(
              [path, op] {
                  int fd = open(path.c_str(), O_RDONLY);
                  return 0 <= fd && 0 == flock(fd, op);
              },
              holdMs) {}
    bool locked() const { return ready(); }
};

class RawFile : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(tessel_test::InSandbox()) << "run through ctest: this test writes under /tmp";
        scratch_ = std::make_unique<tessel_test::ScratchDir>();
        ASSERT_TRUE(scratch_->ok());
        dir_ = scratch_->path();
        ASSERT_EQ(0, chmod(dir_.c_str(), 0755));
        target_ = dir_ + "/basic.json";
    }
    // The names in the test directory, sorted.
    Names Entries() const {
        Names names;
        for (const auto &entry : std::filesystem::directory_iterator(dir_)) {
            names.push_back(entry.path().filename().string());
        }
        std::sort(names.begin(), names.end());
        return names;
    }
    // Made in SetUp, once it is known that /tmp is the sandbox's.
    std::unique_ptr<tessel_test::ScratchDir> scratch_;
    std::string dir_;
    std::string target_;
};

// A new file gets mkstemp's mode and the writer as owner; a rewrite keeps
// the old file's owner, group and mode.
TEST_F(RawFile, WriteGivesTheDataAndKeepsOwnerGroupAndMode) {
    struct Case {
        bool exists;
        uid_t uid;
        gid_t gid;
        mode_t mode;
    } cases[] = {
        {false, geteuid(), getegid(), 0600},
        {true, tessel_test::kUidAlice, tessel_test::kGidUsers, 0640},
        {true, tessel_test::kUidBob, tessel_test::kGidEng, 0604},
        {true, 0, tessel_test::kGidStaff, 02775},
        {true, tessel_test::kUidDave, 1004, 0400},
    };
    const std::string data("line one\n\0binary\xff", 18);
    for (const Case &c : cases) {
        SCOPED_TRACE(std::to_string(c.uid) + ":" + std::to_string(c.gid));
        unlink(target_.c_str());
        if (c.exists) {
            WriteFile(target_, "old content that is longer than the new");
            ASSERT_EQ(0, chown(target_.c_str(), c.uid, c.gid));
            ASSERT_EQ(0, chmod(target_.c_str(), c.mode));
        }
        ASSERT_TRUE(TesselRawToFile(data, target_));
        EXPECT_EQ(data, ReadFile(target_));
        struct stat st;
        ASSERT_EQ(0, stat(target_.c_str(), &st));
        EXPECT_EQ(c.uid, st.st_uid);
        EXPECT_EQ(c.gid, st.st_gid);
        EXPECT_EQ(c.mode, st.st_mode & 07777);
        EXPECT_EQ(Names{"basic.json"}, Entries());
    }
}

// Neither a write nor a read creates anything at a bad path; the frame
// carries the failed check and leaves the code to the caller.
TEST_F(RawFile, BadPathsFailWithAFrameAndLeaveNothing) {
    ASSERT_EQ(0, mkdir((dir_ + "/sub").c_str(), 0755));
    ASSERT_EQ(0, mkfifo((dir_ + "/fifo").c_str(), 0644));
    const char *kNotRegular = "0 != fstat(fdLock, &st) || !S_ISREG(st.st_mode)";
    struct Case {
        std::string path;
        const char *writeCondition;
        const char *readCondition;
    } cases[] = {
        {"", "strPath.empty()", "strPath.empty()"},
        {dir_ + "/missing/basic.json", "0 > fdLock", "0 > fdLock"},
        {dir_ + "/missing.json", nullptr, "0 > fdLock"},
        {dir_ + "/sub", "0 > fdLock", kNotRegular},
        {dir_ + "/fifo", "0 > fdLock", kNotRegular},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.path);
        if (c.writeCondition) {
            Outcome out = OnFreshThread([&] { return TesselRawToFile("data", c.path); });
            EXPECT_FALSE(out.ok);
            ASSERT_EQ(1u, out.jStack.size());
            EXPECT_EQ(c.writeCondition, out.jStack[0u]["msg"].asString());
            EXPECT_FALSE(out.jStack[0u].isMember("code"));
            EXPECT_EQ((Names{"fifo", "sub"}), Entries());
        }
        Json::Value jOut = "untouched";
        Outcome out = OnFreshThread([&] { return TesselRawFromFile(jOut, c.path); });
        EXPECT_FALSE(out.ok);
        ASSERT_EQ(1u, out.jStack.size());
        EXPECT_EQ(c.readCondition, out.jStack[0u]["msg"].asString());
        EXPECT_EQ("untouched", jOut.asString());
        EXPECT_EQ((Names{"fifo", "sub"}), Entries());
    }
}

// A write that cannot make its temporary file (a user who may not write the
// directory) or fails half-way (file size limit) keeps the old content and
// leaves no partial or temporary file; a new target does not appear at all.
TEST_F(RawFile, FailedWritesLeaveTheOldContentAndNothingElse) {
    using namespace tessel_test;
    WriteFile(target_, "old");
    ASSERT_EQ(0, chown(target_.c_str(), kUidAlice, kGidUsers));
    ASSERT_EQ(0, chmod(target_.c_str(), 0644));
    EXPECT_EQ(0, RunInChild([&] {
        if (0 != setresgid(kGidUsers, kGidUsers, kGidUsers) || 0 != setresuid(kUidAlice, kUidAlice, kUidAlice)) {
            return 10;
        }
        return TesselRawToFile("new", target_) ? 11 : ("0 > fdTemp" == LastFrameMsg()) ? 0 : 12;
    }));
    EXPECT_EQ(0, RunInChild([&] {
        signal(SIGXFSZ, SIG_IGN);
        struct rlimit limit = {16, 16};
        const std::string big(65536, 'n');
        if (0 != setrlimit(RLIMIT_FSIZE, &limit)) {
            return 10;
        }
        if (TesselRawToFile(big, target_) || "!ofs.good()" != LastFrameMsg()) {
            return 11;
        }
        return (TesselRawToFile(big, dir_ + "/new.json") || "!ofs.good()" != LastFrameMsg()) ? 12 : 0;
    }));
    EXPECT_EQ("old", ReadFile(target_));
    EXPECT_EQ(Names{"basic.json"}, Entries());
}

// A writer and a reader both give up on a file another process writes, after
// waiting a while: the busy file is logged, left for the caller to report,
// and neither the file nor the reader's value changes.
TEST_F(RawFile, AHeldWriteLockTurnsWritersAndReadersAway) {
    WriteFile(target_, "old");
    {
        LockHolder reader(target_, LOCK_SH);
        ASSERT_TRUE(reader.locked());
        Json::Value jOut;
        EXPECT_TRUE(TesselRawFromFile(jOut, target_)) << "readers share the file";
        EXPECT_EQ("old", jOut.asString());
    }
    LockHolder holder(target_, LOCK_EX);
    ASSERT_TRUE(holder.locked());
    size_t mark = tessel_test::SyslogMark();
    Outcome out = OnFreshThread([&] { return TesselRawToFile("new", target_); });
    EXPECT_FALSE(out.ok);
    EXPECT_GE(out.seconds, 2.0);
    EXPECT_LT(out.seconds, 10.0);
    EXPECT_TRUE(out.jStack.empty());
    EXPECT_TRUE(tessel_test::WaitForSyslog("Failed [!FlockPatiently(fdLock, LOCK_EX)]", mark).has_value());

    Json::Value jOut = "untouched";
    out = OnFreshThread([&] { return TesselRawFromFile(jOut, target_); });
    EXPECT_FALSE(out.ok);
    EXPECT_GE(out.seconds, 2.0);
    EXPECT_LT(out.seconds, 10.0);
    EXPECT_EQ("untouched", jOut.asString());
    EXPECT_EQ("old", ReadFile(target_));
    EXPECT_EQ(Names{"basic.json"}, Entries());
    EXPECT_EQ(0, holder.Release());
}

TEST_F(RawFile, WriterWaitsForAShortLock) {
    WriteFile(target_, "old");
    LockHolder holder(target_, LOCK_EX, 1000);
    ASSERT_TRUE(holder.locked());
    Outcome out = OnFreshThread([&] { return TesselRawToFile("new", target_); });
    EXPECT_TRUE(out.ok);
    EXPECT_GE(out.seconds, 0.8);
    EXPECT_LT(out.seconds, 10.0);
    EXPECT_EQ("new", ReadFile(target_));
    EXPECT_EQ(0, holder.Release());
}

// Writers in several processes replace the file while a reader reads it:
// every read sees one writer's whole content, never a mixture or a part.
TEST_F(RawFile, ConcurrentWritersNeverShowAPartialFile) {
    constexpr size_t kSize = 256 * 1024;
    WriteFile(target_, std::string(kSize, '0'));
    std::vector<pid_t> pids;
    for (char fill : {'a', 'b', 'c'}) {
        pid_t pid = fork();
        ASSERT_LE(0, pid);
        if (0 == pid) {
            bool ok = true;
            for (int i = 0; i < 15 && ok; ++i) {
                ok = TesselRawToFile(std::string(kSize, fill), target_);
            }
            _exit(ok ? 0 : 1);
        }
        pids.push_back(pid);
    }
    int reads = 0, bad = 0;
    for (int i = 0; i < 40; ++i) {
        // A read that gave up on a writer holding the lock too long is not
        // what this test is about.
        Json::Value jOut;
        if (TesselRawFromFile(jOut, target_)) {
            const std::string text = jOut.asString();
            ++reads;
            bad += kSize != text.size() || std::string(kSize, text[0]) != text;
        }
    }
    for (pid_t pid : pids) {
        int status = -1;
        ASSERT_EQ(pid, waitpid(pid, &status, 0));
        EXPECT_TRUE(WIFEXITED(status) && 0 == WEXITSTATUS(status)) << "a writer failed";
    }
    EXPECT_LT(0, reads);
    EXPECT_EQ(0, bad);
    EXPECT_EQ(Names{"basic.json"}, Entries());
}

TEST_F(RawFile, ReadGivesTheRawTextUnparsed) {
    for (const std::string &content :
         {std::string("{\"text\": {\"a\": 1}}\n"), std::string(), std::string("not json \0 with a zero byte", 27)}) {
        WriteFile(target_, content);
        Json::Value jOut;
        ASSERT_TRUE(TesselRawFromFile(jOut, target_));
        ASSERT_TRUE(jOut.isString());
        EXPECT_EQ(content, jOut.asString());
    }
}

TEST_F(RawFile, JsonToFileWritesCompactText) {
    Json::Value jVal(Json::objectValue);
    jVal["b"] = "caf\xc3\xa9";
    jVal["a"][0u] = 1;
    jVal["a"][1u] = true;
    jVal["n"] = Json::Value();
    ASSERT_TRUE(TesselJsonToFile(jVal, target_));
    EXPECT_EQ("{\"a\":[1,true],\"b\":\"caf\xc3\xa9\",\"n\":null}", ReadFile(target_));
    EXPECT_FALSE(TesselJsonToFile(jVal, dir_ + "/missing/x.json"));
}

}  // namespace
