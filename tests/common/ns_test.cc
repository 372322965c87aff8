// Namespace paths: both placement schemes, links and directories on the right
// volume with the right owners, the per-process cache, scratch files, object
// file paths, names that try to leave the namespace, and non-root callers.
// The scheme verdict and the path cache live as long as the process, so every
// scenario runs whole in a fresh child.
#include <errno.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_error.h"
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
void Clear() { TesselErrMsgGet() = Json::Value(Json::arrayValue); }

// This thread's frames as "<code> <msg> | <msg> | ...".
std::string Stack() {
    std::string text;
    for (const Json::Value &jFrame : TesselErrMsgGet()) {
        text += (text.empty() ? "" : " | ") +
                (jFrame.isMember("code") ? std::to_string(jFrame["code"].asInt()) + " " : "") + jFrame["msg"].asString();
    }
    return text;
}

// "<mode> <uid>:<gid>", or "" when missing.
std::string Owner(const std::string &path) {
    struct stat st;
    if (0 != lstat(path.c_str(), &st)) {
        return "";
    }
    char sz[64];
    snprintf(sz, sizeof(sz), "%04o %u:%u", st.st_mode & 07777, st.st_uid, st.st_gid);
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

class NSPath : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(tessel_test::InSandbox()) << "run through ctest: this test writes under /usr/quor and /volume*";
        for (const char *path : {"/usr/quor/etc/tessel", "/usr/quor/etc/tessel.conf", "/usr/quor/etc/platform.conf",
                                 "/volume1/@Tessel", "/volume2/@Tessel", "/volume1/@tmp/@Tessel",
                                 "/volume2/@tmp/@Tessel", "/volume1/plain"}) {
            fs::remove_all(path);
        }
        for (const auto &entry : fs::directory_iterator("/var/packages")) {
            fs::remove_all(entry.path());
        }
        SetBuild("69057");
        ASSERT_TRUE(WriteFile(kSettings, R"({"Access": {"enable_ns_ledger": true}})"));
        Package("LedgerPkg", "/volume2/@appstore/LedgerPkg");
        Package("HomePkg", "/volume1/@appstore/HomePkg");
    }
    static void SetBuild(const std::string &build) {
        ASSERT_TRUE(WriteFile("/etc.defaults/VERSION", "productversion=\"7.2.1\"\nbuildnumber=\"" + build + "\"\n"));
    }
    static void Package(const std::string &pkg, const std::string &target) {
        fs::create_directories("/var/packages/" + pkg);
        fs::create_symlink(target, "/var/packages/" + pkg + "/target");
    }
};

TEST_F(NSPath, FixedSchemeIsTheHomesVolumeForBuild14887AndRemovableModels) {
    SetBuild("14887");
    EXPECT_EQ(0, RunInChild([] {
        std::string s;
        EXPECT_FALSE(TesselSupportVolumeMove());
        SetBuild("69057");  // decided once per process
        EXPECT_FALSE(TesselSupportVolumeMove());
        EXPECT_TRUE(TesselGetRepoDir(s));
        EXPECT_EQ("/volume1/@Tessel", s);
        EXPECT_TRUE(TesselGetNSPath("ledger", s));
        EXPECT_EQ("/volume1/@Tessel/ledger", s);
        EXPECT_FALSE(fs::exists(s));
        EXPECT_TRUE(TesselGetNSVolumePath("ledger", s));
        EXPECT_EQ("/volume1", s);
        Clear();
        EXPECT_FALSE(TesselGetNSPath("..", s));
        EXPECT_EQ("1007 !TesselIsPathComponent(strNS)", Stack());
        return Failed();
    }));
    ASSERT_TRUE(WriteFile(kPlatformConf, "removable_model=\"yes\"\n"));
    fs::create_directories("/volume1/@Tessel/ledger");
    EXPECT_EQ(0, RunInChild([] {
        std::string s;
        EXPECT_FALSE(TesselSupportVolumeMove());
        EXPECT_TRUE(TesselSetNSPath("ledger", "LedgerPkg", s));  // the package plays no part
        EXPECT_EQ("/volume1/@Tessel/ledger", s);
        EXPECT_EQ(s, ReadLink(kLinkDir + "ledger"));
        // A homes share that cannot be found or lies on no volume; cached paths stay.
        EXPECT_TRUE(WriteFile(kPlatformConf, "removable_model=\"yes\"\nshare_homes_path=\"homes\"\n"));
        Clear();
        EXPECT_FALSE(TesselGetRepoDir(s));
        EXPECT_EQ("1000 0 > QUORShareGet(SZK_SECTION_HOMES, &pShare)", Stack());
        EXPECT_TRUE(WriteFile(kPlatformConf, "removable_model=\"yes\"\nshare_homes_path=\"/srv/homes\"\n"));
        Clear();
        EXPECT_FALSE(TesselGetRepoDir(s));
        EXPECT_EQ("1000 0 > QUORShareBinPathGet(pShare->szPath, szVol, sizeof(szVol))", Stack());
        EXPECT_FALSE(TesselGetNSPath("notes", s));
        EXPECT_EQ("1000 !TesselGetRepoDir(strRepo)", Stack());
        EXPECT_TRUE(TesselGetNSPath("ledger", s));
        EXPECT_EQ("/volume1/@Tessel/ledger", s);
        return Failed();
    }));
}

