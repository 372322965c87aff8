// The file-system store's versions through the backend registry: saves that
// commit into each object's own repository (checked with the git tools),
// version counters, reads of the latest and of older versions, histories,
// differences and renames.
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <memory>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "backend_fs/utils.h"
#include "support/error_stack.h"
#include "support/json_text.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "support/versioned_fields.h"
#include "tessel_backend.h"
#include "tessel_file.h"
#include "tesselobject.h"
#include "tesselobjectversion.h"

namespace Json {
// Failures show values as JSON text.
void PrintTo(const Value &jVal, std::ostream *os) { *os << jVal.toStyledString(); }
}  // namespace Json

using namespace tessel_test;
namespace fs = std::filesystem;

namespace {

const std::string kNsDir = "/volume1/@Tessel/ledger";
const std::string kScratchDir = "/volume1/@tmp/@Tessel/ledger";
using Msgs = std::vector<std::string>;

// What a command printed on standard output.
std::string Shell(const std::string &strCmd) {
    std::string strOut;
    std::unique_ptr<FILE, int (*)(FILE *)> p(popen(strCmd.c_str(), "r"), pclose);
    char buf[4096];
    for (size_t n; p && (n = fread(buf, 1, sizeof(buf), p.get())) > 0;) strOut.append(buf, n);
    return strOut;
}

std::string Enc(const std::string &strName) {
    std::string strOut;
    EXPECT_TRUE(TesselEncode(strName, strOut));
    return strOut;
}

class VersionStore : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_EQ(0, system(("mkdir -p " + kNsDir + " " + kScratchDir + " /usr/quor/etc/tessel/ns && ln -sfn " +
                             kNsDir + " /usr/quor/etc/tessel/ns/ledger")
                                .c_str()));
        ASSERT_TRUE(scratch_.ok());
        ASSERT_NE(nullptr, backend_);
        ErrClear();
    }

    Json::Value Req(const std::string &strMembers) const {
        Json::Value jParm = Parse("{" + strMembers + "}");
        jParm["ns"] = "ledger";
        if (!id_.empty() && !jParm.isMember("id")) {
            jParm["id"] = id_;
        }
        return jParm;
    }

    // A new object of alice's; its first version.
    std::string Create(const std::string &strMembers) {
        std::string strVer;
        id_.clear();
        EXPECT_TRUE(backend_->Create(Req(R"("owner": 1001, "requester": 1001, "category": "note", )" + strMembers), id_,
                                     strVer))
            << ::testing::PrintToString(ErrMsgs());
        return strVer;
    }

    std::string Set(const std::string &strMembers, unsigned requester = 1001) {
        std::string strVer;
        ErrClear();
        EXPECT_TRUE(backend_->Set(Req(R"("requester": )" + std::to_string(requester) + ", " + strMembers), strVer))
            << ::testing::PrintToString(ErrMsgs());
        return strVer;
    }

    // The object's text and version as read with the given extra members.
    Json::Value Read(const std::string &strMembers, bool blOk = true) {
        TESSEL_OBJECT obj;
        ErrClear();
        const bool ok =
            backend_->Get(Req(R"("requester": 1001)" + (strMembers.empty() ? "" : ", " + strMembers)), &obj);
        EXPECT_EQ(blOk, ok) << strMembers << ::testing::PrintToString(ErrMsgs());
        return VersionedFields(obj);
    }

    std::string Base() const { return kNsDir + "/" + id_; }
    std::string Repo() const { return Base() + "/version"; }
    // The repository belongs to alice; the tool runs as root.
    std::string Git(const std::string &strArgs) const {
        return Shell("git -c safe.directory='*' -C " + Repo() + " " + strArgs);
    }
    // Work areas of this object left in the namespace scratch directory.
    size_t WorkAreas() const {
        size_t n = 0;
        for (const auto &entry : fs::directory_iterator(kScratchDir)) {
            n += entry.path().filename().string().rfind(id_ + ".", 0) == 0;
        }
        return n;
    }

    ScratchDir scratch_;
    std::string id_;
    std::unique_ptr<TESSEL_BACKEND_OP> backend_{RegisterBackend::New("fs")};
};

