// A platform plug-in of module "object", interface 1.0, for the object
// plug-in tests. Each action writes its name and then every argument it
// received, one per line as name|type|text|integer, to TEST_OBJECT_PLUGIN_OUT;
// the action "fail" returns -5.
#include <stdio.h>
#include <string.h>

#include "quor/qlib_plugin.h"

namespace {

int Action(void *, const char *szAction, const QLIBPLUGINARG *rgArgs, int nArgs) {
    FILE *fp = fopen(TEST_OBJECT_PLUGIN_OUT, "w");
    if (NULL == fp) {
        return -2;
    }
    fprintf(fp, "%s\n", szAction);
    for (int i = 0; i < nArgs; ++i) {
        fprintf(fp, "%s|%s|%s|%lld\n", rgArgs[i].szName, (QLIB_PLUGIN_ARG_INT == rgArgs[i].type) ? "int" : "text",
                rgArgs[i].szValue, rgArgs[i].llValue);
    }
    fclose(fp);
    return (0 == strcmp(szAction, "fail")) ? -5 : 0;
}

}  // namespace

extern "C" QLIB_PLUGIN_EXPORT const QLIBPLUGINDESCRIPTOR QLIBPluginDescriptor = {QLIB_PLUGIN_ABI, 1, 0, NULL, Action,
                                                                                  NULL};
