// The scratch database of the platform_db_test program, made once per run on
// the sandbox's private server. The library's own database is left alone.
#ifndef TESSEL_TESTS_PLATFORM_DB_TEST_SCRATCH_H
#define TESSEL_TESTS_PLATFORM_DB_TEST_SCRATCH_H

#include <string>

#include <gtest/gtest.h>
#include <libpq-fe.h>

#include "quor/quor_db.h"
#include "support/sandbox.h"

namespace quor_test {

constexpr char kScratchDb[] = "quor_db_scratch";

// Creates the scratch database (dropping a leftover); false when the server
// cannot be reached.
inline bool MakeScratchDb() {
    static int made = -1;
    if (made < 0) {
        PGconn *conn = tessel_test::PgConnect("postgres");
        made = 0;
        if (nullptr != conn) {
            std::string drop = std::string("DROP DATABASE IF EXISTS ") + kScratchDb;
            std::string create = std::string("CREATE DATABASE ") + kScratchDb;
            PGresult *res = PQexec(conn, drop.c_str());
            PQclear(res);
            res = PQexec(conn, create.c_str());
            made = (PGRES_COMMAND_OK == PQresultStatus(res)) ? 1 : 0;
            PQclear(res);
            PQfinish(conn);
        }
    }
    return 1 == made;
}

// A test with the scratch database and a wrapper connection to it.
class ScratchDbTest : public ::testing::Test {
protected:
    void SetUp() override {
        if (!tessel_test::HasPostgres()) {
            GTEST_SKIP() << "needs the sandbox's private PostgreSQL server (tessel-sandbox --pg)";
        }
        ASSERT_TRUE(MakeScratchDb());
        conn_ = QUORDBConnect(nullptr, "postgres", nullptr, kScratchDb);
        ASSERT_NE(nullptr, conn_);
        QLIBCErrClear();
    }
    void TearDown() override { QUORDBClose(conn_); }

    // The first field of the first row of a query through the wrapper, or "<error>".
    std::string Value(const std::string &sql, const char *column) {
        DBResult_tag *res = nullptr;
        if (0 != QUORDBExecute(conn_, sql.c_str(), &res)) {
            return "<error>";
        }
        const char *value = (QUORDBNumRows(res) > 0) ? QUORDBFetchField(res, 0, column) : nullptr;
        std::string text = (nullptr == value) ? "<null>" : value;
        QUORDBFreeResult(res);
        return text;
    }

    DBConnect_tag *conn_ = nullptr;
};

}  // namespace quor_test

#endif  // TESSEL_TESTS_PLATFORM_DB_TEST_SCRATCH_H
