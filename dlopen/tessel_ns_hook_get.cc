// Hook pairs from the tables of the process's namespace module.
#include "dlopen/tessel_ns_hook_get.h"

#include <string.h>

#include <string>

#include "common/tessel_report.h"

static constexpr const char kTesselModule[] = "dlopen/tessel_ns_hook_get";

namespace {

constexpr const char SZ_HOOK_TABLE_FUNC[] = "GetTable";
constexpr const char SZ_BATCH_HOOK_TABLE_FUNC[] = "GetBatchTable";

// The table function of the process's module; NULL when there is no module
// or it lacks the symbol, which only means the namespace has no hooks.
TESSEL_NS_HOOK_TABLE_FUNC TableFunc(const std::string &strNs, const char *szSymbol) {
    TESSEL_DLOPEN &loader = tessel::NsHookLoader();
    if (loader.Empty()) {
        loader.LoadLibByNS(strNs);
    }
    return reinterpret_cast<TESSEL_NS_HOOK_TABLE_FUNC>(loader.LoadFunc(szSymbol));
}

int FindAction(const TESSEL_NS_HOOK_ENTRY *pTable, const std::string &strAction, TESSEL_NS_HOOK *pPre,
               TESSEL_NS_HOOK *pPost) {
    for (const TESSEL_NS_HOOK_ENTRY *pEntry = pTable; NULL != pEntry->name; ++pEntry) {
        if (0 == strcmp(pEntry->name, strAction.c_str())) {
            if (NULL != pPre) {
                *pPre = pEntry->pre;
            }
            if (NULL != pPost) {
                *pPost = pEntry->post;
            }
            return 1;
        }
    }
    return 0;
}

}  // namespace

namespace tessel {

TESSEL_DLOPEN &NsHookLoader() {
    static TESSEL_DLOPEN loader;
    return loader;
}

}  // namespace tessel

int TesselNsHookGet(const std::string &strNs, const std::string &strAction, TESSEL_NS_HOOK *pPre,
                    TESSEL_NS_HOOK *pPost) {
    TESSEL_NS_HOOK_TABLE_FUNC pfnGetTable = TableFunc(strNs, SZ_HOOK_TABLE_FUNC);
    if (NULL == pfnGetTable) {
        return 0;
    }
    const TESSEL_NS_HOOK_ENTRY *pHookTable = pfnGetTable();
    TESSEL_CHECK(NULL == pHookTable, TESSEL_ERR_NO_HOOK_TABLE, "NULL == pHookTable", 0);
    return FindAction(pHookTable, strAction, pPre, pPost);
}

int TesselNsBatchHookGet(const std::string &strNs, const std::string &strAction, TESSEL_NS_HOOK *pPre,
                         TESSEL_NS_HOOK *pPost) {
    TESSEL_NS_HOOK_TABLE_FUNC pfnGetTable = TableFunc(strNs, SZ_BATCH_HOOK_TABLE_FUNC);
    if (NULL == pfnGetTable) {
        return 0;
    }
    const TESSEL_NS_HOOK_ENTRY *pTable = pfnGetTable();
    TESSEL_CHECK(NULL == pTable, TESSEL_ERR_NO_HOOK_TABLE, "NULL == pTable", 0);
    return FindAction(pTable, strAction, pPre, pPost);
}
