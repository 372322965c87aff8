// File locks and lockers against other processes holding the same files:
// what a reader gives up on at once, what a writer waits for, which files the
// levels lock, and that no name leads a lock file out of its directory.
#include <dirent.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
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
using Msgs = std::vector<std::string>;

const char kBackupBusy[] = "!m_impl->pBackupLock_ || !m_impl->pBackupLock_->ReadLock(0)";

// A namespace in the linked scheme; answers its scratch directory.
std::string MakeNs(const std::string &ns) {
    mkdir("/usr/quor/etc/tessel", 0755);
    mkdir("/usr/quor/etc/tessel/ns", 0755);
    mkdir("/volume1/@Tessel", 0755);
    mkdir(("/volume1/@Tessel/" + ns).c_str(), 0700);
    symlink(("/volume1/@Tessel/" + ns).c_str(), ("/usr/quor/etc/tessel/ns/" + ns).c_str());
    return "/volume1/@tmp/@Tessel/" + ns;
}
std::string BackupFile(const std::string &ns) { return "/var/lock/tessel_backup_" + ns + ".lock"; }
std::string VolumeFile(const std::string &ns) { return "/var/lock/tessel_volume_move_" + ns + ".lock"; }

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
    explicit Holder(const std::vector<std::string> &paths, int holdMs = -1)
        : ProcessHolding(
              [paths] {
                  for (const std::string &path : paths) {
                      int fd = open(path.c_str(), O_RDWR | O_CREAT, 0644);
                      struct flock fl = {};
                      fl.l_type = F_WRLCK;
                      if (0 > fd || 0 != fcntl(fd, F_SETLK, &fl)) {
                          return false;
                      }
                  }
                  return true;
              },
              holdMs) {}
};

// The names in dir, without "." and "..".
std::vector<std::string> Entries(const std::string &dir) {
    std::vector<std::string> names;
    if (DIR *d = opendir(dir.c_str())) {
        while (dirent *e = readdir(d)) {
            if (0 != strcmp(".", e->d_name) && 0 != strcmp("..", e->d_name)) {
                names.push_back(e->d_name);
            }
        }
        closedir(d);
    }
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
    EXPECT_FALSE(lock.Lock(1, -2));  // refused without trying, though the file is free
    EXPECT_TRUE(lock.ReadLock(0));
    EXPECT_EQ(F_RDLCK, SeenFromOutside(path));
    EXPECT_TRUE(lock.UnLock());
    EXPECT_EQ(F_UNLCK, SeenFromOutside(path));
    Holder briefly({path}, 300);
    ASSERT_TRUE(briefly.ready());
    EXPECT_TRUE(lock.Lock(1, -1));  // waits as long as it takes
    EXPECT_EQ(F_WRLCK, SeenFromOutside(path));
}

TEST(FileLock, UnopenableFileNeverLocks) {
    tessel_test::ScratchDir dir;
    ErrClear();
    TESSEL_FILE_LOCK lock(dir.file("missing/f.lock"));
    EXPECT_EQ(Msgs{"0 > (fd_ = open(filename.c_str(), O_RDWR | O_NONBLOCK | O_CREAT, 0644))"}, ErrMsgs());
    EXPECT_FALSE(lock.ReadLock(-1));
    EXPECT_FALSE(lock.TryLock());
    EXPECT_TRUE(lock.UnLock());
}

// Record locks belong to the process, as the public header tells callers.
TEST(FileLock, ThreadsOfOneProcessDoNotExclude) {
    tessel_test::ScratchDir dir;
    std::string path = dir.file("t.lock");
    TESSEL_FILE_LOCK mine(path);
    ASSERT_TRUE(mine.WriteLock(0));
    std::thread([&] {
        TESSEL_FILE_LOCK other(path);
        EXPECT_TRUE(other.WriteLock(0));
    }).join();
    // The other thread's descriptor closed, and with it the process's lock.
    EXPECT_EQ(F_UNLCK, SeenFromOutside(path));
}

