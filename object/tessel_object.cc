// The object record: its data block, construction, reset and the member
// accessors that the rest of the library goes through.
#include <stdint.h>

#include <new>
#include <string>
#include <utility>

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

namespace {

const std::string &EmptyText() {
    static const std::string strEmpty;
    return strEmpty;
}

const Json::Value &NullJson() {
    static const Json::Value jNull;
    return jNull;
}

// Json::Value::clear() only accepts null, arrays and objects (it throws on a
// scalar). A scalar field, such as binary_info stored as text by fromJson,
// has nothing to keep, so it goes back to null.
void Empty(Json::Value &jField) {
    if (jField.isArray() || jField.isObject()) {
        jField.clear();
    } else {
        jField = Json::Value();
    }
}

}  // namespace

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
    Empty(d.commit_msg);
    d.parent_id.clear();
    d.owner = UID_ERR;  // no user: 0 would be root
    Empty(d.metatext);
    Empty(d.text);
    Empty(d.metabinary_info);
    Empty(d.binary_info);
    // path_info and perm describe where and for whom the record was read;
    // they stay valid across a reset of its content.
    Empty(d.acl);
    d.ctime = 0;
    d.mtime = 0;
    Empty(d.err);
    Empty(d.extra_info);
    d.person = Json::Value(Json::objectValue);
}

// Every field has the same accessors; only the types differ. A record that
// lost its data block answers empty (or a null JSON value, or 0) and refuses
// to store anything.
#define TESSEL_FIELD_SETTER(X, ArgType)            \
    bool TESSEL_OBJECT::set_##X(ArgType v) {       \
        if (NULL == m_impl) {                      \
            return false;                          \
        }                                          \
        m_impl->X = v;                             \
        return true;                               \
    }

// get_X, get_ref_X and set_X of a text field.
#define TESSEL_TEXT_FIELD(X)                                      \
    std::string TESSEL_OBJECT::get_##X() const {                  \
        return m_impl ? m_impl->X : std::string();                \
    }                                                             \
    const std::string &TESSEL_OBJECT::get_ref_##X() const {       \
        return m_impl ? m_impl->X : EmptyText();                  \
    }                                                             \
    TESSEL_FIELD_SETTER(X, const std::string &)

// get_X, get_ref_X, set_X and swap_X of a JSON field.
#define TESSEL_JSON_FIELD(X)                                      \
    Json::Value TESSEL_OBJECT::get_##X() const {                  \
        return m_impl ? m_impl->X : Json::Value();                \
    }                                                             \
    const Json::Value &TESSEL_OBJECT::get_ref_##X() const {       \
        return m_impl ? m_impl->X : NullJson();                   \
    }                                                             \
    TESSEL_FIELD_SETTER(X, const Json::Value &)                   \
    bool TESSEL_OBJECT::swap_##X(Json::Value &v) {                \
        if (NULL == m_impl) {                                     \
            return false;                                         \
        }                                                         \
        m_impl->X.swap(v);                                        \
        return true;                                              \
    }

// get_X and set_X of an integer field; the value is kept in 32 bits.
#define TESSEL_INT_FIELD(X, ApiType, StoredType)                  \
    ApiType TESSEL_OBJECT::get_##X() const {                      \
        return m_impl ? static_cast<ApiType>(m_impl->X) : 0;      \
    }                                                             \
    bool TESSEL_OBJECT::set_##X(ApiType v) {                      \
        if (NULL == m_impl) {                                     \
            return false;                                         \
        }                                                         \
        m_impl->X = static_cast<StoredType>(v);                   \
        return true;                                              \
    }

TESSEL_TEXT_FIELD(ns)
TESSEL_TEXT_FIELD(id)
TESSEL_TEXT_FIELD(category)
TESSEL_TEXT_FIELD(version)
TESSEL_JSON_FIELD(commit_msg)
TESSEL_TEXT_FIELD(parent_id)
TESSEL_INT_FIELD(owner, unsigned long, uint32_t)
TESSEL_JSON_FIELD(metatext)
TESSEL_JSON_FIELD(text)
TESSEL_JSON_FIELD(metabinary_info)
TESSEL_JSON_FIELD(binary_info)
TESSEL_JSON_FIELD(path_info)
TESSEL_JSON_FIELD(acl)
TESSEL_TEXT_FIELD(perm)
TESSEL_INT_FIELD(ctime, long, int32_t)
TESSEL_INT_FIELD(mtime, long, int32_t)
TESSEL_JSON_FIELD(err)
TESSEL_JSON_FIELD(extra_info)
TESSEL_JSON_FIELD(person)

#undef TESSEL_FIELD_SETTER
#undef TESSEL_TEXT_FIELD
#undef TESSEL_JSON_FIELD
#undef TESSEL_INT_FIELD
