// A namespace module for the hook tests. Variant full: GetTable {"create": no
// hooks, "set": set-pre/set-post}, GetBatchTable {"set": batch-set-pre/-post};
// variant null_tables: both tables NULL. A hook appends "<hook> <jParm tag>
// <pObject->m_param tag or null>" to the file jParm["@hook_log"].
#include <stdio.h>

#include "tessel_hook.h"

#define HOOK(fn, name)                                                                          \
    static void fn(const Json::Value &jParm, const TESSEL_OBJECT *pObj) {                       \
        if (FILE *fp = fopen(jParm["@hook_log"].asCString(), "a")) {                            \
            fprintf(fp, "%s %s %s\n", name, jParm["tag"].asCString(),                           \
                    pObj ? pObj->m_param["tag"].asCString() : "null");                          \
            fclose(fp);                                                                         \
        }                                                                                       \
    }
HOOK(SetPre, "set-pre")
HOOK(SetPost, "set-post")
HOOK(BatchSetPre, "batch-set-pre")
HOOK(BatchSetPost, "batch-set-post")

static const TESSEL_NS_HOOK_ENTRY kTable[] = {{"create", NULL, NULL}, {"set", SetPre, SetPost}, {NULL, NULL, NULL}};
static const TESSEL_NS_HOOK_ENTRY kBatchTable[] = {{"set", BatchSetPre, BatchSetPost}, {NULL, NULL, NULL}};
#ifdef HOOK_MODULE_null_tables
#define TABLE(t) NULL
#else
#define TABLE(t) t
#endif
extern "C" __attribute__((visibility("default"))) const TESSEL_NS_HOOK_ENTRY *GetTable() { return TABLE(kTable); }
extern "C" __attribute__((visibility("default"))) const TESSEL_NS_HOOK_ENTRY *GetBatchTable() {
    return TABLE(kBatchTable);
}
