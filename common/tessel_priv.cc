// Process-wide counting of privilege-raising sections; see tessel_priv.h.
#include "common/tessel_priv.h"

#include <errno.h>
#include <string.h>
#include <syslog.h>
#include <unistd.h>

#include <mutex>

namespace {

std::mutex gMutex;
int gDepth = 0;
uid_t gSavedEuid = 0;
gid_t gSavedEgid = 0;

// One logged switch of the effective id; true when it took effect.
bool Switch(const char *szModule, int line, const char *szWhich, bool isUid, long eid) {
    int ret = isUid ? setresuid(-1, static_cast<uid_t>(eid), -1) : setresgid(-1, static_cast<gid_t>(eid), -1);
    if (0 != ret) {
        int err = errno;
        syslog(LOG_AUTH | LOG_ERR, "%s:%d ERROR: set%s(%d, %d, %d) [%s]", szModule, line, szWhich, -1,
               static_cast<int>(eid), -1, strerror(err));
        return false;
    }
    syslog(LOG_AUTH | LOG_INFO, "%s:%d WARNING: set%s(%d, %d, %d)", szModule, line, szWhich, -1,
           static_cast<int>(eid), -1);
    return true;
}

}  // namespace

namespace tessel {

RootSection::RootSection(const char *szModule, int line) : m_szModule(szModule), m_line(line) {
    std::lock_guard<std::mutex> guard(gMutex);
    bool ok = true;
    if (0 == gDepth++) {
        gSavedEuid = geteuid();
        gSavedEgid = getegid();
        ok = Switch(m_szModule, m_line, "resgid", false, 0) && Switch(m_szModule, m_line, "resuid", true, 0);
        if (!ok) {
            syslog(LOG_AUTH | LOG_ERR, "%s:%d ERROR: ENTERCriticalSection", m_szModule, m_line);
        }
    }
    errno = ok ? 0 : 1;
}

RootSection::~RootSection() {
    std::lock_guard<std::mutex> guard(gMutex);
    bool ok = true;
    if (0 == --gDepth) {
        // The group goes back first, while the effective uid is still 0: once
        // the uid is a user's again, the process may set its effective gid only
        // to its real or saved gid, which the caller's own group need not be.
        ok = Switch(m_szModule, m_line, "resgid", false, gSavedEgid);
        ok = Switch(m_szModule, m_line, "resuid", true, gSavedEuid) && ok;
        if (!ok) {
            syslog(LOG_AUTH | LOG_ERR, "%s:%d ERROR: LEAVECriticalSection", m_szModule, m_line);
        }
    }
    errno = ok ? 0 : 1;
}

}  // namespace tessel
