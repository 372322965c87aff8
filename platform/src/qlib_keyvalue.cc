// Files of KEY="value" lines (the platform configuration, the version file).
// A value runs from the '=' to the end of the line, so it may contain '=';
// one pair of surrounding quotes is removed. When a key appears more than
// once the last line wins, as when the file is sourced by a shell; setting a
// key keeps the first of its lines, drops the others, and leaves every other
// line (comments included) as it was.
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <functional>
#include <new>
#include <string>

#include "keyvalue_file.h"
#include "quor/qlib.h"

namespace quor_internal {

namespace {

// Reads the whole file. 0, or an errno value.
int ReadWholeFile(const char *szPath, std::string *pText, struct stat *pStat) {
    int fd = open(szPath, O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        return errno;
    }
    int err = 0;
    if (0 != fstat(fd, pStat)) {
        err = errno;
    } else if (!S_ISREG(pStat->st_mode)) {
        err = S_ISDIR(pStat->st_mode) ? EISDIR : EINVAL;
    }
    char buf[8192];
    while (0 == err) {
        ssize_t n = read(fd, buf, sizeof(buf));
        if (n < 0) {
            if (EINTR == errno) {
                continue;
            }
            err = errno;
        } else if (0 == n) {
            break;
        } else {
            pText->append(buf, static_cast<size_t>(n));
        }
    }
    close(fd);
    return err;
}

// Splits one line into key and value; false for blank, comment and other
// lines that hold no pair.
// Calls fn with each line of text, without its line break; a last line
// without one counts too.
void ForEachLine(const std::string &text, const std::function<void(const std::string &)> &fn) {
    size_t pos = 0;
    while (pos < text.size()) {
        size_t nl = text.find('\n', pos);
        size_t end = (std::string::npos == nl) ? text.size() : nl;
        fn(text.substr(pos, end - pos));
        pos = (std::string::npos == nl) ? text.size() : nl + 1;
    }
}

bool ParseLine(const std::string &line, std::string *pKey, std::string *pValue) {
    size_t begin = line.find_first_not_of(" \t");
    if (std::string::npos == begin || '#' == line[begin]) {
        return false;
    }
    size_t eq = line.find('=', begin);
    if (std::string::npos == eq || eq == begin) {
        return false;
    }
    size_t end = line.size();
    if (end > eq && '\r' == line[end - 1]) {
        --end;
    }
    pKey->assign(line, begin, eq - begin);
    std::string raw = line.substr(eq + 1, end - eq - 1);
    char quote = raw.empty() ? '\0' : raw[0];
    size_t close = ('"' == quote || '\'' == quote) ? raw.rfind(quote) : std::string::npos;
    if (std::string::npos != close && close > 0) {
        // Whatever follows the closing quote (a trailing comment) is not part of the value.
        pValue->assign(raw, 1, close - 1);
    } else {
        size_t last = raw.find_last_not_of(" \t");
        pValue->assign(raw, 0, (std::string::npos == last) ? 0 : last + 1);
    }
    return true;
}

}  // namespace

bool KeyValueKeyIsValid(const std::string &key) {
    return !key.empty() && '#' != key[0] && std::string::npos == key.find_first_of("= \t\r\n\"'");
}

KeyValueLookup KeyValueRead(const char *szPath, const std::string &key, std::string *pValue) {
    std::string text;
    struct stat st;
    int err = ReadWholeFile(szPath, &text, &st);
    if (ENOENT == err || ENOTDIR == err) {
        return KeyValueLookup::kMissing;
    }
    if (0 != err) {
        errno = err;
        return KeyValueLookup::kError;
    }
    bool found = false;
    std::string lineKey;
    std::string lineValue;
    ForEachLine(text, [&](const std::string &line) {
        if (ParseLine(line, &lineKey, &lineValue) && lineKey == key) {
            pValue->swap(lineValue);
            found = true;
        }
    });
    return found ? KeyValueLookup::kFound : KeyValueLookup::kMissing;
}

}  // namespace quor_internal

