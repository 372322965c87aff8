// File locks and lockers against other processes holding the same files.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "support/error_stack.h"
#include "support/process_holding.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_lock.h"

namespace {

using tessel_test::ErrClear;
using tessel_test::ErrCode;
using tessel_test::ErrMsgs;
using Names = std::vector<std::string>;

// A namespace in the linked scheme; answers its scratch directory.
std::string MakeNs(const std::string &ns) {
    std::filesystem::create_directories("/volume1/@Tessel/" + ns);
    std::filesystem::create_directories("/usr/quor/etc/tessel/ns");
    std::filesystem::create_directory_symlink("/volume1/@Tessel/" + ns, "/usr/quor/etc/tessel/ns/" + ns);
    return "/volume1/@tmp/@Tessel/" + ns;
}
std::string Backup(const std::string &ns) { return "/var/lock/tessel_backup_" + ns + ".lock"; }
std::string Volume(const std::string &ns) { return "/var/lock/tessel_volume_move_" + ns + ".lock"; }

// The lock another process finds on path: F_RDLCK, F_WRLCK, F_UNLCK; 100 when there is no file.
int SeenFromOutside(const std::string &path) {
    return tessel_test::RunInChild([&] {
        int fd = open(path.c_str(), O_RDONLY);
        struct flock fl = {};
        fl.l_type = F_WRLCK;
        return (0 > fd) ? 100 : (0 != fcntl(fd, F_GETLK, &fl)) ? 101 : fl.l_type;
    });
}

// Another process holding an exclusive lock on each path (for holdMs, or until released).
struct Holder : tessel_test::ProcessHolding {
    explicit Holder(const Names &paths, int holdMs = -1)
        : ProcessHolding(
              [paths] {
                  for (const std::string &path : paths) {
                      int fd = open(path.c_str(), O_RDWR | O_CREAT, 0644);
                      struct flock fl = {};
                      fl.l_type = F_WRLCK;
                      if (0 > fd || 0 != fcntl(fd, F_SETLK, &fl)) return false;
                  }
                  return true;
              },
              holdMs) {}
};

// The names in dir (none when it is missing).
Names Entries(const std::string &dir) {
    Names names;
    std::error_code ec;
    for (const auto &entry : std::filesystem::directory_iterator(dir, ec)) names.push_back(entry.path().filename());
    return names;
}

TEST(FileLock, AgainstAnotherProcess) {
    tessel_test::ScratchDir dir;
    std::string path = dir.file("f.lock");
    TESSEL_FILE_LOCK lock(path);
    {
        Holder holder({path});
        ASSERT_TRUE(holder.ready());
        EXPECT_FALSE(lock.Lock(0, 0));
        EXPECT_FALSE(lock.TryLock());
        auto start = std::chrono::steady_clock::now();
        EXPECT_FALSE(lock.Lock(1, 2));
        EXPECT_GE(std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count(), 1.5);
    }
    EXPECT_FALSE(lock.Lock(1, -2));  // refused without trying, though the file is free now
    EXPECT_TRUE(lock.ReadLock(0));
    EXPECT_EQ(F_RDLCK, SeenFromOutside(path));
    EXPECT_TRUE(lock.UnLock());
    Holder briefly({path}, 300);
    ASSERT_TRUE(briefly.ready());
    EXPECT_TRUE(lock.Lock(1, -1));  // waits as long as it takes
    EXPECT_EQ(F_WRLCK, SeenFromOutside(path));
}

// Record locks belong to the process, as the public header tells callers.
TEST(FileLock, ThreadsOfOneProcessDoNotExclude) {
    tessel_test::ScratchDir dir;
    TESSEL_FILE_LOCK mine(dir.file("t.lock"));
    ASSERT_TRUE(mine.WriteLock(0));
    std::thread([&] { EXPECT_TRUE(TESSEL_FILE_LOCK(dir.file("t.lock")).WriteLock(0)); }).join();
    // The other thread's descriptor closed, and with it this process's lock.
    EXPECT_EQ(F_UNLCK, SeenFromOutside(dir.file("t.lock")));
}

TEST(Locker, ReadersGiveUpAtOnceWritersHoldUntilUnLock) {
    std::string ns = "jobs", obj = MakeNs(ns) + "/o1.lock";
    {
        Holder backup({Backup(ns)});
        ASSERT_TRUE(backup.ready());
        TESSEL_LOCKER locker;
        EXPECT_FALSE(locker.ReadLock(TESSEL_LOCK_ALL, ns, "o1"));
        EXPECT_EQ(901, ErrCode());
        EXPECT_EQ(Names{"!m_impl->pBackupLock_ || !m_impl->pBackupLock_->ReadLock(0)"}, ErrMsgs());
        EXPECT_EQ("lock/tessel_lock", TesselErrMsgGet()[0]["file"].asString());
        // Taken before the failure, in order, and kept until the locker goes.
        EXPECT_EQ(F_RDLCK, SeenFromOutside(obj));
        EXPECT_EQ(F_RDLCK, SeenFromOutside(Volume(ns)));
    }
    EXPECT_EQ(F_UNLCK, SeenFromOutside(obj));
    Holder both({Volume(ns), Backup(ns)});
    ASSERT_TRUE(both.ready());
    EXPECT_FALSE(TESSEL_LOCKER().ReadLock(TESSEL_LOCK_BACKUP_OBJECT_VOLUME, ns, Json::Value()));
    EXPECT_EQ(900, ErrCode());
    EXPECT_EQ(Names{"!m_impl->pVolLock_ || !m_impl->pVolLock_->ReadLock(0)"}, ErrMsgs());
    both.Release();
    TESSEL_LOCKER writer;
    ASSERT_TRUE(writer.WriteLock(TESSEL_LOCK_ALL, ns, "o1"));
    for (const std::string &path : {obj, Volume(ns), Backup(ns)}) EXPECT_EQ(F_WRLCK, SeenFromOutside(path)) << path;
    EXPECT_TRUE(writer.UnLock());
    EXPECT_EQ(F_UNLCK, SeenFromOutside(Backup(ns)));
    ErrClear();
    EXPECT_FALSE(writer.UnLock());
    EXPECT_EQ(Names{"!m_impl"}, ErrMsgs());
    EXPECT_EQ(-1, ErrCode());
}

TEST(Locker, MoreThan300IdsTakeTheBackupLock) {
    std::string ns = "many", dir = MakeNs(ns);
    Json::Value ids(Json::arrayValue);
    for (int i = 0; i < 301; ++i) ids.append("id" + std::to_string(i));
    {
        TESSEL_LOCKER locker;
        ASSERT_TRUE(locker.ReadLock(TESSEL_LOCK_BACKUP_OBJECT, ns, ids));
        EXPECT_EQ(F_RDLCK, SeenFromOutside(Backup(ns)));
        EXPECT_EQ(Names{}, Entries(dir));
    }
    ids.resize(300);
    TESSEL_LOCKER locker;
    ASSERT_TRUE(locker.ReadLock(TESSEL_LOCK_BACKUP_OBJECT, ns, ids));
    EXPECT_EQ(300u, Entries(dir).size());
    EXPECT_EQ(F_RDLCK, SeenFromOutside(dir + "/id299.lock"));
    EXPECT_EQ(F_UNLCK, SeenFromOutside(Backup(ns)));
}

TEST(Locker, ObjectLockNotObtained) {
    std::string ns = "objects", dir = MakeNs(ns);
    ASSERT_TRUE(std::filesystem::create_directories(dir + "/isdir.lock"));
    ErrClear();
    TESSEL_LOCKER_BACKUP_OBJECT unopenable(ns, "isdir");
    EXPECT_EQ(Names{"0 > (fd_ = open(filename.c_str(), O_RDWR | O_NONBLOCK | O_CREAT, 0644))"}, ErrMsgs());
    EXPECT_FALSE(unopenable.ReadLock(-1));
    EXPECT_FALSE(TESSEL_LOCKER().ReadLock(TESSEL_LOCK_BACKUP_OBJECT, ns, Json::Value("isdir")));
    EXPECT_EQ(902, ErrCode());
    EXPECT_EQ(Names{"!(*it) || !((*it)->ReadLock())"}, ErrMsgs());
    EXPECT_FALSE(TESSEL_LOCKER().WriteLock(TESSEL_LOCK_BACKUP_OBJECT, ns, Json::Value("isdir")));
    EXPECT_EQ(Names{"!(*it) || !((*it)->WriteLock())"}, ErrMsgs());
}

TEST(Locker, HostileNamesStayInTheirDirectory) {
    std::string ns = "hostile", dir = MakeNs(ns);
    // With these, "tessel_backup_" + "/../../../tmp/evil" would be a real way out.
    mkdir("/var/lock/tessel_backup_", 0755);
    mkdir("/var/lock/tessel_volume_move_", 0755);
    Names before = Entries("/var/lock");
    for (const char *name : {"/../../../tmp/evil", "..", "a/b", ""}) {
        ErrClear();
        EXPECT_FALSE(TESSEL_LOCKER_BACKUP(name).ReadLock(0));  // the volume locker shares the check
        EXPECT_EQ(1007, ErrCode()) << name;
        EXPECT_EQ(Names{"!TesselIsPathComponent(strNs)"}, ErrMsgs()) << name;
        ErrClear();
        EXPECT_FALSE(TESSEL_LOCKER_BACKUP_OBJECT(ns, name).WriteLock(0));
        EXPECT_EQ(Names{"!TesselIsPathComponent(strId)"}, ErrMsgs()) << name;
    }
    EXPECT_FALSE(TESSEL_LOCKER().ReadLock(TESSEL_LOCK_ALL, ns, "../../../../../tmp/evil"));
    EXPECT_EQ(902, ErrCode());
    EXPECT_EQ(before, Entries("/var/lock"));
    EXPECT_EQ(Names{}, Entries(dir));
    EXPECT_EQ(100, SeenFromOutside("/tmp/evil.lock"));
}

TEST(Locker, UserCreatesLockFilesInRootDirectories) {
    std::string ns = "user", dir = MakeNs(ns);
    ASSERT_EQ(0, chmod("/var/lock", 0755));
    EXPECT_EQ(0, tessel_test::RunAsUser(tessel_test::kUidAlice, tessel_test::kGidUsers, [&] {
        EXPECT_GT(0, open("/var/lock/probe", O_RDWR | O_CREAT, 0644));  // not on its own
        TESSEL_LOCKER locker;
        EXPECT_TRUE(locker.ReadLock(TESSEL_LOCK_ALL, ns, "a1"));
        EXPECT_EQ(tessel_test::kUidAlice, geteuid());
        EXPECT_EQ(tessel_test::kGidUsers, getegid());
        return ::testing::Test::HasFailure() ? 1 : 0;
    }));
    chmod("/var/lock", 01777);
    for (const std::string &path : {Backup(ns), Volume(ns), dir + "/a1.lock"}) {
        struct stat st = {};
        EXPECT_EQ(0, stat(path.c_str(), &st)) << path;
        EXPECT_EQ(0u, st.st_uid) << path;
    }
}

}  // namespace
