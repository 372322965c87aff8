// The index connection against the sandbox's private server, which starts
// without a "tessel" database. The test process itself never opens the
// connection: every scenario runs in a fresh child, and each test starts with
// the database and the vacuum counter gone.
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <libpq-fe.h>

#include "index/index_test_util.h"
#include "quor/qlib.h"
#include "support/error_stack.h"
#include "support/process_holding.h"
#include "support/sandbox.h"

namespace {

using index_test::CountOneClosing;
using index_test::kCounter;
using namespace tessel_test;

const std::string kConnectFailed = "NULL == (gpConn = QUORDBConnect(NULL, \"postgres\", NULL, \"tessel\"))";

// The rows of a query on a direct connection, "a|b" per row, joined by "\n";
// "<error>" when it fails. Statements without rows give "".
std::string Sql(const std::string &sql, const std::string &db = "tessel") {
    PGconn *conn = PgConnect(db);
    PGresult *res = (nullptr == conn) ? nullptr : PQexec(conn, sql.c_str());
    ExecStatusType status = PQresultStatus(res);
    std::string text = (PGRES_TUPLES_OK == status || PGRES_COMMAND_OK == status) ? "" : "<error>";
    for (int row = 0; PGRES_TUPLES_OK == status && row < PQntuples(res); ++row) {
        text += (0 == row) ? "" : "\n";
        for (int col = 0; col < PQnfields(res); ++col) {
            text += std::string(0 == col ? "" : "|") + PQgetvalue(res, row, col);
        }
    }
    PQclear(res);
    PQfinish(conn);
    return text;
}

// The server process behind a wrapper connection, or -1.
long BackendPid(DBConnect_tag *pConn) {
    DBResult_tag *pResult = nullptr;
    if (nullptr == pConn || 0 != QUORDBExecute(pConn, "SELECT pg_backend_pid() AS pid", &pResult)) {
        return -1;
    }
    long pid = atol(QUORDBFetchField(pResult, 0, "pid"));
    QUORDBFreeResult(pResult);
    return pid;
}

// Lines logged since mark whose message starts with prefix and contains
// needle, counted once a sentinel shows that everything before it arrived.
int Logged(size_t mark, const std::string &prefix, const std::string &needle, int priority = -1) {
    const std::string sentinel = "index test sentinel " + std::to_string(mark);
    syslog(LOG_INFO, "%s", sentinel.c_str());
    EXPECT_TRUE(WaitForSyslog(sentinel, mark).has_value());
    int n = 0;
    for (const SyslogLine &line : SyslogSince(mark)) {
        n += (0 == line.message.rfind(prefix, 0) && std::string::npos != line.message.find(needle) &&
              (priority < 0 || priority == line.priority));
    }
    return n;
}

int Failures() { return ::testing::Test::HasFailure() ? 1 : 0; }

class IndexConnTest : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(HasPostgres());
        ASSERT_EQ("", Sql("DROP DATABASE IF EXISTS tessel WITH (FORCE)", "postgres"));
        unlink(kCounter);
    }
};

