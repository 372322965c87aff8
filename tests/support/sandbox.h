/*
 * What a test program sees of the sandbox it runs in (tests/sandbox): the
 * captured system log and the private PostgreSQL server.
 */
#ifndef TESSEL_TESTS_SUPPORT_SANDBOX_H
#define TESSEL_TESTS_SUPPORT_SANDBOX_H

#include <stddef.h>

#include <chrono>
#include <functional>
#include <optional>
#include <string>
#include <vector>

typedef struct pg_conn PGconn;

namespace tessel_test {

/* Users and groups of the sandbox's passwd and group files. */
constexpr unsigned kUidAlice = 1001;   // real name "Alice Able", mail alice@example.com, groups users, staff, eng
constexpr unsigned kUidBob = 1002;     // "Bob Baker", no mail, groups users, eng
constexpr unsigned kUidCarol = 1003;   // account expired, groups users, staff
constexpr unsigned kUidDave = 1004;    // empty GECOS, own group dave (1004)
constexpr unsigned kUidErin = 1005;    // domain-style name "EXAMPLE\erin", real name "Erin Example"
constexpr unsigned kUidFrank = 1006;   // expires far in the future
constexpr unsigned kUidGrace = 1007;   // directory-style name "grace@example.com"
constexpr unsigned kUidPostgres = 101;
constexpr unsigned kUidNobody = 65534;
constexpr unsigned kUidUnknown = 4242; // in no passwd entry
constexpr unsigned kGidUsers = 100;
constexpr unsigned kGidStaff = 1100;
constexpr unsigned kGidEng = 1101;
constexpr unsigned kGidEmpty = 1102;
constexpr unsigned kGidUnknown = 4343;

/* True inside tests/sandbox/tessel-sandbox. */
bool InSandbox();
/* True when the sandbox runs a private PostgreSQL server (tessel_add_test ... PG). */
bool HasPostgres();

/* One message received on /dev/log. */
struct SyslogLine {
    int priority = -1;   // the <PRI> value: facility | level
    std::string ident;   // the program tag before the first ':'
    std::string message; // the text after "ident[pid]: "
    std::string raw;     // the datagram as received, trailing newlines removed
};

/* A position in the log; lines read "since" it are the ones logged after. */
size_t SyslogMark();
std::vector<SyslogLine> SyslogSince(size_t mark);
/*
 * Waits until a message logged after mark contains needle (and, when
 * priority >= 0, has that priority). Delivery to the receiver is
 * asynchronous, hence the wait.
 */
std::optional<SyslogLine> WaitForSyslog(const std::string &needle, size_t mark, int priority = -1,
                                        std::chrono::milliseconds timeout = std::chrono::seconds(3));

/* A connection to the private server as role postgres, or nullptr. */
PGconn *PgConnect(const std::string &db = "postgres");
/* The first field of the first row, or nullopt on error or no row. */
std::optional<std::string> PgValue(PGconn *conn, const std::string &sql);

/*
 * Runs fn in a forked child and returns its exit status (fn's result), or -1
 * when the child died from a signal. Use for tests that need a fresh process
 * or a second process holding a lock.
 */
int RunInChild(const std::function<int()> &fn);

/*
 * Runs fn in a forked child that calls as a user the way an application
 * that dropped its privileges does: effective gid and uid are the given
 * ones, real and saved ids stay root (so the library can raise itself).
 * Returns fn's result; 125 when the switch failed; -1 on a signal. GoogleTest
 * failures in the child do not reach the parent: return
 * ::testing::Test::HasFailure() ? 1 : 0 from fn.
 */
int RunAsUser(unsigned uid, unsigned gid, const std::function<int()> &fn);

}  // namespace tessel_test

#endif /* TESSEL_TESTS_SUPPORT_SANDBOX_H */
