/*
 * The `tessel` tool as its users run it: the real program in the sandbox,
 * its JSON on standard output, the error stack on standard error, its exit
 * codes, the settings file it leaves and the log lines it writes.
 */
#include <fcntl.h>
#include <grp.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <iterator>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "support/json_text.h"
#include "support/sandbox.h"
#include "support/scratch.h"

namespace {

using tessel_test::Parse;
using tessel_test::ReadFile;
using tessel_test::WriteFile;
using tessel_test::kGidUsers;
using tessel_test::kUidBob;

const char kConf[] = "/usr/quor/etc/tessel.conf";
const std::string kUserInput = "ErrNo=[1007] (User input error.)";
const std::string kNoUser = "ErrNo=[1022] (User not exists.)";
const std::string kNoOpen = "ErrNo=[1002] (Open File failed.)";
const std::string kNsDisabled = "  FALSE == TesselSettingsAccessGetEx(jConf, szNameSpace) (common/tessel_conf)\n"
                                "  !jConf[\"Access\"].isMember(szNSKey) (common/tessel_conf)\n"
                                "  ErrNo=[1012] (Namespace is disabled.)\n";

/* "  frame (module:123)" lines become "  frame (module)": line numbers move with every edit. */
std::string WithoutLineNumbers(const std::string &text) {
    std::istringstream in(text);
    std::string out;
    for (std::string line; std::getline(in, line); out += line + "\n") {
        const size_t open = line.rfind(" ("), colon = line.rfind(':');
        if (open != std::string::npos && colon != std::string::npos && colon > open && colon + 2 < line.size() &&
            ')' == line.back() && line.find_first_not_of("0123456789", colon + 1) == line.size() - 1) {
            line.erase(colon, line.size() - 1 - colon);
        }
    }
    return out;
}

struct Result {
    int code = -1;
    std::string out;
    std::string err;  // line numbers of the frames taken out: "(module)"
};

/*
 * Runs the tool with args and stdin, as root or (uid != 0) as a user with
 * all its ids, the way a shell of that user would.
 */
Result Tessel(const std::vector<std::string> &args, const std::string &stdinText = "", unsigned uid = 0,
              unsigned gid = 0, const std::vector<std::string> &wrapper = {}) {
    tessel_test::ScratchDir dir;
    Result r;
    if (!dir.ok() || !WriteFile(dir.file("in"), stdinText) || 0 != chmod(dir.path().c_str(), 0777)) {
        ADD_FAILURE() << "no scratch directory";
        return r;
    }
    r.code = tessel_test::RunInChild([&]() {
        int in = open(dir.file("in").c_str(), O_RDONLY);
        int out = open(dir.file("out").c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0666);
        int err = open(dir.file("err").c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0666);
        if (in < 0 || out < 0 || err < 0 || dup2(in, 0) < 0 || dup2(out, 1) < 0 || dup2(err, 2) < 0) {
            return 126;
        }
        if (0 != uid && (0 != setgroups(0, nullptr) || 0 != setresgid(gid, gid, gid) || 0 != setresuid(uid, uid, uid))) {
            return 126;
        }
        // A wrapper (a whole command line of its own) runs instead of the tool.
        std::vector<char *> argv;
        if (wrapper.empty()) {
            argv.push_back(const_cast<char *>(TESSEL_CLI_PATH));
        }
        for (const std::string &a : wrapper.empty() ? args : wrapper) {
            argv.push_back(const_cast<char *>(a.c_str()));
        }
        argv.push_back(nullptr);
        execv(argv[0], argv.data());
        return 127;
    });
    EXPECT_NE(-1, r.code) << "the tool did not exit normally";
    r.out = ReadFile(dir.file("out"));
    r.err = WithoutLineNumbers(ReadFile(dir.file("err")));
    return r;
}

/* The error stack as the tool prints it for one frame of its own. */
std::string ToolStack(const std::string &condition, const std::string &errNo) {
    return "tessel call stack:\n  " + condition + " (tools/tessel)\n  " + errNo + "\n";
}

/* The package NotesApp, installed on the second volume. */
const char kInstallNotesApp[] = "mkdir -p /volume2/@appstore/NotesApp /var/packages/NotesApp && "
                                "ln -sfn /volume2/@appstore/NotesApp /var/packages/NotesApp/target";

class TesselCli : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(tessel_test::InSandbox());
        unlink(kConf);
    }
};

