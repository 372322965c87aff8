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
 * each returning an array of entries ended by one whose name is NULL (the
 * array must outlive the module's use; a static array is the usual form).
 * The operations call an entry's pre hook before they change an object and
 * its post hook after the change was stored and indexed, on the calling
 * thread, as hook(jParm, pObject):
 *
 *   action    pre: jParm, pObject                  post: jParm, pObject
 *   "create"  completed parameters, NULL           parameters, the new object
 *   "set"     completed parameters, old state      parameters, the new state
 *   "delete"  parameters, the object as it was     (not called)
 *
 * A change of sharing is a "set": its parameters carry the edited "acl".
 * For list operations (GetBatchTable) pObject is the head of a chain of
 * records, walked with next; each record's m_param holds its own parameters.
 * Hooks observe; they cannot veto or change the operation, and must not keep
 * the pointers after they return. The first module loaded in a process
 * serves every namespace of that process, and the loader is not locked: the
 * operations look hooks up before they start worker threads.
 */
#ifndef TESSEL_HOOK_H
#define TESSEL_HOOK_H

#include <map>
#include <string>

#include <json/value.h>
#include <quor/qlib.h>

#include "tessel_export.h"
#include "tesselobject.h"

/* jParm: the operation's parameter object; pObject: see the table above. */
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
    int result;            /* handed to the plug-in as "RESULT" */
    TESSEL_OBJECT *pOrg;   /* the old state, may be NULL */
    TESSEL_OBJECT *pNew;   /* the new state, may be NULL */
} TESSEL_OBJECT_ENV;

/* The plug-in modules the library drives and the interface version it asks
 * of them; the last row is {NULL, -1, -1}. */
typedef struct _tag_TESSEL_MODULE_MAP {
    const char *szModule;
    int major;
    int minor;
} TESSEL_MODULE_MAP;

TESSEL_C_BEGIN
TESSEL_EXPORT extern const TESSEL_MODULE_MAP TESSEL_moduleMap[];
TESSEL_C_END

/* Loads the plug-in of module szModuleName from szPath (which must contain a
 * "/": no search path is used); 0, or -1. */
TESSEL_EXPORT int TesselPluginInit(const char *szModuleName, const char *szPath, QLIBPLUGIN **ppPlugin);
/* Resets the environment to the two records and loads the "object" plug-in
 * at szPlugin; the caller sets result before TesselObjectPlugin. */
TESSEL_EXPORT bool TesselObjectPlugin_init(TESSEL_OBJECT_ENV *pstEnvVar, const char *szPlugin,
                                           TESSEL_OBJECT *pOrg, TESSEL_OBJECT *pNew);
/* Hands "RESULT" and both records' fields to the plug-in and runs action. */
TESSEL_EXPORT bool TesselObjectPlugin(const char *action, TESSEL_OBJECT_ENV *pstEnvVar);
/* Releases the plug-in. */
TESSEL_EXPORT bool TesselObjectPlugin_exit(TESSEL_OBJECT_ENV *pstEnvVar);

#endif /* TESSEL_HOOK_H */
