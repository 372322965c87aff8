// Object records turned into index rows: one object as an update-or-insert,
// a chain as one delete-and-insert execution, and value tuples for the bulk
// inserts of a re-index. Before text and metatext reach a column, the
// namespace's index filter drops the members it does not want searchable.
//
// The source sits with the index, below the object operations, but callers
// know it as part of the object layer, hence its module name. Reading an
// object by id is the one call from here up into the object layer; it stays
// behind ReadForIndex so that the cycle has a single, named place.
#include <climits>
#include <cstdlib>
#include <memory>
#include <string>

#include <json/value.h>
#include <quor/quor_db.h>

#include "common/tessel_json.h"
#include "common/tessel_report.h"
#include "tessel_conf.h"
#include "tessel_index.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "object/object_index";

namespace {

constexpr char SZ_SQL_UPSERT_OBJECT[] =
    "UPDATE object SET ns='@QUOR:VAR', owner=@QUOR:LLINT, category='@QUOR:VAR',parent_id='@QUOR:VAR',"
    "version='@QUOR:VAR',commit_msg='@QUOR:VAR', acl='@QUOR:VAR', text='@QUOR:VAR', metatext='@QUOR:VAR', "
    "binary_info='@QUOR:VAR', metabinary_info='@QUOR:VAR', ctime=@QUOR:INT, mtime=@QUOR:INT, "
    "extra_info='@QUOR:VAR' WHERE id='@QUOR:VAR'; "
    "INSERT INTO object(id, ns, owner, category, parent_id, version, commit_msg, acl, text, metatext, "
    "binary_info, metabinary_info, ctime, mtime, extra_info)"
    "SELECT '@QUOR:VAR', '@QUOR:VAR', @QUOR:LLINT, '@QUOR:VAR', '@QUOR:VAR', '@QUOR:VAR', '@QUOR:VAR', "
    "'@QUOR:VAR', '@QUOR:VAR', '@QUOR:VAR', '@QUOR:VAR', '@QUOR:VAR', @QUOR:INT, @QUOR:INT, '@QUOR:VAR' "
    "WHERE NOT EXISTS (SELECT 1 FROM object where id = '@QUOR:VAR');";
constexpr char SZ_SQL_UPSERT_PERSON[] =
    "UPDATE person SET person='@QUOR:VAR' WHERE id='@QUOR:VAR'; "
    "INSERT INTO person(id, person) SELECT '@QUOR:VAR', '@QUOR:VAR' "
    "WHERE NOT EXISTS (SELECT 1 FROM person WHERE id = '@QUOR:VAR');";
constexpr char SZ_SQL_OBJECT_VALUE[] =
    " ('@QUOR:VAR', '@QUOR:VAR', @QUOR:LLINT, '@QUOR:VAR', '@QUOR:VAR', '@QUOR:VAR', '@QUOR:VAR', "
    "'@QUOR:VAR', '@QUOR:VAR', '@QUOR:VAR', '@QUOR:VAR', '@QUOR:VAR', @QUOR:INT, @QUOR:INT, '@QUOR:VAR')";
constexpr char SZ_SQL_PERSON_VALUE[] = " ('@QUOR:VAR', '@QUOR:VAR')";
constexpr char SZ_SQL_BATCH_OBJECT_PREFIX[] =
    "INSERT INTO object(id, ns, owner, category, parent_id, version, commit_msg, acl, text, metatext, "
    "binary_info, metabinary_info, ctime, mtime, extra_info) VALUES ";
constexpr char SZ_SQL_BATCH_PERSON_PREFIX[] = "INSERT INTO person (id, person) VALUES ";
constexpr char SZ_SQL_BATCH_DELETE_OBJECT[] = "DELETE FROM object where id IN ";
constexpr char SZ_SQL_BATCH_DELETE_PERSON[] = "DELETE FROM person where id IN ";
constexpr char SZ_SQL_LIST_TEXT[] = "'@QUOR:VAR'";
constexpr char SZ_SQL_LIST_LLINT[] = "@QUOR:LLINT";
// An empty IN list is not SQL; a list holding the empty id matches no row.
constexpr char SZ_SQL_EMPTY_LIST[] = "('')";

constexpr char SZK_TEXT[] = "text";
constexpr char SZK_METATEXT[] = "metatext";
constexpr char SZK_KEY[] = "key";
constexpr char SZK_PREFIX[] = "prefix";
constexpr char SZ_EMPTY_JSON[] = "{}";

struct FreeSql {
    void operator()(char *sz) const { free(sz); }
};
// A statement filled by the database wrapper, which allocates it with malloc.
using SqlText = std::unique_ptr<char, FreeSql>;

// One record's columns as the statements take them.
struct IndexRow {
    std::string id;
    std::string ns;
    long long owner = 0;
    std::string category;
    std::string parent_id;
    std::string version;
    std::string commit_msg;
    std::string acl;
    std::string text;
    std::string metatext;
    std::string binary_info;
    std::string metabinary_info;
    int ctime = 0;
    int mtime = 0;
    std::string extra_info;
    std::string person;
};

const Json::Value &Member(const Json::Value &jVal, const char *szKey) {
    static const Json::Value jNull;
    return jVal.isObject() ? jVal[szKey] : jNull;
}

std::string JsonColumn(const Json::Value &jVal) { return jVal.empty() ? SZ_EMPTY_JSON : tessel::toString(jVal); }

// One field after its part of the filter ({"key": [...], "prefix": [...]}).
std::string FilteredColumn(const Json::Value &jField, const Json::Value &jFieldFilter) {
    if (!jField.isObject() || jField.empty()) {
        return SZ_EMPTY_JSON;
    }
    Json::Value jCopy = jField;
    const Json::Value &jKeys = Member(jFieldFilter, SZK_KEY);
    for (Json::ArrayIndex i = 0; jKeys.isArray() && i < jKeys.size(); ++i) {
        if (jKeys[i].isString()) {
            jCopy.removeMember(jKeys[i].asString());
        }
    }
    const Json::Value &jPrefixes = Member(jFieldFilter, SZK_PREFIX);
    for (Json::ArrayIndex i = 0; jPrefixes.isArray() && i < jPrefixes.size(); ++i) {
        if (!jPrefixes[i].isString()) {
            continue;
        }
        const std::string strPrefix = jPrefixes[i].asString();
        for (const std::string &strName : jCopy.getMemberNames()) {
            if (0 == strName.compare(0, strPrefix.size(), strPrefix)) {
                jCopy.removeMember(strName);
            }
        }
    }
    return tessel::toString(jCopy);
}

bool applyFilter(std::string &strFilterText, std::string &strFilterMetatext, const TESSEL_OBJECT *pObj,
                 const Json::Value &jFilter) {
    TESSEL_CHECK(NULL == pObj, TESSEL_ERR_BAD_PARAMETERS, "NULL == pObj", false);
    strFilterText = FilteredColumn(pObj->get_ref_text(), Member(jFilter, SZK_TEXT));
    strFilterMetatext = FilteredColumn(pObj->get_ref_metatext(), Member(jFilter, SZK_METATEXT));
    return true;
}

// The record's columns, text and metatext already filtered.
IndexRow MakeRow(const TESSEL_OBJECT *pObj, std::string strText, std::string strMetatext) {
    IndexRow row;
    row.id = pObj->get_ref_id();
    row.ns = pObj->get_ref_ns();
    row.owner = static_cast<long long>(pObj->get_owner());
    row.category = pObj->get_ref_category();
    row.parent_id = pObj->get_ref_parent_id();
    row.version = pObj->get_ref_version();
    row.commit_msg = JsonColumn(pObj->get_ref_commit_msg());
    row.acl = JsonColumn(pObj->get_ref_acl());
    row.text = std::move(strText);
    row.metatext = std::move(strMetatext);
    row.binary_info = JsonColumn(pObj->get_ref_binary_info());
    row.metabinary_info = JsonColumn(pObj->get_ref_metabinary_info());
    // The columns are int; the record keeps 32-bit times already.
    row.ctime = static_cast<int>(pObj->get_ctime());
    row.mtime = static_cast<int>(pObj->get_mtime());
    row.extra_info = JsonColumn(pObj->get_ref_extra_info());
    row.person = JsonColumn(pObj->get_ref_person());
    return row;
}

// The record's row, its text and metatext narrowed by jFilter.
bool FilteredRow(IndexRow &row, const TESSEL_OBJECT *pObj, const Json::Value &jFilter) {
    std::string strFilterText;
    std::string strFilterMetatext;
    TESSEL_CHECK_APPEND(!applyFilter(strFilterText, strFilterMetatext, pObj, jFilter),
                        "!applyFilter(strFilterText, strFilterMetatext, pObj, jFilter)", false);
    row = MakeRow(pObj, std::move(strFilterText), std::move(strFilterMetatext));
    return true;
}

// The wrapper takes C strings: a value with a NUL byte would be cut short
// there and stored as something else, so such a row is not filled at all.
// (JSON columns never hold one; the writer escapes it.)
bool CarriesNul(const IndexRow &row) {
    for (const std::string *pStr : {&row.id, &row.ns, &row.category, &row.parent_id, &row.version}) {
        if (std::string::npos != pStr->find('\0')) {
            return true;
        }
    }
    return false;
}

SqlText FillObjectUpsert(const IndexRow &r) {
    if (CarriesNul(r)) {
        return SqlText();
    }
    return SqlText(QUORDBEscapeStringEX3(
        QUOR_DB_PGSQL, SZ_SQL_UPSERT_OBJECT, r.ns.c_str(), r.owner, r.category.c_str(), r.parent_id.c_str(),
        r.version.c_str(), r.commit_msg.c_str(), r.acl.c_str(), r.text.c_str(), r.metatext.c_str(),
        r.binary_info.c_str(), r.metabinary_info.c_str(), r.ctime, r.mtime, r.extra_info.c_str(), r.id.c_str(),
        r.id.c_str(), r.ns.c_str(), r.owner, r.category.c_str(), r.parent_id.c_str(), r.version.c_str(),
        r.commit_msg.c_str(), r.acl.c_str(), r.text.c_str(), r.metatext.c_str(), r.binary_info.c_str(),
        r.metabinary_info.c_str(), r.ctime, r.mtime, r.extra_info.c_str(), r.id.c_str()));
}

SqlText FillPersonUpsert(const IndexRow &r) {
    if (CarriesNul(r)) {
        return SqlText();
    }
    return SqlText(QUORDBEscapeStringEX3(QUOR_DB_PGSQL, SZ_SQL_UPSERT_PERSON, r.person.c_str(), r.id.c_str(),
                                         r.id.c_str(), r.person.c_str(), r.id.c_str()));
}

SqlText FillObjectValue(const IndexRow &r) {
    if (CarriesNul(r)) {
        return SqlText();
    }
    return SqlText(QUORDBEscapeStringEX3(
        QUOR_DB_PGSQL, SZ_SQL_OBJECT_VALUE, r.id.c_str(), r.ns.c_str(), r.owner, r.category.c_str(),
        r.parent_id.c_str(), r.version.c_str(), r.commit_msg.c_str(), r.acl.c_str(), r.text.c_str(),
        r.metatext.c_str(), r.binary_info.c_str(), r.metabinary_info.c_str(), r.ctime, r.mtime,
        r.extra_info.c_str()));
}

SqlText FillPersonValue(const IndexRow &r) {
    if (CarriesNul(r)) {
        return SqlText();
    }
    return SqlText(QUORDBEscapeStringEX3(QUOR_DB_PGSQL, SZ_SQL_PERSON_VALUE, r.id.c_str(), r.person.c_str()));
}

// Both value tuples of one record, filtered with jFilter. The strings are
// changed only on success.
bool CreateValues(std::string &strObjectValue, std::string &strPersonValue, const TESSEL_OBJECT *pObj,
                  const Json::Value &jFilter) {
    IndexRow row;
    if (!FilteredRow(row, pObj, jFilter)) {
        return false;
    }
    SqlText szSQLUpsert = FillObjectValue(row);
    TESSEL_CHECK(!szSQLUpsert, TESSEL_ERR_USER_INPUT, "!szSQLUpsert", false);
    SqlText szSQLPerson = FillPersonValue(row);
    TESSEL_CHECK(!szSQLPerson, TESSEL_ERR_USER_INPUT, "!szSQLUpsert", false);
    strObjectValue = szSQLUpsert.get();
    strPersonValue = szSQLPerson.get();
    return true;
}

// One filled upsert run on pConn; an upsert that could not be filled is refused.
bool RunUpsert(DBConnect_tag *pConn, const SqlText &szSQLUpsert) {
    TESSEL_CHECK(!szSQLUpsert, TESSEL_ERR_USER_INPUT, "!szSQLUpsert", false);
    TESSEL_CHECK((0 != QUORDBExecute(pConn, szSQLUpsert.get(), NULL)), TESSEL_ERR_OPERATION_FAILED,
                 "(0 != QUORDBExecute(pConn, szSQLUpsert, NULL))", false);
    return true;
}

// jsArray as an SQL list "(a,b,...)", each element through escape; an
// element escape leaves empty is refused with the caller's condition text.
template <typename Escape>
bool EscapeList(std::string &strOut, const Json::Value &jsArray, const char *szRefused, Escape escape) {
    TESSEL_CHECK(!jsArray.isArray(), TESSEL_ERR_BAD_PARAMETERS, "!jsArray.isArray()", false);
    if (jsArray.empty()) {
        strOut = SZ_SQL_EMPTY_LIST;
        return true;
    }
    std::string strList = "(";
    for (Json::ArrayIndex i = 0; i < jsArray.size(); ++i) {
        const SqlText szSQL = escape(jsArray[i]);
        if (!szSQL) {
            TESSEL_RAISE(TESSEL_ERR_USER_INPUT, "%s", szRefused);
            return false;
        }
        strList.append(0 == i ? "" : ",").append(szSQL.get());
    }
    strOut = strList + ")";
    return true;
}

// The read parameters of an object as the index wants it: every field, the
// text already narrowed by the namespace's filter.
Json::Value GetParm(const char *szID, const char *szNs, unsigned int requester, unsigned int owner) {
    Json::Value jGetParm(Json::objectValue);
    jGetParm["ns"] = szNs;
    jGetParm["id"] = szID;
    jGetParm["requester"] = requester;
    jGetParm["owner"] = owner;
    jGetParm["field"] = TesselObjectFieldAll();
    return jGetParm;
}

// The object get of the object layer, the only call upward from here.
bool ReadForIndex(TESSEL_OBJECT &Object, const Json::Value &jGetParm) { return Object.Get(jGetParm); }

}  // namespace