TEST_F(TesselCli, EveryCommandHasHelpAndAnUnknownOneIsLogged) {
    Result list = Tessel({"--help"});
    ASSERT_EQ(0, list.code);
    EXPECT_EQ("", list.err);
    // Every command named in the list answers its own --help.
    size_t commands = 0;
    std::istringstream in(list.out);
    for (std::string text; std::getline(in, text);) {
        if (text.size() < 3 || 0 != text.compare(0, 2, "  ") || text[2] < 'a' || text[2] > 'z') {
            continue;
        }
        const std::string name = text.substr(2, text.find("  ", 2) - 2);
        ++commands;
        std::istringstream words(name + " --help");
        Result help = Tessel({std::istream_iterator<std::string>(words), std::istream_iterator<std::string>()});
        EXPECT_EQ(0, help.code) << name;
        EXPECT_EQ(0u, help.out.find("Usage: tessel " + name + " ")) << help.out;
        EXPECT_NE(std::string::npos, help.out.find("  --as UID|NAME ")) << help.out;
        EXPECT_EQ("", help.err);
    }
    EXPECT_GE(commands, 10u);

    Result none = Tessel({});
    EXPECT_EQ(2, none.code);
    EXPECT_EQ(list.out, none.out);

    size_t mark = tessel_test::SyslogMark();
    Result bogus = Tessel({"bogus"});
    EXPECT_EQ(2, bogus.code);
    EXPECT_EQ("", bogus.out);
    EXPECT_EQ(ToolStack("unknown command: bogus", kUserInput) + "Try 'tessel --help'.\n", bogus.err);
    auto logged = tessel_test::WaitForSyslog("Failed [unknown command: bogus], err=", mark);
    ASSERT_TRUE(logged.has_value());
    EXPECT_EQ(0u, logged->message.find("tools/tessel:"));
}

