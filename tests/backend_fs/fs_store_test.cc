// The file-system store through the backend registry: the object directory
// and its files, field selections on read, updates in place and their merge
// by modification time, and removal confined to the object's own directory.
#include <sys/stat.h>
#include <syslog.h>
#include <time.h>
#include <unistd.h>

#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include <git2.h>
#include <gtest/gtest.h>

#include "common/tessel_json.h"
#include "support/json_text.h"
#include "support/error_stack.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_backend.h"
#include "tessel_id.h"
#include "tesselobject.h"

using namespace tessel_test;
namespace fs = std::filesystem;

namespace {

const std::string kRepo = "/volume1/@Tessel";
const std::string kNsDir = kRepo + "/ledger";
using Msgs = std::vector<std::string>;

class FsStore : public ::testing::Test {
protected:
    void SetUp() override {
        // The namespace "ledger" placed the way the linked scheme places it.
        ASSERT_EQ(0, system(("mkdir -p " + kNsDir + " /usr/quor/etc/tessel/ns && ln -sfn " + kNsDir +
                             " /usr/quor/etc/tessel/ns/ledger")
                                .c_str()));
        ASSERT_NE(nullptr, backend_);
        ErrClear();
    }

    // A request on "ledger" with the given members.
    static Json::Value Req(const std::string &strMembers) {
        Json::Value jParm = Parse("{" + strMembers + "}");
        jParm["ns"] = "ledger";
        return jParm;
    }

    // A new object of alice's that carries no versioned field.
    std::string CreatePlain() {
        std::string strId, strVer;
        EXPECT_TRUE(backend_->Create(Req(R"("owner": 1001, "category": "note", "parent_id": "", "ctime": 100,
                                           "acl": {"enabled": false}, "metatext": {"k": "v"},
                                           "person": {"summary": {"count": 1}})"),
                                     strId, strVer))
            << ::testing::PrintToString(ErrMsgs());
        return strId;
    }

    std::unique_ptr<TESSEL_BACKEND_OP> backend_{RegisterBackend::New("fs")};
};

TEST_F(FsStore, CreateWritesTheObjectDirectoryAndItsFiles) {
    std::string strId, strVer;
    // A modification time is a versioned field: the first version is made.
    ASSERT_TRUE(backend_->Create(Req(R"("owner": 1001, "category": "note", "parent_id": "p1", "ctime": 100,
                                        "mtime": 100, "acl": {"enabled": true}, "metatext": {"k": "v", "n": 2})"),
                                 strId, strVer))
        << ::testing::PrintToString(ErrMsgs());
    EXPECT_EQ(40u, strVer.size());
    EXPECT_EQ(1001u, TesselObjectGetOwnerByID(strId));
    const std::string strBase = kNsDir + "/" + strId;
    EXPECT_EQ(Parse(
                  R"({"category": "note", "parent_id": "p1", "ctime": 100, "acl": {"enabled": true},
                       "auto_mtime": {"category": 100, "parent_id": 100, "ctime": 100, "acl": 100}})"),
              ReadJson(strBase + "/basic.json"));
    EXPECT_EQ(Parse(R"({"metatext": {"k": "v", "n": 2}, "auto_mtime": {"k": 100, "n": 100}})"),
              ReadJson(strBase + "/metatext.json"));
    // The repository's work tree holds the files of the latest version and
    // nothing else, so its empty folders are gone after the first commit.
    for (const char *szDir : {"", "/version", "/metabinary", "/metabinary_info", "/person"}) {
        struct stat st;
        ASSERT_EQ(0, stat((strBase + szDir).c_str(), &st)) << szDir;
        EXPECT_TRUE(S_ISDIR(st.st_mode)) << szDir;
        EXPECT_EQ(0700u, st.st_mode & 07777) << szDir;
        EXPECT_EQ(kUidAlice, st.st_uid) << szDir;
        EXPECT_EQ(kGidUsers, st.st_gid) << szDir;
    }
    EXPECT_EQ(Parse(R"({"commit_cnt": 1, "listable_commit_cnt": 0})"), ReadJson(strBase + "/git_info.json"));

