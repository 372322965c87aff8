// What the version operation tests share: requests on the namespace
// "ledger", JSON frames for messages, platform string hashes, and one object
// of alice's made through the store the operations use.
#ifndef TESSEL_TESTS_VERSION_VERSION_TEST_UTIL_H
#define TESSEL_TESTS_VERSION_VERSION_TEST_UTIL_H

#include <memory>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "object/object_test_util.h"
#include "support/error_stack.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_backend.h"
#include "tesselobjectversion.h"

namespace version_test {

using namespace tessel_test;
using object_test::Text;
using Msgs = std::vector<std::string>;

const std::string kNsDir = "/volume1/@Tessel/ledger";
const char kAcl[] = R"("acl": {"enabled": true, "zem_user": {"1002": {"perm": "ro"}}})";

// A request on "ledger" with the given members.
inline Json::Value Req(const std::string &strMembers) {
    Json::Value jParm = Parse("{" + strMembers + "}");
    jParm["ns"] = "ledger";
    return jParm;
}

inline std::string Frames() { return ::testing::PrintToString(ErrMsgs()); }

// A QLIBSZHASH of the given pairs, freed at the end of the scope.
struct Hash {
    explicit Hash(std::vector<std::pair<std::string, std::string>> kv = {}) : p(QLIBCSzHashAlloc(16)) {
        for (const auto &e : kv) {
            QLIBCSzHashSetValue(p, e.first.c_str(), e.second.c_str());
        }
    }
    ~Hash() { QLIBCSzHashFree(p); }
    Hash(const Hash &) = delete;
    Hash &operator=(const Hash &) = delete;
    QLIBSZHASH *p;
};

// One object of alice's that bob may read, made through the store the
// operations use, with the namespace "ledger" enabled. With versions:
//   v1 (t=1000): title "one", body "b"                      {"listable": true, "note": "first"}
//   v2 (t=2000): title "two"                                 "plain text"
//   v3 (t=3000): body removed, extra "x", binary a.bin added {"listable": true}
class VersionApi : public ::testing::Test {
protected:
    static std::string MakeObject(bool blVersions) {
        EXPECT_TRUE(WriteFile("/usr/quor/etc/tessel.conf", R"({"Access": {"enable": true, "enable_ns_ledger": true}})"));
        EXPECT_EQ(0, system(("mkdir -p " + kNsDir + " /usr/quor/etc/tessel/ns && ln -sfn " + kNsDir +
                             " /usr/quor/etc/tessel/ns/ledger").c_str()));
        std::unique_ptr<TESSEL_BACKEND_OP> fs(RegisterBackend::New("fs"));
        std::string strId, strVer;
        const std::string strCreate = std::string(R"("owner": 1001, "requester": 1001, "category": "note",)") +
                                      R"("parent_id": "", "ctime": 1000, )" + kAcl;
        if (!blVersions) {
            EXPECT_TRUE(fs->Create(Req(strCreate), strId, strVer)) << Frames();
            return strId;
        }
        EXPECT_TRUE(fs->Create(Req(strCreate + R"(, "mtime": 1000, "text": {"title": "one", "body": "b"},
                                                   "commit_msg": {"listable": true, "note": "first"})"),
                               strId, strVer)) << Frames();
        s_ver = {strVer};
        EXPECT_TRUE(WriteFile("/tmp/a.bin", "binary bytes"));
        for (const char *szChange :
             {R"("mtime": 2000, "text": {"title": "two"}, "commit_msg": "plain text")",
              R"("mtime": 3000, "text": {"body": null, "extra": "x"}, "commit_msg": {"listable": true},
                 "binary_files": [{"name": "a.bin", "format": "bin", "path": "/tmp/a.bin"}])"}) {
            Json::Value jSet = Req(std::string(R"("owner": 1001, "requester": 1001, )") + szChange);
            jSet["id"] = strId;
            jSet["version"] = s_ver.back();
            EXPECT_TRUE(fs->Set(jSet, strVer)) << Frames();
            s_ver.push_back(strVer);
        }
        return strId;
    }
    static void SetUpTestSuite() { s_id = MakeObject(true); }
    void SetUp() override {
        ASSERT_EQ(3u, s_ver.size());
        ErrClear();
    }
    static Json::Value Ask(unsigned requester, const std::string &strMembers = "") {
        Json::Value jParm = Req(strMembers);
        jParm["id"] = s_id;
        jParm["requester"] = requester;
        return jParm;
    }
    // The version as applications see it, with ns and id.
    static std::string Shown(const TESSEL_OBJECT_VERSION *pVer) {
        Json::Value jRet(Json::objectValue);
        EXPECT_TRUE(pVer && pVer->toJson(Parse(R"({"ns": true, "id": true})"), jRet));
        return Text(jRet);
    }
    static std::string Expected(int i) {
        const char *msgs[] = {R"({"listable":true,"note":"first"})", "\"plain text\"", R"({"listable":true})"};
        return R"({"author":"alice","commit_msg":)" + std::string(msgs[i]) + R"(,"id":")" + s_id +
               R"(","last_version":)" + (i ? "[\"" + s_ver[i - 1] + "\"]" : "[]") + R"(,"mtime":)" +
               std::to_string(1000 * (i + 1)) + R"(,"ns":"ledger","version":")" + s_ver[i] + "\"}";
    }
    static std::vector<std::string> Versions(const TESSEL_OBJECT_VERSION *p) {
        std::vector<std::string> v;
        for (; p; p = p->next) {
            v.push_back(p->get_version());
        }
        return v;
    }

    static inline std::string s_id;
    static inline std::vector<std::string> s_ver;
};

}  // namespace version_test

#endif  // TESSEL_TESTS_VERSION_VERSION_TEST_UTIL_H