bool TesselObjectIndexEx(DBConnect_tag *pConn, TESSEL_OBJECT *pObj) {
    TESSEL_CHECK(NULL == pConn, TESSEL_ERR_BAD_PARAMETERS, "NULL == pConn", false);
    TESSEL_CHECK(NULL == pObj, TESSEL_ERR_BAD_PARAMETERS, "NULL == pObj", false);
    Json::Value jFilter;
    TESSEL_CHECK_APPEND(!TesselSettingsIndexGetFromCache(pObj->get_ns(), jFilter),
                        "!TesselSettingsIndexGetFromCache(pObj->get_ns(), jFilter)", false);
    IndexRow row;
    // The person row follows only once the object row is in.
    return FilteredRow(row, pObj, jFilter) && RunUpsert(pConn, FillObjectUpsert(row)) &&
           RunUpsert(pConn, FillPersonUpsert(row));
}

bool TesselObjectIndexEx(DBConnect_tag *pConn, const char *szID, const char *szNs, unsigned int requester) {
    TESSEL_CHECK(NULL == szID || NULL == szNs, TESSEL_ERR_BAD_PARAMETERS, "NULL == szID || NULL == szNs", false);
    Json::Value jGetParm = GetParm(szID, szNs, requester, requester);
    TESSEL_CHECK_APPEND(!TesselSettingsIndexGetFromCache(szNs, jGetParm["field_filter"]),
                        "!TesselSettingsIndexGetFromCache(szNs, jGetParm[\"field_filter\"])", false);
    TESSEL_OBJECT Object;
    TESSEL_CHECK_APPEND(!ReadForIndex(Object, jGetParm), "!Object.Get(jGetParm)", false);
    TESSEL_CHECK_APPEND(!TesselObjectIndexEx(pConn, &Object), "!TesselObjectIndexEx(pConn, &Object)", false);
    return true;
}

