// The process's connection to the index database, the schema it needs, and
// the vacuum counter that every closing of that connection advances.
#include <sys/file.h>
#include <unistd.h>

#include <mutex>

#include <json/value.h>
#include <quor/qlib.h>
#include <quor/quor_db.h>

#include "common/tessel_json.h"
#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_index.h"

static constexpr const char kTesselModule[] = "index/tessel_index";

namespace {

constexpr char SZ_PGSQL_SERVICE_NAME[] = "pgsql";
constexpr char SZ_DB_ROLE[] = "postgres";
constexpr char SZ_DB_NAME[] = "tessel";
constexpr char SZF_SU[] = "/bin/su";
constexpr char SZ_CMD_CREATEDB[] = "/usr/bin/createdb tessel";

constexpr char SZ_SQL_CHECK_OBJECT_TABLE[] =
    "SELECT 1 FROM information_schema.tables WHERE table_schema = 'public' AND table_name = 'object' LIMIT 1;";
constexpr char SZ_SQL_CREATE_TABLE[] =
    "BEGIN;"
    "CREATE TABLE IF NOT EXISTS object(id text PRIMARY KEY, ns text, owner bigint, category text, "
    "parent_id text, version text, commit_msg json, acl json, text json, metatext json, binary_info json, "
    "metabinary_info json,ctime int,mtime int,extra_info json);"
    "CREATE INDEX id_idx ON object (id);"
    "CREATE INDEX owner_idx ON object (owner);"
    "CREATE INDEX ns_idx ON object (ns);"
    "CREATE INDEX category_idx ON object (category);"
    "CREATE INDEX parent_id_idx ON object (parent_id);"
    "CREATE INDEX acl_idx ON object ((acl->>'enabled'));"
    "CREATE INDEX mtime_idx ON object (mtime);"
    "END;";
constexpr char SZ_SQL_CHECK_PERSON_TABLE[] =
    "SELECT 1 FROM information_schema.tables WHERE table_schema = 'public' AND table_name = 'person' LIMIT 1;";
constexpr char SZ_SQL_CREATE_PERSON_TABLE[] =
    "BEGIN;CREATE TABLE IF NOT EXISTS person(id text PRIMARY KEY, person json );"
    "CREATE INDEX person_id ON person (id);END;";
constexpr char SZ_SQL_VACUUM[] = "VACUUM ANALYZE";

constexpr char SZF_VACUUM_COUNTER[] = "/tmp/tessel.tmp";
constexpr char SZF_VACUUM_COUNTER_LOCK[] = "/tmp/tessel.tmp.lock";
constexpr char SZK_VACUUM_CNT[] = "vacuum_cnt";
constexpr Json::Int64 kClosingsBetweenVacuums = 50000;
// The counter child detaches from the caller's session and standard streams:
// a gateway program's standard output is its response, and the child may
// outlive the request that closed the connection.
constexpr int kVacuumForkFlags = QLIBC_FORK_SETSID | QLIBC_FORK_NULL_STDIO;

// The connection is used by the process's threads without a lock (callers
// serialise their work through the object locks); the mutex only makes the
// first open and the close happen once, so two threads starting together
// cannot both run createdb or leak a second connection.
std::mutex gConnMutex;
DBConnect_tag *gpConn = NULL;
pid_t gConnPid = 0;

// A connection inherited across fork() shares its socket with the parent's
// session: closing it here would end the parent's session too, so a child only
// forgets it. Called with gConnMutex held.
void DropGlobalConn() {
    if (NULL != gpConn && getpid() == gConnPid) {
        QUORDBClose(gpConn);
    }
    gpConn = NULL;
    gConnPid = 0;
}

// Runs the check query and, when it finds no table, the creation. The
// condition texts name the statements, so they come from the callers.
bool EnsureTable(DBConnect_tag *pConn, const char *szCheckSQL, const char *szCheckCondition,
                 const char *szCreateSQL, const char *szCreateCondition) {
    DBResult_tag *pResult = NULL;
    if (-1 == QUORDBExecute(pConn, szCheckSQL, &pResult)) {
        TESSEL_RAISE(TESSEL_ERR_CREATE_DB, "%s", szCheckCondition);
        return false;
    }
    int nRows = QUORDBNumRows(pResult);
    QUORDBFreeResult(pResult);
    if (0 == nRows && -1 == QUORDBExecute(pConn, szCreateSQL, NULL)) {
        TESSEL_RAISE(TESSEL_ERR_CREATE_DB, "%s", szCreateCondition);
        return false;
    }
    return true;
}

// One "VACUUM ANALYZE" on a connection of its own, so that the caller's
// process connection (possibly inherited, possibly busy) is never involved.
bool VacuumAnalyze() {
    TESSEL_CHECK(FALSE == QLIBServiceIsRunning(SZ_PGSQL_SERVICE_NAME), TESSEL_ERR_PGSQL_DISABLED,
                 "FALSE == QLIBServiceIsRunning(SZ_PGSQL_SERVICE_NAME)", false);
    DBConnect_tag *pVacuumConn = QUORDBConnect(NULL, SZ_DB_ROLE, NULL, SZ_DB_NAME);
    TESSEL_CHECK(NULL == pVacuumConn, TESSEL_ERR_OPERATION_FAILED, "NULL == pVacuumConn", false);
    const char *szSQL = SZ_SQL_VACUUM;
    DBResult_tag *pResult = NULL;
    bool blOk = (0 == QUORDBExecute(pVacuumConn, szSQL, &pResult));
    if (!blOk) {
        TESSEL_RAISE(TESSEL_ERR_OPERATION_FAILED, "(0 != QUORDBExecute(pVacuumConn, szSQL, &pResult))");
    }
    QUORDBFreeResult(pResult);
    QUORDBClose(pVacuumConn);
    return blOk;
}

// The counter child's work. Only one try at the lock: a closing that finds
// another process counting is simply not counted, which at worst delays the
// next vacuum a little, whereas waiting would pile children up behind a
// running vacuum. A failed vacuum keeps the count, so the next closing tries
// again.
void CountClosing() {
    TESSEL_AS_ROOT();
    int fd = -1;
    if (1 != QLIBCFileLockTimeByFile(SZF_VACUUM_COUNTER_LOCK, QLIBC_FILE_LOCK_EX, 0, &fd)) {
        return;
    }
    Json::Value jCounter;
    if (!tessel::fromFile(jCounter, SZF_VACUUM_COUNTER) || !jCounter.isObject()) {
        jCounter = Json::Value(Json::objectValue);
    }
    const Json::Value &jCnt = jCounter[SZK_VACUUM_CNT];
    Json::Int64 n = jCnt.isInt64() ? jCnt.asInt64() : 0;
    if (n <= kClosingsBetweenVacuums) {
        jCounter[SZK_VACUUM_CNT] = n + 1;
    } else if (VacuumAnalyze()) {
        jCounter[SZK_VACUUM_CNT] = 0;
    }
    if (!tessel::toFile(jCounter, SZF_VACUUM_COUNTER)) {
        TESSEL_LOG_FAILED("!tessel::toFile(jCounter, SZF_VACUUM_COUNTER)");
    }
    flock(fd, LOCK_UN);
    close(fd);
}

}  // namespace

