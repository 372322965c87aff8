// Upper-casing of UTF-8 text with the C library's Unicode tables, whatever
// locale the process runs in: the conversions use a private UTF-8 locale
// object, switched in for the calling thread only.
#include <limits.h>
#include <locale.h>
#include <string.h>
#include <wchar.h>
#include <wctype.h>

#include "quor/qlib.h"

namespace {

locale_t Utf8Locale() {
    // Created once and kept for the life of the process.
    static const locale_t loc = [] {
        locale_t l = newlocale(LC_CTYPE_MASK, "C.UTF-8", static_cast<locale_t>(0));
        if (static_cast<locale_t>(0) == l) {
            l = newlocale(LC_CTYPE_MASK, "en_US.UTF-8", static_cast<locale_t>(0));
        }
        return l;
    }();
    return loc;
}

// Makes loc the calling thread's locale until the end of the scope.
class ThreadLocale {
public:
    explicit ThreadLocale(locale_t loc) : prev_(uselocale(loc)) {}
    ~ThreadLocale() { uselocale(prev_); }
    ThreadLocale(const ThreadLocale &) = delete;
    ThreadLocale &operator=(const ThreadLocale &) = delete;

private:
    locale_t prev_;
};

constexpr wchar_t kMaxCodePoint = 0x10FFFF;

}  // namespace

extern "C" {

int QLIBCUTF8StrToUpper(const char *szIn, char *szOut, size_t cbOut) {
    if (NULL == szIn || NULL == szOut || 0 == cbOut) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    locale_t loc = Utf8Locale();
    if (static_cast<locale_t>(0) == loc) {
        szOut[0] = '\0';
        QLIBCErrSetEx(QLIBC_ERR_UNKNOWN, __FILE__, __LINE__);
        return -1;
    }
    ThreadLocale scope(loc);
    const size_t nIn = strlen(szIn);
    mbstate_t inState;
    mbstate_t outState;
    memset(&inState, 0, sizeof(inState));
    memset(&outState, 0, sizeof(outState));
    size_t used = 0;
    for (size_t pos = 0; pos < nIn;) {
        wchar_t wc = 0;
        size_t n = mbrtowc(&wc, szIn + pos, nIn - pos, &inState);
        // The decoder also takes the old 5- and 6-byte forms beyond Unicode.
        if (static_cast<size_t>(-1) == n || static_cast<size_t>(-2) == n || 0 == n || wc > kMaxCodePoint) {
            szOut[0] = '\0';
            QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
            return -1;
        }
        pos += n;
        char mb[MB_LEN_MAX];
        size_t m = wcrtomb(mb, static_cast<wchar_t>(towupper_l(static_cast<wint_t>(wc), loc)), &outState);
        if (static_cast<size_t>(-1) == m || used + m + 1 > cbOut) {
            szOut[0] = '\0';
            QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
            return -1;
        }
        memcpy(szOut + used, mb, m);
        used += m;
    }
    szOut[used] = '\0';
    return 0;
}

}  // extern "C"
