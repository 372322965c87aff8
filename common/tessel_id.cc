// Object identifiers: "<owner uid>_<96 upper-case hex digits>", or
// "<uid>_#00000000" for a user's default object. The owner is part of the
// name so that it can be known without reading storage.
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/syscall.h>
#include <time.h>
#include <unistd.h>

#include <new>
#include <string>

#include <openssl/evp.h>

#include <quor/qlib.h>

#include "common/tessel_pathname.h"
#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_id.h"
#include "tessel_ns.h"

static constexpr const char kTesselModule[] = "common/tessel_common";

namespace {

constexpr const char SZ_RANDOM_DEVICE[] = "/dev/urandom";
constexpr const char SZ_RANDOM_DEVICE_BLOCKING[] = "/dev/random";
constexpr size_t kSeedSize = 1024;
constexpr size_t kDigestSize = 16;
constexpr size_t kUidTextSize = 32;

// Two identifiers made in one thread within one clock tick still get
// different seeds through this counter; it is per thread so that generation
// needs no lock.
thread_local unsigned long long tGenerationCount = 0;

unsigned int ThreadId() { return static_cast<unsigned int>(syscall(SYS_gettid)); }

// A 32-bit random word from the kernel; when no random device can be read
// (or it yields 0) the word still varies by time, process and thread.
unsigned int RandomWord() {
    unsigned int word = 0;
    int fd = open(SZ_RANDOM_DEVICE, O_RDONLY | O_CLOEXEC);
    if (0 > fd) {
        fd = open(SZ_RANDOM_DEVICE_BLOCKING, O_RDONLY | O_CLOEXEC);
    }
    if (0 <= fd) {
        if (static_cast<ssize_t>(sizeof(word)) != read(fd, &word, sizeof(word))) {
            word = 0;
        }
        close(fd);
    }
    if (0 == word) {
        word = static_cast<unsigned int>(time(NULL)) + static_cast<unsigned int>(getpid()) + ThreadId();
    }
    return word;
}

unsigned long long WideClock() {
    return static_cast<unsigned long long>(static_cast<long long>(clock()));
}

// Appends the MD5 digest of szSeed as 32 upper-case hexadecimal digits.
void AppendDigest(const char *szSeed, std::string &strOut) {
    unsigned char digest[EVP_MAX_MD_SIZE];
    unsigned int nDigest = 0;
    if (1 != EVP_Digest(szSeed, strlen(szSeed), digest, &nDigest, EVP_md5(), NULL) || kDigestSize != nDigest) {
        // MD5 over a short buffer fails only when memory runs out, which a
        // std::string result reports the same way.
        throw std::bad_alloc();
    }
    static const char kHex[] = "0123456789ABCDEF";
    for (size_t i = 0; i < kDigestSize; ++i) {
        strOut += kHex[digest[i] >> 4];
        strOut += kHex[digest[i] & 0x0F];
    }
}

}  // namespace

std::string TesselObjectDefaultID(unsigned int uid) {
    char szID[32];
    snprintf(szID, sizeof(szID), "%u_#00000000", uid);
    return szID;
}

std::string TesselObjectGenerateID(unsigned int uid, const std::string & /*strNs*/) {
    char szUid[kUidTextSize];
    snprintf(szUid, sizeof(szUid), "%u_", uid);
    std::string strID(szUid);
    char szSeed[kSeedSize];
    for (int i = 0; i < 3; ++i) {
        if (1 == i) {
            snprintf(szSeed, sizeof(szSeed), "%21u_%21u:%21u-%21u+%21llu*%21llu/%21d", ThreadId(),
                     static_cast<unsigned int>(getpid()), RandomWord(), static_cast<unsigned int>(time(NULL)),
                     WideClock(), tGenerationCount++, i);
        } else {
            snprintf(szSeed, sizeof(szSeed), "%21d:%21llu-%21llu+%21u*%21u/%21u_%21u", i, tGenerationCount++,
                     WideClock(), static_cast<unsigned int>(time(NULL)), RandomWord(),
                     static_cast<unsigned int>(getpid()), ThreadId());
        }
        AppendDigest(szSeed, strID);
    }
    return strID;
}

std::string TesselObjectGenerateUniqueID(unsigned int uid, const std::string &strNs) {
    std::string strID;
    do {
        strID = TesselObjectGenerateID(uid, strNs);
    } while (TesselIDIsExist(strNs, strID));
    return strID;
}

bool TesselIDIsExist(const std::string &strNs, const std::string &strId) {
    std::string strNSPath;
    TESSEL_CHECK_APPEND(!TesselGetNSPath(strNs, strNSPath), "!TesselGetNSPath(strNs, strNSPath)", false);
    TESSEL_CHECK(!tessel::TesselIsPathComponent(strId), TESSEL_ERR_USER_INPUT, "!TesselIsPathComponent(strId)",
                 false);
    TESSEL_AS_ROOT();
    return QLIBCFileCheckDir((strNSPath + "/" + strId).c_str());
}

unsigned int TesselObjectGetOwnerByID(const std::string &strId) {
    std::string strOwner = strId.substr(0, strId.find('_'));
    char *szEnd = NULL;
    errno = 0;
    unsigned long owner = strtoul(strOwner.c_str(), &szEnd, 10);
    // A number past 32 bits would wrap onto another user's uid, which would
    // hand that user an object named for someone else: refuse it as well.
    if (NULL == szEnd || 0 != *szEnd || ERANGE == errno || owner > UINT_MAX) {
        TESSEL_RAISE(TESSEL_ERR_USER_INPUT, "Bad ID [%s]", strId.c_str());
        return UID_ERR;
    }
    return static_cast<unsigned int>(owner);
}

long long TesselExtractUid(const char *id) {
    TESSEL_CHECK(NULL == id, TESSEL_ERR_BAD_PARAMETERS, "NULL == id", -1);
    char szUid[kUidTextSize];
    size_t i = 0;
    for (; i < sizeof(szUid) && '_' != id[i] && 0 != id[i]; ++i) {
        szUid[i] = id[i];
    }
    TESSEL_CHECK(32 <= i, TESSEL_ERR_USER_INPUT, "32 <= i", -1);
    szUid[i] = 0;
    char *endPtr = NULL;
    unsigned long uid = strtoul(szUid, &endPtr, 10);
    TESSEL_CHECK(endPtr && 0 != *endPtr, TESSEL_ERR_USER_INPUT, "endPtr && 0 != *endPtr", -1);
    return static_cast<long long>(uid);
}
