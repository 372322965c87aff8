// Namespace paths: both placement schemes, links and directories on the right
// volume with the right owners, the per-process cache, scratch files, object
// file paths, names that try to leave the namespace, and non-root callers.
// The scheme verdict and the path cache live as long as the process, so every
// scenario runs whole in a fresh child.
#include <errno.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "support/error_stack.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_id.h"
#include "tessel_ns.h"

namespace {

namespace fs = std::filesystem;
using tessel_test::RunInChild;
using tessel_test::WriteFile;

const std::string kLinkDir = "/usr/quor/etc/tessel/ns/";
const std::string kPlatformConf = "/usr/quor/etc/platform.conf";
const std::string kSettings = "/usr/quor/etc/tessel.conf";

int Failed() { return ::testing::Test::HasFailure() ? 1 : 0; }

// What a call gave: its output, or "!" with its frames ("<code of frame 0>
// <msg> | <msg> ..."). The stack is emptied for the next call.
std::string Got(BOOL ok, const std::string &out) {
    std::string text = out;
    if (!ok) {
        text = (0 < tessel_test::ErrCode()) ? "! " + std::to_string(tessel_test::ErrCode()) : "!";
        const char *szSep = " ";
        for (const std::string &msg : tessel_test::ErrMsgs()) {
            text += szSep + msg;
            szSep = " | ";
        }
    }
    tessel_test::ErrClear();
    return text;
}

// "<mode> <uid>:<gid>", or "" when missing.
std::string Owner(const std::string &path) {
    struct stat st;
    char sz[64] = "";
    if (0 == lstat(path.c_str(), &st)) {
        snprintf(sz, sizeof(sz), "%04o %u:%u", st.st_mode & 07777, st.st_uid, st.st_gid);
    }
    return sz;
}

std::string ReadLink(const std::string &path) {
    std::error_code ec;
    return fs::read_symlink(path, ec).string();
}

// Every path under the trees the library may write to, links not followed.
std::string Tree() {
    std::string text;
    for (const char *root : {"/usr/quor", "/volume1", "/volume2", "/var/packages"}) {
        for (const auto &entry : fs::recursive_directory_iterator(root)) {
            text += entry.path().string() + "\n";
        }
    }
    return text;
}

void SetBuild(const std::string &build) {
    ASSERT_TRUE(WriteFile("/etc.defaults/VERSION", "productversion=\"7.2.1\"\nbuildnumber=\"" + build + "\"\n"));
}

class NSPath : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(tessel_test::InSandbox()) << "run through ctest: this test writes under /usr/quor and /volume*";
        for (const char *path : {"/usr/quor/etc/tessel", "/usr/quor/etc/platform.conf", "/volume1/@Tessel",
                                 "/volume2/@Tessel", "/volume1/@tmp/@Tessel", "/volume2/@tmp/@Tessel", "/volume1/plain",
                                 "/var/packages/LedgerPkg", "/var/packages/HomePkg"}) {
            fs::remove_all(path);
        }
        SetBuild("69057");
        ASSERT_TRUE(WriteFile(kSettings, R"({"Access": {"enable_ns_ledger": true}})"));
        fs::create_directories("/var/packages/LedgerPkg");
        fs::create_directories("/var/packages/HomePkg");
        fs::create_symlink("/volume2/@appstore/LedgerPkg", "/var/packages/LedgerPkg/target");
        fs::create_symlink("/volume1/@appstore/HomePkg", "/var/packages/HomePkg/target");
        tessel_test::ErrClear();
    }
};