bool TesselObjectIndex(const char *szID, const char *szNs, unsigned int requester) {
    DBConnect_tag *pConn = NULL;
    TESSEL_CHECK_APPEND(NULL == (pConn = TesselOpenConn()), "NULL == (pConn = TesselOpenConn())", false);
    TESSEL_CHECK_APPEND(!TesselObjectIndexEx(pConn, szID, szNs, requester),
                        "!TesselObjectIndexEx(pConn, szID, szNs, requester)", false);
    return true;
}

bool TesselObjectCreateIndexValue(std::string &strObjectValues, std::string &strPersonValues, const char *szID,
                                  const char *szNs, unsigned int owner, const Json::Value &jsFilter) {
    TESSEL_CHECK(NULL == szID || NULL == szNs, TESSEL_ERR_BAD_PARAMETERS, "NULL == szID || NULL == szNs", false);
    Json::Value jGetParm = GetParm(szID, szNs, owner, owner);
    jGetParm["field_filter"] = jsFilter;
    TESSEL_OBJECT Object;
    TESSEL_CHECK_APPEND(!ReadForIndex(Object, jGetParm), "!Object.Get(jGetParm)", false);
    TESSEL_CHECK_APPEND(!CreateValues(strObjectValues, strPersonValues, &Object, jsFilter),
                        "!CreateValues(strObjectValues, strPersonValues, &Object, jsFilter)", false);
    return true;
}

