// The permission word a requester holds on an object, and the editing of an
// acl by one sharing request.
#include "object/object_perm.h"

#include <stdio.h>
#include <sys/types.h>

#include <mutex>

#include "common/tessel_report.h"
#include "tessel_id.h"
#include "tessel_user.h"

static constexpr const char kTesselModule[] = "object/object_perm";

namespace {

constexpr const char SZ_PERM_OWNER[] = "owner";
constexpr const char SZ_PERM_RW[] = "rw";
constexpr const char SZ_PERM_RO[] = "ro";
constexpr const char SZK_ENABLED[] = "enabled";
constexpr const char SZK_PUBLIC[] = "public";
constexpr const char SZK_APP[] = "zem_app";
constexpr const char SZK_USER[] = "zem_user";
constexpr const char SZK_GROUP[] = "zem_group";
constexpr const char SZK_PERM[] = "perm";
constexpr const char SZK_INHERIT[] = "inherit";

// The anonymous caller of a web request: no account, only public entries.
constexpr unsigned int kUidAnonymous = 4294967295u;

// Values of a request that may be of any type; a wrong type reads as absent
// rather than throwing out of the library.
std::string TextOr(const Json::Value &jVal, const std::string &strDefault) {
    return jVal.isString() ? jVal.asString() : strDefault;
}

bool FlagOr(const Json::Value &jVal, bool blDefault) { return jVal.isBool() ? jVal.asBool() : blDefault; }

bool IsInherited(const Json::Value &jEntry) { return jEntry.isObject() && FlagOr(jEntry[SZK_INHERIT], false); }

}  // namespace

// ---- ranks -------------------------------------------------------------------

const std::map<std::string, int> PermissionOrder::s_order = {{SZ_PERM_RO, 1}, {SZ_PERM_RW, 2}};

int PermissionOrder::GetOrder(const std::string &strPerm) {
    std::map<std::string, int>::const_iterator it = s_order.find(strPerm);
    return (s_order.end() == it) ? -1 : it->second;
}

bool max_perm(std::string &final_perm, const std::string &added_perm) {
    if (final_perm.empty()) {
        if (-1 == PermissionOrder::GetOrder(added_perm)) {
            TESSEL_RAISE(TESSEL_ERR_BAD_PARAMETERS, "-1 == PermissionOrder::GetOrder(added_perm) [%s]",
                         added_perm.c_str());
            return false;
        }
        final_perm = added_perm;
        return true;
    }
    int order1 = -1;
    int order2 = -1;
    TESSEL_CHECK(-1 == (order1 = PermissionOrder::GetOrder(final_perm)), TESSEL_ERR_BAD_PARAMETERS,
                 "-1 == (order1 = PermissionOrder::GetOrder(final_perm))", false);
    TESSEL_CHECK(-1 == (order2 = PermissionOrder::GetOrder(added_perm)), TESSEL_ERR_BAD_PARAMETERS,
                 "-1 == (order2 = PermissionOrder::GetOrder(added_perm))", false);
    if (order1 < order2) {
        final_perm = added_perm;
    }
    return true;
}

// ---- the calculation ---------------------------------------------------------

bool get_public_perm(const Json::Value &acl, std::string &perm) {
    perm.clear();
    TESSEL_CHECK(!acl.isObject(), TESSEL_ERR_BAD_PARAMETERS, "!acl.isObject()", false);
    if (!acl.isMember(SZK_PUBLIC)) {
        return true;
    }
    TESSEL_CHECK(!acl[SZK_PUBLIC].isObject(), TESSEL_ERR_BAD_PARAMETERS, "!acl[\"public\"].isObject()", false);
    if (!acl[SZK_PUBLIC].isMember(SZK_PERM)) {
        return true;
    }
    TESSEL_CHECK(!acl[SZK_PUBLIC][SZK_PERM].isString(), TESSEL_ERR_BAD_PARAMETERS,
                 "!acl[\"public\"][\"perm\"].isString()", false);
    perm = acl[SZK_PUBLIC][SZK_PERM].asString();
    return true;
}