TEST_F(IndexConnTest, FirstOpenCreatesTheDatabaseOnceWithExactlyTheSchema) {
    size_t mark = SyslogMark();
    ASSERT_EQ(0, RunInChild([] { return (nullptr == TesselOpenConn()) ? 1 : 0; }));
    EXPECT_EQ(1, Logged(mark, "(to postgres) root on", ""));  // one createdb, run through su
    EXPECT_EQ("object|id|text\nobject|ns|text\nobject|owner|bigint\nobject|category|text\n"
              "object|parent_id|text\nobject|version|text\nobject|commit_msg|json\nobject|acl|json\n"
              "object|text|json\nobject|metatext|json\nobject|binary_info|json\nobject|metabinary_info|json\n"
              "object|ctime|integer\nobject|mtime|integer\nobject|extra_info|json\nperson|id|text\nperson|person|json",
              Sql("SELECT table_name, column_name, data_type FROM information_schema.columns "
                  "WHERE table_schema = 'public' ORDER BY table_name, ordinal_position"));
    EXPECT_EQ("acl_idx|CREATE INDEX acl_idx ON public.object USING btree (((acl ->> 'enabled'::text)))\n"
              "category_idx|CREATE INDEX category_idx ON public.object USING btree (category)\n"
              "id_idx|CREATE INDEX id_idx ON public.object USING btree (id)\n"
              "mtime_idx|CREATE INDEX mtime_idx ON public.object USING btree (mtime)\n"
              "ns_idx|CREATE INDEX ns_idx ON public.object USING btree (ns)\n"
              "object_pkey|CREATE UNIQUE INDEX object_pkey ON public.object USING btree (id)\n"
              "owner_idx|CREATE INDEX owner_idx ON public.object USING btree (owner)\n"
              "parent_id_idx|CREATE INDEX parent_id_idx ON public.object USING btree (parent_id)\n"
              "person_id|CREATE INDEX person_id ON public.person USING btree (id)\n"
              "person_pkey|CREATE UNIQUE INDEX person_pkey ON public.person USING btree (id)",
              Sql("SELECT indexname, indexdef FROM pg_indexes WHERE schemaname = 'public' ORDER BY indexname"));

    // A later process finds everything in place and makes nothing again.
    const std::string ids = "SELECT (SELECT oid FROM pg_database WHERE datname = 'tessel'), "
                            "'object'::regclass::oid, 'person'::regclass::oid";
    const std::string before = Sql(ids);
    mark = SyslogMark();
    ASSERT_EQ(0, RunInChild([] { return (nullptr == TesselOpenConn()) ? 1 : 0; }));
    EXPECT_EQ(0, Logged(mark, "(to postgres)", ""));
    EXPECT_EQ(before, Sql(ids));
}

TEST_F(IndexConnTest, ConnectionBelongsToTheProcessThatOpenedItAndClosingsAreCounted) {
    ASSERT_EQ(0, RunInChild([] {
        DBConnect_tag *pConn = TesselOpenConn();
        EXPECT_EQ(pConn, TesselOpenConn());
        const long mine = BackendPid(pConn);
        EXPECT_LT(0, mine);
        // A child opens a session of its own and closes only that one; a
        // child that never opened closes nothing of its parent's.
        EXPECT_EQ(0, RunInChild([mine] {
            long theirs = BackendPid(TesselOpenConn());
            TesselCloseGlobalConn();
            return (0 < theirs && mine != theirs && 0 < wait(nullptr)) ? 0 : 1;
        }));
        EXPECT_EQ(0, RunInChild([] {
            TesselCloseGlobalConn();
            return (0 < wait(nullptr)) ? 0 : 1;
        }));
        EXPECT_EQ(mine, BackendPid(pConn));
        TesselCloseGlobalConn();
        EXPECT_LT(0, wait(nullptr));
        long again = BackendPid(TesselOpenConn());
        EXPECT_TRUE(0 < again && mine != again) << again;
        EXPECT_EQ("{\"vacuum_cnt\":3}", ReadFile(kCounter));
        return Failures();
    }));
}

