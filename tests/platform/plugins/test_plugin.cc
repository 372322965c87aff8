// A plug-in module for the plug-in tests. Built once per variant: a working
// module implementing interface 1.2, and broken ones that must be refused.
//
// Actions of the working module:
//   "record"  writes every argument it received, one per line as
//             name|type|text|integer, to the file named by the text argument
//             "OUT", and returns the number of arguments;
//   "fail"    returns -5;
//   other     returns -1.
// Its exit appends "exit after N actions" to the last "OUT" file, so a test
// can see that exit ran with the context init made.
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "quor/qlib_plugin.h"

namespace {

struct Context {
    char outPath[4096];
    int actions;
};

int Init(void **ppCtx) {
#ifdef TEST_PLUGIN_VARIANT_bad_init
    (void)ppCtx;
    return -3;
#else
    *ppCtx = calloc(1, sizeof(Context));
    return (NULL == *ppCtx) ? -1 : 0;
#endif
}

int Record(Context *ctx, const QLIBPLUGINARG *rgArgs, int nArgs) {
    const char *out = NULL;
    for (int i = 0; i < nArgs; ++i) {
        if (0 == strcmp(rgArgs[i].szName, "OUT") && QLIB_PLUGIN_ARG_TEXT == rgArgs[i].type) {
            out = rgArgs[i].szValue;
        }
    }
    if (NULL == out || strlen(out) >= sizeof(ctx->outPath)) {
        return -2;
    }
    strcpy(ctx->outPath, out);
    FILE *fp = fopen(out, "w");
    if (NULL == fp) {
        return -2;
    }
    for (int i = 0; i < nArgs; ++i) {
        fprintf(fp, "%s|%s|%s|%lld\n", rgArgs[i].szName, (QLIB_PLUGIN_ARG_INT == rgArgs[i].type) ? "int" : "text",
                rgArgs[i].szValue, rgArgs[i].llValue);
    }
    fclose(fp);
    return nArgs;
}

int Action(void *pCtx, const char *szAction, const QLIBPLUGINARG *rgArgs, int nArgs) {
    Context *ctx = static_cast<Context *>(pCtx);
    ++ctx->actions;
    if (0 == strcmp(szAction, "record")) {
        return Record(ctx, rgArgs, nArgs);
    }
    return (0 == strcmp(szAction, "fail")) ? -5 : -1;
}

void Exit(void *pCtx) {
    Context *ctx = static_cast<Context *>(pCtx);
    if ('\0' != ctx->outPath[0]) {
        FILE *fp = fopen(ctx->outPath, "a");
        if (NULL != fp) {
            fprintf(fp, "exit after %d actions\n", ctx->actions);
            fclose(fp);
        }
    }
    free(ctx);
}

}  // namespace

#ifdef TEST_PLUGIN_VARIANT_wrong_abi
#define TEST_PLUGIN_ABI (QLIB_PLUGIN_ABI + 1)
#else
#define TEST_PLUGIN_ABI QLIB_PLUGIN_ABI
#endif

#ifdef TEST_PLUGIN_VARIANT_no_descriptor
// A descriptor under the wrong name is no descriptor.
#define TEST_PLUGIN_DESCRIPTOR QLIBPluginDescriptr
#else
#define TEST_PLUGIN_DESCRIPTOR QLIBPluginDescriptor
#endif

extern "C" QLIB_PLUGIN_EXPORT const QLIBPLUGINDESCRIPTOR TEST_PLUGIN_DESCRIPTOR = {TEST_PLUGIN_ABI, 1, 2, Init,
                                                                                    Action, Exit};
