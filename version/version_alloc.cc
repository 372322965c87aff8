// The version record: its data block, construction, reset, the member
// accessors, and the life cycle of records and chains of records.
#include <stdint.h>

#include <new>
#include <string>

#include "common/tessel_report.h"
#include "tesselobjectversion.h"

static constexpr const char kTesselModule[] = "version/version_alloc";

// The record's fields, in the order the record is documented in.
struct TESSEL_OBJECT_VERSION_PRIVATE {
    std::string ns;
    std::string id;
    uint32_t author = 0;
    int32_t mtime = 0;
    std::string version;
    Json::Value commit_msg;
    Json::Value last_version{Json::arrayValue};
    Json::Value extra_info;
};

namespace {

const std::string &EmptyText() {
    static const std::string strEmpty;
    return strEmpty;
}

const Json::Value &NullJson() {
    static const Json::Value jNull;
    return jNull;
}

// Json::Value::clear() throws on a scalar; a scalar has nothing to keep, so
// it goes back to null. Arrays and objects keep their type, as an object
// record's JSON fields do on a reset.
void Empty(Json::Value &jField) {
    if (jField.isArray() || jField.isObject()) {
        jField.clear();
    } else {
        jField = Json::Value();
    }
}

}  // namespace

TESSEL_OBJECT_VERSION::TESSEL_OBJECT_VERSION()
    : next(NULL), m_impl(new (std::nothrow) TESSEL_OBJECT_VERSION_PRIVATE) {}

TESSEL_OBJECT_VERSION::~TESSEL_OBJECT_VERSION() { delete m_impl; }

// A reset record reads as a new one, except that a JSON array or object
// field is emptied in place rather than made null.
void TESSEL_OBJECT_VERSION::clear() {
    if (NULL == m_impl) {
        return;
    }
    TESSEL_OBJECT_VERSION_PRIVATE &d = *m_impl;
    d.ns.clear();
    d.id.clear();
    d.author = 0;
    d.mtime = 0;
    d.version.clear();
    Empty(d.commit_msg);
    if (d.last_version.isArray()) {
        d.last_version.clear();
    } else {
        d.last_version = Json::Value(Json::arrayValue);
    }
    Empty(d.extra_info);
}

// The same accessors as the object record's; a record that lost its data
// block answers empty (or null, or 0) and refuses to store anything.
#define TESSEL_VERSION_SETTER(X, ArgType)                \
    bool TESSEL_OBJECT_VERSION::set_##X(ArgType v) {     \
        if (NULL == m_impl) {                            \
            return false;                                \
        }                                                \
        m_impl->X = v;                                   \
        return true;                                     \
    }

#define TESSEL_VERSION_TEXT_FIELD(X)                              \
    std::string TESSEL_OBJECT_VERSION::get_##X() const {          \
        return m_impl ? m_impl->X : std::string();                \
    }                                                             \
    const std::string &TESSEL_OBJECT_VERSION::get_ref_##X() const { \
        return m_impl ? m_impl->X : EmptyText();                  \
    }                                                             \
    TESSEL_VERSION_SETTER(X, const std::string &)

#define TESSEL_VERSION_JSON_FIELD(X)                              \
    Json::Value TESSEL_OBJECT_VERSION::get_##X() const {          \
        return m_impl ? m_impl->X : Json::Value();                \
    }                                                             \
    const Json::Value &TESSEL_OBJECT_VERSION::get_ref_##X() const { \
        return m_impl ? m_impl->X : NullJson();                   \
    }                                                             \
    TESSEL_VERSION_SETTER(X, const Json::Value &)                 \
    bool TESSEL_OBJECT_VERSION::swap_##X(Json::Value &v) {        \
        if (NULL == m_impl) {                                     \
            return false;                                         \
        }                                                         \
        m_impl->X.swap(v);                                        \
        return true;                                              \
    }

// The value is kept in 32 bits, as the version store records it.
#define TESSEL_VERSION_INT_FIELD(X, ApiType, StoredType)          \
    ApiType TESSEL_OBJECT_VERSION::get_##X() const {              \
        return m_impl ? static_cast<ApiType>(m_impl->X) : 0;      \
    }                                                             \
    bool TESSEL_OBJECT_VERSION::set_##X(ApiType v) {              \
        if (NULL == m_impl) {                                     \
            return false;                                         \
        }                                                         \
        m_impl->X = static_cast<StoredType>(v);                   \
        return true;                                              \
    }

TESSEL_VERSION_TEXT_FIELD(ns)
TESSEL_VERSION_TEXT_FIELD(id)
TESSEL_VERSION_INT_FIELD(author, unsigned long, uint32_t)
TESSEL_VERSION_INT_FIELD(mtime, long, int32_t)
TESSEL_VERSION_TEXT_FIELD(version)
TESSEL_VERSION_JSON_FIELD(commit_msg)
TESSEL_VERSION_JSON_FIELD(last_version)
TESSEL_VERSION_JSON_FIELD(extra_info)

#undef TESSEL_VERSION_SETTER
#undef TESSEL_VERSION_TEXT_FIELD
#undef TESSEL_VERSION_JSON_FIELD
#undef TESSEL_VERSION_INT_FIELD

extern "C" {

TESSEL_OBJECT_VERSION *TesselObjectVersionAlloc(void) {
    TESSEL_OBJECT_VERSION *pVer = NULL;
    TESSEL_CHECK(NULL == (pVer = new (std::nothrow) TESSEL_OBJECT_VERSION), TESSEL_ERR_OUT_OF_MEMORY,
                 "NULL == (pVer = (TESSEL_OBJECT_VERSION *)new TESSEL_OBJECT_VERSION)", NULL);
    // A record without its data block would answer every call with nothing;
    // to the caller that is the same failed allocation.
    if (NULL == pVer->m_impl) {
        delete pVer;
        TESSEL_RAISE(TESSEL_ERR_OUT_OF_MEMORY, "NULL == (pVer = (TESSEL_OBJECT_VERSION *)new TESSEL_OBJECT_VERSION)");
        return NULL;
    }
    return pVer;
}

void TesselObjectVersionFreeList(TESSEL_OBJECT_VERSION *pHead) {
    // Iterative: an object's history can be long.
    while (NULL != pHead) {
        TESSEL_OBJECT_VERSION *pNext = pHead->next;
        delete pHead;
        pHead = pNext;
    }
}

TESSEL_OBJECT_VERSION *TesselObjectVersionNext(TESSEL_OBJECT_VERSION *pVersion) {
    return (NULL == pVersion) ? NULL : pVersion->next;
}

void TesselObjectVersionClear(TESSEL_OBJECT_VERSION *pVersion) {
    if (NULL != pVersion) {
        pVersion->clear();
    }
}

}  // extern "C"

TESSEL_OBJECT_VERSION_LIST::TESSEL_OBJECT_VERSION_LIST() : m_head(NULL) {}

TESSEL_OBJECT_VERSION_LIST::~TESSEL_OBJECT_VERSION_LIST() { clear(); }

void TESSEL_OBJECT_VERSION_LIST::clear() {
    TesselObjectVersionFreeList(m_head);
    m_head = NULL;
}