// Wrong command lines are the tool's own refusals: exit code 2, nothing on
// standard output, the tool's frame alone, and nothing written.
TEST_F(TesselCli, WrongCommandLinesExitTwoWithTheToolsFrame) {
    struct Case {
        std::vector<std::string> args;
        std::string stdinText;
        unsigned uid;
        std::string err;
        bool whole;  // err is all of standard error, not only its start
    };
    const std::string notJson = "not JSON in the argument: * Line 1, Column 9   Syntax error: value, object or array expected.";
    const std::vector<Case> cases = {
        {{"settings", "access", "get", "--nss", "demo"}, "", 0,
         ToolStack("unknown option: --nss", kUserInput) + "Try 'tessel settings access get --help'.\n", true},
        {{"settings", "access", "get", "--ns"}, "", 0, ToolStack("option needs a value: --ns", kUserInput), false},
        {{"settings", "access", "set", "maybe"}, "", 0, ToolStack("expected on or off: maybe", kUserInput), false},
        {{"settings", "index", "set", "--ns", "ledger", R"({"text":)"}, "", 0,
         ToolStack(notJson, kUserInput) + "Try 'tessel settings index set --help'.\n", true},
        {{"settings", "index", "set", "--ns", "ledger", "-"}, "[1, 2]", 0,
         ToolStack("not a JSON object in standard input", kUserInput), false},
        {{"settings", "index", "set", "--ns", "ledger", "-"}, R"({"text": {}, "text": {}})", 0,
         "tessel call stack:\n  not JSON in standard input: ", false},
        {{"settings", "index", "set", "--ns", "ledger", "@/tmp/no-such-filter.json"}, "", 0,
         ToolStack("cannot read /tmp/no-such-filter.json", kNoOpen), false},
        {{"settings", "access", "get", "--as", "nosuch"}, "", 0, ToolStack("NULL == getpwnam(\"nosuch\")", kNoUser), false},
        {{"--as", "4242", "settings", "access", "get"}, "", 0, ToolStack("NULL == getpwuid(4242)", kNoUser), false},
        // A user's own shell can name only itself, by --as or in PARAMS.
        {{"--as", "alice", "settings", "access", "get"}, "", kUidBob,
         ToolStack("--as names another user and the caller is not root", kUserInput), false},
        {{"get", R"({"ns": "ledger", "id": "1001_X", "requester": 1001})"}, "", kUidBob,
         ToolStack("\"requester\" names another user and the caller is not root", kUserInput), false},
        {{"get", R"({"field": []})", "--ns", "ledger", "--field", "text"}, "", 0,
         ToolStack("--field needs \"field\" of PARAMS to be an object", kUserInput), false},
        {{"reindex", R"({"ns": ""})"}, "", 0, ToolStack("\"ns\" must be a namespace name", kUserInput), false},
        {{"versions", "list", "--ns", "other", "--id", "1001_X", "--limit", "ten"}, "", 0,
         ToolStack("--limit needs a number: ten", kUserInput), false},
        {{"--as", "alice", "set", "--ns", "notes", "--id", "1001_X", "--text", "body"}, "", 0,
         ToolStack("--text needs NAME=VALUE: body", kUserInput), false},
    };
    for (const Case &c : cases) {
        const std::string line = ::testing::PrintToString(c.args);
        Result r = Tessel(c.args, c.stdinText, c.uid, c.uid ? kGidUsers : 0);
        EXPECT_EQ(2, r.code) << line;
        EXPECT_EQ("", r.out) << line;
        if (c.whole) {
            EXPECT_EQ(c.err, r.err) << line;
        } else {
            EXPECT_EQ(0u, r.err.find(c.err)) << line << "\n" << r.err;
        }
    }
    EXPECT_NE(0, access(kConf, F_OK));
}

/* Runs the tool as root; checks its exit code and exactly what it printed. */
Result Text(int code, const std::string &out, const std::vector<std::string> &args) {
    Result r = Tessel(args);
    EXPECT_EQ(code, r.code) << ::testing::PrintToString(args) << r.err;
    EXPECT_EQ(out, r.out) << ::testing::PrintToString(args);
    return r;
}

/* Runs the tool as root; checks its exit code and the JSON it printed. */
Result Json(int code, const std::string &json, const std::vector<std::string> &args) {
    Result r = Tessel(args);
    EXPECT_EQ(code, r.code) << ::testing::PrintToString(args) << r.err;
    EXPECT_EQ(Parse(json), Parse(r.out)) << ::testing::PrintToString(args);
    return r;
}