    // A given version is refused before anything is made.
    const size_t nEntries = std::distance(fs::directory_iterator(kNsDir), fs::directory_iterator());
    ErrClear();
    EXPECT_FALSE(backend_->Create(Req(R"("owner": 1001, "category": "x", "version": "abc")"), strId, strVer));
    EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, ErrCode());
    EXPECT_EQ(Msgs{"jParm.isMember(\"version\")"}, ErrMsgs());
    EXPECT_EQ(nEntries, (size_t)std::distance(fs::directory_iterator(kNsDir), fs::directory_iterator()));

    ErrClear();
    EXPECT_FALSE(backend_->Create(Req(R"("category": "x")"), strId, strVer));
    EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, ErrCode());
    EXPECT_EQ((Msgs{"!m_jParm.isMember(\"owner\")", "!mf_init(jParm, true)"}), ErrMsgs());
}

TEST_F(FsStore, GetReadsWhatTheSelectionAsksFor) {
    const std::string strId = CreatePlain();
    auto get = [&](const std::string &strField, TESSEL_OBJECT &obj) {
        Json::Value jParm = Req(R"("requester": 1001)");
        jParm["id"] = strId;
        if (!strField.empty()) {
            jParm["field"] = Parse(strField);
        }
        ErrClear();
        return backend_->Get(jParm, &obj);
    };
    {
        // No selection: the plain fields, nothing optional.
        TESSEL_OBJECT obj;
        ASSERT_TRUE(get("", obj));
        EXPECT_EQ("ledger", obj.get_ns());
        EXPECT_EQ(strId, obj.get_id());
        EXPECT_EQ(kUidAlice, obj.get_owner());
        EXPECT_EQ("note", obj.get_category());
        EXPECT_EQ(100, obj.get_ctime());
        EXPECT_EQ(Parse(R"({"enabled": false})"), obj.get_acl());
        EXPECT_EQ(kNsDir + "/" + strId + "/basic.json", obj.get_path_info()["basic.json"].asString());
        EXPECT_TRUE(obj.get_metatext().isNull());
        EXPECT_TRUE(obj.get_person().isNull());
    }
    {
        // Every field of "basic.json" switched off: the file is not read.
        TESSEL_OBJECT obj;
        ASSERT_TRUE(get(R"({"category": false, "parent_id": false, "ctime": false, "acl": false})", obj));
        EXPECT_EQ("", obj.get_category());
        EXPECT_EQ(0, obj.get_ctime());
    }
    // A bool, a string and an object holding a true somewhere select; an
    // object of falses does not. Meta-binaries are read only when asked for;
    // this object has none.
    struct Selection {
        const char *field;
        Json::Value (TESSEL_OBJECT::*member)() const;
        const char *expected;
    } selections[] = {
        {R"({"metatext": true})", &TESSEL_OBJECT::get_metatext, R"({"k": "v"})"},
        {R"({"metatext": "all"})", &TESSEL_OBJECT::get_metatext, R"({"k": "v"})"},
        {R"({"metatext": {"x": {"k": true}}})", &TESSEL_OBJECT::get_metatext, R"({"k": "v"})"},
        {R"({"metatext": {"k": false}})", &TESSEL_OBJECT::get_metatext, "null"},
        {R"({"text": {"a": false}})", &TESSEL_OBJECT::get_metatext, "null"},
        {R"({"person": "summary"})", &TESSEL_OBJECT::get_person, R"({"count": 1})"},
        {R"({"metabinary_info": true})", &TESSEL_OBJECT::get_metabinary_info, "{}"},
    };
    for (const Selection &sel : selections) {
        TESSEL_OBJECT obj;
        ASSERT_TRUE(get(sel.field, obj)) << sel.field;
        EXPECT_EQ(Parse(sel.expected), (obj.*sel.member)()) << sel.field;
    }
    {
        // A number is a bad selector: logged and ignored.
        TESSEL_OBJECT obj;
        size_t mark = SyslogMark();
        ASSERT_TRUE(get(R"({"metatext": 7})", obj));
        EXPECT_TRUE(obj.get_metatext().isNull());
        auto line = WaitForSyslog("bad jField[metatext] type, jField[metatext]=7", mark, LOG_USER | LOG_ERR);
        ASSERT_TRUE(line.has_value());
        EXPECT_EQ(0u, line->message.find("backend_fs/tesselBackend_fs:"));
    }
    {
        TESSEL_OBJECT obj;
        Json::Value jParm = Req(R"("id": "1001_MISSING")");
        EXPECT_FALSE(backend_->Get(jParm, &obj));
        EXPECT_EQ(TESSEL_ERR_NOT_EXISTS, ErrCode());
        EXPECT_EQ(Msgs{"!QLIBCFileCheckDir(m_jPathInfo[TESSEL_ID_PATH].asCString())"}, ErrMsgs());
    }
}

