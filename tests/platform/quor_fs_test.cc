// Directory creation with owner and mode, and file copy.
#include <fcntl.h>
#include <signal.h>
#include <string.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <memory>
#include <set>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "platform/quor_test_files.h"
#include "quor/quor.h"
#include "support/sandbox.h"
#include "support/scratch.h"

namespace {

using quor_test::Exists;
using quor_test::ListDir;
using quor_test::PlatformErrorIs;
using tessel_test::ReadFile;
using tessel_test::WriteFile;

constexpr uid_t kNoUid = static_cast<uid_t>(-1);
constexpr gid_t kNoGid = static_cast<gid_t>(-1);

class PlatformFs : public ::testing::Test {
protected:
    void SetUp() override {
        if (!tessel_test::InSandbox()) {
            GTEST_SKIP() << "changes owners under /volume1: run inside tests/sandbox/tessel-sandbox";
        }
        scratch_ = std::make_unique<tessel_test::ScratchDir>("/volume1");
        ASSERT_TRUE(scratch_->ok());
        ASSERT_EQ(0, chmod(scratch_->path().c_str(), 0711));
        list_ = QLIBCSzListAlloc(4);
        ASSERT_NE(nullptr, list_);
        QLIBCErrClear();
    }
    void TearDown() override { QLIBCSzListFree(list_); }

    std::vector<std::string> Created() const {
        std::vector<std::string> names;
        for (int i = 0; i < QLIBCSzListCount(list_); ++i) {
            names.push_back(QLIBCSzListGet(list_, i));
        }
        return names;
    }

    static ::testing::AssertionResult IsDir(const std::string &path, uid_t uid, gid_t gid, mode_t mode) {
        struct stat st;
        if (0 != lstat(path.c_str(), &st)) {
            return ::testing::AssertionFailure() << path << " missing";
        }
        if (!S_ISDIR(st.st_mode) || st.st_uid != uid || st.st_gid != gid || (st.st_mode & 07777) != mode) {
            return ::testing::AssertionFailure() << path << " is uid " << st.st_uid << " gid " << st.st_gid
                                                 << " mode " << std::oct << (st.st_mode & 07777);
        }
        return ::testing::AssertionSuccess();
    }

    // A regular file with the given bytes, owner and mode.
    static ::testing::AssertionResult IsFile(const std::string &path, const std::string &content, uid_t uid,
                                             gid_t gid, mode_t mode) {
        struct stat st;
        if (0 != lstat(path.c_str(), &st) || !S_ISREG(st.st_mode)) {
            return ::testing::AssertionFailure() << path << " is not a regular file";
        }
        if (st.st_uid != uid || st.st_gid != gid || (st.st_mode & 07777) != mode) {
            return ::testing::AssertionFailure() << path << " is uid " << st.st_uid << " gid " << st.st_gid
                                                 << " mode " << std::oct << (st.st_mode & 07777);
        }
        if (ReadFile(path) != content) {
            return ::testing::AssertionFailure() << path << " has other content";
        }
        return ::testing::AssertionSuccess();
    }

    static std::string Bytes(size_t n) {
        std::string bytes(n, '\0');
        for (size_t i = 0; i < n; ++i) {
            bytes[i] = static_cast<char>((i * 7919) % 251);
        }
        return bytes;
    }

