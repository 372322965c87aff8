/*
 * tessel-download: a gateway (CGI) program that sends one stored file of an
 * object to a web client.
 *
 *   GET /cgi-bin/tessel-download?ns=NS&id=ID&segment=metabinary&field=NAME&format=raw
 *
 * Query parameters (URL-encoded, "+" for a blank):
 *   ns, id     the object;
 *   segment    "metabinary" (the object's unversioned files) or "binary"
 *              (its versioned ones);
 *   field      the file's name;
 *   format     "raw" (the bytes) or "base64" (the bytes encoded as text);
 *   version    optional: a version of a versioned file;
 *   mode       optional: "download" asks for an attachment, so that the
 *              browser saves the file under its stored name.
 *
 * Who asks: the user the web server authenticated (REMOTE_USER, resolved to
 * a uid through the system's user database). A request without one is the
 * unauthenticated caller (4294967295), who may read only what is public. The
 * query cannot name a requester: a client could claim to be anyone.
 *
 * The library reads the request headers HTTP_IF_NONE_MATCH (a matching
 * entity tag gets "304 Not Modified") and HTTP_USER_AGENT (older browsers
 * get a URL-encoded attachment name) from the environment the server sets.
 *
 * The program must run with root as its real or saved user id, as the
 * library's callers do: it raises itself for the store's root-only files.
 * A refused request gets a status (400 bad request, 403 not permitted, 404
 * no such file, 500 anything else) and a one-line body with the library's
 * error code; the whole error stack goes to the system log.
 */
#include <pwd.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <syslog.h>

#include <memory>
#include <string>
#include <vector>

#include <quor/qlib.h>
#include <tessel/tessel.h>

namespace {

constexpr const char *const SZ_QUERY_KEYS[] = {"ns", "id", "segment", "field", "format", "version", "mode"};
constexpr const char SZ_UNAUTHENTICATED[] = "4294967295";

int HexValue(char c) {
    if (c >= '0' && c <= '9') {
        return c - '0';
    }
    if (c >= 'a' && c <= 'f') {
        return c - 'a' + 10;
    }
    if (c >= 'A' && c <= 'F') {
        return c - 'A' + 10;
    }
    return -1;
}

// Decodes one query component; false on a broken escape.
bool UrlDecode(const std::string &strIn, std::string &strOut) {
    strOut.clear();
    for (size_t i = 0; i < strIn.size(); ++i) {
        if ('+' == strIn[i]) {
            strOut.push_back(' ');
        } else if ('%' == strIn[i]) {
            if (i + 2 >= strIn.size()) {
                return false;
            }
            const int hi = HexValue(strIn[i + 1]);
            const int lo = HexValue(strIn[i + 2]);
            if (hi < 0 || lo < 0) {
                return false;
            }
            strOut.push_back(static_cast<char>(hi * 16 + lo));
            i += 2;
        } else {
            strOut.push_back(strIn[i]);
        }
    }
    return true;
}

bool IsQueryKey(const std::string &strKey) {
    for (const char *szKey : SZ_QUERY_KEYS) {
        if (strKey == szKey) {
            return true;
        }
    }
    return false;
}

// The known parameters of the query into pHash; others are ignored.
bool ParseQuery(const char *szQuery, QLIBSZHASH *pHash) {
    const std::string strQuery = (NULL == szQuery) ? "" : szQuery;
    size_t pos = 0;
    while (pos <= strQuery.size()) {
        size_t end = strQuery.find('&', pos);
        if (std::string::npos == end) {
            end = strQuery.size();
        }
        const std::string strPair = strQuery.substr(pos, end - pos);
        pos = end + 1;
        if (strPair.empty()) {
            continue;
        }
        const size_t eq = strPair.find('=');
        std::string strKey, strValue;
        if (!UrlDecode(strPair.substr(0, eq), strKey) ||
            !UrlDecode(std::string::npos == eq ? "" : strPair.substr(eq + 1), strValue)) {
            return false;
        }
        // A zero byte would cut the value short without anyone noticing.
        if (std::string::npos != strValue.find('\0')) {
            return false;
        }
        if (IsQueryKey(strKey) && 0 > QLIBCSzHashSetValue(pHash, strKey.c_str(), strValue.c_str())) {
            return false;
        }
    }
    return true;
}

// The requester as decimal text: the authenticated user's uid.
bool RequesterText(std::string &strRequester) {
    const char *szUser = getenv("REMOTE_USER");
    if (NULL == szUser || '\0' == szUser[0]) {
        strRequester = SZ_UNAUTHENTICATED;
        return true;
    }
    struct passwd pw;
    struct passwd *pFound = NULL;
    std::vector<char> buf(16384);
    if (0 != getpwnam_r(szUser, &pw, buf.data(), buf.size(), &pFound) || NULL == pFound) {
        return false;
    }
    strRequester = std::to_string(pFound->pw_uid);
    return true;
}

int Refuse(const char *szStatus, int code) {
    printf("Status: %s\r\nContent-Type: text/plain\r\n\r\nerror %d\n", szStatus, code);
    return 0;
}

const char *StatusOf(int code) {
    switch (code) {
        case TESSEL_ERR_USER_INPUT:
        case TESSEL_ERR_BAD_PARAMETERS:
            return "400 Bad Request";
        // An object shared with nobody refuses everyone but its owner and
        // root without a code of its own.
        case -1:
        case TESSEL_ERR_NO_PERMISSION:
        case TESSEL_ERR_NS_DISABLED:
        case TESSEL_ERR_SHARING_DISABLED:
        case TESSEL_ERR_DISABLED:
        case TESSEL_ERR_OWNER_INVALID:
        case TESSEL_ERR_USER_NOT_EXISTS:
            return "403 Forbidden";
        case TESSEL_ERR_NOT_EXISTS:
        case TESSEL_ERR_UNEXPECTED:
            return "404 Not Found";
        default:
            return "500 Internal Server Error";
    }
}

}  // namespace

int main() {
    openlog("tessel-download", LOG_PID, LOG_USER);
    std::unique_ptr<QLIBSZHASH, void (*)(QLIBSZHASH *)> hash(QLIBCSzHashAlloc(16), QLIBCSzHashFree);
    if (!hash) {
        return Refuse("500 Internal Server Error", TESSEL_ERR_OUT_OF_MEMORY);
    }
    if (!ParseQuery(getenv("QUERY_STRING"), hash.get())) {
        return Refuse("400 Bad Request", TESSEL_ERR_USER_INPUT);
    }
    std::string strRequester;
    if (!RequesterText(strRequester)) {
        return Refuse("403 Forbidden", TESSEL_ERR_USER_NOT_EXISTS);
    }
    if (0 > QLIBCSzHashSetValue(hash.get(), "requester", strRequester.c_str())) {
        return Refuse("500 Internal Server Error", TESSEL_ERR_OUT_OF_MEMORY);
    }
    if (!TesselObjectDownload(hash.get())) {
        const int code = TesselErrCodeGet();
        TesselErrSyslog();
        return Refuse(StatusOf(code), code);
    }
    return 0;
}