TEST_F(FsStore, SetUpdatesInPlaceAndNeverLosesANewerValue) {
    const std::string strId = CreatePlain();
    const std::string strBase = kNsDir + "/" + strId;
    const Json::Value jBasic = ReadJson(strBase + "/basic.json");
    std::string strVer;

    Json::Value jParm = Req(R"("category": "memo")");
    jParm["id"] = strId;
    EXPECT_FALSE(backend_->Set(jParm, strVer));
    EXPECT_EQ(Msgs{"!jParm.isMember(\"version\")"}, ErrMsgs());
    jParm["version"] = "0123456789012345678901234567890123456789";
    ErrClear();
    ASSERT_TRUE(backend_->Set(jParm, strVer)) << ::testing::PrintToString(ErrMsgs());
    Json::Value jExpected = jBasic;
    jExpected["category"] = "memo";
    jExpected["auto_mtime"]["category"] = ReadJson(strBase + "/basic.json")["auto_mtime"]["category"];
    EXPECT_EQ(jExpected, ReadJson(strBase + "/basic.json"));
    EXPECT_LE(jBasic["auto_mtime"]["category"].asInt64(), jExpected["auto_mtime"]["category"].asInt64());

    // Meta-text entries at explicit times, arriving out of order.
    auto setAt = [&](long long mtime, const std::string &strMetaText) {
        Json::Value jSet = Req(R"("version": "0123456789012345678901234567890123456789")");
        jSet["id"] = strId;
        jSet["mtime"] = (Json::Int64)mtime;
        jSet["metatext"] = Parse(strMetaText);
        ErrClear();
        // Nothing versioned changes: the given version stays the object's.
        EXPECT_TRUE(backend_->Set(jSet, strVer)) << ::testing::PrintToString(ErrMsgs());
        EXPECT_EQ(jSet["version"].asString(), strVer);
        return ReadJson(strBase + "/metatext.json");
    };
    const long long t0 = time(NULL) + 1000;  // newer than the create's entry "k"
    EXPECT_EQ(Parse(R"({"metatext": {"k": "v", "a": "3"}, "auto_mtime": {"k": )" + std::to_string(t0 + 300) +
                    R"(, "a": )" + std::to_string(t0 + 300) + "}}"),
              setAt(t0 + 300, R"({"a": "3", "k": "v"})"));
    Json::Value jMeta = setAt(t0 + 200, R"({"a": "2", "b": "2", "k": null})");
    EXPECT_EQ(Parse(R"({"k": "v", "a": "3", "b": "2"})"), jMeta["metatext"]);
    EXPECT_EQ(t0 + 300, jMeta["auto_mtime"]["a"].asInt64());
    EXPECT_EQ(t0 + 200, jMeta["auto_mtime"]["b"].asInt64());
    // A newer removal, then an older write that must not bring it back.
    jMeta = setAt(t0 + 400, R"({"b": null})");
    EXPECT_EQ(Parse(R"({"k": "v", "a": "3"})"), jMeta["metatext"]);
    jMeta = setAt(t0 + 350, R"({"b": "again", "a": "4"})");
    EXPECT_EQ(Parse(R"({"k": "v", "a": "4"})"), jMeta["metatext"]);
    EXPECT_EQ(t0 + 400, jMeta["auto_mtime"]["b"].asInt64());
}

