// Shares, volumes and switches of the platform configuration file.
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include <gtest/gtest.h>

#include "platform/quor_test_files.h"
#include "quor/quor.h"
#include "support/sandbox.h"
#include "support/scratch.h"

namespace {

using quor_test::PlatformErrorIs;

class PlatformConf : public ::testing::Test {
protected:
    void SetUp() override {
        if (!tessel_test::InSandbox()) {
            GTEST_SKIP() << "writes " QUOR_PLATFORM_CONF ": run inside tests/sandbox/tessel-sandbox";
        }
        Remove();
        QLIBCErrClear();
    }
    void TearDown() override {
        if (tessel_test::InSandbox()) {
            Remove();
        }
    }
    static void Remove() {
        std::error_code ec;
        std::filesystem::remove_all(QUOR_PLATFORM_CONF, ec);
    }
    static void Write(const std::string &text) { ASSERT_TRUE(tessel_test::WriteFile(QUOR_PLATFORM_CONF, text)); }

    // The path of a share, or "<none>".
    static std::string SharePath(const char *name) {
        QUORSHARE *pShare = reinterpret_cast<QUORSHARE *>(0x1);
        if (0 != QUORShareGet(name, &pShare)) {
            EXPECT_EQ(nullptr, pShare) << "a failed lookup hands out nothing";
            return "<none>";
        }
        EXPECT_STREQ(name, pShare->szName);
        std::string path = pShare->szPath;
        QUORShareFree(pShare);
        return path;
    }
};

TEST_F(PlatformConf, WithoutTheFileTheDefaultsOfAFreshMachineApply) {
    EXPECT_EQ("/volume1/homes", SharePath("homes"));
    EXPECT_EQ("<none>", SharePath("music"));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_NOT_FOUND, "quor_share.cc"));
    EXPECT_TRUE(QUORServiceUserHomeIsEnabled(AUTH_LOCAL, nullptr));
    EXPECT_TRUE(QUORServiceUserHomeIsEnabled(AUTH_DOMAIN, nullptr));
    EXPECT_TRUE(QUORServiceUserHomeIsEnabled(AUTH_LDAP, nullptr));
    EXPECT_FALSE(QUORIsRemovableModel());
}

TEST_F(PlatformConf, AFileWithoutTheKeysKeepsTheDefaults) {
    Write("# nothing configured yet\nunrelated=\"1\"\n");
    EXPECT_EQ("/volume1/homes", SharePath("homes"));
    EXPECT_TRUE(QUORServiceUserHomeIsEnabled(AUTH_LOCAL, nullptr));
    EXPECT_FALSE(QUORIsRemovableModel());
}

TEST_F(PlatformConf, ConfiguredValuesOverrideTheDefaults) {
    Write("share_homes_path=\"/volume2/homes\"\n"
          "share_music_path=\"/volume1/music\"\n"
          "share_my_docs_path=/volume2/my docs\n"
          "userhome_local=\"yes\"\n"
          "userhome_domain=\"no\"\n"
          "userhome_ldap=\"NO\"\n"
          "removable_model=\"yes\"\n");
    EXPECT_EQ("/volume2/homes", SharePath("homes"));
    EXPECT_EQ("/volume1/music", SharePath("music"));
    EXPECT_EQ("/volume2/my docs", SharePath("my_docs"));
    EXPECT_EQ("<none>", SharePath("Music")) << "share names are case-sensitive";
    EXPECT_TRUE(QUORServiceUserHomeIsEnabled(AUTH_LOCAL, nullptr));
    EXPECT_FALSE(QUORServiceUserHomeIsEnabled(AUTH_DOMAIN, nullptr));
    EXPECT_FALSE(QUORServiceUserHomeIsEnabled(AUTH_LDAP, nullptr));
    EXPECT_TRUE(QUORIsRemovableModel());
}

TEST_F(PlatformConf, AnUnrecognisedSwitchValueKeepsTheDefault) {
    Write("userhome_local=\"maybe\"\nremovable_model=\"1\"\n");
    EXPECT_TRUE(QUORServiceUserHomeIsEnabled(AUTH_LOCAL, nullptr));
    EXPECT_FALSE(QUORIsRemovableModel());
}

TEST_F(PlatformConf, ABrokenShareEntryIsNotReplacedByTheDefault) {
    Write("share_homes_path=\"\"\nshare_rel_path=\"relative/dir\"\n");
    EXPECT_EQ("<none>", SharePath("homes")) << "an explicit but empty homes path must not fall back to volume 1";
    EXPECT_EQ("<none>", SharePath("rel"));
}

TEST_F(PlatformConf, AnUnreadableFileFailsInsteadOfFallingBack) {
    ASSERT_EQ(0, mkdir(QUOR_PLATFORM_CONF, 0755));
    EXPECT_EQ("<none>", SharePath("homes"));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_FILE_READ, "quor_share.cc"));
    EXPECT_FALSE(QUORServiceUserHomeIsEnabled(AUTH_LOCAL, nullptr));
}

TEST_F(PlatformConf, BadArgumentsAreRecorded) {
    for (const char *name : {"", "a=b", "a b", "new\nline", "q\"uote"}) {
        QLIBCErrClear();
        EXPECT_EQ("<none>", SharePath(name)) << name;
        EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_share.cc")) << name;
    }
    QUORSHARE *pShare = nullptr;
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORShareGet(nullptr, &pShare));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_share.cc"));
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORShareGet("homes", nullptr));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_share.cc"));
    for (int authType : {0, AUTH_LOCAL | AUTH_DOMAIN, 0x04, -1}) {
        QLIBCErrClear();
        EXPECT_FALSE(QUORServiceUserHomeIsEnabled(authType, nullptr)) << authType;
        EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_share.cc")) << authType;
    }
    QUORShareFree(nullptr);
}

