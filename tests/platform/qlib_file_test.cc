// File checks and flock() locks with time-outs, with real second processes
// holding or asking for the lock.
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <fstream>
#include <string>

#include <gtest/gtest.h>

#include "quor/qlib.h"
#include "support/process_holding.h"
#include "support/sandbox.h"
#include "support/scratch.h"

namespace {

using Clock = std::chrono::steady_clock;
using tessel_test::ScratchDir;

long long ElapsedUs(Clock::time_point since) {
    return std::chrono::duration_cast<std::chrono::microseconds>(Clock::now() - since).count();
}

void Release(int fd) {
    flock(fd, LOCK_UN);
    close(fd);
}

// Another process holding a lock on a file. It takes the lock, says so, and
// keeps it until Finish() (or, with holdMs, for that long), writing
// markerPath just before it lets go; the lock goes when the process ends.
class LockHolder {
public:
    LockHolder(const std::string &path, int mode, int holdMs = -1, const std::string &markerPath = "")
        : holding_(
              [path, mode] {
                  int fd = -1;
                  return 1 == QLIBCFileLockTimeByFile(path.c_str(), mode, 0, &fd);
              },
              holdMs,
              [markerPath] {
                  if (!markerPath.empty()) {
                      std::ofstream(markerPath) << "released\n";
                  }
              }) {}
    bool locked() const { return holding_.ready(); }
    // Lets go of the lock and reaps the process; true when it ended cleanly.
    bool Finish() {
        int status = holding_.Release();
        return -1 != status && WIFEXITED(status) && 0 == WEXITSTATUS(status);
    }

private:
    tessel_test::ProcessHolding holding_;
};

TEST(FileChecks, TellFilesDirectoriesAndLinksApart) {
    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    std::ofstream(dir.file("plain")) << "x";
    ASSERT_EQ(0, symlink(dir.path().c_str(), dir.file("dirlink").c_str()));
    ASSERT_EQ(0, symlink(dir.file("missing").c_str(), dir.file("dangling").c_str()));

    EXPECT_TRUE(QLIBCFileExist(dir.file("plain").c_str()));
    EXPECT_FALSE(QLIBCFileCheckDir(dir.file("plain").c_str()));
    EXPECT_TRUE(QLIBCFileExist(dir.path().c_str()));
    EXPECT_TRUE(QLIBCFileCheckDir(dir.path().c_str()));
    // Links are followed.
    EXPECT_TRUE(QLIBCFileExist(dir.file("dirlink").c_str()));
    EXPECT_TRUE(QLIBCFileCheckDir(dir.file("dirlink").c_str()));
    EXPECT_FALSE(QLIBCFileExist(dir.file("dangling").c_str()));
    EXPECT_FALSE(QLIBCFileCheckDir(dir.file("dangling").c_str()));
    EXPECT_FALSE(QLIBCFileExist(dir.file("missing").c_str()));
    EXPECT_FALSE(QLIBCFileCheckDir(dir.file("plain/below").c_str()));
}

TEST(FileChecks, RecordBadArguments) {
    QLIBCErrClear();
    EXPECT_FALSE(QLIBCFileExist(NULL));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    QLIBCErrClear();
    EXPECT_FALSE(QLIBCFileCheckDir(""));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    EXPECT_NE(std::string::npos, std::string(QLIBCErrFileGet()).find("qlib_file.cc"));
    EXPECT_GT(QLIBCErrLineGet(), 0);
}

TEST(FileLock, CreatesAMissingLockFileThatOtherUsersCanOpen) {
    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    const std::string path = dir.file("new.lock");
    mode_t old = umask(077);
    int fd = -1;
    int ret = QLIBCFileLockTimeByFile(path.c_str(), QLIBC_FILE_LOCK_EX, 0, &fd);
    umask(old);
    ASSERT_EQ(1, ret);
    EXPECT_GE(fd, 0);
    struct stat st;
    ASSERT_EQ(0, stat(path.c_str(), &st));
    EXPECT_TRUE(S_ISREG(st.st_mode));
    EXPECT_EQ(0644u, st.st_mode & 07777u);
    Release(fd);
}

TEST(FileLock, ExclusiveLockOfAnotherProcessTimesOut) {
    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    const std::string path = dir.file("held.lock");
    LockHolder holder(path, QLIBC_FILE_LOCK_EX);
    ASSERT_TRUE(holder.locked());

    const long long timeoutUs = 200000;
    QLIBCErrClear();
    int fd = 12345;
    Clock::time_point start = Clock::now();
    EXPECT_EQ(0, QLIBCFileLockTimeByFile(path.c_str(), QLIBC_FILE_LOCK_EX, timeoutUs, &fd));
    long long waited = ElapsedUs(start);
    EXPECT_GE(waited, timeoutUs);
    EXPECT_LT(waited, 30 * timeoutUs) << "gave up long after its time-out";
    EXPECT_EQ(-1, fd);
    EXPECT_EQ(QLIBC_ERR_LOCK_TIMEOUT, QLIBCErrGet());

    // A shared lock is refused too; a zero time-out is a single try.
    QLIBCErrClear();
    start = Clock::now();
    EXPECT_EQ(0, QLIBCFileLockTimeByFile(path.c_str(), QLIBC_FILE_LOCK_SH, 0, &fd));
    EXPECT_LT(ElapsedUs(start), timeoutUs) << "a zero time-out waited";
    EXPECT_EQ(QLIBC_ERR_LOCK_TIMEOUT, QLIBCErrGet());
    EXPECT_EQ(-1, fd);

    ASSERT_TRUE(holder.Finish());
    ASSERT_EQ(1, QLIBCFileLockTimeByFile(path.c_str(), QLIBC_FILE_LOCK_EX, 0, &fd));
    Release(fd);
}

TEST(FileLock, OurLockKeepsAnotherProcessOutUntilReleased) {
    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    const std::string path = dir.file("ours.lock");
    int fd = -1;
    ASSERT_EQ(1, QLIBCFileLockTimeByFile(path.c_str(), QLIBC_FILE_LOCK_EX, 0, &fd));

    auto tryInChild = [&path](int mode, long long timeoutUs) {
        return tessel_test::RunInChild([&path, mode, timeoutUs] {
            int childFd = -1;
            int ret = QLIBCFileLockTimeByFile(path.c_str(), mode, timeoutUs, &childFd);
            if (0 == ret) {
                return (QLIBC_ERR_LOCK_TIMEOUT == QLIBCErrGet()) ? 10 : 11;
            }
            return ret + 20;
        });
    };
    EXPECT_EQ(10, tryInChild(QLIBC_FILE_LOCK_SH, 50000));
    EXPECT_EQ(10, tryInChild(QLIBC_FILE_LOCK_EX, 0));
    Release(fd);
    EXPECT_EQ(21, tryInChild(QLIBC_FILE_LOCK_EX, 0));
}

TEST(FileLock, SharedLocksAreShared) {
    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    const std::string path = dir.file("shared.lock");
    LockHolder holder(path, QLIBC_FILE_LOCK_SH);
    ASSERT_TRUE(holder.locked());

    int fd = -1;
    ASSERT_EQ(1, QLIBCFileLockTimeByFile(path.c_str(), QLIBC_FILE_LOCK_SH, 0, &fd));
    int fdEx = -1;
    EXPECT_EQ(0, QLIBCFileLockTimeByFile(path.c_str(), QLIBC_FILE_LOCK_EX, 20000, &fdEx));
    Release(fd);
    // Still shared by the other process.
    EXPECT_EQ(0, QLIBCFileLockTimeByFile(path.c_str(), QLIBC_FILE_LOCK_EX, 0, &fdEx));
    ASSERT_TRUE(holder.Finish());
}

TEST(FileLock, WaitsForTheHolderToLetGo) {
    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    const std::string path = dir.file("wait.lock");
    // A time-out long enough, then no time-out at all.
    for (long long timeoutUs : {20000000LL, -1LL}) {
        const std::string marker = dir.file("released" + std::to_string(timeoutUs));
        LockHolder holder(path, QLIBC_FILE_LOCK_EX, 300, marker);
        ASSERT_TRUE(holder.locked());
        int fd = -1;
        ASSERT_EQ(1, QLIBCFileLockTimeByFile(path.c_str(), QLIBC_FILE_LOCK_EX, timeoutUs, &fd)) << timeoutUs;
        EXPECT_TRUE(QLIBCFileExist(marker.c_str())) << "locked while the other process still held it";
        Release(fd);
        EXPECT_TRUE(holder.Finish());
    }
}

TEST(FileLock, RefusesLinksAndNonRegularFiles) {
    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    std::ofstream(dir.file("target")) << "keep";
    ASSERT_EQ(0, symlink(dir.file("target").c_str(), dir.file("link.lock").c_str()));
    ASSERT_EQ(0, symlink(dir.file("created-through-link").c_str(), dir.file("dangling.lock").c_str()));
    ASSERT_EQ(0, mkfifo(dir.file("fifo.lock").c_str(), 0644));

    for (const char *name : {"link.lock", "dangling.lock", "fifo.lock", ""}) {
        int fd = 7;
        QLIBCErrClear();
        EXPECT_EQ(-1, QLIBCFileLockTimeByFile(dir.file(name).c_str(), QLIBC_FILE_LOCK_EX, 0, &fd)) << name;
        EXPECT_EQ(-1, fd) << name;
        EXPECT_NE(QLIBC_ERR_NONE, QLIBCErrGet()) << name;
    }
    EXPECT_FALSE(QLIBCFileExist(dir.file("created-through-link").c_str()));
}

TEST(FileLock, RecordsBadArguments) {
    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    const std::string path = dir.file("args.lock");
    int fd = -1;
    QLIBCErrClear();
    EXPECT_EQ(-1, QLIBCFileLockTimeByFile(NULL, QLIBC_FILE_LOCK_EX, 0, &fd));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    QLIBCErrClear();
    EXPECT_EQ(-1, QLIBCFileLockTimeByFile(path.c_str(), QLIBC_FILE_LOCK_EX, 0, NULL));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    QLIBCErrClear();
    EXPECT_EQ(-1, QLIBCFileLockTimeByFile(path.c_str(), 2, 0, &fd));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    // Nothing was created for a refused call.
    EXPECT_FALSE(QLIBCFileExist(path.c_str()));
}

}  // namespace