TEST(Locker, ReaderGivesUpAtOnceOnJobs) {
    std::string ns = "jobs", obj = MakeNs(ns) + "/o1.lock";
    {
        Holder backup({BackupFile(ns)});
        ASSERT_TRUE(backup.ready());
        TESSEL_LOCKER locker;
        ErrClear();
        EXPECT_FALSE(locker.ReadLock(TESSEL_LOCK_ALL, ns, "o1"));
        EXPECT_EQ(901, ErrCode());
        EXPECT_EQ(Msgs{kBackupBusy}, ErrMsgs());
        EXPECT_EQ("lock/tessel_lock", TesselErrMsgGet()[0]["file"].asString());
        char *buf = nullptr;
        size_t len = 0;
        FILE *report = open_memstream(&buf, &len);
        TesselErrPrint(report);
        fclose(report);
        EXPECT_NE(nullptr, strstr(buf, kBackupBusy));
        EXPECT_EQ(nullptr, strstr(buf, "ErrNo"));
        free(buf);
        // Taken before the failure and kept until the locker goes.
        EXPECT_EQ(F_RDLCK, SeenFromOutside(obj));
        EXPECT_EQ(F_RDLCK, SeenFromOutside(VolumeFile(ns)));
    }
    EXPECT_EQ(F_UNLCK, SeenFromOutside(obj));
    Holder both({VolumeFile(ns), BackupFile(ns)});
    ASSERT_TRUE(both.ready());
    TESSEL_LOCKER locker;
    EXPECT_FALSE(locker.ReadLock(TESSEL_LOCK_BACKUP_OBJECT_VOLUME, ns, Json::Value()));
    EXPECT_EQ(900, ErrCode());
    EXPECT_EQ(Msgs{"!m_impl->pVolLock_ || !m_impl->pVolLock_->ReadLock(0)"}, ErrMsgs());
}

TEST(Locker, WriterTakesEveryLevelExclusively) {
    std::string ns = "writer", dir = MakeNs(ns);
    TESSEL_LOCKER locker;
    ASSERT_TRUE(locker.WriteLock(TESSEL_LOCK_ALL, ns, "w1"));
    for (const std::string &path : {dir + "/w1.lock", VolumeFile(ns), BackupFile(ns)}) {
        EXPECT_EQ(F_WRLCK, SeenFromOutside(path)) << path;
    }
    EXPECT_TRUE(locker.UnLock());
    EXPECT_EQ(F_UNLCK, SeenFromOutside(BackupFile(ns)));
    ErrClear();
    EXPECT_FALSE(locker.UnLock());
    EXPECT_EQ(Msgs{"!m_impl"}, ErrMsgs());
    EXPECT_EQ(-1, ErrCode());
    EXPECT_FALSE(locker.ReadLock(TESSEL_LOCK_VOLUME, ns, "w1"));
    EXPECT_EQ(F_UNLCK, SeenFromOutside(VolumeFile(ns)));
}

TEST(Locker, MoreThan300IdsTakeTheBackupLock) {
    std::string ns = "many", dir = MakeNs(ns);
    Json::Value ids(Json::arrayValue);
    for (int i = 0; i < 301; ++i) {
        ids.append("id" + std::to_string(i));
    }
    {
        TESSEL_LOCKER locker;
        ASSERT_TRUE(locker.ReadLock(TESSEL_LOCK_BACKUP_OBJECT, ns, ids));
        EXPECT_EQ(F_RDLCK, SeenFromOutside(BackupFile(ns)));
        EXPECT_TRUE(Entries(dir).empty());
    }
    {
        Holder backup({BackupFile(ns)});
        ASSERT_TRUE(backup.ready());
        TESSEL_LOCKER locker;
        EXPECT_FALSE(locker.ReadLock(TESSEL_LOCK_BACKUP_OBJECT, ns, ids));
        EXPECT_EQ(901, ErrCode());
        EXPECT_EQ(Msgs{kBackupBusy}, ErrMsgs());
    }
    ids.resize(300);
    TESSEL_LOCKER locker;
    ASSERT_TRUE(locker.ReadLock(TESSEL_LOCK_BACKUP_OBJECT, ns, ids));
    EXPECT_EQ(300u, Entries(dir).size());
    EXPECT_EQ(F_RDLCK, SeenFromOutside(dir + "/id299.lock"));
    EXPECT_EQ(F_UNLCK, SeenFromOutside(BackupFile(ns)));
}

