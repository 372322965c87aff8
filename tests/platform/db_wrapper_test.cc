// The database wrapper and the service check against the sandbox's private
// PostgreSQL server.
#include <stdlib.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <optional>
#include <string>

#include <gtest/gtest.h>
#include <libpq-fe.h>

#include "platform/db_test_scratch.h"
#include "platform/quor_test_files.h"
#include "quor/qlib.h"
#include "quor/quor_db.h"
#include "support/sandbox.h"
#include "support/scratch.h"

namespace {

using quor_test::kScratchDb;
using quor_test::PlatformErrorIs;
using quor_test::ScratchDbTest;

// Sets an environment variable for one scope.
class ScopedEnv {
public:
    ScopedEnv(const char *name, const char *value) : name_(name) {
        const char *old = getenv(name);
        had_ = (nullptr != old);
        old_ = had_ ? old : "";
        setenv(name, value, 1);
    }
    ~ScopedEnv() {
        if (had_) {
            setenv(name_.c_str(), old_.c_str(), 1);
        } else {
            unsetenv(name_.c_str());
        }
    }

private:
    std::string name_;
    std::string old_;
    bool had_ = false;
};

// Runs one statement on a direct libpq connection to db; true on success.
bool Admin(const std::string &sql, const std::string &db = "postgres") {
    PGconn *conn = tessel_test::PgConnect(db);
    if (nullptr == conn) {
        return false;
    }
    PGresult *res = PQexec(conn, sql.c_str());
    ExecStatusType status = PQresultStatus(res);
    PQclear(res);
    PQfinish(conn);
    return PGRES_COMMAND_OK == status || PGRES_TUPLES_OK == status;
}

// Waits until the server has ended the backend with this pid.
bool BackendGone(const std::string &pid) {
    PGconn *conn = tessel_test::PgConnect("postgres");
    if (nullptr == conn) {
        return false;
    }
    bool gone = false;
    for (int i = 0; i < 500 && !gone; ++i) {
        gone = (tessel_test::PgValue(conn, "SELECT count(*) FROM pg_stat_activity WHERE pid = " + pid) ==
                std::optional<std::string>("0"));
        if (!gone) {
            usleep(10000);
        }
    }
    PQfinish(conn);
    return gone;
}

using DbConnect = ScratchDbTest;

TEST_F(DbConnect, NoHostMeansTheDefaultLocalSocket) {
    EXPECT_EQ(kScratchDb, Value("SELECT current_database() AS db", "db"));
    EXPECT_EQ("postgres", Value("SELECT current_user AS who", "who"));
    EXPECT_EQ("<null>", Value("SELECT inet_server_addr() AS addr", "addr")) << "a Unix socket has no address";
}

TEST_F(DbConnect, NullArgumentsComeFromTheLibpqEnvironment) {
    {
        ScopedEnv user("PGUSER", "postgres");
        ScopedEnv db("PGDATABASE", kScratchDb);
        DBConnect_tag *conn = QUORDBConnect(nullptr, nullptr, nullptr, nullptr);
        ASSERT_NE(nullptr, conn);
        DBResult_tag *res = nullptr;
        ASSERT_EQ(0, QUORDBExecute(conn, "SELECT current_database() AS db, current_user AS who", &res));
        EXPECT_STREQ(kScratchDb, QUORDBFetchField(res, 0, "db"));
        EXPECT_STREQ("postgres", QUORDBFetchField(res, 0, "who"));
        QUORDBFreeResult(res);
        QUORDBClose(conn);
    }
    // Without the environment libpq's default user is the login name (root),
    // which has no role: the wrapper must not invent one.
    QLIBCErrClear();
    EXPECT_EQ(nullptr, QUORDBConnect(nullptr, nullptr, nullptr, kScratchDb));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_DB, "quor_db.cc"));
}

TEST_F(DbConnect, AMissingDatabaseFailsAndIsLogged) {
    size_t mark = tessel_test::SyslogMark();
    QLIBCErrClear();
    EXPECT_EQ(nullptr, QUORDBConnect(nullptr, "postgres", nullptr, "tessel"));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_DB, "quor_db.cc"));
    auto line = tessel_test::WaitForSyslog("database \"tessel\" does not exist", mark);
    ASSERT_TRUE(line.has_value());
    EXPECT_EQ(LOG_ERR, line->priority & LOG_PRIMASK);
    EXPECT_EQ("0", Value("SELECT count(*) AS n FROM pg_database WHERE datname = 'tessel'", "n"));
}