DBConnect_tag *TesselOpenConn() {
    std::lock_guard<std::mutex> guard(gConnMutex);
    if (NULL != gpConn && getpid() == gConnPid) {
        return gpConn;
    }
    DropGlobalConn();
    TESSEL_CHECK(FALSE == QLIBServiceIsRunning(SZ_PGSQL_SERVICE_NAME), TESSEL_ERR_PGSQL_DISABLED,
                 "FALSE == QLIBServiceIsRunning(SZ_PGSQL_SERVICE_NAME)", NULL);
    {
        // Root for both: the server admits the postgres role to root's local
        // connections, and su starts createdb as postgres only for root.
        TESSEL_AS_ROOT();
        gpConn = QUORDBConnect(NULL, SZ_DB_ROLE, NULL, SZ_DB_NAME);
        if (NULL == gpConn) {
            // A machine that never had the database gets it now. createdb's
            // status is not needed: if another process made the database
            // meanwhile, createdb fails and the second connect succeeds.
            QLIBCExec(SZF_SU, SZ_DB_ROLE, "-c", SZ_CMD_CREATEDB, static_cast<char *>(NULL));
            TESSEL_CHECK(NULL == (gpConn = QUORDBConnect(NULL, SZ_DB_ROLE, NULL, SZ_DB_NAME)), TESSEL_ERR_CREATE_DB,
                         "NULL == (gpConn = QUORDBConnect(NULL, \"postgres\", NULL, \"tessel\"))", NULL);
        }
    }
    gConnPid = getpid();
    if (!TesselCreateObjectTable(gpConn)) {
        TESSEL_APPEND("!TesselCreateObjectTable(gpConn)");
        DropGlobalConn();
        return NULL;
    }
    return gpConn;
}