    // Made in SetUp, once it is known that /volume1 is the sandbox's.
    std::unique_ptr<tessel_test::ScratchDir> scratch_;
    QLIBSZLIST *list_ = nullptr;
};

TEST_F(PlatformFs, MkdirPCreatesParentsWithOwnerGroupAndMode) {
    std::string base = scratch_->path();
    std::string path = base + "/a/b/c";
    ASSERT_EQ(0, QUORFSMkdirP(path.c_str(), &list_, TRUE, tessel_test::kUidAlice, tessel_test::kGidUsers, 0750));
    EXPECT_EQ((std::vector<std::string>{base + "/a", base + "/a/b", base + "/a/b/c"}), Created());
    for (const char *dir : {"/a", "/a/b", "/a/b/c"}) {
        EXPECT_TRUE(IsDir(base + dir, tessel_test::kUidAlice, tessel_test::kGidUsers, 0750));
    }
    EXPECT_TRUE(IsDir(base, 0, 0, 0711)) << "the existing parent is left alone";
}

TEST_F(PlatformFs, MkdirPModeIsNotCutByTheUmask) {
    mode_t old = umask(077);
    std::string path = scratch_->file("open/shared");
    int ret = QUORFSMkdirP(path.c_str(), nullptr, TRUE, kNoUid, tessel_test::kGidUsers, 02775);
    umask(old);
    ASSERT_EQ(0, ret);
    EXPECT_TRUE(IsDir(scratch_->file("open"), 0, tessel_test::kGidUsers, 02775));
    EXPECT_TRUE(IsDir(path, 0, tessel_test::kGidUsers, 02775));
}

TEST_F(PlatformFs, MkdirPLeavesExistingDirectoriesAlone) {
    ASSERT_EQ(0, mkdir(scratch_->file("old").c_str(), 0700));
    std::string path = scratch_->file("old/new/");
    ASSERT_EQ(0, QUORFSMkdirP(path.c_str(), &list_, TRUE, tessel_test::kUidAlice, tessel_test::kGidUsers, 0755));
    EXPECT_EQ((std::vector<std::string>{scratch_->file("old/new")}), Created()) << "a trailing slash is not a directory";
    EXPECT_TRUE(IsDir(scratch_->file("old"), 0, 0, 0700));

    QLIBCSzListClear(list_);
    ASSERT_EQ(0, QUORFSMkdirP(path.c_str(), &list_, TRUE, tessel_test::kUidAlice, tessel_test::kGidUsers, 0700));
    EXPECT_TRUE(Created().empty());
    EXPECT_TRUE(IsDir(scratch_->file("old/new"), tessel_test::kUidAlice, tessel_test::kGidUsers, 0755));
}

TEST_F(PlatformFs, MkdirPWithoutParentsNeedsTheParent) {
    std::string path = scratch_->file("p/q");
    EXPECT_EQ(-1, QUORFSMkdirP(path.c_str(), &list_, FALSE, kNoUid, kNoGid, 0755));
    EXPECT_FALSE(Exists(scratch_->file("p")));
    EXPECT_TRUE(Created().empty());
    ASSERT_EQ(0, QUORFSMkdirP(scratch_->file("p").c_str(), &list_, FALSE, kNoUid, kNoGid, 0705));
    EXPECT_TRUE(IsDir(scratch_->file("p"), 0, 0, 0705));
}

TEST_F(PlatformFs, MkdirPFailureRemovesWhatItCreated) {
    ASSERT_TRUE(WriteFile(scratch_->file("file"), "x"));
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORFSMkdirP(scratch_->file("file/sub").c_str(), &list_, TRUE, kNoUid, kNoGid, 0755));
    EXPECT_EQ(ENOTDIR, errno);
    EXPECT_NE(0, QLIBCErrGet());

    // The last name is too long, so the failure comes after two directories were made.
    std::string path = scratch_->file("n1/n2/" + std::string(300, 'z'));
    EXPECT_EQ(-1, QUORFSMkdirP(path.c_str(), &list_, TRUE, tessel_test::kUidAlice, kNoGid, 0755));
    EXPECT_EQ(ENAMETOOLONG, errno);
    EXPECT_FALSE(Exists(scratch_->file("n1")));
    EXPECT_TRUE(Created().empty());
}