TEST_F(DbConnect, SessionsAlwaysReadStandardStringsInUtf8) {
    // Even where the database or the environment says otherwise, the escaping
    // of QUORDBEscapeStringEX3 must hold on every wrapper connection.
    std::string alter = std::string("ALTER DATABASE ") + kScratchDb + " SET standard_conforming_strings = ";
    ASSERT_TRUE(Admin(alter + "off"));
    ScopedEnv encoding("PGCLIENTENCODING", "LATIN1");
    DBConnect_tag *conn = QUORDBConnect(nullptr, "postgres", nullptr, kScratchDb);
    bool restored = Admin(alter + "on");
    ASSERT_NE(nullptr, conn);
    DBResult_tag *res = nullptr;
    ASSERT_EQ(0, QUORDBExecute(conn,
                               "SELECT current_setting('standard_conforming_strings') AS scs, "
                               "current_setting('client_encoding') AS enc",
                               &res));
    EXPECT_STREQ("on", QUORDBFetchField(res, 0, "scs"));
    EXPECT_STREQ("UTF8", QUORDBFetchField(res, 0, "enc"));
    QUORDBFreeResult(res);
    QUORDBClose(conn);
    EXPECT_TRUE(restored);
}

TEST_F(DbConnect, ADroppedSessionIsReopenedForTheNextStatement) {
    std::string alter = std::string("ALTER DATABASE ") + kScratchDb + " SET standard_conforming_strings = ";
    std::string pid = Value("SELECT pg_backend_pid() AS pid", "pid");
    ASSERT_TRUE(Admin(alter + "off"));
    ASSERT_TRUE(Admin("SELECT pg_terminate_backend(" + pid + ")"));
    ASSERT_TRUE(BackendGone(pid)) << "the server never ended backend " << pid;
    EXPECT_EQ(-1, QUORDBExecute(conn_, "SELECT 1", nullptr)) << "the statement that finds the session gone fails";
    EXPECT_EQ("on", Value("SELECT current_setting('standard_conforming_strings') AS scs", "scs"))
        << "the reopened session is prepared like a new one";
    EXPECT_NE(pid, Value("SELECT pg_backend_pid() AS pid", "pid"));
    EXPECT_TRUE(Admin(alter + "on"));
}

using DbExecute = ScratchDbTest;

TEST_F(DbExecute, SeveralStatementsRunAndTheLastResultIsReturned) {
    DBResult_tag *res = nullptr;
    ASSERT_EQ(0, QUORDBExecute(conn_,
                               "CREATE TABLE several(id int, name text, note text);"
                               "INSERT INTO several VALUES (1, 'one', NULL), (2, 'two', 'x');"
                               "SELECT id, name, note, upper(name) AS \"Upper\" FROM several ORDER BY id",
                               &res));
    ASSERT_NE(nullptr, res);
    EXPECT_EQ(2, QUORDBNumRows(res));
    EXPECT_STREQ("1", QUORDBFetchField(res, 0, "id"));
    EXPECT_STREQ("two", QUORDBFetchField(res, 1, "name"));
    EXPECT_STREQ("x", QUORDBFetchField(res, 1, "note"));
    EXPECT_STREQ("TWO", QUORDBFetchField(res, 1, "Upper")) << "column names match exactly";

    QLIBCErrClear();
    EXPECT_EQ(nullptr, QUORDBFetchField(res, 0, "note")) << "SQL NULL";
    EXPECT_EQ(0, QLIBCErrGet()) << "a NULL value is not an error";
    const struct {
        int row;
        const char *column;
    } bad[] = {{0, "upper"}, {0, "missing"}, {2, "id"}, {-1, "id"}, {0, nullptr}};
    for (const auto &b : bad) {
        QLIBCErrClear();
        EXPECT_EQ(nullptr, QUORDBFetchField(res, b.row, b.column)) << b.row << (b.column ? b.column : "(null)");
        EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_db.cc"));
    }
    QUORDBFreeResult(res);

    ASSERT_EQ(0, QUORDBExecute(conn_, "UPDATE several SET note = 'y'", &res));
    EXPECT_EQ(0, QUORDBNumRows(res)) << "a command returns no rows";
    QUORDBFreeResult(res);
    EXPECT_EQ(0, QUORDBExecute(conn_, "DROP TABLE several", nullptr));
}

