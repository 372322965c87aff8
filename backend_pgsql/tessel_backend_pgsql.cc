// The index store's entry points and its registration as "pgsql".
#include "backend_pgsql/tessel_backend_pgsql.h"

#include "common/tessel_report.h"
#include "tessel_index.h"

static constexpr const char kTesselModule[] = "backend_pgsql/tessel_backend_pgsql";

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

bool TESSEL_BACKEND_PGSQL::HasChildren(const Json::Value &) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_PGSQL::HasChildren is not available yet");
    return false;
}

bool TESSEL_BACKEND_PGSQL::Delete(const Json::Value &) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_PGSQL::Delete is not available yet");
    return false;
}