TEST_F(TesselCli, SettingsRoundTripThroughTheFile) {
    EXPECT_EQ("tessel call stack:\n  FALSE == QLIBCFileExist(SZF_TESSEL_CONF_PATH) (common/tessel_conf)\n"
              "  ErrNo=[1027] (tessel is disabled.)\n",
              Json(1, R"({"enabled": false, "ns": null})", {"settings", "access", "get"}).err);

    Text(0, "{\n  \"enabled\" : true,\n  \"ns\" : null\n}\n", {"settings", "access", "set", "on"});
    Text(0, "{\"enabled\":true,\"ns\":\"ledger\",\"pkg_id\":\"LedgerApp\"}\n",
         {"--compact", "settings", "access", "set", "--ns", "ledger", "--pkg", "LedgerApp", "on"});
    Json(0, R"({"ns": "ledger", "uid": 1002, "sharing": false})",
         {"settings", "sharing", "set", "--uid", "bob", "--ns", "ledger", "off"});
    Json(0, R"({"ns": "ledger", "filter": {"text": {"title": true}}})",
         {"settings", "index", "set", "--ns", "ledger", R"({"text": {"title": true}, "other": 1})"});

    const std::string expected = R"({"Access": {"enable": true, "enable_ns_ledger": true},
        "pkg_id": {"ledger": "LedgerApp"}, "Sharing": {"1002": {"disable_ns_ledger": true}},
        "Index": {"ledger": {"text": {"title": true}}}})";
    EXPECT_EQ(Parse(expected), tessel_test::ReadJson(kConf));
    Json(0, expected, {"settings", "show", "--ns", "ledger"});

    EXPECT_EQ("", Json(0, R"({"enabled": true, "ns": "ledger"})", {"settings", "access", "check", "--ns", "ledger"}).err);
    Result other = Tessel({"settings", "access", "check", "--ns", "other"});
    EXPECT_EQ(1, other.code);
    EXPECT_EQ("tessel call stack:\n" + kNsDisabled, other.err);

    // Sharing: the namespace's own switch, then the check of both.
    Json(0, R"({"ns": null, "uid": 1002, "sharing": true})", {"settings", "sharing", "get", "--uid", "1002"});
    EXPECT_EQ("tessel call stack:\n"
              "  FALSE == TesselSettingsSharingGetEx(jConf, szNameSpace, owner) (common/tessel_conf)\n"
              "  jConf[\"Sharing\"][szUid][szNSKey].asBool() (common/tessel_conf)\n"
              "  ErrNo=[1020] (Sharing is not enabled for the object.)\n",
              Json(1, R"({"ns": "ledger", "uid": 1002, "sharing": false})",
                   {"settings", "sharing", "check", "--uid", "bob", "--ns", "ledger"}).err);
    Json(0, R"({"ns": "ledger", "uids": [1002]})", {"settings", "sharing", "off-list", "--ns", "ledger"});
    Json(0, R"({"ns": "ledger", "filter": {"text": {"title": true}}})", {"settings", "index", "get", "--ns", "ledger"});
}

TEST_F(TesselCli, AFilterTheLibraryRefusesLeavesTheFileAndAsTakesTheUsersIds) {
    ASSERT_EQ(0, Tessel({"settings", "access", "set", "on"}).code);
    const std::string before = ReadFile(kConf);
    // Well-formed, but the library refuses it: its frames, exit code 1.
    Result empty = Tessel({"settings", "index", "set", "--ns", "ledger", "{}"});
    EXPECT_EQ(1, empty.code);
    EXPECT_EQ("tessel call stack:\n"
              "  !jsFilter.isMember(\"text\") && !jsFilter.isMember(\"metatext\") (common/tessel_conf)\n",
              empty.err);
    EXPECT_EQ(before, ReadFile(kConf));

    // Run as root, --as makes the call with the user's effective ids: the
    // library's raise to root and the way back are logged with them.
    size_t mark = tessel_test::SyslogMark();
    Result alice = Tessel({"--as", "alice", "settings", "index", "set", "--ns", "ledger", "-"}, R"({"metatext": {}})");
    EXPECT_EQ(0, alice.code) << alice.err;
    EXPECT_EQ(Parse(R"({"ns": "ledger", "filter": {"metatext": {}}})"), Parse(alice.out));
    EXPECT_TRUE(tessel_test::WaitForSyslog("WARNING: setresuid(-1, 1001, -1)", mark).has_value());
}