struct VolumeCase {
    const char *path;
    const char *vol;  // nullptr: on no volume
    int number;
    const char *rel;
};

TEST(VolumePath, SplitsPathsOnAVolume) {
    const VolumeCase cases[] = {
        {"/volume1", "/volume1", 1, ""},
        {"/volume1/", "/volume1", 1, "/"},
        {"/volume1/homes/alice", "/volume1", 1, "/homes/alice"},
        {"/volume12/@tmp", "/volume12", 12, "/@tmp"},
        {"/volume2//x", "/volume2", 2, "//x"},
        {"/volume1/a..b/..c", "/volume1", 1, "/a..b/..c"},
        {"/volume2147483647/x", "/volume2147483647", 2147483647, "/x"},
    };
    for (const VolumeCase &c : cases) {
        QUORVOLINFO info;
        memset(&info, 0x5a, sizeof(info));
        ASSERT_EQ(0, VolumePathParseEx(c.path, &info)) << c.path;
        EXPECT_STREQ(c.vol, info.szVolPath) << c.path;
        EXPECT_EQ(c.number, info.volNumber) << c.path;
        EXPECT_STREQ(c.rel, info.szRelPath) << c.path;
        EXPECT_EQ(std::string(c.path), std::string(info.szVolPath) + info.szRelPath);
    }
}

TEST(VolumePath, RefusesPathsOnNoVolume) {
    for (const char *path : {"", "/", "/volume", "/volume/", "/volumes", "/volumes/1", "/volume1x", "/volume1x/a",
                             "/volume1.bak", "volume1/a", "/tmp/volume1", "//volume1", "/Volume1", "/volume01",
                             "/volume0", "/volume-1", "/volume2147483648", "/volume99999999999999999999/a",
                             "/volume1/..", "/volume1/../etc/passwd", "/volume1/a/../../etc"}) {
        QUORVOLINFO info;
        QLIBCErrClear();
        EXPECT_EQ(-1, VolumePathParseEx(path, &info)) << path;
        EXPECT_NE(0, QLIBCErrGet()) << path;
        char vol[64] = "x";
        EXPECT_EQ(-1, QUORShareBinPathGet(path, vol, sizeof(vol))) << path;
        EXPECT_STREQ("", vol) << path;
        char tmp[64] = "x";
        EXPECT_EQ(-1, QUORShareTmpPathGet(path, tmp, sizeof(tmp))) << path;
        EXPECT_STREQ("", tmp) << path;
    }
    QLIBCErrClear();
    EXPECT_EQ(-1, VolumePathParseEx("/volume1", nullptr));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_share.cc"));

    std::string longPath = "/volume1/" + std::string(sizeof(QUORVOLINFO::szRelPath), 'a');
    QUORVOLINFO info;
    QLIBCErrClear();
    EXPECT_EQ(-1, VolumePathParseEx(longPath.c_str(), &info)) << "a rest that does not fit is refused";
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_share.cc"));
}

TEST(VolumePath, VolumeAndTemporaryDirectoryOfAPath) {
    char buf[64];
    ASSERT_EQ(0, QUORShareBinPathGet("/volume2/homes/alice/x", buf, sizeof(buf)));
    EXPECT_STREQ("/volume2", buf);
    ASSERT_EQ(0, QUORShareTmpPathGet("/volume2/homes/alice/x", buf, sizeof(buf)));
    EXPECT_STREQ("/volume2/@tmp", buf);
    ASSERT_EQ(0, QUORShareTmpPathGet("/volume1", buf, sizeof(buf)));
    EXPECT_STREQ("/volume1/@tmp", buf);
}

TEST(VolumePath, ShortBuffersFailCleanly) {
    char buf[32];
    memset(buf, 'X', sizeof(buf));
    EXPECT_EQ(0, QUORShareBinPathGet("/volume1/a", buf, 9)) << "exactly \"/volume1\" and its terminator";
    EXPECT_STREQ("/volume1", buf);

    memset(buf, 'X', sizeof(buf));
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORShareBinPathGet("/volume1/a", buf, 8));
    EXPECT_EQ('\0', buf[0]);
    EXPECT_EQ('X', buf[8]) << "nothing written past cbVolume";
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_share.cc"));

    memset(buf, 'X', sizeof(buf));
    EXPECT_EQ(0, QUORShareTmpPathGet("/volume1/a", buf, 14));
    EXPECT_STREQ("/volume1/@tmp", buf);
    memset(buf, 'X', sizeof(buf));
    EXPECT_EQ(-1, QUORShareTmpPathGet("/volume1/a", buf, 13));
    EXPECT_EQ('\0', buf[0]);
    EXPECT_EQ('X', buf[13]);

    EXPECT_EQ(-1, QUORShareBinPathGet("/volume1", buf, 0));
    EXPECT_EQ(-1, QUORShareBinPathGet("/volume1", nullptr, 16));
    EXPECT_EQ(-1, QUORShareTmpPathGet(nullptr, buf, sizeof(buf)));
}

}  // namespace
