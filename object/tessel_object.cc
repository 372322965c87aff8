// The object record: its data block, construction, reset and the member
// accessors that the rest of the library goes through.
#include <stdint.h>

#include <new>
#include <string>
#include <utility>

#include "common/tessel_record_fields.h"
#include "tessel_id.h"
#include "tesselobject.h"

// The record's fields, in the order the record is documented in.
struct TESSEL_OBJECT_PRIVATE {
    uint32_t flags = 0;  // internal word, reset with the record
    std::string ns;
    std::string id;
    std::string category;
    std::string version;
    Json::Value commit_msg;
    std::string parent_id;
    uint32_t owner = 0;
    Json::Value metatext;
    Json::Value text;
    Json::Value metabinary_info;
    Json::Value binary_info;
    Json::Value path_info;
    Json::Value acl;
    std::string perm;
    int32_t ctime = 0;
    int32_t mtime = 0;
    Json::Value err;
    Json::Value extra_info;
    Json::Value person;
};

TESSEL_OBJECT::TESSEL_OBJECT()
    : next(NULL), m_param(Json::objectValue), m_impl(new (std::nothrow) TESSEL_OBJECT_PRIVATE) {}

TESSEL_OBJECT::~TESSEL_OBJECT() { delete m_impl; }

void TESSEL_OBJECT::clear() {
    if (NULL == m_impl) {
        return;
    }
    TESSEL_OBJECT_PRIVATE &d = *m_impl;
    d.flags = 0;
    d.ns.clear();
    d.id.clear();
    d.category.clear();
    d.version.clear();
    tessel::EmptyJson(d.commit_msg);
    d.parent_id.clear();
    d.owner = UID_ERR;  // no user: 0 would be root
    tessel::EmptyJson(d.metatext);
    tessel::EmptyJson(d.text);
    tessel::EmptyJson(d.metabinary_info);
    tessel::EmptyJson(d.binary_info);
    // path_info and perm describe where and for whom the record was read;
    // they stay valid across a reset of its content.
    tessel::EmptyJson(d.acl);
    d.ctime = 0;
    d.mtime = 0;
    tessel::EmptyJson(d.err);
    tessel::EmptyJson(d.extra_info);
    d.person = Json::Value(Json::objectValue);
}

TESSEL_RECORD_TEXT_FIELD(TESSEL_OBJECT, ns)
TESSEL_RECORD_TEXT_FIELD(TESSEL_OBJECT, id)
TESSEL_RECORD_TEXT_FIELD(TESSEL_OBJECT, category)
TESSEL_RECORD_TEXT_FIELD(TESSEL_OBJECT, version)
TESSEL_RECORD_JSON_FIELD(TESSEL_OBJECT, commit_msg)
TESSEL_RECORD_TEXT_FIELD(TESSEL_OBJECT, parent_id)
TESSEL_RECORD_INT_FIELD(TESSEL_OBJECT, owner, unsigned long, uint32_t)
TESSEL_RECORD_JSON_FIELD(TESSEL_OBJECT, metatext)
TESSEL_RECORD_JSON_FIELD(TESSEL_OBJECT, text)
TESSEL_RECORD_JSON_FIELD(TESSEL_OBJECT, metabinary_info)
TESSEL_RECORD_JSON_FIELD(TESSEL_OBJECT, binary_info)
TESSEL_RECORD_JSON_FIELD(TESSEL_OBJECT, path_info)
TESSEL_RECORD_JSON_FIELD(TESSEL_OBJECT, acl)
TESSEL_RECORD_TEXT_FIELD(TESSEL_OBJECT, perm)
TESSEL_RECORD_INT_FIELD(TESSEL_OBJECT, ctime, long, int32_t)
TESSEL_RECORD_INT_FIELD(TESSEL_OBJECT, mtime, long, int32_t)
TESSEL_RECORD_JSON_FIELD(TESSEL_OBJECT, err)
TESSEL_RECORD_JSON_FIELD(TESSEL_OBJECT, extra_info)
TESSEL_RECORD_JSON_FIELD(TESSEL_OBJECT, person)