TEST_F(VersionStore, CreateCommitsTextAndBinariesIntoASoundRepository) {
    ASSERT_TRUE(WriteFile(scratch_.file("upload"), "hello\n"));
    const std::string strVer = Create(R"("mtime": 1700000000, "text": {"title": "Hello", "n": {"a": 1},
        "memo": "12 apples"}, "raw_text": {"memo": true},
        "binary_files": [{"name": "photo.jpg", "format": "raw", "path": ")" +
                                      scratch_.file("upload") + R"("}],
        "commit_msg": {"listable": true, "note": "first"})");
    ASSERT_EQ(40u, strVer.size());

    EXPECT_EQ("status 0\n", Git("fsck --strict --no-dangling 2>&1; echo status $?"));
    EXPECT_EQ(strVer + "\nalice\nalice@example.com\n1700000000\n" +
                  R"({"author_uid":1001,"commit_msg":{"listable":true,"note":"first"}})" + "\n",
              Git("log --all --format=%H%n%an%n%ae%n%at%n%B"));
    std::string strFiles;  // as git lists them: sorted bytewise
    for (const std::string &strPath :
         std::set<std::string>{"text/" + Enc("title"), "text/" + Enc("n"), "text/" + Enc("memo"),
                               "binary/" + Enc("photo.jpg"), "binary_info/" + Enc("photo.jpg")}) {
        strFiles += strPath + "\n";
    }
    EXPECT_EQ(strFiles, Git("ls-files"));
    EXPECT_EQ("\"Hello\"", ReadFile(Repo() + "/text/" + Enc("title")));
    EXPECT_EQ("{\"a\":1}", ReadFile(Repo() + "/text/" + Enc("n")));
    EXPECT_EQ("12 apples", ReadFile(Repo() + "/text/" + Enc("memo")));
    EXPECT_EQ("hello\n", ReadFile(Repo() + "/binary/" + Enc("photo.jpg")));
    EXPECT_EQ(Parse(R"({"format": "raw", "md5": "b1946ac92492d2347c6235b4d2611184", "name": "photo.jpg",
                        "auto_mtime": 1700000000})"),
              ReadJson(Repo() + "/binary_info/" + Enc("photo.jpg")));
    EXPECT_EQ(Parse(R"({"commit_cnt": 1, "listable_commit_cnt": 1})"), ReadJson(Base() + "/git_info.json"));

    // Read back: raw text as its bare string, the rest as JSON.
    EXPECT_EQ(Parse(R"({"text": {"title": "Hello", "n": {"a": 1}, "memo": "12 apples"}, "version": ")" + strVer +
                    R"(", "commit_msg": {"listable": true, "note": "first"}, "mtime": 1700000000})"),
              Read(R"("field": {"text": true})"));
}

