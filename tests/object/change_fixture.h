// The namespace "ledger" as the create and set tests use it: placed the
// linked way, switched on in the settings, its hook module (the recording
// module built beside the programs) described, and the index database of the
// sandbox's PostgreSQL server.
#ifndef TESSEL_TESTS_OBJECT_CHANGE_FIXTURE_H
#define TESSEL_TESTS_OBJECT_CHANGE_FIXTURE_H

#include <dirent.h>
#include <stdlib.h>
#include <unistd.h>

#include <set>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <json/value.h>
#include <json/writer.h>
#include <libpq-fe.h>

#include "support/error_stack.h"
#include "support/json_text.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tesselobject.h"

namespace change_test {

using Msgs = std::vector<std::string>;
using tessel_test::Parse;

const std::string kNsDir = "/volume1/@Tessel/ledger";
const std::string kHookLog = "/tmp/hook.log";

class ChangeFixture : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(tessel_test::HasPostgres()) << "run through ctest";
        ASSERT_EQ(0, system(("rm -rf " + kNsDir + " && mkdir -p " + kNsDir +
                             " /usr/quor/etc/tessel/ns && ln -sfn " + kNsDir + " /usr/quor/etc/tessel/ns/ledger")
                                .c_str()));
        ASSERT_TRUE(tessel_test::WriteFile("/usr/quor/etc/tessel.conf",
                                           R"({"Access": {"enable": true, "enable_ns_ledger": true}})"));
        ASSERT_TRUE(tessel_test::WriteFile("/usr/local/libexec/tessel/ledger.lib",
                                           std::string("{\"lib\": \"") + TEST_RECORDING_HOOK + "\"}"));
        unlink(kHookLog.c_str());
        // The first create makes the database; later tests start from no rows.
        Sql("DELETE FROM object; DELETE FROM person");
        tessel_test::ErrClear();
    }

    // A request on "ledger" by requester with the members of strMembers,
    // recording hook calls.
    static Json::Value Req(unsigned requester, const std::string &strMembers = "") {
        Json::Value jParm = Parse("{" + strMembers + "}");
        jParm["ns"] = "ledger";
        jParm["requester"] = requester;
        jParm["@hook_log"] = kHookLog;
        return jParm;
    }

    // A new object made through the create under test; its id.
    static std::string Made(unsigned requester, const std::string &strMembers = "") {
        Json::Value jParm = Req(requester, "\"category\": \"note\"" + (strMembers.empty() ? "" : ", " + strMembers));
        TESSEL_OBJECT obj;
        EXPECT_TRUE(obj.Create(jParm)) << ::testing::PrintToString(tessel_test::ErrMsgs());
        tessel_test::ErrClear();
        return obj.get_id();
    }

    // The object as root reads it, acl included.
    static Json::Value Stored(const std::string &strId) {
        TESSEL_OBJECT obj;
        Json::Value jRet(Json::objectValue);
        Json::Value jGet = Req(0);
        jGet["id"] = strId;
        jGet["field"] = TesselObjectFieldAll();
        EXPECT_TRUE(obj.Get(jGet)) << ::testing::PrintToString(tessel_test::ErrMsgs());
        obj.toJson(Parse(R"({"acl": true, "metatext": true, "text": true})"), jRet, true);
        return jRet;
    }

    // Statements on the index database; the text of the first field of the
    // last result's first row ("" when there is none).
    static std::string Sql(const std::string &strSql) {
        PGconn *conn = tessel_test::PgConnect("tessel");
        std::string strOut;
        if (conn) {
            strOut = tessel_test::PgValue(conn, strSql).value_or("");
            PQfinish(conn);
        }
        return strOut;
    }

    static std::set<std::string> ObjectDirs() {
        std::set<std::string> names;
        if (DIR *dir = opendir(kNsDir.c_str())) {
            while (dirent *ent = readdir(dir)) {
                if (ent->d_name[0] != '.') {
                    names.insert(ent->d_name);
                }
            }
            closedir(dir);
        }
        return names;
    }

    static std::vector<std::string> HookLines() {
        std::vector<std::string> lines;
        std::string strText = tessel_test::ReadFile(kHookLog);
        for (size_t pos = 0, nl; (nl = strText.find('\n', pos)) != std::string::npos; pos = nl + 1) {
            lines.push_back(strText.substr(pos, nl - pos));
        }
        return lines;
    }
};

}  // namespace change_test

#endif  // TESSEL_TESTS_OBJECT_CHANGE_FIXTURE_H
