// Objects laid out by the file-system store for the read tests: the
// namespace "ledger" placed the linked way, the settings file switching the
// store and the namespace on, and objects of sandbox users with given acls.
#ifndef TESSEL_TESTS_OBJECT_GET_FIXTURE_H
#define TESSEL_TESTS_OBJECT_GET_FIXTURE_H

#include <stdlib.h>

#include <memory>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <json/value.h>

#include "support/error_stack.h"
#include "support/json_text.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_backend.h"
#include "tesselobject.h"

namespace get_test {

using Msgs = std::vector<std::string>;

const std::string kNsDir = "/volume1/@Tessel/ledger";
const char kConf[] = "/usr/quor/etc/tessel.conf";
const char kConfOpen[] = R"({"Access": {"enable": true, "enable_ns_ledger": true}})";

class GetFixture : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(tessel_test::InSandbox()) << "run through ctest: this test writes " << kConf;
        ASSERT_EQ(0, system(("mkdir -p " + kNsDir + " /usr/quor/etc/tessel/ns && ln -sfn " + kNsDir +
                             " /usr/quor/etc/tessel/ns/ledger")
                                .c_str()));
        ASSERT_TRUE(tessel_test::WriteFile(kConf, kConfOpen));
        tessel_test::ErrClear();
    }

    // A new object of owner with this acl (JSON text, "null" for none).
    static std::string Create(unsigned owner, const std::string &strAcl, const std::string &strCategory = "note") {
        std::unique_ptr<TESSEL_BACKEND_OP> pFs(RegisterBackend::New("fs"));
        Json::Value jParm(Json::objectValue);
        jParm["ns"] = "ledger";
        jParm["owner"] = owner;
        jParm["category"] = strCategory;
        jParm["parent_id"] = "";
        jParm["ctime"] = 100;
        jParm["metatext"] = tessel_test::Parse(R"({"k": "v"})");
        const Json::Value jAcl = tessel_test::Parse(strAcl);
        if (!jAcl.isNull()) {
            jParm["acl"] = jAcl;
        }
        std::string strId, strVer;
        EXPECT_TRUE(pFs->Create(jParm, strId, strVer)) << ::testing::PrintToString(tessel_test::ErrMsgs());
        tessel_test::ErrClear();
        return strId;
    }

    // A read request of requester for id, with further members as JSON text.
    static Json::Value Req(unsigned requester, const std::string &strId, const std::string &strMore = "{}") {
        Json::Value jParm = tessel_test::Parse(strMore);
        jParm["ns"] = "ledger";
        jParm["id"] = strId;
        jParm["requester"] = requester;
        return jParm;
    }
};

}  // namespace get_test

#endif  // TESSEL_TESTS_OBJECT_GET_FIXTURE_H