bool get_specific_perm(unsigned int Requester, unsigned int, const Json::Value &acl, std::string &perm) {
    std::string strSpecificPerm;
    TESSEL_CHECK(!acl.isObject(), TESSEL_ERR_BAD_PARAMETERS, "!acl.isObject()", false);

    if (acl.isMember(SZK_APP)) {
        TESSEL_CHECK(!acl[SZK_APP].isObject(), TESSEL_ERR_BAD_PARAMETERS, "!acl[\"zem_app\"].isObject()", false);
        if (acl[SZK_APP].isMember(SZK_PERM)) {
            TESSEL_CHECK(!acl[SZK_APP][SZK_PERM].isString(), TESSEL_ERR_BAD_PARAMETERS,
                         "!acl[\"zem_app\"][\"perm\"].isString()", false);
            strSpecificPerm = acl[SZK_APP][SZK_PERM].asString();
        }
    }

    // The user's own entry replaces the application-wide word even when it
    // is lower: a user can be held below what every local user gets.
    if (SZ_PERM_RW != strSpecificPerm && acl.isMember(SZK_USER)) {
        TESSEL_CHECK(!acl[SZK_USER].isObject(), TESSEL_ERR_BAD_PARAMETERS, "!acl[\"zem_user\"].isObject()", false);
        char szUid[64];
        snprintf(szUid, sizeof(szUid), "%u", Requester);
        if (acl[SZK_USER].isMember(szUid)) {
            const Json::Value &jEntry = acl[SZK_USER][szUid];
            TESSEL_CHECK(!jEntry.isObject(), TESSEL_ERR_BAD_PARAMETERS, "!acl[\"zem_user\"][szUid].isObject()",
                         false);
            TESSEL_CHECK(!jEntry.isMember(SZK_PERM), TESSEL_ERR_BAD_PARAMETERS,
                         "!acl[\"zem_user\"][szUid].isMember(\"perm\")", false);
            TESSEL_CHECK(!jEntry[SZK_PERM].isString(), TESSEL_ERR_BAD_PARAMETERS,
                         "!acl[\"zem_user\"][szUid][\"perm\"].isString()", false);
            strSpecificPerm = jEntry[SZK_PERM].asString();
        }
    }

    // "owner" is final: it is never compared, so group words cannot meet it.
    if (SZ_PERM_RW != strSpecificPerm && SZ_PERM_OWNER != strSpecificPerm && acl.isMember(SZK_GROUP)) {
        TESSEL_CHECK(!acl[SZK_GROUP].isObject(), TESSEL_ERR_BAD_PARAMETERS, "!acl[\"zem_group\"].isObject()", false);
        Json::Value jsGid;
        TESSEL_CHECK(!TesselGetAllGID(Requester, jsGid, true), TESSEL_ERR_USER_NOT_EXISTS,
                     "!TesselGetAllGID(Requester, jsGid, true)", false);
        for (const Json::Value &jGid : jsGid) {
            const std::string strGid = std::to_string(jGid.asInt64());
            if (!acl[SZK_GROUP].isMember(strGid)) {
                continue;
            }
            const Json::Value &jEntry = acl[SZK_GROUP][strGid];
            TESSEL_CHECK(!jEntry.isObject(), TESSEL_ERR_BAD_PARAMETERS, "!acl[\"zem_group\"][strGid].isObject()",
                         false);
            TESSEL_CHECK(!jEntry.isMember(SZK_PERM), TESSEL_ERR_BAD_PARAMETERS,
                         "!acl[\"zem_group\"][strGid].isMember(\"perm\")", false);
            TESSEL_CHECK(!jEntry[SZK_PERM].isString(), TESSEL_ERR_BAD_PARAMETERS,
                         "!acl[\"zem_group\"][strGid][\"perm\"].isString()", false);
            if (jEntry[SZK_PERM].asString().empty()) {
                continue;
            }
            TESSEL_CHECK_APPEND(!max_perm(strSpecificPerm, acl[SZK_GROUP][strGid][SZK_PERM].asString()),
                                "!max_perm(strSpecificPerm, acl[\"zem_group\"][strGid][\"perm\"].asString())", false);
            if (SZ_PERM_RW == strSpecificPerm) {
                break;
            }
        }
    }
    perm = strSpecificPerm;
    return true;
}

