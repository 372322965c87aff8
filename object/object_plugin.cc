// The object plug-in: the old and new state of an object handed to the
// "object" platform plug-in as named text arguments.
#include <stdio.h>
#include <syslog.h>

#include <string>
#include <utility>
#include <vector>

#include <quor/qlib.h>

#include "common/tessel_json.h"
#include "common/tessel_report.h"
#include "tessel_hook.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "object/object_plugin";

namespace {

constexpr const char SZ_OBJECT_PLUGIN_MODULE[] = "object";

// The record's arguments, in the order plug-ins receive them.
std::vector<std::pair<const char *, std::string>> ObjectArgs(const TESSEL_OBJECT &obj) {
    char szOwner[32];
    char szCtime[32];
    char szMtime[32];
    snprintf(szOwner, sizeof(szOwner), "%lu", obj.get_owner());
    snprintf(szCtime, sizeof(szCtime), "%ld", obj.get_ctime());
    snprintf(szMtime, sizeof(szMtime), "%ld", obj.get_mtime());
    return {
        {"NameSpace", obj.get_ref_ns()},
        {"ID", obj.get_ref_id()},
        {"Category", obj.get_ref_category()},
        {"Version", obj.get_ref_version()},
        {"CommitMsg", tessel::toString(obj.get_ref_commit_msg())},
        {"ParentID", obj.get_ref_parent_id()},
        {"Owner", szOwner},
        {"MetaText", tessel::toString(obj.get_ref_metatext())},
        {"Text", tessel::toString(obj.get_ref_text())},
        {"MetaBinary_info", tessel::toString(obj.get_ref_metabinary_info())},
        {"Binary_info", tessel::toString(obj.get_ref_binary_info())},
        {"ACL", tessel::toString(obj.get_ref_acl())},
        {"CreateTime", szCtime},
        {"ModifyTime", szMtime},
        {"ExtraInfo", tessel::toString(obj.get_ref_extra_info())},
    };
}

bool SetObjectArgs(QLIBPLUGIN *pPlugin, const char *szPrefix, const TESSEL_OBJECT &obj) {
    for (const std::pair<const char *, std::string> &arg : ObjectArgs(obj)) {
        const std::string strName = std::string(szPrefix) + arg.first;
        TESSEL_CHECK(0 > QLIBPluginSetArg(pPlugin, strName.c_str(), arg.second.c_str()),
                     TESSEL_ERR_OPERATION_FAILED, "0 > QLIBPluginSetArg(pPlugin, strName.c_str(), arg.second.c_str())",
                     false);
    }
    return true;
}

bool TesselObjectPluginSetEnv(TESSEL_OBJECT_ENV *pstEnvVar) {
    TESSEL_CHECK((NULL == pstEnvVar->pOrg && NULL == pstEnvVar->pNew), TESSEL_ERR_PLUGIN_NOT_INIT,
                 "(NULL == pstEnvVar->pOrg && NULL == pstEnvVar->pNew)", false);
    TESSEL_CHECK(0 > QLIBPluginSetArgByInt(pstEnvVar->pPlugin, "RESULT", pstEnvVar->result),
                 TESSEL_ERR_OPERATION_FAILED, "0 > QLIBPluginSetArgByInt(pstEnvVar->pPlugin, \"RESULT\", pstEnvVar->result)",
                 false);
    if (NULL != pstEnvVar->pOrg && !SetObjectArgs(pstEnvVar->pPlugin, "Org_", *pstEnvVar->pOrg)) {
        return false;
    }
    if (NULL != pstEnvVar->pNew && !SetObjectArgs(pstEnvVar->pPlugin, "New_", *pstEnvVar->pNew)) {
        return false;
    }
    return true;
}

}  // namespace

bool TesselObjectPlugin_init(TESSEL_OBJECT_ENV *pstEnvVar, const char *szPlugin, TESSEL_OBJECT *pOrg,
                             TESSEL_OBJECT *pNew) {
    TESSEL_CHECK(NULL == pstEnvVar, TESSEL_ERR_BAD_PARAMETERS, "NULL == pstEnvVar", false);
    TESSEL_CHECK(NULL == szPlugin, TESSEL_ERR_BAD_PARAMETERS, "NULL == szPlugin", false);
    TESSEL_CHECK(NULL == pOrg && NULL == pNew, TESSEL_ERR_BAD_PARAMETERS, "NULL == pOrg && NULL == pNew", false);
    pstEnvVar->pPlugin = NULL;
    pstEnvVar->result = 0;
    pstEnvVar->pOrg = pOrg;
    pstEnvVar->pNew = pNew;
    if (0 > TesselPluginInit(SZ_OBJECT_PLUGIN_MODULE, szPlugin, &pstEnvVar->pPlugin)) {
        TESSEL_LOG(LOG_ERR, "Fail to init plugin [%s] [0x%04X %s:%d]", SZ_OBJECT_PLUGIN_MODULE, QLIBCErrGet(),
                   QLIBCErrFileGet(), QLIBCErrLineGet());
        return false;
    }
    return true;
}

bool TesselObjectPlugin(const char *action, TESSEL_OBJECT_ENV *pstEnvVar) {
    TESSEL_CHECK(NULL == pstEnvVar, TESSEL_ERR_BAD_PARAMETERS, "NULL == pstEnvVar", false);
    TESSEL_CHECK(!QLIBPluginHasInit(pstEnvVar->pPlugin), TESSEL_ERR_PLUGIN_NOT_INIT,
                 "!QLIBPluginHasInit(pstEnvVar->pPlugin)", false);
    TESSEL_CHECK_APPEND(!TesselObjectPluginSetEnv(pstEnvVar), "!TesselObjectPluginSetEnv(pstEnvVar)", false);
    TESSEL_CHECK(0 > QLIBPluginAction(action, pstEnvVar->pPlugin), TESSEL_ERR_PLUGIN_EXEC,
                 "0 > QLIBPluginAction(action, pstEnvVar->pPlugin)", false);
    return true;
}

bool TesselObjectPlugin_exit(TESSEL_OBJECT_ENV *pstEnvVar) {
    TESSEL_CHECK(NULL == pstEnvVar, TESSEL_ERR_BAD_PARAMETERS, "NULL == pstEnvVar", false);
    if (NULL != pstEnvVar->pPlugin) {
        QLIBPluginExit(pstEnvVar->pPlugin);
        pstEnvVar->pPlugin = NULL;
    }
    return true;
}