void TesselCloseConn(DBConnect_tag *) {}

void TesselCloseGlobalConn() {
    {
        std::lock_guard<std::mutex> guard(gConnMutex);
        DropGlobalConn();
    }
    TesselCheckVaccum();
}

// Both tables, object first: the person table came later, so a database made
// by an older release may have only the object table.
bool TesselCreateObjectTable(DBConnect_tag *pConn) {
    TESSEL_CHECK(!pConn, TESSEL_ERR_BAD_PARAMETERS, "!pConn", false);
    return EnsureTable(pConn, SZ_SQL_CHECK_OBJECT_TABLE,
                       "-1 == QUORDBExecute(pConn, SZ_SQL_CHECK_OBJECT_TABLE, &pResult)", SZ_SQL_CREATE_TABLE,
                       "-1 == QUORDBExecute(pConn, SZ_SQL_CREATE_TABLE, NULL)") &&
           EnsureTable(pConn, SZ_SQL_CHECK_PERSON_TABLE,
                       "-1 == QUORDBExecute(pConn, SZ_SQL_CHECK_PERSON_TABLE, &pResult)", SZ_SQL_CREATE_PERSON_TABLE,
                       "-1 == QUORDBExecute(pConn, SZ_SQL_CREATE_PERSON_TABLE, NULL)");
}

// Callers (the settings writer, when a namespace is switched on) hold no
// connection. The process's own is used rather than a private one: opening
// it already makes the database and the tables on a fresh machine, and the
// process needs it for indexing right after anyway. The tables are checked
// again on it because the connection may be older than a dropped table. A
// failed creation leaves the session inside an aborted transaction, useless
// for every later statement, so the connection is given up and the next
// open starts a clean one.
bool TesselAppendPersonTable() {
    DBConnect_tag *pConn = TesselOpenConn();
    TESSEL_CHECK_APPEND(!pConn, "!pConn", false);
    if (!TesselCreateObjectTable(pConn)) {
        TESSEL_APPEND("!TesselCreateObjectTable(pConn)");
        std::lock_guard<std::mutex> guard(gConnMutex);
        if (pConn == gpConn) {
            DropGlobalConn();
        }
        return false;
    }
    return true;
}

pid_t TesselCheckVaccum() {
    pid_t pid = -1;
    TESSEL_CHECK(0 > (pid = QLIBCProcForkEx(kVacuumForkFlags)), TESSEL_ERR_OPERATION_FAILED,
                 "0 > (pid = QLIBCProcForkEx(kVacuumForkFlags))", -1);
    if (0 == pid) {
        CountClosing();
        // Not exit(): the child must not run the parent's exit handlers or
        // flush the parent's buffered output a second time.
        _exit(0);
    }
    return pid;
}
