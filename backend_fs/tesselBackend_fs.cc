// The file-system store's entry points and its registration as "fs".
#include "backend_fs/tesselBackend_fs.h"

#include "common/tessel_report.h"

static constexpr const char kTesselModule[] = "backend_fs/tesselBackend_fs";

TESSEL_BACKEND_OP *CreateFsBackend() { return new TESSEL_BACKEND_FS(); }

namespace {
const RegisterBackend g_registerFs("fs", CreateFsBackend);
}  // namespace

TESSEL_BACKEND_FS::TESSEL_BACKEND_FS() {}

TESSEL_BACKEND_FS::~TESSEL_BACKEND_FS() {}

// ---- questions for the index store ------------------------------------------

int TESSEL_BACKEND_FS::List(const Json::Value &, TESSEL_OBJECT **, unsigned int &) { return 0; }

bool TESSEL_BACKEND_FS::ListChildren(const Json::Value &, Json::Value &) { return false; }

bool TESSEL_BACKEND_FS::HasChildren(const Json::Value &) { return false; }

// ---- the store's own operations ---------------------------------------------
// The object directory, the field table and the version store are not built
// yet. Until they are, each operation fails loudly rather than pretend to
// have stored or read anything.

bool TESSEL_BACKEND_FS::Get(const Json::Value &, TESSEL_OBJECT *) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_FS::Get is not available yet");
    return false;
}

bool TESSEL_BACKEND_FS::Download(const Json::Value &) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_FS::Download is not available yet");
    return false;
}

bool TESSEL_BACKEND_FS::Set(const Json::Value &, std::string &) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_FS::Set is not available yet");
    return false;
}

bool TESSEL_BACKEND_FS::FieldRename(const Json::Value &, std::string &) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_FS::FieldRename is not available yet");
    return false;
}

bool TESSEL_BACKEND_FS::Create(const Json::Value &, std::string &, std::string &) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_FS::Create is not available yet");
    return false;
}

bool TESSEL_BACKEND_FS::Delete(const Json::Value &) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_FS::Delete is not available yet");
    return false;
}

bool TESSEL_BACKEND_FS::VersionGet(const Json::Value &, TESSEL_OBJECT_VERSION *) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_FS::VersionGet is not available yet");
    return false;
}

bool TESSEL_BACKEND_FS::VersionDiff(const Json::Value &, Json::Value &) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_FS::VersionDiff is not available yet");
    return false;
}

int TESSEL_BACKEND_FS::VersionList(const Json::Value &, TESSEL_OBJECT_VERSION **, unsigned int &,
                                   unsigned int &) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_FS::VersionList is not available yet");
    return -1;
}

bool TESSEL_BACKEND_FS::SetOwner(const Json::Value &, std::string &) {
    TESSEL_RAISE(TESSEL_ERR_UNEXPECTED, "TESSEL_BACKEND_FS::SetOwner is not available yet");
    return false;
}
