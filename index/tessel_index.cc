// The process's connection to the index database, the schema it needs, and
// the vacuum counter that every closing of that connection advances.
#include <glob.h>
#include <sys/file.h>
#include <syslog.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <mutex>
#include <string>

#include <json/value.h>
#include <quor/qlib.h>
#include <quor/quor_db.h>

#include "common/tessel_json.h"
#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_conf.h"
#include "tessel_id.h"
#include "tessel_index.h"
#include "tessel_ns.h"

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
constexpr char SZ_SQL_DELETE_NS[] =
    "DELETE FROM person WHERE id IN (SELECT id FROM object WHERE ns='@QUOR:VAR');"
    "DELETE FROM person WHERE id NOT IN (SELECT id FROM object);"
    "DELETE FROM object WHERE ns='@QUOR:VAR';";
constexpr char SZ_SQL_DELETE_ALL[] = "DELETE FROM person;DELETE FROM object;";
constexpr char SZ_SQL_VACUUM_OBJECT[] = "VACUUM FULL object;";
constexpr char SZ_SQL_VACUUM_PERSON[] = "VACUUM FULL person;";
constexpr char SZK_NS[] = "ns";
constexpr char SZK_ID[] = "id";
constexpr char SZ_SQL_OBJECT_PREFIX[] =
    "INSERT INTO object (id, ns, owner, category, parent_id, version, commit_msg, acl, text, metatext, "
    "binary_info, metabinary_info, ctime, mtime, extra_info) VALUES ";
constexpr char SZ_SQL_PERSON_PREFIX[] = "INSERT INTO person (id, person) VALUES ";
// Rows per bulk insert: big enough to save round trips, small enough to keep
// one failing object from costing more than a few neighbours' statement.
constexpr size_t kReindexBatch = 30;

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

// Empties the index of jParam's "ns", or all of it, and gives the space back.
// A parameter that is neither an object nor null names no scope, and a
// namespace that is not a string names none either: both are refused rather
// than read as "everything".
bool clear_index(DBConnect_tag *pConn, const Json::Value &jParam) {
    TESSEL_CHECK(!jParam.isNull() && !jParam.isObject(), TESSEL_ERR_USER_INPUT, "!jParam.isObject()", false);
    const bool blOneNs = jParam.isObject() && jParam.isMember(SZK_NS);
    TESSEL_CHECK(blOneNs && !jParam[SZK_NS].isString(), TESSEL_ERR_USER_INPUT, "!jParam[\"ns\"].isString()", false);
    char *szSQLDelete = NULL;
    if (blOneNs) {
        // The wrapper takes C strings; a name with a NUL byte would name
        // another namespace there.
        const std::string strNs = jParam[SZK_NS].asString();
        if (std::string::npos == strNs.find('\0')) {
            szSQLDelete = QUORDBEscapeStringEX3(QUOR_DB_PGSQL, SZ_SQL_DELETE_NS, strNs.c_str(), strNs.c_str());
        }
    } else {
        szSQLDelete = strdup(SZ_SQL_DELETE_ALL);
    }
    TESSEL_CHECK(NULL == szSQLDelete, TESSEL_ERR_OPERATION_FAILED, "NULL == szSQLDelete", false);
    const int ret = QUORDBExecute(pConn, szSQLDelete, NULL);
    free(szSQLDelete);
    TESSEL_CHECK(0 > ret, TESSEL_ERR_OPERATION_FAILED, "0 > QUORDBExecute(pConn, szSQLDelete, NULL)", false);
    TESSEL_CHECK(0 > QUORDBExecute(pConn, SZ_SQL_VACUUM_OBJECT, NULL), TESSEL_ERR_OPERATION_FAILED,
                 "0 > QUORDBExecute(pConn, \"VACUUM FULL object;\", NULL)", false);
    TESSEL_CHECK(0 > QUORDBExecute(pConn, SZ_SQL_VACUUM_PERSON, NULL), TESSEL_ERR_OPERATION_FAILED,
                 "0 > QUORDBExecute(pConn, \"VACUUM FULL person;\", NULL)", false);
    return true;
}