TEST_F(PlatformFs, MkdirPRefusesBadArguments) {
    QLIBSZLIST *empty = nullptr;
    const struct {
        const char *path;
        QLIBSZLIST **list;
        mode_t mode;
    } cases[] = {{nullptr, nullptr, 0755},
                 {"", nullptr, 0755},
                 {"/volume1/x/../y", nullptr, 0755},
                 {"/volume1/./y", nullptr, 0755},
                 {"/volume1/y", &empty, 0755},
                 {"/volume1/y", nullptr, S_IFDIR | 0755}};
    for (const auto &c : cases) {
        QLIBCErrClear();
        EXPECT_EQ(-1, QUORFSMkdirP(c.path, c.list, TRUE, kNoUid, kNoGid, c.mode)) << (c.path ? c.path : "(null)");
        EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_fs.cc"));
    }
    EXPECT_FALSE(Exists("/volume1/y"));
    EXPECT_FALSE(Exists("/volume1/x"));
}

TEST_F(PlatformFs, CopyWithDefaultsIsPrivateToTheCaller) {
    std::string src = scratch_->file("src.bin");
    std::string dest = scratch_->file("dest.bin");
    std::string content = Bytes(300000);  // several read blocks, with NUL bytes
    ASSERT_TRUE(WriteFile(src, content));
    ASSERT_EQ(0, chown(src.c_str(), tessel_test::kUidAlice, tessel_test::kGidUsers));
    ASSERT_EQ(0, chmod(src.c_str(), 0644));
    ASSERT_EQ(0, QUORFileCopy(src.c_str(), dest.c_str(), nullptr));
    EXPECT_TRUE(IsFile(dest, content, 0, 0, 0600));
    EXPECT_EQ((std::set<std::string>{"src.bin", "dest.bin"}), ListDir(scratch_->path()));
}

TEST_F(PlatformFs, CopyKeepsOwnerAndModeWhenAsked) {
    std::string src = scratch_->file("src");
    ASSERT_TRUE(WriteFile(src, "shared"));
    ASSERT_EQ(0, chown(src.c_str(), tessel_test::kUidAlice, tessel_test::kGidUsers));
    ASSERT_EQ(0, chmod(src.c_str(), 02754));
    QUORFILECOPYARG keepBoth = {FALSE, TRUE, TRUE};
    ASSERT_EQ(0, QUORFileCopy(src.c_str(), scratch_->file("both").c_str(), &keepBoth));
    EXPECT_TRUE(IsFile(scratch_->file("both"), "shared", tessel_test::kUidAlice, tessel_test::kGidUsers, 02754));
    QUORFILECOPYARG keepOwner = {FALSE, TRUE, FALSE};
    ASSERT_EQ(0, QUORFileCopy(src.c_str(), scratch_->file("owner").c_str(), &keepOwner));
    EXPECT_TRUE(IsFile(scratch_->file("owner"), "shared", tessel_test::kUidAlice, tessel_test::kGidUsers, 0600));
    QUORFILECOPYARG keepMode = {FALSE, FALSE, TRUE};
    ASSERT_EQ(0, QUORFileCopy(src.c_str(), scratch_->file("mode").c_str(), &keepMode));
    EXPECT_TRUE(IsFile(scratch_->file("mode"), "shared", 0, 0, 02754));
}

TEST_F(PlatformFs, CopyOverwritesOnlyWhenAskedAndReplacesAtomically) {
    std::string src = scratch_->file("src");
    std::string dest = scratch_->file("dest");
    ASSERT_TRUE(WriteFile(src, "new content"));
    ASSERT_TRUE(WriteFile(dest, "old content"));
    QUORFILECOPYARG noOverwrite = {FALSE, FALSE, FALSE};
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORFileCopy(src.c_str(), dest.c_str(), &noOverwrite));
    EXPECT_EQ(EEXIST, errno);
    EXPECT_NE(0, QLIBCErrGet());
    EXPECT_EQ("old content", ReadFile(dest));

    // A reader of the old file keeps it whole: the copy is renamed into place.
    int reader = open(dest.c_str(), O_RDONLY);
    ASSERT_GE(reader, 0);
    QUORFILECOPYARG overwrite = {TRUE, FALSE, FALSE};
    ASSERT_EQ(0, QUORFileCopy(src.c_str(), dest.c_str(), &overwrite));
    char buf[32] = {0};
    ASSERT_EQ(11, read(reader, buf, sizeof(buf)));
    close(reader);
    EXPECT_STREQ("old content", buf);
    EXPECT_EQ("new content", ReadFile(dest));
    EXPECT_EQ((std::set<std::string>{"src", "dest"}), ListDir(scratch_->path()));
}

