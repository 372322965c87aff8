/*
 * The settings file "/usr/quor/etc/tessel.conf": whether the store and each
 * namespace are enabled, which users have sharing switched off, and which
 * fields each namespace indexes. Writers serialise on "/tmp/.tessel_conf.lock";
 * readers read the whole file anew on every call, except the index-filter and
 * owner-validity caches, which live as long as the process.
 */
#ifndef TESSEL_CONF_H
#define TESSEL_CONF_H

#include <string>

#include <json/value.h>
#include <quor/qlib.h>

#include "tessel_export.h"

/* Scoped writer lock of the settings file (waits at most 5 s; the writer goes
 * on even without it). */
class TESSEL_EXPORT ConfMutex {
public:
    ConfMutex();
    ~ConfMutex();
    ConfMutex(const ConfMutex &) = delete;
    ConfMutex &operator=(const ConfMutex &) = delete;

private:
    std::string m_strPath;
    bool m_locked;
    int m_fd;
};

TESSEL_EXPORT BOOL TesselSettingsAccessGetEx(const Json::Value &jConf, const char *szNameSpace);
TESSEL_EXPORT BOOL TesselSettingsAccessGet(const char *szNameSpace);
TESSEL_EXPORT BOOL TesselAccessCheck(const char *szNameSpace);
TESSEL_EXPORT BOOL TesselSettingsGet(const char *szNameSpace, Json::Value &jConf);
TESSEL_EXPORT int TesselSettingsAccessSet(const char *szNameSpace, const char *szPkgId, int enable);
TESSEL_EXPORT BOOL TesselSettingsSharingGetEx(const Json::Value &jConf, const char *szNameSpace, unsigned int owner);
TESSEL_EXPORT BOOL TesselSettingsSharingGet(const char *szNameSpace, unsigned int owner);
TESSEL_EXPORT int TesselSettingsSharingSet(const char *szNameSpace, unsigned int uid, int enable);
TESSEL_EXPORT BOOL TesselSharingCheck(const char *szNameSpace, unsigned int owner);
TESSEL_EXPORT int TesselSettingsNoSharingUserList(const char *szNameSpace, QLIBSZLIST **ppList);
/* The store's format version: 2. */
TESSEL_EXPORT unsigned int TesselVersionGet(void);
TESSEL_EXPORT BOOL TesselSettingsIndexSet(const std::string &strNs, const Json::Value &jsFilter);
TESSEL_EXPORT BOOL TesselSettingsIndexGet(const std::string &strNs, Json::Value &jsFilter);
TESSEL_EXPORT BOOL TesselSettingsIndexGetFromCache(const std::string &strNs, Json::Value &jsFilter);
TESSEL_EXPORT BOOL TesselObjectOwnerIsValid(unsigned int uid);
/* The "app priv" of the namespace's module descriptor, or "". */
TESSEL_EXPORT std::string TesselAppPrivName(const std::string &strNs);

#endif /* TESSEL_CONF_H */
