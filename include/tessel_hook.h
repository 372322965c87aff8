/*
 * Namespace modules and object plug-ins.
 *
 * A namespace module is a shared library named by the descriptor
 * "/usr/local/libexec/tessel//<ns>.lib", a JSON object {"lib": "<path>", and
 * optionally "app priv": "<privilege name>"}. It exports two C functions,
 *
 *     extern "C" const TESSEL_NS_HOOK_ENTRY *GetTable(void);       single-object operations
 *     extern "C" const TESSEL_NS_HOOK_ENTRY *GetBatchTable(void);  list operations
 *
 * each returning an array of entries ended by one whose name is NULL. The
 * operations call an entry's pre hook before they change an object and its
 * post hook after the change was stored and indexed, on the calling thread:
 *
 *   action    pre (jParm, pObject)                 post (jParm, pObject)
 *   "create"  the completed parameters, NULL       the parameters, the new object
 *   "set"     the completed parameters, old state  the parameters, the new state
 *
 * For list operations (GetBatchTable), pObject is the head of the chain of
 * records. Hooks observe; they cannot veto or change the operation, and must
 * not keep the pointers after they return. The first module loaded in a
 * process serves every namespace of that process.
 */
#ifndef TESSEL_HOOK_H
#define TESSEL_HOOK_H

#include <map>
#include <string>

#include <json/value.h>
#include <quor/qlib.h>

#include "tessel_export.h"
#include "tesselobject.h"

typedef void (*TESSEL_NS_HOOK)(const Json::Value &jParm, const TESSEL_OBJECT *pObject);

typedef struct _tag_TESSEL_NS_HOOK_ENTRY {
    const char *name;     /* the action, NULL in the last entry */
    TESSEL_NS_HOOK pre;   /* may be NULL */
    TESSEL_NS_HOOK post;  /* may be NULL */
} TESSEL_NS_HOOK_ENTRY;

typedef const TESSEL_NS_HOOK_ENTRY *(*TESSEL_NS_HOOK_TABLE_FUNC)(void);

/* The module library path of the namespace's descriptor, "" when there is none. */
TESSEL_EXPORT std::string TesselNsHookPath(const std::string &strNs);

/* Loads one library and caches its symbols. */
class TESSEL_EXPORT TESSEL_DLOPEN {
public:
    TESSEL_DLOPEN();
    ~TESSEL_DLOPEN();
    TESSEL_DLOPEN(const TESSEL_DLOPEN &) = delete;
    TESSEL_DLOPEN &operator=(const TESSEL_DLOPEN &) = delete;

    bool Empty() const;
    /* Loads path unless a library is loaded already (then true at once). */
    bool LoadLibByPath(const std::string &strPath);
    bool LoadLibByNS(const std::string &strNs);
    void *LoadFunc(const std::string &strName);
    void Unload();

private:
    void *m_handle;
    std::map<std::string, void *> m_symbols;
};

/* 1 with pre and post filled when the module has the action, else 0. */
TESSEL_EXPORT int TesselNsHookGet(const std::string &strNs, const std::string &strAction,
                                  TESSEL_NS_HOOK *pPre, TESSEL_NS_HOOK *pPost);
TESSEL_EXPORT int TesselNsBatchHookGet(const std::string &strNs, const std::string &strAction,
                                       TESSEL_NS_HOOK *pPre, TESSEL_NS_HOOK *pPost);

/* ---- object plug-ins ------------------------------------------------------- */
/*
 * A platform plug-in (quor/qlib.h) of module "object", version 1.0, receives
 * "RESULT" and the fields of the old and the new record as text arguments
 * named "Org_<Field>" and "New_<Field>" ("NameSpace", "ID", "Category",
 * "Version", "CommitMsg", "ParentID", "Owner", "MetaText", "Text",
 * "MetaBinary_info", "Binary_info", "ACL", "CreateTime", "ModifyTime",
 * "ExtraInfo").
 */
typedef struct _tag_tessel_object_env_ {
    QLIBPLUGIN *pPlugin;
    int result;
    TESSEL_OBJECT *pOrg;
    TESSEL_OBJECT *pNew;
} TESSEL_OBJECT_ENV;

TESSEL_EXPORT int TesselPluginInit(const char *szModuleName, const char *szPath, QLIBPLUGIN **ppPlugin);
TESSEL_EXPORT bool TesselObjectPlugin_init(TESSEL_OBJECT_ENV *pstEnvVar, const char *szPlugin,
                                           TESSEL_OBJECT *pOrg, TESSEL_OBJECT *pNew);
TESSEL_EXPORT bool TesselObjectPlugin(const char *action, TESSEL_OBJECT_ENV *pstEnvVar);
TESSEL_EXPORT bool TesselObjectPlugin_exit(TESSEL_OBJECT_ENV *pstEnvVar);

#endif /* TESSEL_HOOK_H */