TEST_F(NSPath, FixedSchemeIsTheHomesVolumeForBuild14887AndRemovableModels) {
    SetBuild("14887");
    EXPECT_EQ(0, RunInChild([] {
        std::string s;
        EXPECT_FALSE(TesselSupportVolumeMove());
        SetBuild("69057");  // decided once per process
        EXPECT_FALSE(TesselSupportVolumeMove());
        EXPECT_EQ("/volume1/@Tessel", Got(TesselGetRepoDir(s), s));
        EXPECT_EQ("/volume1/@Tessel/ledger", Got(TesselGetNSPath("ledger", s), s));
        EXPECT_FALSE(fs::exists(s));
        EXPECT_EQ("/volume1", Got(TesselGetNSVolumePath("ledger", s), s));
        EXPECT_EQ("! 1007 !TesselIsPathComponent(strNS)", Got(TesselGetNSPath("..", s), s));
        return Failed();
    }));
    ASSERT_TRUE(WriteFile(kPlatformConf, "removable_model=\"yes\"\n"));
    fs::create_directories("/volume1/@Tessel/ledger");
    EXPECT_EQ(0, RunInChild([] {
        std::string s;
        EXPECT_FALSE(TesselSupportVolumeMove());
        EXPECT_EQ("/volume1/@Tessel/ledger", Got(TesselSetNSPath("ledger", "LedgerPkg", s), s));  // no package
        EXPECT_EQ(s, ReadLink(kLinkDir + "ledger"));
        EXPECT_TRUE(WriteFile(kPlatformConf, "removable_model=\"yes\"\nshare_homes_path=\"/srv/homes\"\n"));
        EXPECT_EQ("! 1000 !TesselGetRepoDir(strRepo)", Got(TesselGetNSPath("notes", s), s));  // not on a volume
        EXPECT_EQ("/volume1/@Tessel/ledger", Got(TesselGetNSPath("ledger", s), s));
        return Failed();
    }));
}

TEST_F(NSPath, LinkedSchemeWithoutAUsableLinkFails) {
    EXPECT_EQ(0, RunInChild([] {
        std::string s;
        size_t mark = tessel_test::SyslogMark();
        EXPECT_TRUE(TesselSupportVolumeMove());
        EXPECT_EQ(kLinkDir, Got(TesselGetRepoDir(s), s));
        EXPECT_FALSE(TesselGetNSPath("ledger", s));
        EXPECT_EQ("common/tessel_common", TesselErrMsgGet()[0]["file"].asString());
        EXPECT_EQ("! FALSE == QLIBCFileCheckDir(strNSPath.c_str())", Got(FALSE, s));
        auto line = tessel_test::WaitForSyslog("Failed [FALSE == QLIBCFileCheckDir(strNSPath.c_str())], err=", mark);
        EXPECT_TRUE(line && 0 == line->message.rfind("common/tessel_common:", 0));
        EXPECT_EQ("! FALSE == QLIBCFileCheckDir(strNSPath.c_str()) | !TesselGetNSPath(strNS, strNSPath)",
                  Got(TesselGetNSStatus("ledger"), s));
        EXPECT_EQ("! strNS.empty()", Got(TesselGetNSPath("", s), s));
        fs::create_directories(kLinkDir + "ledger");  // resolves, but is no link
        EXPECT_EQ("! -1 == (len = readlink(strNSPath.c_str(), szPath, sizeof(szPath) - 1))",
                  Got(TesselGetNSPath("ledger", s), s));
        EXPECT_EQ("! 0 > (len = readlink(strNSPath.c_str(), szPath, sizeof(szPath) - 1))",
                  Got(TesselSetNSPath("ledger", "LedgerPkg", s), s));
        return Failed();
    }));
}

TEST_F(NSPath, SetPlacesOnThePackageVolumeAndTheCacheOutlivesOtherProcesses) {
    ASSERT_TRUE(WriteFile(kSettings, R"({"Access": {"enable_ns_ledger": true, "enable_ns_notes": true,
        "enable_ns_bare": true, "enable_ns_stale": true}, "pkg_id": {"notes": "LedgerPkg"}})"));
    EXPECT_EQ(0, RunInChild([] {
        std::string s;
        EXPECT_EQ("/volume2/@Tessel/ledger", Got(TesselSetNSPath("ledger", "LedgerPkg", s), s));
        EXPECT_EQ("0700 0:100", Owner(s));
        EXPECT_EQ(s, ReadLink(kLinkDir + "ledger"));
        EXPECT_EQ("0755 0:0", Owner(kLinkDir));
        EXPECT_EQ("0755 0:100", Owner("/volume2/@tmp/@Tessel/ledger"));
        EXPECT_EQ("/volume2/@Tessel/notes", Got(TesselSetNSPath("notes", "", s), s));  // package from the settings
        EXPECT_EQ("/volume1/@Tessel/other", Got(TesselFindNSPath("other", "LedgerPkg", s), s));  // not enabled: homes
        EXPECT_EQ("! strNSPath.empty()", Got(TesselFindNSPath("bare", "", s), s));
        // A dangling link is replaced; a working one is kept whatever the package says.
        fs::create_symlink("/volume3/@Tessel/stale", kLinkDir + "stale");
        EXPECT_EQ("/volume1/@Tessel/stale", Got(TesselSetNSPath("stale", "HomePkg", s), s));
        EXPECT_EQ(s, ReadLink(kLinkDir + "stale"));
        EXPECT_EQ("/volume2/@Tessel/ledger", Got(TesselSetNSPath("ledger", "HomePkg", s), s));
        EXPECT_EQ(3, std::distance(fs::directory_iterator(kLinkDir), fs::directory_iterator()));  // no leftovers

        // Another process moves ledger; this one keeps its cached path until it resets the link itself.
        EXPECT_TRUE(TesselGetNSPath("ledger", s) && TesselRootFSMkdirP("/volume1/@Tessel/ledger", UID_ERR));
        EXPECT_EQ(0, RunInChild([] { return TesselResetNSPath("ledger", "/volume1/@Tessel/ledger") ? 0 : 1; }));
        EXPECT_EQ("/volume1/@Tessel/ledger", ReadLink(kLinkDir + "ledger"));
        EXPECT_EQ("/volume2/@Tessel/ledger", Got(TesselGetNSPath("ledger", s), s));
        EXPECT_TRUE(TesselResetNSPath("ledger", "/volume1/@Tessel/ledger"));
        EXPECT_EQ("/volume1", Got(TesselGetNSVolumePath("ledger", s), s));
        EXPECT_TRUE(TesselGetNSStatus("ledger"));
        return Failed();
    }));
}

