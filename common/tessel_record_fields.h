// The member accessors the object record and the version record share:
// every field has the same get_X / get_ref_X / set_X (and swap_X for JSON),
// only the class and the types differ. A record that lost its data block
// answers empty (or a null JSON value, or 0) and refuses to store anything.
#ifndef TESSEL_COMMON_TESSEL_RECORD_FIELDS_H
#define TESSEL_COMMON_TESSEL_RECORD_FIELDS_H

#include <string>

#include <json/value.h>

namespace tessel {

inline const std::string &EmptyText() {
    static const std::string strEmpty;
    return strEmpty;
}

inline const Json::Value &NullJson() {
    static const Json::Value jNull;
    return jNull;
}

// Json::Value::clear() only accepts null, arrays and objects (it throws on a
// scalar). A scalar has nothing to keep, so it goes back to null; arrays and
// objects keep their type.
inline void EmptyJson(Json::Value &jField) {
    if (jField.isArray() || jField.isObject()) {
        jField.clear();
    } else {
        jField = Json::Value();
    }
}

}  // namespace tessel

#define TESSEL_RECORD_SETTER(Class, X, ArgType) \
    bool Class::set_##X(ArgType v) {            \
        if (NULL == m_impl) {                   \
            return false;                       \
        }                                       \
        m_impl->X = v;                          \
        return true;                            \
    }

// get_X, get_ref_X and set_X of a text field.
#define TESSEL_RECORD_TEXT_FIELD(Class, X)                             \
    std::string Class::get_##X() const {                               \
        return m_impl ? m_impl->X : std::string();                     \
    }                                                                  \
    const std::string &Class::get_ref_##X() const {                    \
        return m_impl ? m_impl->X : tessel::EmptyText();               \
    }                                                                  \
    TESSEL_RECORD_SETTER(Class, X, const std::string &)

// get_X, get_ref_X, set_X and swap_X of a JSON field.
#define TESSEL_RECORD_JSON_FIELD(Class, X)                             \
    Json::Value Class::get_##X() const {                               \
        return m_impl ? m_impl->X : Json::Value();                     \
    }                                                                  \
    const Json::Value &Class::get_ref_##X() const {                    \
        return m_impl ? m_impl->X : tessel::NullJson();                \
    }                                                                  \
    TESSEL_RECORD_SETTER(Class, X, const Json::Value &)                \
    bool Class::swap_##X(Json::Value &v) {                             \
        if (NULL == m_impl) {                                          \
            return false;                                              \
        }                                                              \
        m_impl->X.swap(v);                                             \
        return true;                                                   \
    }

// get_X and set_X of an integer field kept as StoredType (32 bits in both
// records) behind the wider ApiType of the interface.
#define TESSEL_RECORD_INT_FIELD(Class, X, ApiType, StoredType)         \
    ApiType Class::get_##X() const {                                   \
        return m_impl ? static_cast<ApiType>(m_impl->X) : 0;           \
    }                                                                  \
    bool Class::set_##X(ApiType v) {                                   \
        if (NULL == m_impl) {                                          \
            return false;                                              \
        }                                                              \
        m_impl->X = static_cast<StoredType>(v);                        \
        return true;                                                   \
    }

#endif  // TESSEL_COMMON_TESSEL_RECORD_FIELDS_H
