// The index store's entry points and its registration as "pgsql".
#include "backend_pgsql/tessel_backend_pgsql.h"

#include <stdlib.h>

#include "common/tessel_report.h"
#include "tessel_index.h"

static constexpr const char kTesselModule[] = "backend_pgsql/tessel_backend_pgsql";

namespace {

constexpr char SZ_SQL_NS_CONDITION[] = "ns = '@QUOR:VAR'";
constexpr char SZ_SQL_SELECT_CHILDREN[] = "SELECT id FROM object WHERE parent_id IN ";
constexpr char SZ_SQL_LIMIT_ONE[] = " LIMIT 1";

}  // namespace

TESSEL_BACKEND_OP *CreatePgsqlBackend() { return new TESSEL_BACKEND_PGSQL(); }

namespace {
const RegisterBackend g_registerPgsql("pgsql", CreatePgsqlBackend);
}  // namespace

// A backend whose connection cannot be opened is still made, with a null
// handle; the failure stays on the error stack.
TESSEL_BACKEND_PGSQL::TESSEL_BACKEND_PGSQL() : m_conn(TesselOpenConn()) {}

// The connection belongs to the process, not to the backend.
TESSEL_BACKEND_PGSQL::~TESSEL_BACKEND_PGSQL() {}

// ---- the file-system store's operations -------------------------------------

bool TESSEL_BACKEND_PGSQL::Get(const Json::Value &, TESSEL_OBJECT *) { return true; }

bool TESSEL_BACKEND_PGSQL::Download(const Json::Value &) { return true; }

bool TESSEL_BACKEND_PGSQL::Set(const Json::Value &, std::string &) { return true; }

bool TESSEL_BACKEND_PGSQL::FieldRename(const Json::Value &, std::string &) { return true; }

bool TESSEL_BACKEND_PGSQL::Create(const Json::Value &, std::string &, std::string &) { return true; }

bool TESSEL_BACKEND_PGSQL::VersionGet(const Json::Value &, TESSEL_OBJECT_VERSION *) { return true; }

bool TESSEL_BACKEND_PGSQL::VersionDiff(const Json::Value &, Json::Value &) { return true; }

// Unlike its siblings this one answers false: a version listing must not
// look as if the index had found versions.
int TESSEL_BACKEND_PGSQL::VersionList(const Json::Value &, TESSEL_OBJECT_VERSION **, unsigned int &,
                                      unsigned int &) {
    return 0;
}

bool TESSEL_BACKEND_PGSQL::SetOwner(const Json::Value &, std::string &) { return true; }

// ---- the store's own operations ---------------------------------------------
// The queries are not built yet. Until they are, each operation fails loudly
// rather than report an empty index.

int TESSEL_BACKEND_PGSQL::List(const Json::Value &, TESSEL_OBJECT **, unsigned int &) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_PGSQL::List is not available yet");
    return -1;
}

bool TESSEL_BACKEND_PGSQL::ListChildren(const Json::Value &, Json::Value &) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_PGSQL::ListChildren is not available yet");
    return false;
}

// The child query without recursion, for the object's id (or ids) as the
// parent list; one row is enough to know.
bool TESSEL_BACKEND_PGSQL::HasChildren(const Json::Value &jParm) {
    TESSEL_CHECK(!jParm.isObject() || !jParm.isMember("id"), TESSEL_ERR_USER_INPUT, "!jParm.isMember(\"id\")", false);
    TESSEL_CHECK(!jParm.isMember("ns"), TESSEL_ERR_USER_INPUT, "!jParm.isMember(\"ns\")", false);
    TESSEL_CHECK(!jParm["ns"].isString(), TESSEL_ERR_USER_INPUT, "!jParm[\"ns\"].isString()", false);
    TESSEL_CHECK_APPEND(NULL == m_conn && NULL == (m_conn = TesselOpenConn()), "NULL == (m_conn = TesselOpenConn())",
                        false);
    Json::Value jsId(Json::arrayValue);
    if (jParm["id"].isArray()) {
        jsId = jParm["id"];
    } else {
        jsId.append(jParm["id"]);
    }
    std::string strIdList;
    TESSEL_CHECK_APPEND(!TesselObjectEscapeStringArray(strIdList, jsId),
                        "!TesselObjectEscapeStringArray(strIdList, jsId)", false);
    char *szCondition = QUORDBEscapeStringEX3(QUOR_DB_PGSQL, SZ_SQL_NS_CONDITION, jParm["ns"].asCString());
    TESSEL_CHECK(NULL == szCondition, TESSEL_ERR_OUT_OF_MEMORY,
                 "NULL == (szCondition = QUORDBEscapeStringEX3(QUOR_DB_PGSQL, \"ns = '@QUOR:VAR'\", "
                 "jParm[\"ns\"].asCString()))",
                 false);
    const std::string strSql =
        std::string(SZ_SQL_SELECT_CHILDREN) + strIdList + " AND " + szCondition + SZ_SQL_LIMIT_ONE;
    free(szCondition);
    DBResult_tag *pResult = NULL;
    TESSEL_CHECK(0 != QUORDBExecute(m_conn, strSql.c_str(), &pResult), TESSEL_ERR_OPERATION_FAILED,
                 "(0 != QUORDBExecute(m_conn, strSql.c_str(), &pResult))", false);
    const bool blHas = 0 < QUORDBNumRows(pResult);
    QUORDBFreeResult(pResult);
    return blHas;
}

bool TESSEL_BACKEND_PGSQL::Delete(const Json::Value &) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_PGSQL::Delete is not available yet");
    return false;
}