TEST_F(NSPath, LinkedSchemeWithoutAUsableLinkFails) {
    EXPECT_EQ(0, RunInChild([] {
        std::string s;
        size_t mark = tessel_test::SyslogMark();
        EXPECT_TRUE(TesselSupportVolumeMove());
        EXPECT_TRUE(TesselGetRepoDir(s));
        EXPECT_EQ(kLinkDir, s);
        Clear();
        EXPECT_FALSE(TesselGetNSPath("ledger", s));
        EXPECT_EQ("FALSE == QLIBCFileCheckDir(strNSPath.c_str())", Stack());
        EXPECT_EQ("common/tessel_common", TesselErrMsgGet()[0]["file"].asString());
        auto line = tessel_test::WaitForSyslog("Failed [FALSE == QLIBCFileCheckDir(strNSPath.c_str())], err=", mark);
        EXPECT_TRUE(line && 0 == line->message.rfind("common/tessel_common:", 0));
        Clear();
        EXPECT_FALSE(TesselGetNSStatus("ledger"));
        EXPECT_EQ("FALSE == QLIBCFileCheckDir(strNSPath.c_str()) | !TesselGetNSPath(strNS, strNSPath)", Stack());
        Clear();
        EXPECT_FALSE(TesselGetNSPath("", s));
        EXPECT_EQ("strNS.empty()", Stack());
        // A directory in the link's place resolves, but is no link.
        fs::create_directories(kLinkDir + "ledger");
        Clear();
        EXPECT_FALSE(TesselGetNSPath("ledger", s));
        EXPECT_EQ("-1 == (len = readlink(strNSPath.c_str(), szPath, sizeof(szPath) - 1))", Stack());
        Clear();
        EXPECT_FALSE(TesselSetNSPath("ledger", "LedgerPkg", s));
        EXPECT_EQ("0 > (len = readlink(strNSPath.c_str(), szPath, sizeof(szPath) - 1))", Stack());
        return Failed();
    }));
}

TEST_F(NSPath, SetPlacesOnThePackageVolumeAndTheCacheOutlivesOtherProcesses) {
    ASSERT_TRUE(WriteFile(kSettings, R"({"Access": {"enable_ns_ledger": true, "enable_ns_notes": true,
        "enable_ns_bare": true, "enable_ns_stale": true}, "pkg_id": {"notes": "LedgerPkg"}})"));
    EXPECT_EQ(0, RunInChild([] {
        std::string s;
        EXPECT_TRUE(TesselSetNSPath("ledger", "LedgerPkg", s));
        EXPECT_EQ("/volume2/@Tessel/ledger", s);
        EXPECT_EQ("0700 0:100", Owner(s));
        EXPECT_EQ(s, ReadLink(kLinkDir + "ledger"));
        EXPECT_EQ("0755 0:0", Owner(kLinkDir));
        EXPECT_EQ("0755 0:100", Owner("/volume2/@tmp/@Tessel/ledger"));
        EXPECT_TRUE(TesselSetNSPath("notes", "", s));  // package from the settings
        EXPECT_EQ("/volume2/@Tessel/notes", s);
        EXPECT_TRUE(TesselFindNSPath("other", "LedgerPkg", s));  // settings refuse the namespace: homes
        EXPECT_EQ("/volume1/@Tessel/other", s);
        Clear();
        EXPECT_FALSE(TesselFindNSPath("bare", "", s));
        EXPECT_EQ("strNSPath.empty()", Stack());
        // A dangling link is replaced; a working one is kept whatever the package says.
        fs::create_symlink("/volume3/@Tessel/stale", kLinkDir + "stale");
        EXPECT_TRUE(TesselSetNSPath("stale", "HomePkg", s));
        EXPECT_EQ("/volume1/@Tessel/stale", ReadLink(kLinkDir + "stale"));
        EXPECT_TRUE(TesselSetNSPath("ledger", "HomePkg", s));
        EXPECT_EQ("/volume2/@Tessel/ledger", s);
        std::vector<std::string> links;
        for (const auto &entry : fs::directory_iterator(kLinkDir)) {
            links.push_back(entry.path().filename());
        }
        std::sort(links.begin(), links.end());
        EXPECT_EQ((std::vector<std::string>{"ledger", "notes", "stale"}), links);

        EXPECT_TRUE(TesselGetNSPath("ledger", s));
        EXPECT_TRUE(TesselRootFSMkdirP("/volume1/@Tessel/ledger", UID_ERR));
        EXPECT_EQ(0, RunInChild([] { return TesselResetNSPath("ledger", "/volume1/@Tessel/ledger") ? 0 : 1; }));
        EXPECT_EQ("/volume1/@Tessel/ledger", ReadLink(kLinkDir + "ledger"));
        EXPECT_TRUE(TesselGetNSPath("ledger", s));
        EXPECT_EQ("/volume2/@Tessel/ledger", s);
        EXPECT_TRUE(TesselResetNSPath("ledger", "/volume1/@Tessel/ledger"));  // here: the new place from now on
        EXPECT_TRUE(TesselGetNSVolumePath("ledger", s));
        EXPECT_EQ("/volume1", s);
        EXPECT_TRUE(TesselGetNSStatus("ledger"));
        return Failed();
    }));
}