// A path as a glob pattern that matches only itself: namespace names may
// hold the pattern characters.
std::string GlobLiteral(const std::string &strPath) {
    std::string strOut;
    for (char c : strPath) {
        if ('*' == c || '?' == c || '[' == c || '\\' == c) {
            strOut += '\\';
        }
        strOut += c;
    }
    return strOut;
}

struct GlobList {
    glob_t buf = {};
    ~GlobList() { globfree(&buf); }
};

// The entries of strPattern; an empty list when nothing matches. Object and
// namespace directories are the store's, so they are listed as root.
int ListAsRoot(const std::string &strPattern, GlobList &list) {
    TESSEL_AS_ROOT();
    int ret = glob(strPattern.c_str(), GLOB_ERR, NULL, &list.buf);
    return (GLOB_NOMATCH == ret) ? 0 : ret;
}

// Sends the pending tuples as one insert per table and empties them.
bool FlushReindex(DBConnect_tag *pConn, std::string &strSQL, std::string &strPerson) {
    if (strSQL.empty()) {
        return true;
    }
    strSQL += ";";
    strPerson += ";";
    TESSEL_CHECK(0 > QUORDBExecute(pConn, (SZ_SQL_OBJECT_PREFIX + strSQL).c_str(), NULL), TESSEL_ERR_OPERATION_FAILED,
                 "0 > QUORDBExecute(pConn, (SZ_SQL_OBJECT_PREFIX + strSQL).c_str(), NULL)", false);
    TESSEL_CHECK(0 > QUORDBExecute(pConn, (SZ_SQL_PERSON_PREFIX + strPerson).c_str(), NULL),
                 TESSEL_ERR_OPERATION_FAILED, "0 > QUORDBExecute(pConn, (SZ_SQL_PERSON_PREFIX + strPerson).c_str(), NULL)",
                 false);
    strSQL.clear();
    strPerson.clear();
    return true;
}

// Indexes every object directory below strNsPath. An object that cannot be
// read is logged and left out, so that one damaged object does not keep the
// rest of its namespace out of the index.
bool ReindexNs(DBConnect_tag *pConn, const std::string &strNsPath, const std::string &strNs) {
    // One section over the whole namespace: every object read raises its own,
    // and thousands of reads each switching ids and logging the switches cost
    // more than the reads themselves. Nested sections neither switch nor log.
    TESSEL_AS_ROOT();
    const char *szNs = strNs.c_str();
    Json::Value jsFilter;
    TESSEL_CHECK_APPEND(!TesselSettingsIndexGet(szNs, jsFilter), "!TesselSettingsIndexGet(szNs, jsFilter)", false);
    GlobList objects;
    const std::string strPattern = GlobLiteral(strNsPath) + "/*";
    TESSEL_CHECK(0 != ListAsRoot(strPattern, objects), TESSEL_ERR_OPERATION_FAILED,
                 "0 != glob(strPattern.c_str(), GLOB_ERR, NULL, &Globbuf)", false);
    const size_t prefixLen = strNsPath.size() + 1;
    std::string strSQL;
    std::string strPerson;
    for (size_t count = 1; count <= objects.buf.gl_pathc; ++count) {
        const std::string strId = std::string(objects.buf.gl_pathv[count - 1]).substr(prefixLen);
        const unsigned int owner = TesselObjectGetOwnerByID(strId);
        std::string strObjectValue;
        std::string strPersonValue;
        if (!TesselObjectCreateIndexValue(strObjectValue, strPersonValue, strId.c_str(), szNs, owner, jsFilter)) {
            TESSEL_LOG(LOG_ERR, "fail to reindex object ns=%s, id=%s, owner=%u", szNs, strId.c_str(), owner);
        } else {
            strSQL.append(strSQL.empty() ? "" : ",").append(strObjectValue);
            strPerson.append(strPerson.empty() ? "" : ",").append(strPersonValue);
        }
        if (0 == count % kReindexBatch && !FlushReindex(pConn, strSQL, strPerson)) {
            return false;
        }
    }
    return FlushReindex(pConn, strSQL, strPerson);
}

