// Base64 over OpenSSL's block coder. The block coder is lenient in ways a
// strict decoder must not be ('=' inside the text decodes as 'A', the length
// it reports counts the padding), so the text is checked here first.
#include <limits.h>
#include <string.h>

#include <string>
#include <vector>

#include <openssl/evp.h>

#include "quor/qlib.h"

namespace {

constexpr size_t kLineLength = 76;

bool IsBase64Char(char c) {
    return ('A' <= c && c <= 'Z') || ('a' <= c && c <= 'z') || ('0' <= c && c <= '9') || '+' == c || '/' == c;
}

bool IsLineSpace(char c) { return ' ' == c || '\t' == c || '\r' == c || '\n' == c; }

// The characters of szIn without line breaks and blanks, or false when the
// rest is not a whole number of padded base64 groups.
bool CleanInput(const char *szIn, size_t nIn, std::string *pText, size_t *pnPad) {
    pText->clear();
    pText->reserve(nIn);
    size_t nPad = 0;
    for (size_t i = 0; i < nIn; ++i) {
        char c = szIn[i];
        if (IsLineSpace(c)) {
            continue;
        }
        if ('=' == c) {
            ++nPad;
        } else if (!IsBase64Char(c) || nPad > 0) {
            return false;  // a foreign character, or data after padding
        }
        pText->push_back(c);
    }
    if (0 != pText->size() % 4 || nPad > 2) {
        return false;
    }
    *pnPad = nPad;
    return true;
}

}  // namespace

extern "C" {

BOOL QLIBCBase64SzEncodeFull(const unsigned char *pIn, size_t nIn, char *szOut, size_t cbOut, BOOL blLineBreak) {
    if ((NULL == pIn && nIn > 0) || NULL == szOut || 0 == cbOut) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return FALSE;
    }
    if (nIn > (static_cast<size_t>(INT_MAX) / 4) * 3) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return FALSE;
    }
    const size_t nText = (nIn + 2) / 3 * 4;
    const size_t nBreaks = (blLineBreak && nText > 0) ? (nText - 1) / kLineLength : 0;
    if (cbOut < nText + nBreaks + 1) {
        szOut[0] = '\0';
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return FALSE;
    }
    if (0 == nBreaks) {
        EVP_EncodeBlock(reinterpret_cast<unsigned char *>(szOut), pIn, static_cast<int>(nIn));
        return TRUE;
    }
    std::vector<unsigned char> text(nText + 1);
    EVP_EncodeBlock(text.data(), pIn, static_cast<int>(nIn));
    // Lines of 76 characters separated by newlines, none after the last.
    char *p = szOut;
    for (size_t off = 0; off < nText; off += kLineLength) {
        if (off > 0) {
            *p++ = '\n';
        }
        size_t n = (nText - off < kLineLength) ? nText - off : kLineLength;
        memcpy(p, text.data() + off, n);
        p += n;
    }
    *p = '\0';
    return TRUE;
}

BOOL QLIBCBase64Decode(const char *szIn, size_t nIn, char *pOut, size_t *pnOut) {
    if ((NULL == szIn && nIn > 0) || NULL == pnOut || (NULL == pOut && *pnOut > 0)) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return FALSE;
    }
    std::string text;
    size_t nPad = 0;
    if (!CleanInput(szIn, nIn, &text, &nPad) || text.size() > static_cast<size_t>(INT_MAX)) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return FALSE;
    }
    const size_t nBlock = text.size() / 4 * 3;
    const size_t nData = nBlock - nPad;
    if (nData > *pnOut) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return FALSE;
    }
    if (0 == nData) {
        *pnOut = 0;
        return TRUE;
    }
    // The block coder writes the padding bytes too, so it gets a buffer of
    // its own and only the data reaches the caller's.
    std::vector<unsigned char> block(nBlock);
    int ret = EVP_DecodeBlock(block.data(), reinterpret_cast<const unsigned char *>(text.data()),
                              static_cast<int>(text.size()));
    if (ret < 0 || static_cast<size_t>(ret) != nBlock) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return FALSE;
    }
    memcpy(pOut, block.data(), nData);
    *pnOut = nData;
    return TRUE;
}

}  // extern "C"
