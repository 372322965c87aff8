// The loader of one namespace module and its symbol cache; see tessel_hook.h.
#include <dlfcn.h>

#include <string>

#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_hook.h"

static constexpr const char kTesselModule[] = "dlopen/tessel_dlopen";

TESSEL_DLOPEN::TESSEL_DLOPEN() : m_handle(NULL) {}

TESSEL_DLOPEN::~TESSEL_DLOPEN() { Unload(); }

bool TESSEL_DLOPEN::Empty() const { return NULL == m_handle; }

bool TESSEL_DLOPEN::LoadLibByPath(const std::string &strPath) {
    if (NULL != m_handle) {
        return true;
    }
    m_handle = dlopen(strPath.c_str(), RTLD_LAZY);
    if (NULL == m_handle) {
        const char *szErr = dlerror();
        TESSEL_LOG(LOG_ERR, "cannot open library: %s. error = %s", strPath.c_str(), (NULL == szErr) ? "" : szErr);
        return false;
    }
    return true;
}

bool TESSEL_DLOPEN::LoadLibByNS(const std::string &strNs) {
    std::string strPath;
    {
        TESSEL_AS_ROOT();
        strPath = TesselNsHookPath(strNs);
    }
    // The module itself is loaded with the caller's rights.
    return !strPath.empty() && LoadLibByPath(strPath);
}

void *TESSEL_DLOPEN::LoadFunc(const std::string &strName) {
    if (NULL == m_handle) {
        return NULL;
    }
    std::map<std::string, void *>::const_iterator it = m_symbols.find(strName);
    if (m_symbols.end() != it) {
        return it->second;
    }
    // A symbol may legitimately be NULL; only dlerror tells a failure apart.
    dlerror();
    void *pFunc = dlsym(m_handle, strName.c_str());
    if (NULL != dlerror()) {
        TESSEL_LOG(LOG_ERR, "cannot load symbol: %s", strName.c_str());
        return NULL;
    }
    m_symbols[strName] = pFunc;
    return pFunc;
}

void TESSEL_DLOPEN::Unload() {
    m_symbols.clear();
    if (NULL != m_handle) {
        dlclose(m_handle);
        m_handle = NULL;
    }
}