TEST_F(VersionStore, SetsOnTheLatestAndOnOlderVersions) {
    const std::string v1 = Create(R"("mtime": 1700000000, "text": {"a": 1, "b": 2}, "commit_msg": "plain")");
    EXPECT_EQ(Parse(R"({"commit_cnt": 1, "listable_commit_cnt": 0})"), ReadJson(Base() + "/git_info.json"));

    // On the latest: a changed field and a removed one.
    const std::string v2 = Set(R"("version": ")" + v1 + R"(", "mtime": 1700000010, "text": {"a": 10, "b": null},
                                  "commit_msg": {"listable": true}, "metatext": {"k": "v"})");
    ASSERT_EQ(40u, v2.size());
    EXPECT_NE(v1, v2);
    EXPECT_EQ("text/" + Enc("a") + "\n", Git("ls-files"));
    EXPECT_EQ("10", ReadFile(Repo() + "/text/" + Enc("a")));
    EXPECT_EQ(Parse(R"({"commit_cnt": 2, "listable_commit_cnt": 1})"), ReadJson(Base() + "/git_info.json"));
    EXPECT_EQ(0u, WorkAreas());

    // Nothing versioned: the given version back, no commit, no count.
    EXPECT_EQ(v1, Set(R"("version": ")" + v1 + R"(", "mtime": 1700000015, "metatext": {"k": "w"})"));
    EXPECT_EQ("2\n", Git("rev-list --all --count"));
    EXPECT_EQ(Parse(R"({"commit_cnt": 2, "listable_commit_cnt": 1})"), ReadJson(Base() + "/git_info.json"));

    // On the older version: a branch of its own, and the newest becomes the latest.
    const std::string v3 = Set(R"("version": ")" + v1 + R"(", "mtime": 1700000020, "text": {"c": 3})");
    const std::string strHeads = Git("for-each-ref refs/heads");
    EXPECT_EQ(2, std::count(strHeads.begin(), strHeads.end(), '\n')) << strHeads;
    EXPECT_EQ(v1 + "\n", Git("log -1 --format=%P " + v3));
    EXPECT_EQ(Parse(R"({"commit_cnt": 3, "listable_commit_cnt": 1})"), ReadJson(Base() + "/git_info.json"));
    EXPECT_EQ(Parse(R"({"text": {"a": 1, "b": 2, "c": 3}, "version": ")" + v3 +
                    R"(", "commit_msg": null, "mtime": 1700000020})"),
              Read(R"("field": {"text": true})"));

    // An older version is checked out into the work area, which then goes.
    // A file where the work area would be made shows which reads need one.
    const std::string strWorkArea = kScratchDir + "/" + id_ + "." + tessel::FsScratchName();
    ASSERT_TRUE(WriteFile(strWorkArea, "in the way"));
    EXPECT_EQ(v3, Read(R"("version": ")" + v3 + R"(", "field": {"text": true})")["version"].asString());
    Read(R"("version": ")" + v2 + R"(", "field": {"text": true})", false);
    EXPECT_EQ(TESSEL_ERR_MKDIR, ErrCode());
    EXPECT_EQ((Msgs{"!TesselRootFSMkdirP(strTmpDir.c_str(), UID_ERR)", "!mf_LoadGitVersion(strDir, &blIsLatest)",
                    "!mf_GetGit(pObject)"}),
              ErrMsgs());
    EXPECT_EQ("in the way", ReadFile(strWorkArea));
    ASSERT_TRUE(fs::remove(strWorkArea));
    EXPECT_EQ(Parse(R"({"text": {"a": 10}, "version": ")" + v2 +
                    R"(", "commit_msg": {"listable": true}, "mtime": 1700000010})"),
              Read(R"("version": ")" + v2 + R"(", "field": {"text": true})"));
    EXPECT_EQ(0u, WorkAreas());

    // A version that does not exist.
    Read(R"("version": "0123456789012345678901234567890123456789", "field": {"text": true})", false);
    EXPECT_EQ(TESSEL_ERR_NOT_EXISTS, ErrCode());
    const Msgs msgs = ErrMsgs();
    ASSERT_LE(2u, msgs.size());
    EXPECT_EQ((Msgs{"!mf_LoadGitVersion(strDir, &blIsLatest)", "!mf_GetGit(pObject)"}),
              Msgs(msgs.end() - 2, msgs.end()));
    EXPECT_EQ(0u, WorkAreas());
}

TEST_F(VersionStore, ReadsWhatTheSelectionAndTheFilterLeave) {
    const std::string v1 = Create(R"("mtime": 1700000000, "text": {"a": 1, "b": "two", "tmp_x": 3, "tmp": 4})");
    const Json::Value jFilter = Parse(R"({"text": {"key": ["b"], "prefix": ["tmp_"]}})");
    TESSEL_OBJECT obj;
    Json::Value jParm = Req(R"("requester": 1001, "field": {"text": true})");
    jParm["field_filter"] = jFilter;
    ASSERT_TRUE(backend_->Get(jParm, &obj)) << ::testing::PrintToString(ErrMsgs());
    EXPECT_EQ(Parse(R"({"a": 1, "tmp": 4})"), obj.get_text());

    EXPECT_EQ(Parse(R"({"a": 1, "b": "two"})"),
              Read(R"("field": {"text": {"a": true, "b": {"x": true}, "tmp": false, "gone": true}})")["text"]);
    // Without a text selection the text is not read; version and time are.
    // Named fields that are not asked for stay out.
    EXPECT_EQ(Parse(R"({"text": {}, "version": ")" + v1 + R"(", "commit_msg": null, "mtime": 1700000000})"),
              Read(R"("field": {"text": {"a": false}})"));
    EXPECT_EQ(Parse(R"({"text": null, "version": ")" + v1 + R"(", "commit_msg": null, "mtime": 1700000000})"),
              Read(""));
}