// The library's refusals: exit code 1, nothing on standard output, its frames
// as they stand, and nothing written.
TEST_F(TesselCli, GetVersionsAndDownloadShowTheLibrarysRefusals) {
    ASSERT_EQ(0, Tessel({"settings", "access", "set", "on"}).code);
    ASSERT_EQ(0, Tessel({"settings", "access", "set", "--ns", "ledger", "on"}).code);
    tessel_test::ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    // A namespace that is off: the read's own frame over the settings' frames.
    const std::string getFrames =
        "  FALSE == TesselAccessCheck(jParm[\"ns\"].asCString()) (object/object_get)\n" + kNsDisabled;
    const std::string off = "tessel call stack:\n" + getFrames;
    const std::vector<std::pair<std::vector<std::string>, std::string>> cases = {
        {{"--as", "alice", "get", "--ns", "other", "--id", "1001_X"}, off},
        // PARAMS reach the library as given; the options win over them.
        {{"--as", "alice", "get", "-"},
         "tessel call stack:\n"
         "  !jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"id\") || "
         "!jParm[\"id\"].isString() || !jParm.isMember(\"requester\") || !jParm[\"requester\"].isIntegral() "
         "(object/object_get)\n  " + kUserInput + "\n"},
        {{"--as", "alice", "get", R"({"ns": 5, "id": "1001_X"})", "--ns", "other"}, off},
        {{"--as", "alice", "versions", "list", "--ns", "other", "--id", "1001_X"},
         "tessel call stack:\n"
         "  0 > (count = TesselObjectVersionList(jParm, &pHead, total, listable_total)) (version/version_list)\n"
         "  FALSE == TesselAccessCheck(jParm[\"ns\"].asCString()) (version/version_list)\n" + kNsDisabled},
        {{"--as", "alice", "download", "--ns", "other", "--id", "1001_X", "--name", "a.txt", "--output", dir.file("a.txt")},
         "tessel call stack:\n  !tmpObj.Get(jGetParm) (object/object_download)\n" + getFrames},
    };
    for (const auto &c : cases) {
        Result r = Tessel(c.first, R"({"ns": 5, "id": "1001_X"})");
        EXPECT_EQ(1, r.code) << ::testing::PrintToString(c.first);
        EXPECT_EQ("", r.out) << ::testing::PrintToString(c.first);
        EXPECT_EQ(c.second, r.err) << ::testing::PrintToString(c.first);
    }
    EXPECT_NE(0, access(dir.file("a.txt").c_str(), F_OK));
}

TEST_F(TesselCli, NamespaceIsPlacedByItsPackageAndReindexedWithProgressOnATerminal) {
    ASSERT_EQ(0, Tessel({"settings", "access", "set", "on"}).code);
    ASSERT_EQ(0, Tessel({"settings", "access", "set", "--ns", "notes", "on"}).code);
    Result nowhere = Tessel({"namespace", "create", "--ns", "notes"});
    EXPECT_EQ(1, nowhere.code);
    EXPECT_EQ("tessel call stack:\n"
              "  !TesselFindNSPath(strNS, strPkgId, strNSPath) (common/tessel_common)\n"
              "  strNSPath.empty() (common/tessel_common)\n",
              nowhere.err);

    // The package's target decides the volume.
    ASSERT_EQ(0, system(kInstallNotesApp));
    const std::string placed = "{\"ns\":\"notes\",\"path\":\"/volume2/@Tessel/notes\"}\n";
    Text(0, placed, {"--compact", "namespace", "create", "--ns", "notes", "--pkg", "NotesApp"});
    Text(0, placed, {"--compact", "namespace", "path", "--ns", "notes"});
    struct stat st;
    ASSERT_EQ(0, stat("/volume2/@Tessel/notes", &st));
    EXPECT_EQ(0700u, st.st_mode & 07777);

    EXPECT_EQ("", Text(0, "{\"indexed\":0,\"ns\":\"notes\",\"stored\":0}\n", {"--compact", "reindex", "--ns", "notes"}).err);

    // On a terminal (a pseudo-terminal from script(1)) the bar is drawn on
    // standard error, and its line ended before the result.
    Result tty = Tessel({}, "", 0, 0, {"/usr/bin/script", "-qec", std::string(TESSEL_CLI_PATH) +
                                                             " --compact reindex --ns notes", "/dev/null"});
    EXPECT_EQ(0, tty.code);
    EXPECT_EQ("\rreindex notes [" + std::string(40, '#') + "] 0/0\r\n{\"indexed\":0,\"ns\":\"notes\",\"stored\":0}\r\n",
              tty.out.substr(tty.out.rfind("\rreindex notes [")));
}

