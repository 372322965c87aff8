// What the index test programs share: the vacuum counter file read back
// after one closing has been counted, and rows read straight from the server.
#ifndef TESSEL_TESTS_INDEX_INDEX_TEST_UTIL_H
#define TESSEL_TESTS_INDEX_INDEX_TEST_UTIL_H

#include <sys/wait.h>

#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <libpq-fe.h>

#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_index.h"

namespace index_test {

constexpr char kConf[] = "/usr/quor/etc/tessel.conf";
constexpr char kCounter[] = "/tmp/tessel.tmp";
constexpr char kCounterLock[] = "/tmp/tessel.tmp.lock";

// Runs the vacuum check, waits for its child and returns the counter file.
inline std::string CountOneClosing() {
    pid_t pid = TesselCheckVaccum();
    int status = -1;
    EXPECT_LT(0, pid);
    EXPECT_EQ(pid, waitpid(pid, &status, 0));
    EXPECT_TRUE(WIFEXITED(status) && 0 == WEXITSTATUS(status)) << "status " << status;
    return tessel_test::ReadFile(kCounter);
}

// Rows of a query result, each field as text.
using Table = std::vector<std::vector<std::string>>;

// The rows of a query on a connection of the test's own to database
// "tessel", each field as text ("<null>" for SQL NULL). A failed query is a
// test failure and gives no rows.
inline Table Rows(const std::string &sql) {
    Table rows;
    PGconn *conn = tessel_test::PgConnect("tessel");
    PGresult *res = (nullptr == conn) ? nullptr : PQexec(conn, sql.c_str());
    EXPECT_EQ(PGRES_TUPLES_OK, PQresultStatus(res)) << sql << ": " << (conn ? PQerrorMessage(conn) : "no connection");
    for (int row = 0; PGRES_TUPLES_OK == PQresultStatus(res) && row < PQntuples(res); ++row) {
        rows.emplace_back();
        for (int col = 0; col < PQnfields(res); ++col) {
            rows.back().push_back(PQgetisnull(res, row, col) ? "<null>" : PQgetvalue(res, row, col));
        }
    }
    PQclear(res);
    PQfinish(conn);
    return rows;
}

// Runs statements on a connection of the test's own; false when they fail.
inline bool Exec(const std::string &sql) {
    PGconn *conn = tessel_test::PgConnect("tessel");
    PGresult *res = (nullptr == conn) ? nullptr : PQexec(conn, sql.c_str());
    ExecStatusType status = PQresultStatus(res);
    EXPECT_TRUE(PGRES_COMMAND_OK == status || PGRES_TUPLES_OK == status)
        << sql << ": " << (conn ? PQerrorMessage(conn) : "no connection");
    PQclear(res);
    PQfinish(conn);
    return PGRES_COMMAND_OK == status || PGRES_TUPLES_OK == status;
}

// Every column of the object table, in table order.
constexpr char kObjectColumns[] =
    "SELECT id, ns, owner, category, parent_id, version, commit_msg, acl, text, metatext, binary_info, "
    "metabinary_info, ctime, mtime, extra_info FROM object";

}  // namespace index_test

#endif  // TESSEL_TESTS_INDEX_INDEX_TEST_UTIL_H