TEST_F(NSPath, ScratchFilesAndObjectFilePaths) {
    EXPECT_EQ(0, RunInChild([] {
        std::string a, b, p;
        EXPECT_TRUE(TesselSetNSPath("ledger", "LedgerPkg", a));
        EXPECT_TRUE(TesselGetNSTmpFile("ledger", a));
        EXPECT_TRUE(TesselGetNSTmpFile("ledger", b));
        EXPECT_NE(a, b);
        for (const std::string &f : {a, b}) {
            EXPECT_EQ("/volume2/@tmp/@Tessel/ledger/tmp_file.", f.substr(0, f.size() - 6));
            EXPECT_EQ(0u, fs::file_size(f));
        }
        const std::string obj = "/volume2/@Tessel/ledger/1001_ABC";
        EXPECT_FALSE(TesselGetTextPath("ledger", "1001_ABC", "a.txt", p));
        EXPECT_EQ(obj + "/version/text/YS50{101}HQ{61}", p);
        fs::create_directories(obj + "/version/text");
        EXPECT_TRUE(WriteFile(p, ""));
        EXPECT_TRUE(TesselGetTextPath("ledger", "1001_ABC", "a.txt", p));
        EXPECT_FALSE(TesselGetMetaBinaryPath("ledger", "1001_ABC", "../../../x", p));
        EXPECT_EQ(obj + "/metabinary/", p.substr(0, obj.size() + 12));
        EXPECT_EQ(std::string::npos, p.find('/', obj.size() + 12));
        Clear();
        EXPECT_FALSE(TesselGetMetaBinaryPath("ledger", "1001_ABC", "", p));
        EXPECT_EQ("1015 NULL == szIn || 0 == nIn | !TesselEncode((const unsigned char *)strName.c_str(), "
                  "(size_t)strName.length(), strEncodedFilename)",
                  Stack());
        return Failed();
    }));
}

TEST_F(NSPath, NoNameReachesOutsideItsNamespace) {
    const std::vector<std::string> bad = {"..", ".", "a/b", "../ledger", "ledger/..", std::string("a\0b", 3)};
    std::string conf = R"({"Access": {"enable_ns_ledger": true, "enable_ns_notes": true, "enable_ns_a": true)";
    for (const std::string &ns : bad) {
        conf += ", \"enable_ns_" + ns.substr(0, ns.find('\0')) + "\": true";
    }
    ASSERT_TRUE(WriteFile(kSettings, conf + "}}"));
    EXPECT_EQ(0, RunInChild([&] {
        std::string s;
        EXPECT_TRUE(TesselSetNSPath("ledger", "LedgerPkg", s));
        const std::string before = Tree();
        auto refused = [](bool ok, const char *szText) {
            bool good = !ok && 1007 == TesselErrCodeGet() && szText == TesselErrMsgGet()[0]["msg"].asString();
            Clear();
            return good;
        };
        for (const std::string &ns : bad) {
            const char *szNS = "!TesselIsPathComponent(strNS)";
            EXPECT_TRUE(refused(TesselGetNSPath(ns, s), szNS)) << ns;
            EXPECT_TRUE(refused(TesselFindNSPath(ns, "LedgerPkg", s), szNS)) << ns;
            EXPECT_TRUE(refused(TesselSetNSPath(ns, "LedgerPkg", s), szNS)) << ns;
            EXPECT_TRUE(refused(TesselResetNSPath(ns, "/volume2/@Tessel/x"), szNS)) << ns;
            EXPECT_TRUE(refused(TesselGetNSStatus(ns), szNS)) << ns;
            EXPECT_TRUE(refused(TesselGetNSVolumePath(ns, s), szNS)) << ns;
            EXPECT_TRUE(refused(TesselGetNSTmpDir(ns, s), szNS)) << ns;
            EXPECT_TRUE(refused(TesselGetNSTmpFile(ns, s), szNS)) << ns;
            EXPECT_TRUE(refused(TesselGetTextPath(ns, "1001_ABC", "a", s), szNS)) << ns;
            EXPECT_TRUE(refused(TesselGetTextPath("ledger", ns, "a", s), "!TesselIsPathComponent(strId)")) << ns;
            EXPECT_TRUE(refused(TesselGetMetaBinaryPath("ledger", ns, "a", s), "!TesselIsPathComponent(strId)"))
                << ns;
            EXPECT_TRUE(refused(TesselFindNSPath("notes", ns, s), "!TesselIsPathComponent(strPkg)")) << ns;
        }
        EXPECT_TRUE(refused(TesselGetTextPath("ledger", "", "a", s), "!TesselIsPathComponent(strId)"));
        EXPECT_EQ(before, Tree());
        return Failed();
    }));
}

