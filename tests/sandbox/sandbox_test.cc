// The sandbox itself: the guarantees every other test program relies on.
#include <fcntl.h>
#include <grp.h>
#include <pwd.h>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <fstream>
#include <string>

#include <gtest/gtest.h>
#include <libpq-fe.h>

#include "support/sandbox.h"

namespace {

constexpr long kTmpfsMagic = 0x01021994;

bool IsTmpfs(const char *path) {
    struct statfs fs;
    return 0 == statfs(path, &fs) && kTmpfsMagic == static_cast<long>(fs.f_type);
}

TEST(Sandbox, FixedPathsArePrivateTmpfs) {
    ASSERT_TRUE(tessel_test::InSandbox());
    for (const char *path : {"/tmp", "/usr/quor", "/usr/local/libexec/tessel", "/var/lock", "/etc.defaults",
                             "/var/packages", "/volume1", "/volume2"}) {
        EXPECT_TRUE(IsTmpfs(path)) << path;
    }
    struct stat st;
    EXPECT_EQ(0, stat("/volume1/homes", &st));
    EXPECT_EQ(0, stat("/volume2/@tmp", &st));
    EXPECT_EQ(0, stat("/usr/quor/etc", &st));
    EXPECT_NE(0, stat("/usr/quor/etc/tessel.conf", &st)) << "a fresh sandbox has no settings file";
    std::ifstream version("/etc.defaults/VERSION");
    std::string text((std::istreambuf_iterator<char>(version)), std::istreambuf_iterator<char>());
    EXPECT_NE(std::string::npos, text.find("buildnumber=")) << text;
}

TEST(Sandbox, NameServiceAnswersFromTheTestFiles) {
    struct passwd *pw = getpwnam("alice");
    ASSERT_NE(nullptr, pw);
    EXPECT_EQ(tessel_test::kUidAlice, pw->pw_uid);
    pw = getpwuid(tessel_test::kUidErin);
    ASSERT_NE(nullptr, pw);
    EXPECT_STREQ("EXAMPLE\\erin", pw->pw_name);
    EXPECT_EQ(nullptr, getpwuid(tessel_test::kUidUnknown));

    gid_t groups[16];
    int n = 16;
    ASSERT_GE(getgrouplist("alice", tessel_test::kGidUsers, groups, &n), 0);
    EXPECT_EQ(3, n) << "users, staff, eng";
    struct group *gr = getgrgid(tessel_test::kGidStaff);
    ASSERT_NE(nullptr, gr);
    EXPECT_STREQ("staff", gr->gr_name);
}

TEST(Sandbox, SystemLogIsCaptured) {
    size_t mark = tessel_test::SyslogMark();
    syslog(LOG_ERR, "%s:%d Failed [%s], err=%m\n", "tests/sandbox", 7, "sandbox probe");
    auto line = tessel_test::WaitForSyslog("tests/sandbox:7 Failed [sandbox probe], err=", mark, LOG_USER | LOG_ERR);
    ASSERT_TRUE(line.has_value());
    EXPECT_EQ("sandbox_test", line->ident);

    // Lines logged before the mark are not seen again.
    size_t later = tessel_test::SyslogMark();
    EXPECT_FALSE(tessel_test::WaitForSyslog("sandbox probe", later, -1, std::chrono::milliseconds(50)).has_value());
}

TEST(Sandbox, PrivatePostgresWithoutTheTesselDatabase) {
    ASSERT_TRUE(tessel_test::HasPostgres());
    PGconn *conn = tessel_test::PgConnect();
    ASSERT_NE(nullptr, conn);
    EXPECT_EQ("/var/lib/postgresql/data", tessel_test::PgValue(conn, "SHOW data_directory")) << "the sandbox's own server";
    EXPECT_EQ("0", tessel_test::PgValue(conn, "SELECT count(*) FROM pg_database WHERE datname = 'tessel'"));
    EXPECT_EQ("", tessel_test::PgValue(conn, "SHOW listen_addresses")) << "no TCP: sandboxes run side by side";

    // The way the library creates its database on first use.
    pid_t pid = fork();
    ASSERT_GE(pid, 0);
    if (0 == pid) {
        execl("/bin/su", "su", "postgres", "-c", "/usr/bin/createdb tessel", (char *)NULL);
        _exit(127);
    }
    int status = 0;
    ASSERT_EQ(pid, waitpid(pid, &status, 0));
    ASSERT_TRUE(WIFEXITED(status));
    EXPECT_EQ(0, WEXITSTATUS(status));
    EXPECT_EQ("1", tessel_test::PgValue(conn, "SELECT count(*) FROM pg_database WHERE datname = 'tessel'"));
    PQfinish(conn);
}

}  // namespace

TEST(Sandbox, RunAsUserKeepsRootInReserve) {
    using namespace tessel_test;
    int rc = RunAsUser(kUidAlice, kGidUsers, []() {
        uid_t ruid, euid, suid;
        gid_t rgid, egid, sgid;
        getresuid(&ruid, &euid, &suid);
        getresgid(&rgid, &egid, &sgid);
        EXPECT_EQ(kUidAlice, euid);
        EXPECT_EQ(kGidUsers, egid);
        EXPECT_EQ(0u, ruid);
        EXPECT_EQ(0u, suid);
        // The shadow file is root's: the caller itself cannot open it
        // (access() would ask for the real uid, which is still root).
        EXPECT_NE(0, faccessat(AT_FDCWD, "/etc/shadow", R_OK, AT_EACCESS));
        EXPECT_EQ(0, seteuid(0)) << "the saved uid lets the library raise itself";
        return ::testing::Test::HasFailure() ? 1 : 0;
    });
    EXPECT_EQ(0, rc);
}