TEST_F(NSPath, ScratchFilesAndObjectFilePaths) {
    EXPECT_EQ(0, RunInChild([] {
        std::string a, b, p;
        const std::string obj = "/volume2/@Tessel/ledger/1001_ABC";
        EXPECT_TRUE(TesselSetNSPath("ledger", "LedgerPkg", a) && TesselGetNSTmpFile("ledger", a) &&
                    TesselGetNSTmpFile("ledger", b));
        EXPECT_NE(a, b);
        for (const std::string &f : {a, b}) {
            EXPECT_EQ("/volume2/@tmp/@Tessel/ledger/tmp_file.", f.substr(0, f.size() - 6));
            EXPECT_EQ(0u, fs::file_size(f));
        }
        EXPECT_FALSE(TesselGetTextPath("ledger", "1001_ABC", "a.txt", p));
        EXPECT_EQ(obj + "/version/text/YS50{101}HQ{61}", p);
        fs::create_directories(obj + "/version/text");
        EXPECT_TRUE(WriteFile(p, "") && TesselGetTextPath("ledger", "1001_ABC", "a.txt", p));
        EXPECT_FALSE(TesselGetMetaBinaryPath("ledger", "1001_ABC", "../../../x", p));
        EXPECT_EQ(obj + "/metabinary/L{105}4{118}L{105}4{118}L{105}4{118}{101}A{61}{61}", p);
        EXPECT_EQ("! 1015 NULL == szIn || 0 == nIn | !TesselEncode((const unsigned char *)strName.c_str(), "
                  "(size_t)strName.length(), strEncodedFilename)",
                  Got(TesselGetMetaBinaryPath("ledger", "1001_ABC", "", p), p));
        return Failed();
    }));
}

TEST_F(NSPath, NoNameReachesOutsideItsNamespace) {
    const std::vector<std::string> bad = {"..", ".", "a/b", "../ledger", "ledger/..", std::string("a\0b", 3)};
    std::string conf = R"({"Access": {"enable_ns_ledger": true, "enable_ns_notes": true, "enable_ns_a": true)";
    for (const std::string &ns : bad) {
        conf += ", \"enable_ns_" + ns.substr(0, ns.find('\0')) + "\": true";  // the settings let them all pass
    }
    ASSERT_TRUE(WriteFile(kSettings, conf + "}}"));
    EXPECT_EQ(0, RunInChild([&] {
        std::string s;
        EXPECT_TRUE(TesselSetNSPath("ledger", "LedgerPkg", s));
        const std::string before = Tree();
        auto refused = [](BOOL ok, const std::string &text) {
            bool good = !ok && 1007 == tessel_test::ErrCode() && text == tessel_test::ErrMsgs()[0];
            tessel_test::ErrClear();
            return good;
        };
        const std::string ns = "!TesselIsPathComponent(strNS)", id = "!TesselIsPathComponent(strId)";
        for (const std::string &name : bad) {
            EXPECT_TRUE(refused(TesselGetNSPath(name, s), ns)) << name;
            EXPECT_TRUE(refused(TesselFindNSPath(name, "LedgerPkg", s), ns)) << name;
            EXPECT_TRUE(refused(TesselSetNSPath(name, "LedgerPkg", s), ns)) << name;
            EXPECT_TRUE(refused(TesselResetNSPath(name, "/volume2/@Tessel/x"), ns)) << name;
            EXPECT_TRUE(refused(TesselGetNSStatus(name), ns)) << name;
            EXPECT_TRUE(refused(TesselGetNSVolumePath(name, s), ns)) << name;
            EXPECT_TRUE(refused(TesselGetNSTmpDir(name, s), ns)) << name;
            EXPECT_TRUE(refused(TesselGetNSTmpFile(name, s), ns)) << name;
            EXPECT_TRUE(refused(TesselGetTextPath(name, "1001_ABC", "a", s), ns)) << name;
            EXPECT_TRUE(refused(TesselGetTextPath("ledger", name, "a", s), id)) << name;
            EXPECT_TRUE(refused(TesselGetMetaBinaryPath("ledger", name, "a", s), id)) << name;
            EXPECT_TRUE(refused(TesselFindNSPath("notes", name, s), "!TesselIsPathComponent(strPkg)")) << name;
        }
        EXPECT_TRUE(refused(TesselGetTextPath("ledger", "", "a", s), id));
        EXPECT_EQ(before, Tree());
        return Failed();
    }));
}

