// HTTP output for gateway programs: MIME types from the system's table,
// sending a file to standard output, URL encoding.
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <fstream>
#include <mutex>
#include <new>
#include <sstream>
#include <string>
#include <unordered_map>

#include "quor/qlib.h"
#include "quor/quor_web.h"

namespace {

constexpr char kMimeTypesPath[] = "/etc/mime.types";
constexpr char kDefaultMimeType[] = "application/octet-stream";

std::string Lower(std::string text) {
    for (char &c : text) {
        if (c >= 'A' && c <= 'Z') {
            c = static_cast<char>(c - 'A' + 'a');
        }
    }
    return text;
}

// Extension (lower case) -> type. The table is read once per process; where
// it lists an extension twice the first line wins.
class MimeTable {
public:
    static const MimeTable &Get() {
        static std::once_flag once;
        static MimeTable *pTable = NULL;
        std::call_once(once, [] { pTable = new MimeTable(kMimeTypesPath); });
        return *pTable;
    }

    const std::string *Find(const std::string &ext) const {
        auto it = types_.find(ext);
        return (types_.end() == it) ? NULL : &it->second;
    }

private:
    explicit MimeTable(const char *szPath) {
        std::ifstream in(szPath);
        std::string line;
        while (std::getline(in, line)) {
            size_t hash = line.find('#');
            if (std::string::npos != hash) {
                line.erase(hash);
            }
            std::istringstream fields(line);
            std::string type;
            std::string ext;
            if (!(fields >> type)) {
                continue;
            }
            while (fields >> ext) {
                types_.emplace(Lower(ext), type);
            }
        }
    }

    std::unordered_map<std::string, std::string> types_;
};

bool WriteAll(FILE *out, const char *pData, size_t cb) { return fwrite(pData, 1, cb, out) == cb; }

}  // namespace

HTTPFileOutputer::HTTPFileOutputer() {}

HTTPFileOutputer::~HTTPFileOutputer() {}

std::string HTTPFileOutputer::GetMimeType(const char *szFileName) {
    if (NULL == szFileName) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return kDefaultMimeType;
    }
    const char *szBase = strrchr(szFileName, '/');
    szBase = (NULL == szBase) ? szFileName : szBase + 1;
    // Longest suffix first: the table has compound extensions ("pcf.Z"). A
    // leading dot marks a hidden file, not an extension.
    const MimeTable &table = MimeTable::Get();
    const char *szFrom = ('\0' == szBase[0]) ? szBase : szBase + 1;
    for (const char *szDot = strchr(szFrom, '.'); NULL != szDot; szDot = strchr(szDot + 1, '.')) {
        const std::string *pType = table.Find(Lower(szDot + 1));
        if (NULL != pType) {
            return *pType;
        }
    }
    return kDefaultMimeType;
}

int HTTPFileOutputer::Output(const char *szPath, const char *szMimeType) {
    if (NULL == szPath) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    std::string type = (NULL == szMimeType || '\0' == szMimeType[0]) ? GetMimeType(szPath) : szMimeType;
    if (std::string::npos != type.find_first_of("\r\n")) {
        // A line break would let the caller's text end the header block.
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    int fd = open(szPath, O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY);
    if (fd < 0) {
        QLIBCErrSetEx(QLIBC_ERR_FILE_OPEN, __FILE__, __LINE__);
        return -1;
    }
    struct stat st;
    if (0 != fstat(fd, &st) || !S_ISREG(st.st_mode)) {
        close(fd);
        QLIBCErrSetEx(QLIBC_ERR_FILE_OPEN, __FILE__, __LINE__);
        return -1;
    }
    // Through stdio, so the bytes follow whatever the caller already printf()ed.
    if (fprintf(stdout, "Content-Type: %s\r\nContent-Length: %lld\r\n\r\n", type.c_str(),
                static_cast<long long>(st.st_size)) < 0) {
        close(fd);
        QLIBCErrSetEx(QLIBC_ERR_FILE_WRITE, __FILE__, __LINE__);
        return -1;
    }
    // Exactly the announced length: a file that grows meanwhile is cut, one
    // that shrinks is a failure (the client will see a short body).
    long long left = static_cast<long long>(st.st_size);
    char buf[65536];
    int ret = 0;
    while (left > 0) {
        size_t want = (left < static_cast<long long>(sizeof(buf))) ? static_cast<size_t>(left) : sizeof(buf);
        ssize_t n = read(fd, buf, want);
        if (n < 0 && EINTR == errno) {
            continue;
        }
        if (n <= 0) {
            QLIBCErrSetEx(QLIBC_ERR_FILE_READ, __FILE__, __LINE__);
            ret = -1;
            break;
        }
        if (!WriteAll(stdout, buf, static_cast<size_t>(n))) {
            QLIBCErrSetEx(QLIBC_ERR_FILE_WRITE, __FILE__, __LINE__);
            ret = -1;
            break;
        }
        left -= n;
    }
    close(fd);
    if (0 != fflush(stdout) && 0 == ret) {
        QLIBCErrSetEx(QLIBC_ERR_FILE_WRITE, __FILE__, __LINE__);
        ret = -1;
    }
    return ret;
}

std::string QUOR_WebAPIUtil_URLEncode(const std::string &strIn) {
    static const char kHex[] = "0123456789ABCDEF";
    std::string out;
    out.reserve(strIn.size() * 3);
    for (unsigned char c : strIn) {
        bool unreserved = (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || '-' == c ||
                          '.' == c || '_' == c || '~' == c;
        if (unreserved) {
            out.push_back(static_cast<char>(c));
        } else {
            out.push_back('%');
            out.push_back(kHex[c >> 4]);
            out.push_back(kHex[c & 0x0F]);
        }
    }
    return out;
}