TEST_F(VersionStore, ListsDiffsAndRenames) {
    const std::string v1 = Create(R"("mtime": 1700000000, "text": {"a": 1, "b": 2}, "commit_msg": {"listable": true})");
    // Only the owner may name another author in the message.
    const std::string v2 = Set(R"("version": ")" + v1 + R"(", "mtime": 1700000010, "text": {"a": 5, "b": null, "c": 7},
                                  "commit_msg": {"k": 2, "author_uid": 1007})",
                               kUidBob);
    const std::string v3 = Set(R"("version": ")" + v2 + R"(", "mtime": 1700000020, "text": {"c": 8},
                                  "commit_msg": {"listable": true, "k": 3, "author_uid": 1007})");

    // Each record as JSON; the versions listed in order.
    auto asJson = [](const TESSEL_OBJECT_VERSION &ver) {
        Json::Value jVer(Json::objectValue);
        jVer["ns_id"] = ver.get_ns() + "/" + ver.get_id();
        jVer["author"] = (Json::Int64)ver.get_author();
        jVer["mtime"] = (Json::Int64)ver.get_mtime();
        jVer["commit_msg"] = ver.get_commit_msg();
        jVer["last_version"] = ver.get_last_version();
        return jVer;
    };
    unsigned total = 0, listable = 0;
    std::vector<Json::Value> records;
    auto list = [&](const std::string &strMembers) {
        TESSEL_OBJECT_VERSION *pHead = nullptr;
        const int count = backend_->VersionList(Req(strMembers), &pHead, total, listable);
        std::vector<std::string> versions;
        records.clear();
        for (TESSEL_OBJECT_VERSION *p = pHead; p != nullptr; p = p->next) {
            versions.push_back(p->get_version());
            records.push_back(asJson(*p));
        }
        TesselObjectVersionFreeList(pHead);
        EXPECT_EQ((int)versions.size(), count);
        return versions;
    };
    using Vers = std::vector<std::string>;
    EXPECT_EQ((Vers{v3, v2, v1}), list(""));
    EXPECT_EQ(3u, total);
    EXPECT_EQ(2u, listable);
    const std::string strNsId = "ledger/" + id_;
    EXPECT_EQ(Parse(R"({"ns_id": ")" + strNsId + R"(", "author": 1007, "mtime": 1700000020, "last_version": [")" + v2 +
                    R"("], "commit_msg": {"listable": true, "k": 3, "author_uid": 1007}})"),
              records[0]);
    EXPECT_EQ(Parse(R"({"ns_id": ")" + strNsId + R"(", "author": 1001, "mtime": 1700000000, "last_version": [],
                        "commit_msg": {"listable": true}})"),
              records[2]);
    EXPECT_EQ((Vers{v1, v2, v3}), list(R"("sort_direction": "asc")"));
    EXPECT_EQ((Vers{v2}), list(R"("limit": 1, "offset": 1, "sort_direction": "desc")"));
    EXPECT_EQ((Vers{v1, v3}), list(R"("filter": {"listable": true}, "sort_direction": "Asc")"));

    // One version; "ver" names it, the latest when absent.
    TESSEL_OBJECT_VERSION ver;
    ASSERT_TRUE(backend_->VersionGet(Req(R"("ver": ")" + v2 + R"(")"), &ver)) << ::testing::PrintToString(ErrMsgs());
    EXPECT_EQ(v2, ver.get_version());
    EXPECT_EQ(Parse(R"({"ns_id": ")" + strNsId + R"(", "author": 1002, "mtime": 1700000010, "last_version": [")" + v1 +
                    R"("], "commit_msg": {"k": 2, "author_uid": 1007}})"),
              asJson(ver));
    ASSERT_TRUE(backend_->VersionGet(Req(""), &ver));
    EXPECT_EQ(v3, ver.get_version());

    // Differences: files of text and binaries only, by their names.
    Json::Value jDiff(Json::objectValue);
    ASSERT_TRUE(backend_->VersionDiff(Req(R"("old_version": ")" + v1 + R"(")"), jDiff))
        << ::testing::PrintToString(ErrMsgs());
    EXPECT_EQ(Parse(R"({"text": {"a": "modified", "b": "deleted", "c": "created"}})"), jDiff);

    // A rename is a commit of its own, by the requester.
    std::string v4;
    ASSERT_TRUE(backend_->FieldRename(Req(R"("requester": 1001, "version": ")" + v3 + R"(", "segment": "text",
                                              "old_field": "c", "new_field": "see", "mtime": 1700000030)"),
                                      v4))
        << ::testing::PrintToString(ErrMsgs());
    EXPECT_EQ(Parse(R"({"a": 5, "see": 8})"), Read(R"("field": {"text": true})")["text"]);
    jDiff = Json::Value(Json::objectValue);
    ASSERT_TRUE(backend_->VersionDiff(Req(R"("old_version": ")" + v3 + R"(", "new_version": ")" + v4 + R"(")"), jDiff));
    EXPECT_EQ(Parse(R"({"text": {"c": "deleted", "see": "created"}})"), jDiff);
    EXPECT_EQ("alice\n" + v3 + "\n", Git("log -1 --format=%an%n%P " + v4));
    EXPECT_EQ(Parse(R"({"commit_cnt": 4, "listable_commit_cnt": 2})"), ReadJson(Base() + "/git_info.json"));

    ErrClear();
    EXPECT_FALSE(backend_->FieldRename(Req(R"("version": ")" + v4 + R"(", "segment": "meta", "old_field": "a",
                                              "new_field": "b")"),
                                       v4));
    EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, ErrCode());
    EXPECT_EQ((Msgs{"segment error, segment=\"meta\"", "!mf_RenameGitField(strNewVer)"}), ErrMsgs());
}