bool TesselObjectPermCalculate(unsigned int Requester, unsigned int owner, const Json::Value &jACL, std::string &perm) {
    if (Requester == owner) {
        perm = SZ_PERM_OWNER;
        return true;
    }
    // Root administers every object but owns only its own.
    if (UID_ROOT == Requester) {
        perm = SZ_PERM_RW;
        return true;
    }
    // Never shared: the caller reports "no permission" in its own words.
    if (jACL.isNull()) {
        return false;
    }
    TESSEL_CHECK(!jACL.isObject(), TESSEL_ERR_SHARING_DISABLED, "!jACL.isObject()", false);
    TESSEL_CHECK(!jACL.isMember(SZK_ENABLED), TESSEL_ERR_SHARING_DISABLED, "!jACL.isMember(\"enabled\")", false);
    TESSEL_CHECK(!jACL[SZK_ENABLED].isBool(), TESSEL_ERR_SHARING_DISABLED, "!jACL[\"enabled\"].isBool()", false);
    TESSEL_CHECK(!jACL[SZK_ENABLED].asBool(), TESSEL_ERR_SHARING_DISABLED, "!jACL[\"enabled\"].asBool()", false);

    std::string strPublicPerm;
    // Without an account nothing but the public entry can apply.
    if (kUidAnonymous == Requester) {
        TESSEL_CHECK_APPEND(!get_public_perm(jACL, strPublicPerm), "!get_public_perm(jACL, strPublicPerm)", false);
        TESSEL_CHECK(strPublicPerm.empty(), TESSEL_ERR_NO_PERMISSION, "strPublicPerm.empty()", false);
        perm = strPublicPerm;
        return true;
    }

    std::string strSpecificPerm;
    TESSEL_CHECK_APPEND(!get_specific_perm(Requester, owner, jACL, strSpecificPerm),
                        "!get_specific_perm(Requester, owner, jACL, strSpecificPerm)", false);
    if (SZ_PERM_OWNER == strSpecificPerm || SZ_PERM_RW == strSpecificPerm) {
        perm = strSpecificPerm;
        return true;
    }
    TESSEL_CHECK_APPEND(!get_public_perm(jACL, strPublicPerm), "!get_public_perm(jACL, strPublicPerm)", false);
    // A word that cannot be compared grants nothing; the refusal below says so.
    if (strPublicPerm.empty() || max_perm(strSpecificPerm, strPublicPerm)) {
        if (!strSpecificPerm.empty()) {
            perm = strSpecificPerm;
            return true;
        }
    }
    TESSEL_RAISE(TESSEL_ERR_NO_PERMISSION, "Requester no permission: %u", Requester);
    return false;
}

// ---- editing an acl ------------------------------------------------------------

