/*
 * What a plug-in module exports. A plug-in module is a shared object loaded
 * by QLIBPluginInit (quor/qlib.h). It exports one data symbol, named by
 * QLIB_PLUGIN_DESCRIPTOR_SYMBOL, of type QLIBPLUGINDESCRIPTOR:
 *
 *   static int MyInit(void **ppCtx) { ... return 0; }
 *   static int MyAction(void *pCtx, const char *szAction,
 *                       const QLIBPLUGINARG *rgArgs, int nArgs) { ... }
 *   static void MyExit(void *pCtx) { ... }
 *
 *   extern "C" QLIB_PLUGIN_EXPORT const QLIBPLUGINDESCRIPTOR QLIBPluginDescriptor = {
 *       QLIB_PLUGIN_ABI, 1, 0, MyInit, MyAction, MyExit};
 *
 * Life of a loaded module:
 *   - QLIBPluginInit checks abiVersion and the interface version, then calls
 *     pfnInit once. A negative result fails the load (the module is unloaded
 *     without pfnExit). What pfnInit stores in *ppCtx is handed back to
 *     pfnAction and pfnExit.
 *   - QLIBPluginSetArg / QLIBPluginSetArgByInt collect named arguments. Each
 *     QLIBPluginAction passes the arguments collected since the previous
 *     action, in the order they were first set (setting a name again replaces
 *     its value in place), and then forgets them: every action sees exactly
 *     the arguments set for it.
 *   - QLIBPluginExit calls pfnExit once and unloads the module.
 * The argument array and its strings belong to the caller and are valid only
 * during the pfnAction call. A module is driven by one thread at a time.
 */
#ifndef QUOR_QLIB_PLUGIN_H
#define QUOR_QLIB_PLUGIN_H

#ifdef __cplusplus
extern "C" {
#endif

/* The layout of QLIBPLUGINDESCRIPTOR and QLIBPLUGINARG; changes with them. */
#define QLIB_PLUGIN_ABI 1
#define QLIB_PLUGIN_DESCRIPTOR_SYMBOL "QLIBPluginDescriptor"
#define QLIB_PLUGIN_EXPORT __attribute__((visibility("default")))

#define QLIB_PLUGIN_ARG_TEXT 0 /* set with QLIBPluginSetArg */
#define QLIB_PLUGIN_ARG_INT 1  /* set with QLIBPluginSetArgByInt */

typedef struct _tag_QLIBPLUGINARG {
    const char *szName;
    int type;             /* QLIB_PLUGIN_ARG_TEXT or QLIB_PLUGIN_ARG_INT */
    const char *szValue;  /* the value as text (an integer in decimal) */
    long long llValue;    /* the integer value; 0 for text arguments */
} QLIBPLUGINARG;

typedef struct _tag_QLIBPLUGINDESCRIPTOR {
    int abiVersion; /* QLIB_PLUGIN_ABI as the module was built */
    /*
     * The interface version the module implements. A module serves a request
     * for major.minor when its major equals the major asked for and its
     * minor is at least the minor asked for.
     */
    int major;
    int minor;
    int (*pfnInit)(void **ppCtx);  /* may be NULL: nothing to set up */
    /* The result of the action: 0 or more on success, negative on failure. */
    int (*pfnAction)(void *pCtx, const char *szAction, const QLIBPLUGINARG *rgArgs, int nArgs);
    void (*pfnExit)(void *pCtx);   /* may be NULL: nothing to release */
} QLIBPLUGINDESCRIPTOR;

#ifdef __cplusplus
}
#endif

#endif /* QUOR_QLIB_PLUGIN_H */
