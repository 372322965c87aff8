// The version record: its data block, construction, reset, the member
// accessors, and the life cycle of records and chains of records.
#include <stdint.h>

#include <new>
#include <string>

#include "common/tessel_record_fields.h"
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
    tessel::EmptyJson(d.commit_msg);
    if (d.last_version.isArray()) {
        d.last_version.clear();
    } else {
        d.last_version = Json::Value(Json::arrayValue);
    }
    tessel::EmptyJson(d.extra_info);
}

TESSEL_RECORD_TEXT_FIELD(TESSEL_OBJECT_VERSION, ns)
TESSEL_RECORD_TEXT_FIELD(TESSEL_OBJECT_VERSION, id)
TESSEL_RECORD_INT_FIELD(TESSEL_OBJECT_VERSION, author, unsigned long, uint32_t)
TESSEL_RECORD_INT_FIELD(TESSEL_OBJECT_VERSION, mtime, long, int32_t)
TESSEL_RECORD_TEXT_FIELD(TESSEL_OBJECT_VERSION, version)
TESSEL_RECORD_JSON_FIELD(TESSEL_OBJECT_VERSION, commit_msg)
TESSEL_RECORD_JSON_FIELD(TESSEL_OBJECT_VERSION, last_version)
TESSEL_RECORD_JSON_FIELD(TESSEL_OBJECT_VERSION, extra_info)

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