TEST(Locker, ObjectLockNotObtained) {
    std::string ns = "objects", dir = MakeNs(ns);
    Holder held({dir + "/held.lock"});
    ASSERT_TRUE(held.ready());
    EXPECT_FALSE(TESSEL_LOCKER_BACKUP_OBJECT(ns, "held").ReadLock(0));
    EXPECT_TRUE(TESSEL_LOCKER_BACKUP_OBJECT(ns, "free").ReadLock(0));
    ASSERT_EQ(0, mkdir((dir + "/isdir.lock").c_str(), 0755));
    TESSEL_LOCKER reader, writer;
    EXPECT_FALSE(reader.ReadLock(TESSEL_LOCK_BACKUP_OBJECT, ns, Json::Value("isdir")));
    EXPECT_EQ(902, ErrCode());
    EXPECT_EQ(Msgs{"!(*it) || !((*it)->ReadLock())"}, ErrMsgs());
    EXPECT_FALSE(writer.WriteLock(TESSEL_LOCK_BACKUP_OBJECT, ns, Json::Value("isdir")));
    EXPECT_EQ(Msgs{"!(*it) || !((*it)->WriteLock())"}, ErrMsgs());
}

TEST(Locker, HostileNamesStayInTheirDirectory) {
    std::string ns = "hostile", dir = MakeNs(ns);
    // Would turn "tessel_backup_/../../../tmp/x" into a real way out.
    mkdir("/var/lock/tessel_backup_", 0755);
    mkdir("/var/lock/tessel_volume_move_", 0755);
    std::vector<std::string> before = Entries("/var/lock");
    for (const char *name : {"/../../../tmp/evil", "..", "a/b", ""}) {
        ErrClear();
        TESSEL_LOCKER_BACKUP backup(name);
        EXPECT_EQ(1007, ErrCode()) << name;
        EXPECT_EQ(Msgs{"!TesselIsPathComponent(strNs)"}, ErrMsgs()) << name;
        EXPECT_FALSE(backup.ReadLock(0));
        TESSEL_LOCKER locker;
        EXPECT_FALSE(locker.ReadLock(TESSEL_LOCK_VOLUME, name, Json::Value()));
        EXPECT_EQ(900, ErrCode()) << name;
        ErrClear();
        TESSEL_LOCKER_BACKUP_OBJECT object(ns, name);
        EXPECT_EQ(Msgs{"!TesselIsPathComponent(strId)"}, ErrMsgs()) << name;
        EXPECT_FALSE(object.WriteLock(0));
    }
    TESSEL_LOCKER locker;
    EXPECT_FALSE(locker.ReadLock(TESSEL_LOCK_ALL, ns, "../../../../../tmp/evil"));
    EXPECT_EQ(902, ErrCode());
    EXPECT_EQ(before, Entries("/var/lock"));
    EXPECT_TRUE(Entries(dir).empty());
    EXPECT_EQ(100, SeenFromOutside("/tmp/evil.lock"));
}

TEST(Locker, UserCreatesLockFilesInRootDirectories) {
    std::string ns = "user";
    MakeNs(ns);
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
    struct stat st = {};
    ASSERT_EQ(0, stat(BackupFile(ns).c_str(), &st));
    EXPECT_EQ(0u, st.st_uid);
    EXPECT_EQ(0, stat(("/volume1/@tmp/@Tessel/" + ns + "/a1.lock").c_str(), &st));
}

}  // namespace