/* A namespace "notes" switched on and placed on the volume of its package. */
void PlaceNotes() {
    ASSERT_EQ(0, Tessel({"settings", "access", "set", "on"}).code);
    ASSERT_EQ(0, Tessel({"settings", "access", "set", "--ns", "notes", "--pkg", "NotesApp", "on"}).code);
    ASSERT_EQ(0, system(kInstallNotesApp));
    ASSERT_EQ(0, Tessel({"namespace", "create", "--ns", "notes"}).code);
}

/* The entries of a directory, sorted. */
std::vector<std::string> Entries(const std::string &dir) {
    std::vector<std::string> names;
    for (const auto &e : std::filesystem::directory_iterator(dir)) {
        names.push_back(e.path().filename().string());
    }
    std::sort(names.begin(), names.end());
    return names;
}

TEST_F(TesselCli, CreatePrintsTheStoredObjectAndARefusedCreateLeavesNothing) {
    ASSERT_NO_FATAL_FAILURE(PlaceNotes());
    tessel_test::ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    ASSERT_EQ(0, chmod(dir.path().c_str(), 0755));
    ASSERT_TRUE(WriteFile(dir.file("list.txt"), "Milk\nBread\n"));
    ASSERT_EQ(0, chmod(dir.file("list.txt").c_str(), 0644));
    ASSERT_TRUE(WriteFile(dir.file("secret.txt"), "root only\n"));
    ASSERT_EQ(0, chmod(dir.file("secret.txt").c_str(), 0600));

    Result made = Tessel({"--as", "alice", "create", "--ns", "notes", "--category", "note", "--text", "title=Shopping",
                          "--binary", "list.txt=" + dir.file("list.txt"), "--commit-msg", "first"});
    ASSERT_EQ(0, made.code) << made.err;
    EXPECT_EQ("", made.err);
    const Json::Value got = Parse(made.out);
    const std::string id = got["id"].asString();
    EXPECT_EQ(101u, id.size());
    EXPECT_EQ(std::string::npos, id.find_first_not_of("0123456789ABCDEF", 5)) << id;
    EXPECT_EQ(0u, id.rfind("1001_", 0)) << id;
    const std::string version = got["version"].asString();
    EXPECT_EQ(40u, version.size());
    EXPECT_EQ(std::string::npos, version.find_first_not_of("0123456789abcdef")) << version;
    Json::Value expected = Parse(R"({"acl": {}, "category": "note", "commit_msg": {"message": "first"},
        "binary_info": {"list.txt": {"format": "raw", "md5": "eeb706fc81a6ee6a2a0fa7b96d33cecc", "name": "list.txt"}},
        "metabinary_info": {}, "metatext": {}, "ns": "notes", "owner": {"display_name": "alice", "uid": 1001},
        "parent_id": "1001_#00000000", "perm": "owner", "person": {}, "text": {"title": "Shopping"}})");
    for (const char *key : {"id", "version", "ctime", "mtime"}) {
        expected[key] = got[key];
    }
    expected["binary_info"]["list.txt"]["auto_mtime"] = got["binary_info"]["list.txt"]["auto_mtime"];
    EXPECT_EQ(expected, got);
    EXPECT_EQ(got["ctime"], got["mtime"]);
    const std::vector<std::string> stored = {id};
    EXPECT_EQ(stored, Entries("/volume2/@Tessel/notes"));

    // Refused by the library: the identifier is taken; the object is as it was.
    Result taken = Tessel({"--as", "alice", "create", "--ns", "notes", "--category", "note", "--id", id, "--text",
                           "title=Other"});
    EXPECT_EQ(1, taken.code);
    EXPECT_EQ("", taken.out);
    EXPECT_EQ("tessel call stack:\n"
              "  !PrepareCreateParm(jParm) (object/list_object_create)\n"
              "  TesselIDIsExist(jParm[\"ns\"].asString(), jParm[\"id\"].asString()) (object/list_object_create)\n"
              "  ErrNo=[1031] (Object ID already exists.)\n",
              taken.err);
    // Refused by the tool: alice cannot read the file she names, so nothing reaches the store.
    Result secret = Tessel({"--as", "alice", "create", "--ns", "notes", "--category", "note", "--binary",
                            "s.txt=" + dir.file("secret.txt")});
    EXPECT_EQ(2, secret.code);
    EXPECT_EQ(ToolStack("cannot read " + dir.file("secret.txt") + " as a regular file", kNoOpen) +
                  "Try 'tessel create --help'.\n",
              secret.err);
    // bob cannot create under alice's object.
    Result child = Tessel({"--as", "bob", "create", "--ns", "notes", "--category", "note", "--parent", id});
    EXPECT_EQ(1, child.code);
    EXPECT_EQ("", child.out);
    EXPECT_EQ(stored, Entries("/volume2/@Tessel/notes"));
    for (const std::string &name : Entries("/tmp")) {
        EXPECT_NE(0u, name.rfind("tessel-attach-", 0)) << "left behind: " << name;
    }
    Result read = Tessel({"--as", "alice", "get", "--ns", "notes", "--id", id});
    ASSERT_EQ(0, read.code) << read.err;
    expected.removeMember("person");  // a read shows persons only when asked for them
    EXPECT_EQ(expected, Parse(read.out));
}