TEST_F(NSPath, DirectoriesThatCannotBeMadeReport1032) {
    std::string s;
    ASSERT_TRUE(WriteFile("/volume1/plain", "x"));
    EXPECT_EQ("! 1032 0 > QUORFSMkdirP(szPath, NULL, TRUE, uid, GID_USERS, mode)",
              Got(TesselRootFSMkdirP("/volume1/plain/sub", UID_ERR), s));
    ASSERT_TRUE(WriteFile("/volume2/@Tessel", "x") && WriteFile("/volume2/@tmp/@Tessel", "x"));
    EXPECT_EQ(0, RunInChild([] {
        std::string s;
        EXPECT_EQ("! 1032 !TesselRootFSMkdirP(strNSPath.c_str(), UID_ERR)",
                  Got(TesselSetNSPath("ledger", "LedgerPkg", s), s));
        fs::remove("/volume2/@Tessel");
        EXPECT_EQ("! 1032 0 > QUORFSMkdirP(szPath, NULL, TRUE, uid, GID_USERS, mode) | "
                  "!TesselRootFSMkdirP(strPath.c_str(), 0, 0755) | !TesselGetNSTmpDir(strNS, strTmpDir)",
                  Got(TesselSetNSPath("ledger", "LedgerPkg", s), s));
        return Failed();
    }));
}

TEST_F(NSPath, NonRootCallersReachTheLinksOnlyThroughTheRootSection) {
    fs::create_directories(kLinkDir);
    fs::permissions(kLinkDir, fs::perms::owner_all);
    ASSERT_TRUE(WriteFile("/volume1/plain", "x"));
    EXPECT_EQ(0, tessel_test::RunAsUser(tessel_test::kUidAlice, tessel_test::kGidUsers, [] {
        auto mine = [] { return tessel_test::kUidAlice == geteuid() && tessel_test::kGidUsers == getegid(); };
        std::string s;
        struct stat st;
        size_t mark = tessel_test::SyslogMark();
        EXPECT_EQ("! FALSE == QLIBCFileCheckDir(strNSPath.c_str())", Got(TesselGetNSPath("ledger", s), s));
        EXPECT_TRUE(mine());
        EXPECT_EQ("/volume2/@Tessel/ledger", Got(TesselSetNSPath("ledger", "LedgerPkg", s), s));
        EXPECT_TRUE(mine());
        EXPECT_TRUE(-1 == lstat((kLinkDir + "ledger").c_str(), &st) && EACCES == errno);  // not for alice herself
        EXPECT_EQ("/volume2/@Tessel/ledger", Got(TesselGetNSPath("ledger", s), s));
        EXPECT_TRUE(mine());
        EXPECT_FALSE(TesselRootFSMkdirP("/volume1/plain/sub", UID_ERR));
        EXPECT_TRUE(mine());
        auto raised = tessel_test::WaitForSyslog("WARNING: setresuid(-1, 0, -1)", mark);
        EXPECT_TRUE(raised && 0 == raised->message.rfind("common/tessel_common:", 0));
        return Failed();
    }));
    EXPECT_EQ("0700 0:100", Owner("/volume2/@Tessel/ledger"));
    EXPECT_EQ("/volume2/@Tessel/ledger", ReadLink(kLinkDir + "ledger"));
}

}  // namespace