TEST_F(IndexConnTest, UserCallerOpensAsRootAndGetsItsIdsBackAlsoOnFailure) {
    size_t mark = SyslogMark();
    ASSERT_EQ(0, RunAsUser(kUidAlice, kGidUsers, [] {
        EXPECT_LT(0, BackendPid(TesselOpenConn()));
        EXPECT_EQ(kUidAlice, geteuid());
        EXPECT_EQ(kGidUsers, getegid());
        return Failures();
    }));
    for (const char *sw : {"resgid(-1, 0, -1)", "resuid(-1, 0, -1)", "resgid(-1, 100, -1)", "resuid(-1, 1001, -1)"}) {
        EXPECT_EQ(1, Logged(mark, "index/tessel_index:", std::string(" WARNING: set") + sw, LOG_AUTH | LOG_INFO))
            << sw;
    }

    // A database nobody may connect to: createdb is tried and fails, and so
    // does every later open, since a failed one keeps nothing.
    ASSERT_EQ("", Sql("DROP DATABASE tessel WITH (FORCE)", "postgres"));
    ASSERT_EQ("", Sql("CREATE DATABASE tessel ALLOW_CONNECTIONS false", "postgres"));
    mark = SyslogMark();
    ASSERT_EQ(0, RunAsUser(kUidAlice, kGidUsers, [] {
        for (int i = 0; i < 2; ++i) {
            EXPECT_EQ(nullptr, TesselOpenConn());
            EXPECT_EQ(1025, ErrCode());
            EXPECT_EQ(std::vector<std::string>{kConnectFailed}, ErrMsgs());
            EXPECT_EQ(kUidAlice, geteuid());
            EXPECT_EQ(kGidUsers, getegid());
        }
        return Failures();
    }));
    EXPECT_EQ(2, Logged(mark, "(to postgres)", ""));
    EXPECT_EQ(2, Logged(mark, "index/tessel_index:",
                        " Failed [NULL == (gpConn = QUORDBConnect(NULL, \"postgres\", NULL, \"tessel\"))], err=",
                        LOG_USER | LOG_ERR));
}

TEST_F(IndexConnTest, FailedTableCreationKeepsNoConnectionAndTablesComeBack) {
    ASSERT_EQ("", Sql("CREATE DATABASE tessel", "postgres"));
    ASSERT_EQ("", Sql("CREATE TABLE blocker(id text);CREATE INDEX id_idx ON blocker (id)"));
    ASSERT_EQ(0, RunInChild([] {
        EXPECT_EQ(nullptr, TesselOpenConn());
        EXPECT_EQ(1025, ErrCode());
        EXPECT_EQ((std::vector<std::string>{"-1 == QUORDBExecute(pConn, SZ_SQL_CREATE_TABLE, NULL)",
                                            "!TesselCreateObjectTable(gpConn)"}),
                  ErrMsgs());
        EXPECT_EQ("", Sql("DROP INDEX id_idx"));
        // The failed session sits in an aborted transaction: kept, it would fail here.
        const long pid = BackendPid(TesselOpenConn());
        EXPECT_LT(0, pid);
        EXPECT_EQ("", Sql("DROP TABLE person"));
        EXPECT_TRUE(TesselAppendPersonTable());
        EXPECT_EQ("person_id\nperson_pkey",
                  Sql("SELECT indexname FROM pg_indexes WHERE tablename = 'person' ORDER BY 1"));
        EXPECT_EQ(pid, BackendPid(TesselOpenConn()));
        return Failures();
    }));
}

TEST_F(IndexConnTest, VacuumCounterCountsToFiftyThousandThenVacuumsAndRestarts) {
    ASSERT_EQ(0, RunInChild([] { return (nullptr == TesselOpenConn()) ? 1 : 0; }));
    const std::string vacuumed = "SELECT last_vacuum IS NOT NULL, last_analyze IS NOT NULL "
                                 "FROM pg_stat_user_tables WHERE relname = 'object'";
    EXPECT_EQ("{\"vacuum_cnt\":1}", CountOneClosing());
    ASSERT_TRUE(WriteFile(kCounter, "{\"vacuum_cnt\": 50000}"));
    EXPECT_EQ("{\"vacuum_cnt\":50001}", CountOneClosing());
    EXPECT_EQ("f|f", Sql(vacuumed));
    EXPECT_EQ("{\"vacuum_cnt\":0}", CountOneClosing());
    EXPECT_EQ("t|t", Sql(vacuumed));

    // Another process counting: this closing is not counted at all.
    ASSERT_TRUE(WriteFile(kCounter, "{\"vacuum_cnt\": 7}"));
    ProcessHolding holder([] {
        int fd = -1;
        return 1 == QLIBCFileLockTimeByFile(index_test::kCounterLock, QLIBC_FILE_LOCK_EX, 0, &fd);
    });
    ASSERT_TRUE(holder.ready());
    EXPECT_EQ("{\"vacuum_cnt\": 7}", CountOneClosing());
    holder.Release();
    EXPECT_EQ("{\"vacuum_cnt\":8}", CountOneClosing());
}

}  // namespace
