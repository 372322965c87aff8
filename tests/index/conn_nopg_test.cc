// The index connection on a machine whose PostgreSQL server is not running
// (this program's sandbox starts none).
#include <syslog.h>

#include <memory>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "index/index_test_util.h"
#include "support/error_stack.h"
#include "support/sandbox.h"
#include "tessel_backend.h"

namespace {

using index_test::CountOneClosing;
using tessel_test::ErrCode;
using tessel_test::ErrMsgs;

const std::string kNotRunning = "FALSE == QLIBServiceIsRunning(SZ_PGSQL_SERVICE_NAME)";
const std::string kNotRunningLog = "Failed [" + kNotRunning + "], err=";

TEST(IndexConnWithoutServer, EveryOpenFailsWith1024AndNothingIsKept) {
    ASSERT_FALSE(tessel_test::HasPostgres());
    for (int i = 0; i < 2; ++i) {
        size_t mark = tessel_test::SyslogMark();
        EXPECT_EQ(nullptr, TesselOpenConn());
        EXPECT_EQ(1024, ErrCode());
        EXPECT_EQ(std::vector<std::string>{kNotRunning}, ErrMsgs());
        EXPECT_EQ("index/tessel_index", TesselErrMsgGet()[0u]["file"].asString());
        auto line = tessel_test::WaitForSyslog(kNotRunningLog, mark, LOG_USER | LOG_ERR);
        ASSERT_TRUE(line.has_value());
        EXPECT_EQ(0u, line->message.find("index/tessel_index:")) << line->message;
    }
    EXPECT_FALSE(TesselAppendPersonTable());
    EXPECT_EQ(1024, ErrCode());
    EXPECT_EQ((std::vector<std::string>{kNotRunning, "!pConn"}), ErrMsgs());

    // The index store is still made, without a connection.
    std::unique_ptr<TESSEL_BACKEND_OP> pgsql(RegisterBackend::New("pgsql"));
    EXPECT_NE(nullptr, pgsql);
    EXPECT_EQ(std::vector<std::string>{kNotRunning}, ErrMsgs());
}

TEST(IndexConnWithoutServer, VacuumDueWithoutServerKeepsTheCount) {
    ASSERT_TRUE(tessel_test::WriteFile(index_test::kCounter, "{\"vacuum_cnt\": 50001}"));
    size_t mark = tessel_test::SyslogMark();
    EXPECT_EQ("{\"vacuum_cnt\":50001}", CountOneClosing());
    EXPECT_TRUE(tessel_test::WaitForSyslog(kNotRunningLog, mark, LOG_USER | LOG_ERR).has_value());
}

}  // namespace