// Every namespace folder of the store, each under its folder's name. A
// namespace that fails does not keep the others out; the result reports it.
bool ReindexAll(DBConnect_tag *pConn) {
    std::string strRepo;
    TESSEL_CHECK_APPEND(!TesselGetRepoDir(strRepo), "!TesselGetRepoDir(strRepo)", false);
    GlobList namespaces;
    const std::string strTesselPath = GlobLiteral(strRepo) + "/*";
    TESSEL_CHECK(0 != ListAsRoot(strTesselPath, namespaces), TESSEL_ERR_OPERATION_FAILED,
                 "0 != glob(strTesselPath.c_str(), GLOB_ERR, NULL, &Globbuf)", false);
    bool blOk = true;
    for (size_t i = 0; i < namespaces.buf.gl_pathc; ++i) {
        const std::string strNsPath = namespaces.buf.gl_pathv[i];
        const std::string strNs = strNsPath.substr(strRepo.size() + 1);
        if (!ReindexNs(pConn, strNsPath, strNs)) {
            TESSEL_APPEND("!ReindexNs(pConn, strNsPath, strNs)");
            blOk = false;
        }
    }
    return blOk;
}

// The object the parameter names, when it names one, indexed once more on
// its own: a caller that re-indexes on behalf of one object gets that
// object's row from a read of its own, whatever the folder listing held.
bool TesselIndex(DBConnect_tag *pConn, const Json::Value &jParam) {
    if (!jParam.isObject() || !jParam[SZK_ID].isString() || !jParam[SZK_NS].isString()) {
        return true;
    }
    const std::string strId = jParam[SZK_ID].asString();
    const std::string strNs = jParam[SZK_NS].asString();
    TESSEL_CHECK_APPEND(!TesselObjectIndexEx(pConn, strId.c_str(), strNs.c_str(), TesselObjectGetOwnerByID(strId)),
                        "!TesselObjectIndexEx(pConn, szID, szNs, owner)", false);
    return true;
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

bool TesselDeleteIndex(const Json::Value &jParam) {
    DBConnect_tag *pConn = NULL;
    TESSEL_CHECK_APPEND(NULL == (pConn = TesselOpenConn()), "NULL == (pConn = TesselOpenConn())", false);
    TESSEL_CHECK_APPEND(!clear_index(pConn, jParam), "!clear_index(pConn, jParam)", false);
    return true;
}

bool TesselReindex(const Json::Value &jParam) {
    DBConnect_tag *pConn = NULL;
    TESSEL_CHECK_APPEND(NULL == (pConn = TesselOpenConn()), "NULL == (pConn = TesselOpenConn())", false);
    TESSEL_CHECK_APPEND(!clear_index(pConn, jParam), "!clear_index(pConn, jParam)", false);
    if (jParam.isObject() && jParam.isMember(SZK_NS)) {
        const std::string strNs = jParam[SZK_NS].asString();
        std::string strNsPath;
        TESSEL_CHECK_APPEND(!TesselGetNSPath(strNs, strNsPath), "!TesselGetNSPath(strNs, strNsPath)", false);
        TESSEL_CHECK_APPEND(!ReindexNs(pConn, strNsPath, strNs), "!ReindexNs(pConn, strNsPath, strNs)", false);
    } else {
        TESSEL_CHECK_APPEND(!ReindexAll(pConn), "!ReindexAll(pConn)", false);
    }
    TESSEL_CHECK_APPEND(!TesselIndex(pConn, jParam), "!TesselIndex(pConn, jParam)", false);
    return true;
}
