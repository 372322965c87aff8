// Plug-in modules: shared objects loaded with dlopen that export a
// descriptor (quor/qlib_plugin.h) and run named actions with named arguments.
#include <dlfcn.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <syslog.h>

#include <new>
#include <string>
#include <vector>

#include "quor/qlib.h"
#include "quor/qlib_plugin.h"

namespace {

struct PluginArg {
    std::string name;
    int type = QLIB_PLUGIN_ARG_TEXT;
    std::string text;
    long long value = 0;
};

}  // namespace

struct _tag_QLIBPLUGIN {
    void *handle = NULL;
    const QLIBPLUGINDESCRIPTOR *desc = NULL;
    void *ctx = NULL;
    bool initialised = false;
    std::vector<PluginArg> args;
};

namespace {

bool IsRegularFile(const std::string &path) {
    struct stat st;
    return 0 == stat(path.c_str(), &st) && S_ISREG(st.st_mode);
}

// A name with a '/' is a path of its own. A bare name is looked for only in
// the directories given: dlopen's own search would let the library path of
// the environment choose the code that runs.
bool ResolveModule(const char *szPath, const QLIBSZLIST *pSearchPath, std::string *pResolved) {
    if (NULL != strchr(szPath, '/')) {
        *pResolved = szPath;
        return true;
    }
    int count = (NULL == pSearchPath) ? 0 : QLIBCSzListCount(pSearchPath);
    for (int i = 0; i < count; ++i) {
        const char *szDir = QLIBCSzListGet(pSearchPath, i);
        if (NULL == szDir || '\0' == szDir[0]) {
            continue;
        }
        std::string candidate = std::string(szDir) + "/" + szPath;
        if (IsRegularFile(candidate)) {
            *pResolved = candidate;
            return true;
        }
    }
    return false;
}

bool VersionServes(const QLIBPLUGINDESCRIPTOR *desc, int major, int minor) {
    return desc->major == major && desc->minor >= minor;
}

PluginArg *FindOrAddArg(QLIBPLUGIN *pPlugin, const char *szName) {
    for (PluginArg &arg : pPlugin->args) {
        if (arg.name == szName) {
            return &arg;
        }
    }
    pPlugin->args.emplace_back();
    pPlugin->args.back().name = szName;
    return &pPlugin->args.back();
}

}  // namespace