TEST_F(DbExecute, AFailedStatementIsLoggedAndReturnsNoResult) {
    size_t mark = tessel_test::SyslogMark();
    DBResult_tag *res = reinterpret_cast<DBResult_tag *>(0x1);
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORDBExecute(conn_, "SELECT * FROM no_such_table", &res));
    EXPECT_EQ(nullptr, res);
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_DB, "quor_db.cc"));
    auto line = tessel_test::WaitForSyslog("relation \"no_such_table\" does not exist", mark);
    ASSERT_TRUE(line.has_value());
    EXPECT_EQ(LOG_ERR, line->priority & LOG_PRIMASK);
    EXPECT_NE(std::string::npos, line->message.find("42P01")) << line->message;

    // The statements of one call share a transaction: a later failure undoes
    // the earlier ones.
    ASSERT_EQ(0, QUORDBExecute(conn_, "CREATE TABLE atomic(n int)", nullptr));
    EXPECT_EQ(-1, QUORDBExecute(conn_, "INSERT INTO atomic VALUES (1); INSERT INTO atomic VALUES ('x')", nullptr));
    EXPECT_EQ("0", Value("SELECT count(*) AS n FROM atomic", "n"));
    EXPECT_EQ(0, QUORDBExecute(conn_, "DROP TABLE atomic", nullptr));
}

TEST_F(DbExecute, CopyIsRefusedWithoutWedgingTheConnection) {
    ASSERT_EQ(0, QUORDBExecute(conn_, "CREATE TABLE copied(n int); INSERT INTO copied VALUES (7)", nullptr));
    EXPECT_EQ(-1, QUORDBExecute(conn_, "COPY copied FROM STDIN", nullptr));
    EXPECT_EQ("1", Value("SELECT count(*) AS n FROM copied", "n"));
    EXPECT_EQ(-1, QUORDBExecute(conn_, "COPY copied TO STDOUT", nullptr));
    EXPECT_EQ("7", Value("SELECT n FROM copied", "n"));
    EXPECT_EQ(0, QUORDBExecute(conn_, "DROP TABLE copied", nullptr));
}

TEST_F(DbExecute, BadArgumentsAreRecorded) {
    DBResult_tag *res = reinterpret_cast<DBResult_tag *>(0x1);
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORDBExecute(nullptr, "SELECT 1", &res));
    EXPECT_EQ(nullptr, res);
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_db.cc"));
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORDBExecute(conn_, nullptr, nullptr));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_db.cc"));
    QLIBCErrClear();
    EXPECT_EQ(-1, QUORDBNumRows(nullptr));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_db.cc"));
    QUORDBFreeResult(nullptr);
    QUORDBClose(nullptr);
}

TEST(ServiceState, PgsqlRunsWhenTheDefaultServerAnswers) {
    if (!tessel_test::HasPostgres()) {
        GTEST_SKIP() << "needs the sandbox's private PostgreSQL server (tessel-sandbox --pg)";
    }
    EXPECT_TRUE(QLIBServiceIsRunning("pgsql"));
    // The check honours libpq's environment: a socket directory without a
    // server is a stopped service.
    tessel_test::ScratchDir empty;
    ASSERT_TRUE(empty.ok());
    {
        ScopedEnv host("PGHOST", empty.path().c_str());
        EXPECT_FALSE(QLIBServiceIsRunning("pgsql"));
    }
    EXPECT_TRUE(QLIBServiceIsRunning("pgsql"));

    EXPECT_FALSE(QLIBServiceIsRunning("httpd"));
    QLIBCErrClear();
    EXPECT_FALSE(QLIBServiceIsRunning(nullptr));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "qlib_service.cc"));
}

}  // namespace