TEST_F(NSPath, DirectoriesThatCannotBeMadeReport1032) {
    ASSERT_TRUE(WriteFile("/volume1/plain", "x"));
    Clear();
    EXPECT_FALSE(TesselRootFSMkdirP("/volume1/plain/sub", UID_ERR));
    EXPECT_EQ("1032 0 > QUORFSMkdirP(szPath, NULL, TRUE, uid, GID_USERS, mode)", Stack());
    ASSERT_TRUE(WriteFile("/volume2/@Tessel", "x"));
    ASSERT_TRUE(WriteFile("/volume2/@tmp/@Tessel", "x"));
    EXPECT_EQ(0, RunInChild([] {
        std::string s;
        Clear();
        EXPECT_FALSE(TesselSetNSPath("ledger", "LedgerPkg", s));
        EXPECT_EQ("1032 !TesselRootFSMkdirP(strNSPath.c_str(), UID_ERR)", Stack());
        fs::remove("/volume2/@Tessel");
        EXPECT_FALSE(TesselSetNSPath("ledger", "LedgerPkg", s));
        EXPECT_EQ("1032 0 > QUORFSMkdirP(szPath, NULL, TRUE, uid, GID_USERS, mode) | "
                  "!TesselRootFSMkdirP(strPath.c_str(), 0, 0755) | !TesselGetNSTmpDir(strNS, strTmpDir)",
                  Stack());
        EXPECT_FALSE(TesselGetNSTmpFile("ledger", s));
        EXPECT_EQ("!TesselGetNSTmpDir(strNS, strPath)", TesselErrMsgGet()[3]["msg"].asString());
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
        size_t mark = tessel_test::SyslogMark();
        Clear();
        EXPECT_FALSE(TesselGetNSPath("ledger", s));
        EXPECT_EQ("FALSE == QLIBCFileCheckDir(strNSPath.c_str())", Stack());
        EXPECT_TRUE(mine());
        EXPECT_TRUE(TesselSetNSPath("ledger", "LedgerPkg", s));
        EXPECT_TRUE(mine());
        EXPECT_EQ("/volume2/@Tessel/ledger", s);
        struct stat st;
        EXPECT_EQ(-1, lstat((kLinkDir + "ledger").c_str(), &st));  // not for alice herself
        EXPECT_EQ(EACCES, errno);
        EXPECT_TRUE(TesselGetNSPath("ledger", s));
        EXPECT_EQ("/volume2/@Tessel/ledger", s);
        EXPECT_TRUE(mine());
        EXPECT_FALSE(TesselRootFSMkdirP("/volume1/plain/sub", UID_ERR));
        EXPECT_TRUE(mine());
        auto raised = tessel_test::WaitForSyslog("WARNING: setresuid(-1, 0, -1)", mark);
        EXPECT_TRUE(raised && 0 == raised->message.rfind("common/tessel_common:", 0));
        EXPECT_TRUE(tessel_test::WaitForSyslog("WARNING: setresuid(-1, 1001, -1)", mark));
        return Failed();
    }));
    EXPECT_EQ("0700 0:100", Owner("/volume2/@Tessel/ledger"));
    EXPECT_EQ("/volume2/@Tessel/ledger", ReadLink(kLinkDir + "ledger"));
}

}  // namespace
