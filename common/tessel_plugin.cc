// Platform plug-ins of the library's plug-in modules: the module table and
// loading a module's plug-in at the interface version the table asks for.
#include <string.h>

#include <memory>

#include <quor/qlib.h>

#include "common/tessel_report.h"
#include "tessel_hook.h"

static constexpr const char kTesselModule[] = "common/tessel_plugin";

const TESSEL_MODULE_MAP TESSEL_moduleMap[] = {
    {"object", 1, 0},
    {NULL, -1, -1},
};

namespace {

// Plug-ins are always named by path; the search list exists because the
// platform call takes one, and stays empty so that nothing is looked up.
constexpr int kSearchPathEntries = 1024;

struct SzListFree {
    void operator()(QLIBSZLIST *pList) const { QLIBCSzListFree(pList); }
};

int TesselPluginModuleVersion(const char *szModule, int *pMajor, int *pMinor) {
    int iRet = -1;
    for (const TESSEL_MODULE_MAP *pRow = TESSEL_moduleMap; NULL != pRow->szModule; ++pRow) {
        if (0 == strcmp(pRow->szModule, szModule)) {
            *pMajor = pRow->major;
            *pMinor = pRow->minor;
            iRet = 0;
            break;
        }
    }
    TESSEL_CHECK(-1 == iRet, TESSEL_ERR_BAD_PARAMETERS, "-1 == iRet", -1);
    return iRet;
}

}  // namespace

int TesselPluginInit(const char *szModuleName, const char *szPath, QLIBPLUGIN **ppPlugin) {
    TESSEL_CHECK(NULL == ppPlugin, TESSEL_ERR_BAD_PARAMETERS, "NULL == ppPlugin", -1);
    QLIBSZLIST *pslSearchPath = NULL;
    TESSEL_CHECK(NULL == (pslSearchPath = QLIBCSzListAlloc(kSearchPathEntries)), TESSEL_ERR_OUT_OF_MEMORY,
                 "NULL == (pslSearchPath = QLIBCSzListAlloc(BUFSIZ))", -1);
    std::unique_ptr<QLIBSZLIST, SzListFree> searchPathGuard(pslSearchPath);
    TESSEL_CHECK(NULL == szModuleName, TESSEL_ERR_BAD_PARAMETERS, "NULL == szModuleName", -1);
    const char *szModule = szModuleName;
    int major = -1;
    int minor = -1;
    TESSEL_CHECK_APPEND(0 > TesselPluginModuleVersion(szModule, &major, &minor),
                        "0 > TesselPluginModuleVersion(szModule, &major, &minor)", -1);
    TESSEL_CHECK(0 > QLIBPluginInit(szPath, pslSearchPath, major, minor, ppPlugin), TESSEL_ERR_PLUGIN_INIT,
                 "0 > QLIBPluginInit(szPath, pslSearchPath, major, minor, ppPlugin)", -1);
    return 0;
}