TEST_F(PlatformFs, CopyRefusesWhatIsNotARegularFile) {
    ASSERT_EQ(0, mkdir(scratch_->file("dir").c_str(), 0755));
    ASSERT_EQ(0, mkfifo(scratch_->file("fifo").c_str(), 0644));
    ASSERT_TRUE(WriteFile(scratch_->file("src"), "data"));
    std::string dest = scratch_->file("dest");
    for (const char *src : {"dir", "fifo", "missing"}) {
        QLIBCErrClear();
        EXPECT_EQ(-1, QUORFileCopy(scratch_->file(src).c_str(), dest.c_str(), nullptr)) << src;
        EXPECT_NE(0, QLIBCErrGet()) << src;
        EXPECT_FALSE(Exists(dest)) << src;
    }
    EXPECT_EQ(-1, QUORFileCopy(scratch_->file("src").c_str(), scratch_->file("dir").c_str(), nullptr))
        << "a directory is never replaced by a file";
    EXPECT_EQ(-1, QUORFileCopy(scratch_->file("src").c_str(), scratch_->file("nodir/dest").c_str(), nullptr));
    EXPECT_EQ(-1, QUORFileCopy(scratch_->file("src").c_str(), (scratch_->path() + "/").c_str(), nullptr));
    EXPECT_EQ((std::set<std::string>{"dir", "fifo", "src"}), ListDir(scratch_->path()));
    EXPECT_TRUE(ListDir(scratch_->file("dir")).empty());

    QLIBCErrClear();
    EXPECT_EQ(-1, QUORFileCopy(nullptr, dest.c_str(), nullptr));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_fs.cc"));
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORFileCopy(scratch_->file("src").c_str(), "", nullptr));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_fs.cc"));
}

TEST_F(PlatformFs, CopyThatFailsMidwayLeavesTheDestinationAsItWas) {
    std::string src = scratch_->file("big");
    std::string dest = scratch_->file("dest");
    ASSERT_TRUE(WriteFile(src, Bytes(1 << 20)));
    ASSERT_TRUE(WriteFile(dest, "previous"));
    // In a child limited to 128 KiB per file, writing the copy fails after
    // the first blocks went out.
    int status = tessel_test::RunInChild([&]() {
        signal(SIGXFSZ, SIG_IGN);
        struct rlimit limit = {128 * 1024, 128 * 1024};
        if (0 != setrlimit(RLIMIT_FSIZE, &limit)) {
            return 10;
        }
        QUORFILECOPYARG overwrite = {TRUE, FALSE, FALSE};
        if (-1 != QUORFileCopy(src.c_str(), dest.c_str(), &overwrite)) {
            return 11;
        }
        return (EFBIG == errno && QLIBC_ERR_FILE_WRITE == QLIBCErrGet()) ? 0 : 12;
    });
    EXPECT_EQ(0, status);
    EXPECT_EQ("previous", ReadFile(dest));
    EXPECT_EQ((std::set<std::string>{"big", "dest"}), ListDir(scratch_->path())) << "no partial temporary file";

    status = tessel_test::RunInChild([&]() {
        signal(SIGXFSZ, SIG_IGN);
        struct rlimit limit = {128 * 1024, 128 * 1024};
        setrlimit(RLIMIT_FSIZE, &limit);
        return (-1 == QUORFileCopy(src.c_str(), scratch_->file("fresh").c_str(), nullptr)) ? 0 : 1;
    });
    EXPECT_EQ(0, status);
    EXPECT_FALSE(Exists(scratch_->file("fresh")));
    EXPECT_EQ((std::set<std::string>{"big", "dest"}), ListDir(scratch_->path()));
}

}  // namespace