extern "C" {

int QLIBPluginInit(const char *szPath, const QLIBSZLIST *pSearchPath, int major, int minor,
                   QLIBPLUGIN **ppPlugin) {
    if (NULL != ppPlugin) {
        *ppPlugin = NULL;
    }
    if (NULL == szPath || '\0' == szPath[0] || NULL == ppPlugin || major < 0 || minor < 0) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    std::string path;
    if (!ResolveModule(szPath, pSearchPath, &path)) {
        syslog(LOG_ERR, "%s:%d plug-in [%s] not found in the search path", __FILE__, __LINE__, szPath);
        QLIBCErrSetEx(QLIBC_ERR_NOT_FOUND, __FILE__, __LINE__);
        return -1;
    }
    void *handle = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (NULL == handle) {
        const char *szWhy = dlerror();
        syslog(LOG_ERR, "%s:%d cannot load plug-in [%s]: %s", __FILE__, __LINE__, path.c_str(),
               (NULL == szWhy) ? "" : szWhy);
        QLIBCErrSetEx(QLIBC_ERR_PLUGIN, __FILE__, __LINE__);
        return -1;
    }
    const QLIBPLUGINDESCRIPTOR *desc =
        static_cast<const QLIBPLUGINDESCRIPTOR *>(dlsym(handle, QLIB_PLUGIN_DESCRIPTOR_SYMBOL));
    const char *szWhy = NULL;
    if (NULL == desc) {
        szWhy = "no " QLIB_PLUGIN_DESCRIPTOR_SYMBOL;
    } else if (QLIB_PLUGIN_ABI != desc->abiVersion) {
        szWhy = "built for another plug-in ABI";
    } else if (NULL == desc->pfnAction) {
        szWhy = "no action entry point";
    } else if (!VersionServes(desc, major, minor)) {
        szWhy = "interface version does not match";
    }
    if (NULL != szWhy) {
        syslog(LOG_ERR, "%s:%d plug-in [%s] refused: %s (wanted %d.%d)", __FILE__, __LINE__, path.c_str(), szWhy,
               major, minor);
        dlclose(handle);
        QLIBCErrSetEx(QLIBC_ERR_PLUGIN, __FILE__, __LINE__);
        return -1;
    }
    QLIBPLUGIN *pPlugin = new (std::nothrow) QLIBPLUGIN();
    if (NULL == pPlugin) {
        dlclose(handle);
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
    pPlugin->handle = handle;
    pPlugin->desc = desc;
    if (NULL != desc->pfnInit) {
        int ret = desc->pfnInit(&pPlugin->ctx);
        if (ret < 0) {
            syslog(LOG_ERR, "%s:%d plug-in [%s] failed to initialise (%d)", __FILE__, __LINE__, path.c_str(), ret);
            delete pPlugin;
            dlclose(handle);
            QLIBCErrSetEx(QLIBC_ERR_PLUGIN, __FILE__, __LINE__);
            return -1;
        }
    }
    pPlugin->initialised = true;
    *ppPlugin = pPlugin;
    return 0;
}

BOOL QLIBPluginHasInit(const QLIBPLUGIN *pPlugin) {
    if (NULL == pPlugin) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return FALSE;
    }
    return pPlugin->initialised ? TRUE : FALSE;
}

int QLIBPluginSetArg(QLIBPLUGIN *pPlugin, const char *szName, const char *szValue) {
    if (NULL == pPlugin || NULL == szName || '\0' == szName[0] || NULL == szValue) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    try {
        PluginArg *pArg = FindOrAddArg(pPlugin, szName);
        pArg->type = QLIB_PLUGIN_ARG_TEXT;
        pArg->text = szValue;
        pArg->value = 0;
    } catch (const std::bad_alloc &) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
    return 0;
}

int QLIBPluginSetArgByInt(QLIBPLUGIN *pPlugin, const char *szName, int value) {
    if (NULL == pPlugin || NULL == szName || '\0' == szName[0]) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    try {
        PluginArg *pArg = FindOrAddArg(pPlugin, szName);
        pArg->type = QLIB_PLUGIN_ARG_INT;
        pArg->text = std::to_string(value);
        pArg->value = value;
    } catch (const std::bad_alloc &) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
    return 0;
}

int QLIBPluginAction(const char *szAction, QLIBPLUGIN *pPlugin) {
    if (NULL == szAction || '\0' == szAction[0] || NULL == pPlugin || !pPlugin->initialised) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    std::vector<PluginArg> args;
    args.swap(pPlugin->args);
    std::vector<QLIBPLUGINARG> rgArgs(args.size());
    for (size_t i = 0; i < args.size(); ++i) {
        rgArgs[i].szName = args[i].name.c_str();
        rgArgs[i].type = args[i].type;
        rgArgs[i].szValue = args[i].text.c_str();
        rgArgs[i].llValue = args[i].value;
    }
    int ret = pPlugin->desc->pfnAction(pPlugin->ctx, szAction, rgArgs.empty() ? NULL : rgArgs.data(),
                                       static_cast<int>(rgArgs.size()));
    if (ret < 0) {
        QLIBCErrSetEx(QLIBC_ERR_PLUGIN, __FILE__, __LINE__);
    }
    return ret;
}

int QLIBPluginExit(QLIBPLUGIN *pPlugin) {
    if (NULL == pPlugin) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    if (pPlugin->initialised && NULL != pPlugin->desc->pfnExit) {
        pPlugin->desc->pfnExit(pPlugin->ctx);
    }
    void *handle = pPlugin->handle;
    delete pPlugin;
    if (0 != dlclose(handle)) {
        QLIBCErrSetEx(QLIBC_ERR_PLUGIN, __FILE__, __LINE__);
        return -1;
    }
    return 0;
}

}  // extern "C"
