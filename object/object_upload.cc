// What a create or set may hand the store to copy. The store copies a
// request's files as root, so the right to read them is decided here, as
// the caller, before anything is written.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <string>

#include "common/tessel_report.h"
#include "object/object_ops.h"
#include "object/object_upload.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "object/object_upload";

namespace {

constexpr char SZ_FORMAT_OBJECT[] = "object";
constexpr char SZ_FORMAT_DELETE[] = "delete";
constexpr char SZ_FORMAT_RAW[] = "raw";
constexpr char SZ_FORMAT_BASE64[] = "base64";
constexpr char SZ_PERM_RO[] = "ro";
constexpr char SZ_PERM_RW[] = "rw";
constexpr char SZ_PERM_OWNER[] = "owner";

// Closes on every way out of the check.
struct FdCloser {
    int fd;
    ~FdCloser() {
        if (0 <= fd) {
            close(fd);
        }
    }
};

// Opened rather than asked about (access(2)): the answer is then about the
// very file found, and its type comes from the same descriptor. O_NONBLOCK
// keeps a FIFO without writer from holding the call; O_NOCTTY keeps a
// terminal from becoming the process's own.
bool CheckReadableFile(const std::string &strPath) {
    FdCloser file{open(strPath.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC)};
    if (0 > file.fd) {
        TESSEL_RAISE(TESSEL_ERR_USER_INPUT, "0 > (fd = open(jItem[\"path\"].asCString(), O_RDONLY)) [%s]",
                     strPath.c_str());
        return false;
    }
    struct stat st;
    TESSEL_CHECK(0 != fstat(file.fd, &st), TESSEL_ERR_USER_INPUT, "0 != fstat(fd, &st)", false);
    // A directory, device or FIFO would be read as root later on: its
    // contents (or a blocked copy) are nothing a caller may attach.
    if (!S_ISREG(st.st_mode)) {
        TESSEL_RAISE(TESSEL_ERR_USER_INPUT, "!S_ISREG(st.st_mode) [%s]", strPath.c_str());
        return false;
    }
    return true;
}

// The requester reads the source object the way an object get does; a word
// below "ro" never lets its binaries be copied.
bool CheckReadableObject(const Json::Value &jParm, const std::string &strId) {
    TESSEL_OBJECT src;
    Json::Value jGetParm(Json::objectValue);
    jGetParm["ns"] = jParm["ns"];
    jGetParm["id"] = strId;
    jGetParm["requester"] = jParm["requester"];
    jGetParm["field"]["acl"] = true;
    TESSEL_CHECK_APPEND(!src.Get(jGetParm), "!src.Get(jGetParm)", false);
    const std::string &strPerm = src.get_ref_perm();
    if (SZ_PERM_RO != strPerm && SZ_PERM_RW != strPerm && SZ_PERM_OWNER != strPerm) {
        TESSEL_RAISE(TESSEL_ERR_NO_PERMISSION,
                     "\"ro\" != src.get_ref_perm() && \"rw\" != src.get_ref_perm() && "
                     "\"owner\" != src.get_ref_perm() [%s]",
                     strPerm.c_str());
        return false;
    }
    return true;
}

// blVersioned: the versioned binaries copy a path for every format but
// "object" and "delete"; the meta-binaries only for "raw" and "base64".
bool CheckItems(const Json::Value &jParm, const char *szKey, bool blVersioned) {
    const Json::Value &jArray = tessel::MemberOf(jParm, szKey);
    if (!jArray.isArray()) {
        return true;
    }
    const bool blRoot = 0 == tessel::UidOf(jParm["requester"]);
    for (const Json::Value &jItem : jArray) {
        if (!jItem.isObject()) {
            continue;
        }
        const Json::Value &jFormat = jItem["format"];
        const std::string strFormat = jFormat.isString() ? jFormat.asString() : std::string();
        if (SZ_FORMAT_OBJECT == strFormat) {
            if (!blRoot && jItem["id"].isString() && !CheckReadableObject(jParm, jItem["id"].asString())) {
                TESSEL_APPEND("!CheckReadableObject(jParm, jItem[\"id\"].asString())");
                return false;
            }
            continue;
        }
        const bool blCopiesPath = blVersioned ? SZ_FORMAT_DELETE != strFormat
                                              : (SZ_FORMAT_RAW == strFormat || SZ_FORMAT_BASE64 == strFormat);
        if (blCopiesPath && jItem["path"].isString() && !CheckReadableFile(jItem["path"].asString())) {
            return false;
        }
    }
    return true;
}

}  // namespace

namespace tessel {

bool CheckUploadSources(const Json::Value &jParm) {
    TESSEL_CHECK_APPEND(!CheckItems(jParm, "binary_files", true), "!CheckItems(jParm, \"binary_files\")", false);
    TESSEL_CHECK_APPEND(!CheckItems(jParm, "metabinary_files", false), "!CheckItems(jParm, \"metabinary_files\")",
                        false);
    return true;
}

}  // namespace tessel
