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

using Clock = std::chrono::steady_clock;
using Seconds = std::chrono::duration<double>;
using tessel_test::ReadFile;
using tessel_test::WriteFile;

// The last frame of this thread's stack, or "" when it is empty.
std::string LastFrameMsg() {
    const Json::Value &jStack = TesselErrMsgGet();
    return jStack.empty() ? std::string() : jStack[jStack.size() - 1]["msg"].asString();
}

// Runs fn on a fresh thread (empty error stack) and hands back its stack.
template <typename Fn>
bool OnFreshThread(Fn fn, Json::Value &jStack) {
    bool result = false;
    std::thread t([&] {
        result = fn();
        jStack = TesselErrMsgGet();
    });
    t.join();
    return result;
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
    std::vector<std::string> Entries() const {
        std::vector<std::string> names;
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

TEST_F(RawFile, NewFileGetsTheDataAndMkstempMode) {
    const std::string data("line one\n\0binary\xff", 18);
    ASSERT_TRUE(TesselRawToFile(data, target_));
    EXPECT_EQ(data, ReadFile(target_));
    struct stat st;
    ASSERT_EQ(0, stat(target_.c_str(), &st));
    EXPECT_EQ(0600u, st.st_mode & 07777);
    EXPECT_EQ(geteuid(), st.st_uid);
    EXPECT_EQ(std::vector<std::string>{"basic.json"}, Entries());
}

TEST_F(RawFile, RewriteKeepsOwnerGroupAndMode) {
    struct Case {
        uid_t uid;
        gid_t gid;
        mode_t mode;
    } cases[] = {
        {tessel_test::kUidAlice, tessel_test::kGidUsers, 0640},
        {tessel_test::kUidBob, tessel_test::kGidEng, 0604},
        {0, tessel_test::kGidStaff, 02775},
        {tessel_test::kUidDave, 1004, 0400},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(std::to_string(c.uid) + ":" + std::to_string(c.gid));
        WriteFile(target_, "old content that is longer than the new");
        ASSERT_EQ(0, chown(target_.c_str(), c.uid, c.gid));
        ASSERT_EQ(0, chmod(target_.c_str(), c.mode));
        ASSERT_TRUE(TesselRawToFile("{\"v\":2}", target_));
        EXPECT_EQ("{\"v\":2}", ReadFile(target_));
        struct stat st;
        ASSERT_EQ(0, stat(target_.c_str(), &st));
        EXPECT_EQ(c.uid, st.st_uid);
        EXPECT_EQ(c.gid, st.st_gid);
        EXPECT_EQ(c.mode, st.st_mode & 07777);
        EXPECT_EQ(std::vector<std::string>{"basic.json"}, Entries());
    }
}

TEST_F(RawFile, BadTargetsFailWithAFrameAndLeaveNothing) {
    ASSERT_EQ(0, mkdir((dir_ + "/sub").c_str(), 0755));
    ASSERT_EQ(0, mkfifo((dir_ + "/fifo").c_str(), 0644));
    struct Case {
        std::string path;
        const char *condition;
    } cases[] = {
        {"", "strPath.empty()"},
        {dir_ + "/missing/basic.json", "0 > fdLock"},
        {dir_ + "/sub", "0 > fdLock"},
        {dir_ + "/fifo", "0 > fdLock"},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.path);
        Json::Value jStack;
        EXPECT_FALSE(OnFreshThread([&] { return TesselRawToFile("data", c.path); }, jStack));
        ASSERT_EQ(1u, jStack.size());
        EXPECT_EQ(c.condition, jStack[0u]["msg"].asString());
        EXPECT_FALSE(jStack[0u].isMember("code")) << "the caller gives the code";
        EXPECT_EQ((std::vector<std::string>{"fifo", "sub"}), Entries());
    }
}

// A user who may read the file but not write the directory cannot make the
// temporary file: the old content stays.
TEST_F(RawFile, TemporaryFileNotCreatable) {
    WriteFile(target_, "old");
    ASSERT_EQ(0, chown(target_.c_str(), tessel_test::kUidAlice, tessel_test::kGidUsers));
    ASSERT_EQ(0, chmod(target_.c_str(), 0644));
    int status = tessel_test::RunInChild([&] {
        if (0 != setresgid(tessel_test::kGidUsers, tessel_test::kGidUsers, tessel_test::kGidUsers) ||
            0 != setresuid(tessel_test::kUidAlice, tessel_test::kUidAlice, tessel_test::kUidAlice)) {
            return 10;
        }
        if (TesselRawToFile("new", target_)) {
            return 11;
        }
        return ("0 > fdTemp" == LastFrameMsg()) ? 0 : 12;
    });
    EXPECT_EQ(0, status);
    EXPECT_EQ("old", ReadFile(target_));
    EXPECT_EQ(std::vector<std::string>{"basic.json"}, Entries());
}

// A write that fails half-way (file size limit) leaves neither a partial
// target nor a temporary file; a new target does not appear at all.
TEST_F(RawFile, WriteFailureLeavesNoPartialFile) {
    const std::string other = dir_ + "/new.json";
    WriteFile(target_, "old");
    int status = tessel_test::RunInChild([&] {
        signal(SIGXFSZ, SIG_IGN);
        struct rlimit limit = {16, 16};
        if (0 != setrlimit(RLIMIT_FSIZE, &limit)) {
            return 10;
        }
        const std::string big(65536, 'n');
        if (TesselRawToFile(big, target_) || "!ofs.good()" != LastFrameMsg()) {
            return 11;
        }
        if (TesselRawToFile(big, other) || "!ofs.good()" != LastFrameMsg()) {
            return 12;
        }
        return 0;
    });
    EXPECT_EQ(0, status);
    EXPECT_EQ("old", ReadFile(target_));
    EXPECT_EQ(std::vector<std::string>{"basic.json"}, Entries());
}

TEST_F(RawFile, WriterGivesUpOnAHeldLock) {
    WriteFile(target_, "old");
    LockHolder holder(target_, LOCK_EX);
    ASSERT_TRUE(holder.locked());
    size_t mark = tessel_test::SyslogMark();
    Json::Value jStack;
    Clock::time_point t0 = Clock::now();
    bool ok = OnFreshThread([&] { return TesselRawToFile("new", target_); }, jStack);
    Seconds elapsed = Clock::now() - t0;
    EXPECT_FALSE(ok);
    EXPECT_GE(elapsed.count(), 2.0);
    EXPECT_LT(elapsed.count(), 10.0);
    EXPECT_EQ("old", ReadFile(target_));
    EXPECT_EQ(std::vector<std::string>{"basic.json"}, Entries());
    EXPECT_TRUE(jStack.empty()) << "a busy file is left for the caller to report";
    EXPECT_TRUE(tessel_test::WaitForSyslog("Failed [!FlockPatiently(fdLock, LOCK_EX)]", mark).has_value());
    EXPECT_EQ(0, holder.Release());
}

TEST_F(RawFile, WriterWaitsForAShortLock) {
    WriteFile(target_, "old");
    LockHolder holder(target_, LOCK_EX, 1000);
    ASSERT_TRUE(holder.locked());
    Clock::time_point t0 = Clock::now();
    EXPECT_TRUE(TesselRawToFile("new", target_));
    Seconds elapsed = Clock::now() - t0;
    EXPECT_GE(elapsed.count(), 0.8);
    EXPECT_LT(elapsed.count(), 10.0);
    EXPECT_EQ("new", ReadFile(target_));
    EXPECT_EQ(0, holder.Release());
}

TEST_F(RawFile, ReaderGivesUpOnAWriterButSharesWithReaders) {
    WriteFile(target_, "{\"a\":1}");
    {
        LockHolder reader(target_, LOCK_SH);
        ASSERT_TRUE(reader.locked());
        Json::Value jOut;
        EXPECT_TRUE(TesselRawFromFile(jOut, target_));
        EXPECT_EQ("{\"a\":1}", jOut.asString());
    }
    LockHolder writer(target_, LOCK_EX);
    ASSERT_TRUE(writer.locked());
    Json::Value jOut = "untouched";
    Json::Value jStack;
    Clock::time_point t0 = Clock::now();
    bool ok = OnFreshThread([&] { return TesselRawFromFile(jOut, target_); }, jStack);
    Seconds elapsed = Clock::now() - t0;
    EXPECT_FALSE(ok);
    EXPECT_GE(elapsed.count(), 2.0);
    EXPECT_LT(elapsed.count(), 10.0);
    EXPECT_EQ("untouched", jOut.asString());
}

// Writers in several processes replace the file while a reader reads it:
// every read sees one writer's whole content, never a mixture or a part.
TEST_F(RawFile, ConcurrentWritersNeverShowAPartialFile) {
    constexpr size_t kSize = 256 * 1024;
    constexpr int kWriters = 3;
    constexpr int kWrites = 15;
    WriteFile(target_, std::string(kSize, '0'));
    std::vector<pid_t> pids;
    for (int w = 0; w < kWriters; ++w) {
        pid_t pid = fork();
        ASSERT_LE(0, pid);
        if (0 == pid) {
            const std::string data(kSize, static_cast<char>('a' + w));
            for (int i = 0; i < kWrites; ++i) {
                if (!TesselRawToFile(data, target_)) {
                    _exit(1);
                }
            }
            _exit(0);
        }
        pids.push_back(pid);
    }
    int reads = 0;
    int bad = 0;
    for (int i = 0; i < 40; ++i) {
        Json::Value jOut;
        if (!TesselRawFromFile(jOut, target_)) {
            continue;  // a writer held the lock for too long; not what this test is about
        }
        ++reads;
        const std::string text = jOut.asString();
        if (kSize != text.size() || std::string(kSize, text[0]) != text) {
            ++bad;
        }
    }
    for (pid_t pid : pids) {
        int status = -1;
        ASSERT_EQ(pid, waitpid(pid, &status, 0));
        EXPECT_TRUE(WIFEXITED(status) && 0 == WEXITSTATUS(status)) << "a writer failed";
    }
    EXPECT_LT(0, reads);
    EXPECT_EQ(0, bad);
    EXPECT_EQ(std::vector<std::string>{"basic.json"}, Entries());
}

TEST_F(RawFile, ReadGivesTheRawTextUnparsed) {
    struct Case {
        std::string content;
    } cases[] = {
        {"{\"text\": {\"a\": 1}}\n"},
        {""},
        {std::string("not json \0 with a zero byte", 27)},
    };
    for (const Case &c : cases) {
        WriteFile(target_, c.content);
        Json::Value jOut;
        ASSERT_TRUE(TesselRawFromFile(jOut, target_));
        ASSERT_TRUE(jOut.isString());
        EXPECT_EQ(c.content, jOut.asString());
    }
}

TEST_F(RawFile, ReadOfABadPathFailsAndCreatesNothing) {
    ASSERT_EQ(0, mkdir((dir_ + "/sub").c_str(), 0755));
    ASSERT_EQ(0, mkfifo((dir_ + "/fifo").c_str(), 0644));
    struct Case {
        std::string path;
        const char *condition;
    } cases[] = {
        {"", "strPath.empty()"},
        {dir_ + "/missing.json", "0 > fdLock"},
        {dir_ + "/sub", "0 != fstat(fdLock, &st) || !S_ISREG(st.st_mode)"},
        {dir_ + "/fifo", "0 != fstat(fdLock, &st) || !S_ISREG(st.st_mode)"},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.path);
        Json::Value jOut = "untouched";
        Json::Value jStack;
        EXPECT_FALSE(OnFreshThread([&] { return TesselRawFromFile(jOut, c.path); }, jStack));
        ASSERT_EQ(1u, jStack.size());
        EXPECT_EQ(c.condition, jStack[0u]["msg"].asString());
        EXPECT_EQ("untouched", jOut.asString());
        EXPECT_EQ((std::vector<std::string>{"fifo", "sub"}), Entries());
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