namespace {

using quor_internal::KeyValueKeyIsValid;

bool WriteAll(int fd, const std::string &text) {
    size_t done = 0;
    while (done < text.size()) {
        ssize_t n = write(fd, text.data() + done, text.size() - done);
        if (n < 0) {
            if (EINTR == errno) {
                continue;
            }
            return false;
        }
        done += static_cast<size_t>(n);
    }
    return true;
}

// Replaces szPath with text through a temporary file in the same directory,
// so that readers see either the old or the new file, never a partial one.
// The file keeps its mode and owner; a new one gets 0644.
int ReplaceFile(const std::string &path, const std::string &text, const struct stat *pOld) {
    std::string tmpl = path + ".XXXXXX";
    int fd = mkostemp(&tmpl[0], O_CLOEXEC);
    if (fd < 0) {
        QLIBCErrSetEx(QLIBC_ERR_FILE_WRITE, __FILE__, __LINE__);
        return -1;
    }
    mode_t mode = (NULL == pOld) ? 0644 : (pOld->st_mode & 07777);
    bool ok = WriteAll(fd, text);
    if (ok && NULL != pOld && (pOld->st_uid != geteuid() || pOld->st_gid != getegid())) {
        ok = (0 == fchown(fd, pOld->st_uid, pOld->st_gid));
    }
    ok = ok && 0 == fchmod(fd, mode) && 0 == fsync(fd);
    int saved = errno;
    if (0 != close(fd) && ok) {
        ok = false;
        saved = errno;
    }
    if (ok && 0 != rename(tmpl.c_str(), path.c_str())) {
        ok = false;
        saved = errno;
    }
    if (!ok) {
        unlink(tmpl.c_str());
        errno = saved;
        QLIBCErrSetEx(QLIBC_ERR_FILE_WRITE, __FILE__, __LINE__);
        return -1;
    }
    // Make the rename itself durable; the new content is already on disk.
    std::string dir = path.substr(0, path.rfind('/') + 1);
    int dfd = open(dir.empty() ? "." : dir.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (dfd >= 0) {
        fsync(dfd);
        close(dfd);
    }
    return 0;
}

int SetKeyValue(const char *szPath, const std::string &key, const std::string &value) {
    // Rewrite the target of a symbolic link, not the link itself.
    std::string path = szPath;
    struct stat lst;
    if (0 == lstat(szPath, &lst) && S_ISLNK(lst.st_mode)) {
        char *szReal = realpath(szPath, NULL);
        if (NULL == szReal) {
            QLIBCErrSetEx(QLIBC_ERR_FILE_OPEN, __FILE__, __LINE__);
            return -1;
        }
        path = szReal;
        free(szReal);
    }

    std::string text;
    struct stat st;
    int err = quor_internal::ReadWholeFile(path.c_str(), &text, &st);
    bool exists = (0 == err);
    if (!exists && ENOENT != err) {
        errno = err;
        QLIBCErrSetEx(QLIBC_ERR_FILE_READ, __FILE__, __LINE__);
        return -1;
    }

    std::string newLine = key + "=\"" + value + "\"\n";
    std::string out;
    out.reserve(text.size() + newLine.size());
    bool replaced = false;
    std::string lineKey;
    std::string lineValue;
    quor_internal::ForEachLine(text, [&](const std::string &line) {
        if (quor_internal::ParseLine(line, &lineKey, &lineValue) && lineKey == key) {
            if (!replaced) {
                out += newLine;
                replaced = true;
            }
            return;
        }
        out += line;
        out += '\n';
    });
    if (!replaced) {
        out += newLine;
    }
    return ReplaceFile(path, out, exists ? &st : NULL);
}

}  // namespace

extern "C" {

int QLIBCFileGetKeyValue(const char *szPath, const char *szKey, char *szBuf, size_t cbBuf) {
    if (NULL == szPath || NULL == szKey || NULL == szBuf || 0 == cbBuf || !KeyValueKeyIsValid(szKey)) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    szBuf[0] = '\0';
    try {
        std::string value;
        switch (quor_internal::KeyValueRead(szPath, szKey, &value)) {
        case quor_internal::KeyValueLookup::kFound:
            break;
        case quor_internal::KeyValueLookup::kMissing:
            QLIBCErrSetEx(QLIBC_ERR_NOT_FOUND, __FILE__, __LINE__);
            return -1;
        case quor_internal::KeyValueLookup::kError:
            QLIBCErrSetEx(QLIBC_ERR_FILE_READ, __FILE__, __LINE__);
            return -1;
        }
        if (value.size() > INT_MAX) {
            QLIBCErrSetEx(QLIBC_ERR_FILE_READ, __FILE__, __LINE__);
            return -1;
        }
        size_t n = (value.size() < cbBuf) ? value.size() : cbBuf - 1;
        memcpy(szBuf, value.data(), n);
        szBuf[n] = '\0';
        return static_cast<int>(value.size());
    } catch (const std::bad_alloc &) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
}

int QLIBCFileSetKeyValue(const char *szPath, const char *szKey, const char *szValue) {
    if (NULL == szPath || '\0' == szPath[0] || NULL == szKey || NULL == szValue || !KeyValueKeyIsValid(szKey) ||
        NULL != strpbrk(szValue, "\r\n")) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    try {
        return SetKeyValue(szPath, szKey, szValue);
    } catch (const std::bad_alloc &) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
}

}  // extern "C"