bool TesselObjectIndex(TESSEL_OBJECT *pObj) {
    DBConnect_tag *pConn = NULL;
    TESSEL_CHECK_APPEND(NULL == (pConn = TesselOpenConn()), "NULL == (pConn = TesselOpenConn())", false);
    TESSEL_CHECK_APPEND(!TesselObjectIndexEx(pConn, pObj), "!TesselObjectIndexEx(pConn, pObj)", false);
    return true;
}

bool TesselObjectBatchIndexEx(DBConnect_tag *pConn, TESSEL_OBJECT *pList) {
    TESSEL_CHECK(NULL == pConn, TESSEL_ERR_BAD_PARAMETERS, "NULL == pConn", false);
    std::string strSQL = SZ_SQL_BATCH_OBJECT_PREFIX;
    std::string strPerson = SZ_SQL_BATCH_PERSON_PREFIX;
    Json::Value jIds(Json::arrayValue);
    for (TESSEL_OBJECT *pObj = pList; NULL != pObj; pObj = pObj->next) {
        Json::Value jFilter;
        TESSEL_CHECK_APPEND(!TesselSettingsIndexGetFromCache(pObj->get_ns(), jFilter),
                            "!TesselSettingsIndexGetFromCache(pObj->get_ns(), jFilter)", false);
        std::string strObjectValue;
        std::string strPersonValue;
        TESSEL_CHECK_APPEND(!CreateValues(strObjectValue, strPersonValue, pObj, jFilter),
                            "!CreateValues(strObjectValue, strPersonValue, pObj, jFilter)", false);
        const char *szSep = jIds.empty() ? "" : ",";
        strSQL.append(szSep).append(strObjectValue);
        strPerson.append(szSep).append(strPersonValue);
        jIds.append(pObj->get_id());
    }
    std::string strIds;
    TESSEL_CHECK_APPEND(!TesselObjectEscapeStringArray(strIds, jIds), "!TesselObjectEscapeStringArray(strIds, jIds)",
                        false);
    // An empty chain inserts nothing: a bare "VALUES " would fail the whole
    // execution, so its inserts are left out and only the deletes run.
    if (jIds.empty()) {
        strSQL.clear();
        strPerson.clear();
    }
    strSQL = SZ_SQL_BATCH_DELETE_OBJECT + strIds + ";" + strSQL;
    strPerson = SZ_SQL_BATCH_DELETE_PERSON + strIds + ";" + strPerson;
    TESSEL_CHECK((0 != QUORDBExecute(pConn, (strSQL + ";" + strPerson).c_str(), NULL)), TESSEL_ERR_OPERATION_FAILED,
                 "(0 != QUORDBExecute(pConn, (strSQL + \";\" + strPerson).c_str(), NULL))", false);
    return true;
}