namespace {

enum AclOp { kOpSet, kOpDelete, kOpBreak };

// One op on one entry (acl["public"], acl["zem_user"]["1001"], ...), held in
// its parent object under strKey. Returns 1 when the acl changed, else 0.
int EditEntry(Json::Value &jParent, const std::string &strKey, AclOp op, const std::string &strPerm, bool blRecursive,
              bool blForceInherit) {
    const bool blExists = jParent.isMember(strKey);
    const Json::Value jBefore = blExists ? jParent[strKey] : Json::Value();
    switch (op) {
        case kOpSet:
            if (!blRecursive) {
                Json::Value jEntry(Json::objectValue);
                jEntry[SZK_PERM] = strPerm;
                jEntry[SZK_INHERIT] = false;
                jParent[strKey] = jEntry;
            } else if (blExists && IsInherited(jBefore)) {
                jParent[strKey][SZK_PERM] = strPerm;
            } else if (blExists && jBefore.isObject() && !blForceInherit) {
                // The object's own entry yields only to a higher word from above.
                const int present = PermissionOrder::GetOrder(TextOr(jBefore[SZK_PERM], ""));
                if (PermissionOrder::GetOrder(strPerm) <= present) {
                    return 0;
                }
                jParent[strKey][SZK_PERM] = strPerm;
            } else {
                Json::Value jEntry(Json::objectValue);
                jEntry[SZK_PERM] = strPerm;
                jEntry[SZK_INHERIT] = true;
                jParent[strKey] = jEntry;
            }
            break;
        case kOpDelete:
            if (!blExists || (blRecursive && !blForceInherit && !IsInherited(jBefore))) {
                return 0;
            }
            jParent.removeMember(strKey);
            return 1;
        case kOpBreak:
            if (!blExists || !IsInherited(jBefore)) {
                return 0;
            }
            jParent[strKey][SZK_INHERIT] = false;
            break;
    }
    return (blExists && jParent[strKey] == jBefore) ? 0 : 1;
}

// The object holding the per-user or per-group entries, made when missing.
Json::Value *EntryMap(Json::Value &acl, const char *szKey) {
    if (!acl.isMember(szKey)) {
        acl[szKey] = Json::Value(Json::objectValue);
    }
    return acl[szKey].isObject() ? &acl[szKey] : NULL;
}

}  // namespace

