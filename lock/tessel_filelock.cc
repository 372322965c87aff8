// Advisory record locks over a whole lock file; see tessel_lock.h.
#include <errno.h>
#include <fcntl.h>
#include <stdint.h>
#include <unistd.h>

#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_lock.h"

static constexpr const char kTesselModule[] = "lock/tessel_filelock";

namespace {

// A lock under contention is retried after this pause, which counts as this
// many hundredths of a second against the caller's timeout.
constexpr useconds_t kRetryPauseUs = 50000;
constexpr int64_t kRetryPauseHundredths = 5;

// One request over the whole file, whatever its length now or later.
int SetWholeFileLock(int fd, int cmd, short type) {
    struct flock64 fl = {};
    fl.l_type = type;
    fl.l_whence = SEEK_SET;
    fl.l_start = 0;
    fl.l_len = 0;
    return fcntl(fd, cmd, &fl);
}

bool TimedOut(int64_t hundredths, int64_t timeout) {
    // timeout is seconds; guard the product against overflow for huge values.
    return -1 != timeout && timeout <= INT64_MAX / 100 && hundredths > 100 * timeout;
}

}  // namespace

TESSEL_FILE_LOCK::TESSEL_FILE_LOCK(const std::string &strFileName) : fd_(-1) { Open(strFileName); }

TESSEL_FILE_LOCK::~TESSEL_FILE_LOCK() {
    UnLock();
    Close();
}

bool TESSEL_FILE_LOCK::Open(const std::string &filename) {
    Close();
    int err = 0;
    {
        // Lock files live in root-owned directories; any caller may need one.
        TESSEL_AS_ROOT();
        fd_ = open(filename.c_str(), O_RDWR | O_NONBLOCK | O_CREAT, 0644);
        err = errno;
    }
    errno = err;
    TESSEL_CHECK_APPEND(0 > fd_, "0 > (fd_ = open(filename.c_str(), O_RDWR | O_NONBLOCK | O_CREAT, 0644))", false);
    return true;
}

bool TESSEL_FILE_LOCK::Lock(int type, int64_t timeout) {
    if (0 > fd_ || (0 != type && 1 != type) || (0 > timeout && -1 != timeout)) {
        return false;
    }
    short lockType = (1 == type) ? F_WRLCK : F_RDLCK;
    int64_t hundredths = 0;
    while (0 != SetWholeFileLock(fd_, F_SETLK64, lockType)) {
        if (EINTR == errno) {
            continue;
        }
        if (0 == timeout || TimedOut(hundredths, timeout)) {
            return false;
        }
        usleep(kRetryPauseUs);
        hundredths += kRetryPauseHundredths;
    }
    return true;
}

bool TESSEL_FILE_LOCK::WriteLock(int64_t timeout) { return Lock(1, timeout); }

bool TESSEL_FILE_LOCK::ReadLock(int64_t timeout) { return Lock(0, timeout); }

bool TESSEL_FILE_LOCK::TryLock() { return Lock(1, 0); }

bool TESSEL_FILE_LOCK::UnLock() {
    if (0 > fd_) {
        return true;
    }
    return 0 == SetWholeFileLock(fd_, F_SETLKW64, F_UNLCK);
}

void TESSEL_FILE_LOCK::Close() {
    if (0 <= fd_) {
        close(fd_);
        fd_ = -1;
    }
}