TEST_F(TesselCli, SetMakesVersionsOnTheLatestAndARefusedSetChangesNothing) {
    ASSERT_NO_FATAL_FAILURE(PlaceNotes());
    Result made = Tessel({"--as", "alice", "create", "--ns", "notes", "--category", "note", "--text", "title=Shopping",
                          "--text", "body=Milk"});
    ASSERT_EQ(0, made.code) << made.err;
    const Json::Value first = Parse(made.out);
    const std::string id = first["id"].asString();

    Result edit = Tessel({"--as", "alice", "--compact", "set", "--ns", "notes", "--id", id, "--text", "body=Eggs",
                          "--delete-text", "title", "--commit-msg", "eggs"});
    ASSERT_EQ(0, edit.code) << edit.err;
    const Json::Value second = Parse(edit.out);
    EXPECT_EQ(Parse(R"({"body": "Eggs"})"), second["text"]);
    EXPECT_EQ(Parse(R"({"message": "eggs"})"), second["commit_msg"]);
    EXPECT_NE(first["version"], second["version"]);
    EXPECT_EQ(first["ctime"], second["ctime"]);

    // bob has no permission on alice's unshared note: refused, nothing changes.
    Result bob = Tessel({"--as", "bob", "set", "--ns", "notes", "--id", id, "--text", "body=Bob's"});
    EXPECT_EQ(1, bob.code);
    EXPECT_EQ("", bob.out);
    EXPECT_NE(std::string::npos, bob.err.find("  ErrNo=[1020] (Sharing is not enabled for the object.)\n")) << bob.err;

    Result versions = Tessel({"--as", "alice", "versions", "list", "--ns", "notes", "--id", id});
    ASSERT_EQ(0, versions.code) << versions.err;
    const Json::Value list = Parse(versions.out);
    EXPECT_EQ(2, list["total"].asInt());
    std::set<std::string> names;
    for (const Json::Value &v : list["versions"]) {
        names.insert(v["version"].asString());
    }
    EXPECT_EQ((std::set<std::string>{first["version"].asString(), second["version"].asString()}), names);
    Result now = Tessel({"--as", "alice", "--compact", "get", "--ns", "notes", "--id", id});
    ASSERT_EQ(0, now.code);
    Json::Value shown = second;
    shown.removeMember("person");
    EXPECT_EQ(shown, Parse(now.out));
}

}  // namespace