int prepare_acl(unsigned int owner, const Json::Value &jsParm, Json::Value &acl) {
    TESSEL_CHECK(!jsParm.isObject(), TESSEL_ERR_USER_INPUT, "!jsParm.isObject()", -1);
    TESSEL_CHECK(!acl.isNull() && !acl.isObject(), TESSEL_ERR_BAD_PARAMETERS, "!acl.isNull() && !acl.isObject()", -1);
    const std::string strType = TextOr(jsParm["type"], "");
    const std::string strOp = TextOr(jsParm["op"], "");
    const bool blRecursive = FlagOr(jsParm["recursive"], false);
    const bool blForceInherit = FlagOr(jsParm["force_inherit"], false);

    if ("global" != strType && SZK_PUBLIC != strType && "app" != strType && "user" != strType &&
        "group" != strType) {
        TESSEL_RAISE(TESSEL_ERR_USER_INPUT, "Unknown type [%s] for permission setting", strType.c_str());
        return -1;
    }
    AclOp op = kOpSet;
    if ("set" == strOp) {
        op = kOpSet;
    } else if ("delete" == strOp) {
        op = kOpDelete;
    } else if ("break" == strOp) {
        op = kOpBreak;
    } else {
        TESSEL_RAISE(TESSEL_ERR_USER_INPUT, "Unknown op [%s] for permission setting", strOp.c_str());
        return -1;
    }

    // The switch of the whole acl: the op names no entry.
    if ("global" == strType) {
        TESSEL_CHECK(!jsParm.isMember("enabled") || !jsParm["enabled"].isBool(), TESSEL_ERR_USER_INPUT,
                     "!jsParm.isMember(\"enabled\") || !jsParm[\"enabled\"].isBool()", -1);
        const Json::Value jBefore = acl.isObject() ? acl.get(SZK_ENABLED, Json::Value()) : Json::Value();
        acl[SZK_ENABLED] = jsParm["enabled"].asBool();
        return (jBefore == acl[SZK_ENABLED]) ? 0 : 1;
    }

    std::string strPerm;
    if (kOpSet == op) {
        TESSEL_CHECK(!jsParm.isMember("perm"), TESSEL_ERR_USER_INPUT, "!jsParm.isMember(\"perm\")", -1);
        TESSEL_CHECK(!jsParm["perm"].isString(), TESSEL_ERR_USER_INPUT, "!jsParm[\"perm\"].isString()", -1);
        TESSEL_CHECK("ro" != jsParm["perm"].asString() && "rw" != jsParm["perm"].asString(), TESSEL_ERR_USER_INPUT,
                     "\"ro\" != jsParm[\"perm\"].asString() && \"rw\" != jsParm[\"perm\"].asString()", -1);
        strPerm = jsParm["perm"].asString();
    }

    if (SZK_PUBLIC == strType) {
        return EditEntry(acl, SZK_PUBLIC, op, strPerm, blRecursive, blForceInherit);
    }
    if ("app" == strType) {
        return EditEntry(acl, SZK_APP, op, strPerm, blRecursive, blForceInherit);
    }
    if ("user" == strType) {
        TESSEL_CHECK(!jsParm.isMember("uid"), TESSEL_ERR_USER_INPUT, "!jsParm.isMember(\"uid\")", -1);
        TESSEL_CHECK(!jsParm["uid"].isIntegral(), TESSEL_ERR_USER_INPUT, "!jsParm[\"uid\"].isIntegral()", -1);
        // The owner holds "owner" already; an entry could only lower it.
        TESSEL_CHECK((uid_t)jsParm["uid"].asInt64() == owner, TESSEL_ERR_USER_INPUT,
                     "(uid_t)jsParm[\"uid\"].asInt64() == owner", -1);
        if (kOpSet != op && !acl.isMember(SZK_USER)) {
            return 0;
        }
        Json::Value *pUsers = NULL;
        TESSEL_CHECK(NULL == (pUsers = EntryMap(acl, SZK_USER)), TESSEL_ERR_BAD_PARAMETERS,
                     "!acl[\"zem_user\"].isObject()", -1);
        char szUid[64];
        snprintf(szUid, sizeof(szUid), "%u", (unsigned int)jsParm["uid"].asInt64());
        return EditEntry(*pUsers, szUid, op, strPerm, blRecursive, blForceInherit);
    }
    TESSEL_CHECK(!jsParm.isMember("gid"), TESSEL_ERR_USER_INPUT, "!jsParm.isMember(\"gid\")", -1);
    TESSEL_CHECK(!jsParm["gid"].isIntegral(), TESSEL_ERR_USER_INPUT, "!jsParm[\"gid\"].isIntegral()", -1);
    if (kOpSet != op && !acl.isMember(SZK_GROUP)) {
        return 0;
    }
    Json::Value *pGroups = NULL;
    TESSEL_CHECK(NULL == (pGroups = EntryMap(acl, SZK_GROUP)), TESSEL_ERR_BAD_PARAMETERS,
                 "!acl[\"zem_group\"].isObject()", -1);
    char szGid[64];
    snprintf(szGid, sizeof(szGid), "%u", (unsigned int)jsParm["gid"].asInt64());
    return EditEntry(*pGroups, szGid, op, strPerm, blRecursive, blForceInherit);
}

// ---- the sharing request's keys -----------------------------------------------

bool FilterParam(const Json::Value &jsParm, Json::Value &jParm) {
    static std::once_flag s_once;
    static Json::Value *s_pAllowed = NULL;
    std::call_once(s_once, [] {
        // Never freed: threads may still filter while the process exits.
        s_pAllowed = new Json::Value(Json::objectValue);
        for (const char *szKey : {"ns", "id", "type", "op", "requester", "break", "apply_all_children", "uid", "gid",
                                  "enabled", "perm", "recursive", "force_inherit"}) {
            (*s_pAllowed)[szKey] = true;
        }
    });
    jParm = Json::Value(Json::objectValue);
    if (jsParm.isObject()) {
        for (Json::Value::const_iterator it = jsParm.begin(); it != jsParm.end(); ++it) {
            const std::string strName = it.name();
            if (s_pAllowed->isMember(strName) || (!strName.empty() && '@' == strName[0])) {
                jParm[strName] = *it;
            }
        }
    }
    TESSEL_CHECK_APPEND(jParm.empty(), "jParm.empty()", false);
    return true;
}
