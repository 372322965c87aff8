// Directory creation with owner and mode, and file copy that never leaves a
// partial destination behind.
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <new>
#include <string>
#include <vector>

#include "quor/quor.h"

namespace {

// Restores errno on scope exit, so clean-up does not hide the cause.
class ErrnoKeeper {
public:
    ErrnoKeeper() : saved_(errno) {}
    ~ErrnoKeeper() { errno = saved_; }
    ErrnoKeeper(const ErrnoKeeper &) = delete;
    ErrnoKeeper &operator=(const ErrnoKeeper &) = delete;

private:
    int saved_;
};

// Splits a path into its components; false when one of them is "." or "..",
// which would make the list of created directories name the same directory
// twice or point outside the path the caller asked for.
bool SplitPath(const std::string &path, std::vector<std::string> *pParts) {
    size_t pos = 0;
    while (pos < path.size()) {
        size_t slash = path.find('/', pos);
        size_t end = (std::string::npos == slash) ? path.size() : slash;
        if (end > pos) {
            std::string part = path.substr(pos, end - pos);
            if ("." == part || ".." == part) {
                return false;
            }
            pParts->push_back(part);
        }
        pos = end + 1;
    }
    return true;
}

void RemoveCreated(const std::vector<std::string> &created) {
    ErrnoKeeper keep;
    for (auto it = created.rbegin(); it != created.rend(); ++it) {
        rmdir(it->c_str());
    }
}

// Creates one directory and gives it its owner and mode. The directory starts
// as 0700 so that nobody can use it before it is finished; chmod comes after
// chown (which may clear set-id bits) and is not cut by the umask.
bool MakeOneDir(const std::string &dir, uid_t uid, gid_t gid, mode_t mode) {
    if (0 != mkdir(dir.c_str(), 0700)) {
        return false;
    }
    if ((static_cast<uid_t>(-1) != uid || static_cast<gid_t>(-1) != gid) && 0 != chown(dir.c_str(), uid, gid)) {
        ErrnoKeeper keep;
        rmdir(dir.c_str());
        return false;
    }
    if (0 != chmod(dir.c_str(), mode)) {
        ErrnoKeeper keep;
        rmdir(dir.c_str());
        return false;
    }
    return true;
}

int MkdirP(const std::string &path, QLIBSZLIST **pCreated, bool blParents, uid_t uid, gid_t gid, mode_t mode) {
    std::vector<std::string> parts;
    if (!SplitPath(path, &parts)) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    std::vector<std::string> created;
    std::string dir = ('/' == path[0]) ? "/" : "";
    for (size_t i = 0; i < parts.size(); ++i) {
        if (!dir.empty() && '/' != dir.back()) {
            dir += '/';
        }
        dir += parts[i];
        struct stat st;
        if (0 == stat(dir.c_str(), &st)) {
            if (S_ISDIR(st.st_mode)) {
                continue;
            }
            errno = ENOTDIR;
        } else if (ENOENT == errno) {
            if (!blParents && i + 1 < parts.size()) {
                errno = ENOENT;
            } else if (MakeOneDir(dir, uid, gid, mode)) {
                created.push_back(dir);
                continue;
            } else if (EEXIST == errno && 0 == stat(dir.c_str(), &st) && S_ISDIR(st.st_mode)) {
                continue;  // made by someone else meanwhile: not ours to own
            }
        }
        RemoveCreated(created);
        QLIBCErrSetEx(QLIBC_ERR_FILE_WRITE, __FILE__, __LINE__);
        return -1;
    }
    if (NULL != pCreated) {
        for (const std::string &one : created) {
            if (QLIBCSzListPush(pCreated, one.c_str()) < 0) {
                RemoveCreated(created);
                return -1;
            }
        }
    }
    return 0;
}

bool WriteAll(int fd, const char *pData, size_t cb) {
    while (cb > 0) {
        ssize_t n = write(fd, pData, cb);
        if (n < 0) {
            if (EINTR == errno) {
                continue;
            }
            return false;
        }
        pData += n;
        cb -= static_cast<size_t>(n);
    }
    return true;
}

// Copies the bytes of in to out; 0, or the platform error code.
int CopyBytes(int in, int out) {
    char buf[65536];
    for (;;) {
        ssize_t n = read(in, buf, sizeof(buf));
        if (n < 0) {
            if (EINTR == errno) {
                continue;
            }
            return QLIBC_ERR_FILE_READ;
        }
        if (0 == n) {
            return 0;
        }
        if (!WriteAll(out, buf, static_cast<size_t>(n))) {
            return QLIBC_ERR_FILE_WRITE;
        }
    }
}

// Moves the finished temporary file to its place; without overwrite an
// existing destination (even one created while we copied) is kept.
bool Publish(const std::string &tmp, const char *szDest, bool blOverwrite) {
    if (blOverwrite) {
        return 0 == rename(tmp.c_str(), szDest);
    }
    if (0 == renameat2(AT_FDCWD, tmp.c_str(), AT_FDCWD, szDest, RENAME_NOREPLACE)) {
        return true;
    }
    if (EINVAL != errno && ENOSYS != errno) {
        return false;
    }
    // File systems without RENAME_NOREPLACE: link() refuses an existing name too.
    if (0 != link(tmp.c_str(), szDest)) {
        return false;
    }
    unlink(tmp.c_str());
    return true;
}

void SyncDir(const std::string &dir) {
    int fd = open(dir.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (fd >= 0) {
        fsync(fd);
        close(fd);
    }
}

int CopyFile(const char *szSrc, const char *szDest, const QUORFILECOPYARG &arg) {
    std::string dest = szDest;
    size_t slash = dest.rfind('/');
    std::string dir = (std::string::npos == slash) ? "." : ((0 == slash) ? "/" : dest.substr(0, slash));
    std::string base = (std::string::npos == slash) ? dest : dest.substr(slash + 1);
    if (base.empty() || "." == base || ".." == base) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }

    // O_NONBLOCK keeps a FIFO from blocking the open; it is refused below.
    int in = open(szSrc, O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY);
    if (in < 0) {
        QLIBCErrSetEx(QLIBC_ERR_FILE_OPEN, __FILE__, __LINE__);
        return -1;
    }
    struct stat st;
    if (0 != fstat(in, &st)) {
        ErrnoKeeper keep;
        close(in);
        QLIBCErrSetEx(QLIBC_ERR_FILE_OPEN, __FILE__, __LINE__);
        return -1;
    }
    if (!S_ISREG(st.st_mode)) {
        close(in);
        errno = S_ISDIR(st.st_mode) ? EISDIR : EINVAL;
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    struct stat dst;
    if (0 == stat(szDest, &dst) && (!arg.blOverwrite || S_ISDIR(dst.st_mode))) {
        close(in);
        errno = S_ISDIR(dst.st_mode) ? EISDIR : EEXIST;
        QLIBCErrSetEx(QLIBC_ERR_FILE_WRITE, __FILE__, __LINE__);
        return -1;
    }

    std::string tmp = dir + "/." + base + ".XXXXXX";
    int out = mkostemp(&tmp[0], O_CLOEXEC);
    if (out < 0) {
        ErrnoKeeper keep;
        close(in);
        QLIBCErrSetEx(QLIBC_ERR_FILE_OPEN, __FILE__, __LINE__);
        return -1;
    }
    int err = CopyBytes(in, out);
    close(in);
    if (0 == err && arg.blKeepOwner && 0 != fchown(out, st.st_uid, st.st_gid)) {
        err = QLIBC_ERR_FILE_WRITE;
    }
    // After fchown, which clears set-id bits.
    if (0 == err && 0 != fchmod(out, arg.blKeepMode ? (st.st_mode & 07777) : 0600)) {
        err = QLIBC_ERR_FILE_WRITE;
    }
    if (0 == err && 0 != fsync(out)) {
        err = QLIBC_ERR_FILE_WRITE;
    }
    if (0 != close(out) && 0 == err) {
        err = QLIBC_ERR_FILE_WRITE;
    }
    if (0 == err && !Publish(tmp, szDest, arg.blOverwrite)) {
        err = QLIBC_ERR_FILE_WRITE;
    }
    if (0 != err) {
        ErrnoKeeper keep;
        unlink(tmp.c_str());
        QLIBCErrSetEx(err, __FILE__, __LINE__);
        return -1;
    }
    SyncDir(dir);
    return 0;
}

}  // namespace

extern "C" {

int QUORFSMkdirP(const char *szPath, QLIBSZLIST **pCreated, BOOL blParents, uid_t uid, gid_t gid, mode_t mode) {
    if (NULL == szPath || '\0' == szPath[0] || (NULL != pCreated && NULL == *pCreated) || 0 != (mode & ~07777)) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    try {
        return MkdirP(szPath, pCreated, FALSE != blParents, uid, gid, mode);
    } catch (const std::bad_alloc &) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
}

int QUORFileCopy(const char *szSrc, const char *szDest, const QUORFILECOPYARG *pArg) {
    if (NULL == szSrc || NULL == szDest || '\0' == szSrc[0] || '\0' == szDest[0]) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    QUORFILECOPYARG arg = {TRUE, FALSE, FALSE};
    if (NULL != pArg) {
        arg = *pArg;
    }
    try {
        return CopyFile(szSrc, szDest, arg);
    } catch (const std::bad_alloc &) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
}

}  // extern "C"