bool TesselObjectBatchIndex(TESSEL_OBJECT *pList) {
    DBConnect_tag *pConn = NULL;
    TESSEL_CHECK_APPEND(NULL == (pConn = TesselOpenConn()), "NULL == (pConn = TesselOpenConn())", false);
    TESSEL_CHECK_APPEND(!TesselObjectBatchIndexEx(pConn, pList), "!TesselObjectBatchIndexEx(pConn, pList)", false);
    return true;
}

bool TesselObjectEscapeStringArray(std::string &strOut, const Json::Value &jsArray) {
    return EscapeList(strOut, jsArray, "!szSQL", [](const Json::Value &jId) {
        const std::string strId = jId.isString() ? jId.asString() : std::string();
        SqlText szSQL;
        if (jId.isString() && std::string::npos == strId.find('\0')) {
            szSQL.reset(QUORDBEscapeStringEX3(QUOR_DB_PGSQL, SZ_SQL_LIST_TEXT, strId.c_str()));
        }
        return szSQL;
    });
}

bool TesselObjectEscapeUIntArray(std::string &strOut, const Json::Value &jsArray) {
    return EscapeList(strOut, jsArray, "NULL == szSQL", [](const Json::Value &jUid) {
        SqlText szSQL;
        // Only what a bigint column can hold: no signs, fractions or text.
        if (jUid.isUInt64() && jUid.asUInt64() <= static_cast<Json::UInt64>(LLONG_MAX)) {
            szSQL.reset(QUORDBEscapeStringEX3(QUOR_DB_PGSQL, SZ_SQL_LIST_LLINT,
                                              static_cast<long long>(jUid.asUInt64())));
        }
        return szSQL;
    });
}