TEST_F(VersionStore, SetOwnerHandsEveryFileOver) {
    const std::string v1 = Create(R"("mtime": 1700000000, "text": {"a": 1}, "metatext": {"m": 1})");
    std::string strVer;
    EXPECT_FALSE(backend_->SetOwner(Req(R"("new_owner": 4242)"), strVer));
    EXPECT_EQ(TESSEL_ERR_USER_NOT_EXISTS, ErrCode());
    EXPECT_EQ(Msgs{"!TesselCheckUID(newOwner)"}, ErrMsgs());
    ASSERT_TRUE(backend_->SetOwner(Req(R"("new_owner": 1002)"), strVer)) << ::testing::PrintToString(ErrMsgs());
    EXPECT_EQ(v1, strVer);
    size_t nEntries = 0;
    for (const auto &entry : fs::recursive_directory_iterator(Base())) {
        struct stat st;
        ASSERT_EQ(0, lstat(entry.path().c_str(), &st));
        EXPECT_EQ(kUidBob, st.st_uid) << entry.path();
        ++nEntries;
    }
    EXPECT_LT(10u, nEntries);
}

// Downloads in a child whose standard output goes to a file: the response,
// and the child's error frames (one a line) when it failed.
std::pair<std::string, std::string> Download(const Json::Value &jParm) {
    ScratchDir dir;
    const int rc = RunInChild([&]() {
        unsetenv("HTTP_IF_NONE_MATCH");
        const int fd = open(dir.file("out").c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
        if (fd < 0 || dup2(fd, STDOUT_FILENO) < 0) {
            return 99;
        }
        ErrClear();
        std::unique_ptr<TESSEL_BACKEND_OP> backend(RegisterBackend::New("fs"));
        const bool ok = backend->Download(jParm);
        fflush(stdout);
        std::string strMsgs;
        for (const std::string &strMsg : ErrMsgs()) strMsgs += strMsg + "\n";
        return WriteFile(dir.file("stack"), strMsgs) ? (ok ? 0 : 1) : 98;
    });
    EXPECT_TRUE(0 == rc || 1 == rc) << rc;
    return {ReadFile(dir.file("out")), ReadFile(dir.file("stack"))};
}

TEST_F(VersionStore, BinariesComeAndGoWithTheirDescriptions) {
    ASSERT_TRUE(WriteFile(scratch_.file("one"), "one"));
    Create(R"("mtime": 1699999999, "text": {},
        "binary_files": [{"name": "c.txt", "format": "raw", "path": ")" +
           scratch_.file("one") + R"("}])");
    const std::string strOther = id_;
    const std::string v1 = Create(R"("mtime": 1700000000, "text": {},
        "binary_files": [{"name": "a.txt", "format": "raw", "path": ")" +
                                  scratch_.file("one") + R"("},
                         {"name": "b.txt", "format": "base64", "path": ")" +
                                  scratch_.file("one") + R"("},
                         {"name": "c.txt", "format": "object", "id": ")" +
                                  strOther + R"("}])");
    // Another object's binary comes with its own description.
    for (const char *szFolder : {"/binary/", "/binary_info/"}) {
        EXPECT_EQ(ReadFile(kNsDir + "/" + strOther + "/version" + szFolder + Enc("c.txt")),
                  ReadFile(Repo() + szFolder + Enc("c.txt")));
    }
    const std::string v2 = Set(R"("version": ")" + v1 + R"(", "mtime": 1700000010,
        "binary_files": [{"name": "a.txt", "format": "delete"}])");
    EXPECT_EQ("binary/" + Enc("b.txt") + "\nbinary/" + Enc("c.txt") + "\nbinary_info/" + Enc("b.txt") +
                  "\nbinary_info/" + Enc("c.txt") + "\n",
              Git("ls-files"));
    EXPECT_FALSE(fs::exists(Repo() + "/binary/" + Enc("a.txt")));
    EXPECT_FALSE(fs::exists(Repo() + "/binary_info/" + Enc("a.txt")));
    Json::Value jDiff(Json::objectValue);
    ASSERT_TRUE(backend_->VersionDiff(Req(R"("old_version": ")" + v1 + R"(")"), jDiff));
    EXPECT_EQ(Parse(R"({"binary": {"a.txt": "deleted"}})"), jDiff);

    // The descriptions of the version read come with every read.
    TESSEL_OBJECT obj;
    ASSERT_TRUE(backend_->Get(Req(R"("requester": 1001, "version": ")" + v1 + R"(")"), &obj));
    EXPECT_EQ(Parse(R"({"a.txt": {"format": "raw", "md5": "f97c5d29941bfb1b2fdab0874906ab82", "name": "a.txt",
                                  "auto_mtime": 1700000000},
                        "b.txt": {"format": "base64", "md5": "f97c5d29941bfb1b2fdab0874906ab82", "name": "b.txt",
                                  "auto_mtime": 1700000000},
                        "c.txt": {"format": "raw", "md5": "f97c5d29941bfb1b2fdab0874906ab82", "name": "c.txt",
                                  "auto_mtime": 1699999999}})"),
              obj.get_binary_info());

    // A file of an older version is sent from a checkout, which then goes.
    Json::Value jParm = Req(R"("requester": 1001, "segment": "binary", "field": "a.txt", "format": "raw")");
    jParm["version"] = v1;
    EXPECT_EQ(std::make_pair(std::string("Content-Type: text/plain\r\nContent-Length: 3\r\n\r\none"), std::string()),
              Download(jParm));
    EXPECT_EQ(0u, WorkAreas());
    jParm.removeMember("version");
    EXPECT_EQ(std::make_pair(std::string(), std::string("!QLIBCFileExist(strBinaryFilePath.c_str())\n"
                                                        "!mf_DownloadBinaryByDir(strBinaryDir, strBinaryInfoDir)\n"
                                                        "!mf_DownloadVersionBinary()\n")),
              Download(jParm));

    // A failed save commits nothing, counts nothing and leaves no work area.
    std::string strVer;
    ErrClear();
    EXPECT_FALSE(backend_->Set(Req(R"("requester": 1001, "version": ")" + v2 + R"(", "text": {"x": 1},
        "binary_files": [{"name": "d.txt", "format": "raw", "path": ")" +
                                   scratch_.file("missing") + R"("}])"),
                               strVer));
    EXPECT_EQ(TESSEL_ERR_OPEN_FILE, ErrCode());
    const Msgs msgs = ErrMsgs();
    ASSERT_LE(4u, msgs.size());
    EXPECT_EQ((Msgs{"!TesselObjectEvalFileMd5(strFile.c_str(), strMd5)",
                    "!TesselObjectVersionDataToDisk(pAddHash, pDelHash, m_jParm, strTmpDir)", "!mf_SaveGit(strNewVer)",
                    "!mf_SaveConfig(strNewVer)"}),
              Msgs(msgs.end() - 4, msgs.end()));
    EXPECT_EQ("2\n", Git("rev-list --all --count"));
    EXPECT_EQ(Parse(R"({"commit_cnt": 2, "listable_commit_cnt": 0})"), ReadJson(Base() + "/git_info.json"));
    EXPECT_EQ(0u, WorkAreas());
}

}  // namespace
