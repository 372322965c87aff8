// File existence checks and time-limited flock() locks.
#include <errno.h>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>

#include "quor/qlib.h"

namespace {

long long MonotonicUs() {
    struct timespec ts;
    clock_gettime(CLOCK_MONOTONIC, &ts);
    return static_cast<long long>(ts.tv_sec) * 1000000LL + ts.tv_nsec / 1000;
}

void SleepUs(long long us) {
    struct timespec ts;
    ts.tv_sec = static_cast<time_t>(us / 1000000LL);
    ts.tv_nsec = static_cast<long>((us % 1000000LL) * 1000);
    while (0 != nanosleep(&ts, &ts) && EINTR == errno) {
    }
}

// Opens the lock file, creating it when missing. A lock file needs no write
// access, so read-only is enough and works on files other users created.
// Links are refused: lock files live in shared directories such as /tmp,
// where a planted link would make a privileged caller create files elsewhere.
// O_NONBLOCK keeps a FIFO planted at the path from hanging the open.
int OpenLockFile(const char *szPath) {
    for (int attempt = 0; attempt < 3; ++attempt) {
        int fd = open(szPath, O_RDONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0644);
        if (fd >= 0) {
            // The umask must not keep other users from opening the lock.
            if (0 != fchmod(fd, 0644)) {
                int saved = errno;
                close(fd);
                errno = saved;
                return -1;
            }
            return fd;
        }
        if (EEXIST != errno) {
            return -1;
        }
        fd = open(szPath, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
        if (fd >= 0) {
            struct stat st;
            if (0 != fstat(fd, &st) || !S_ISREG(st.st_mode)) {
                close(fd);
                errno = EINVAL;
                return -1;
            }
            return fd;
        }
        if (ENOENT != errno) {
            return -1;
        }
        // Removed between the two opens: try again.
    }
    return -1;
}

// Polls with growing pauses: short ones keep a briefly held lock cheap, and
// the cap keeps a long wait from spinning.
int LockWithTimeout(int fd, int op, long long timeoutUs) {
    if (timeoutUs < 0) {
        while (0 != flock(fd, op)) {
            if (EINTR != errno) {
                return -1;
            }
        }
        return 1;
    }
    const long long deadline = MonotonicUs() + timeoutUs;
    long long pauseUs = 1000;
    for (;;) {
        if (0 == flock(fd, op | LOCK_NB)) {
            return 1;
        }
        if (EWOULDBLOCK != errno && EINTR != errno) {
            return -1;
        }
        long long left = deadline - MonotonicUs();
        if (left <= 0) {
            return 0;
        }
        SleepUs(std::min(pauseUs, left));
        pauseUs = std::min(pauseUs * 2, 50000LL);
    }
}

}  // namespace

extern "C" {

BOOL QLIBCFileExist(const char *szPath) {
    if (NULL == szPath || '\0' == szPath[0]) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return FALSE;
    }
    struct stat st;
    return (0 == stat(szPath, &st)) ? TRUE : FALSE;
}

BOOL QLIBCFileCheckDir(const char *szPath) {
    if (NULL == szPath || '\0' == szPath[0]) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return FALSE;
    }
    struct stat st;
    return (0 == stat(szPath, &st) && S_ISDIR(st.st_mode)) ? TRUE : FALSE;
}

int QLIBCFileLockTimeByFile(const char *szPath, int mode, long long timeoutUs, int *pFd) {
    if (NULL != pFd) {
        *pFd = -1;
    }
    if (NULL == szPath || '\0' == szPath[0] || NULL == pFd ||
        (QLIBC_FILE_LOCK_SH != mode && QLIBC_FILE_LOCK_EX != mode)) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    int fd = OpenLockFile(szPath);
    if (fd < 0) {
        QLIBCErrSetEx(QLIBC_ERR_FILE_OPEN, __FILE__, __LINE__);
        return -1;
    }
    int ret = LockWithTimeout(fd, (QLIBC_FILE_LOCK_EX == mode) ? LOCK_EX : LOCK_SH, timeoutUs);
    if (1 != ret) {
        int saved = errno;
        close(fd);
        if (0 == ret) {
            QLIBCErrSetEx(QLIBC_ERR_LOCK_TIMEOUT, __FILE__, __LINE__);
        } else {
            QLIBCErrSetEx(QLIBC_ERR_UNKNOWN, __FILE__, __LINE__);
            errno = saved;
        }
        return ret;
    }
    *pFd = fd;
    return 1;
}

}  // extern "C"