TEST_F(FsStore, DeleteRemovesTheObjectDirectoryAndNothingElse) {
    const std::string strGone = CreatePlain();
    const std::string strKept = CreatePlain();
    // Directories a path built from a hostile name would reach.
    for (const std::string &strDir : {kRepo + "/x", kNsDir + "/1001_a/b", kRepo + "/other"}) {
        ASSERT_TRUE(fs::create_directories(strDir)) << strDir;
    }
    struct Hostile {
        std::string ns, id;
        Msgs msgs;
    };
    const std::string kIdFrame = "!TesselIsPathComponent(jParm[\"id\"].asString())";
    for (const Hostile &h :
         {Hostile{"ledger", "..", {"Bad ID [..]"}}, Hostile{"ledger", "../x", {"Bad ID [../x]"}},
          Hostile{"ledger", "a/b", {"Bad ID [a/b]"}}, Hostile{"ledger", "1001_a/b", {kIdFrame}},
          Hostile{"ledger", std::string("1001_a\0b", 8), {kIdFrame}},
          Hostile{"..", strKept, {"!TesselIsPathComponent(jParm[\"ns\"].asString())"}},
          Hostile{"ledger/../other", strKept, {"!TesselIsPathComponent(jParm[\"ns\"].asString())"}}}) {
        Json::Value jParm(Json::objectValue);
        jParm["ns"] = h.ns;
        jParm["id"] = h.id;
        SCOPED_TRACE(h.ns + " " + h.id);
        ErrClear();
        EXPECT_FALSE(backend_->Delete(jParm));
        EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
        ASSERT_FALSE(ErrMsgs().empty());
        EXPECT_EQ(h.msgs.front(), ErrMsgs().front());
        EXPECT_EQ("!mf_init(jParm)", ErrMsgs().back());
    }
    for (const std::string &strDir :
         {kRepo + "/x", kNsDir + "/1001_a/b", kRepo + "/other", kNsDir + "/" + strGone, kNsDir + "/" + strKept}) {
        EXPECT_TRUE(fs::is_directory(strDir)) << strDir;
    }

    Json::Value jParm = Req("");
    jParm["id"] = strGone;
    ASSERT_TRUE(backend_->Delete(jParm)) << ::testing::PrintToString(ErrMsgs());
    EXPECT_FALSE(fs::exists(kNsDir + "/" + strGone));
    EXPECT_TRUE(fs::exists(kNsDir + "/" + strKept + "/basic.json"));
    EXPECT_TRUE(fs::is_directory(kNsDir + "/1001_a/b"));
    // Nothing there any more: nothing to do.
    EXPECT_TRUE(backend_->Delete(jParm));

    ErrClear();
    EXPECT_FALSE(backend_->Delete(Req("")));
    EXPECT_EQ(Msgs{"!jParm.isMember(\"id\")"}, ErrMsgs());
}

}  // namespace

// libgit2 counts its users: each store is one while it exists, and the count
// falls back when the store goes, so stores made and deleted by the thousand
// never leave libgit2 up or down behind an unrelated user's back.
TEST(FsStoreLibgit2, EachStoreHoldsOneReferenceWhileItExists) {
    auto depth = [] {
        int n = git_libgit2_init();
        git_libgit2_shutdown();
        return n - 1;
    };
    std::unique_ptr<TESSEL_BACKEND_OP>(RegisterBackend::New("fs"));  // the process's own reference
    const int before = depth();
    {
        std::unique_ptr<TESSEL_BACKEND_OP> first(RegisterBackend::New("fs"));
        ASSERT_NE(first, nullptr);
        EXPECT_EQ(depth(), before + 1);
        std::unique_ptr<TESSEL_BACKEND_OP> second(RegisterBackend::New("fs"));
        EXPECT_EQ(depth(), before + 2);
    }
    EXPECT_EQ(depth(), before);
    EXPECT_GE(before, 1) << "libgit2 stays up for the process between stores";
}
