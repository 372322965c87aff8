// Digests of stored files: the entity tag of a download and the "md5" of a
// file description are the same value, so a client's cached copy stays valid
// exactly as long as the bytes are unchanged.
#include <stdio.h>

#include <memory>
#include <string>

#include <openssl/evp.h>

#include "common/tessel_report.h"
#include "tessel_binary.h"

static constexpr const char kTesselModule[] = "backend_fs/git";

namespace {

constexpr size_t kBlockSize = 1024;

}  // namespace

BOOL TesselObjectEvalFileMd5(const char *szPath, std::string &strMd5) {
    strMd5.clear();
    TESSEL_CHECK(NULL == szPath, TESSEL_ERR_BAD_PARAMETERS, "NULL == szPath", FALSE);
    FILE *inFile = NULL;
    TESSEL_CHECK(NULL == (inFile = fopen(szPath, "rb")), TESSEL_ERR_OPEN_FILE,
                 "NULL == (inFile = fopen (szPath, \"rb\"))", FALSE);
    std::unique_ptr<FILE, int (*)(FILE *)> file(inFile, fclose);
    std::unique_ptr<EVP_MD_CTX, void (*)(EVP_MD_CTX *)> ctx(EVP_MD_CTX_new(), EVP_MD_CTX_free);
    TESSEL_CHECK(!ctx, TESSEL_ERR_OUT_OF_MEMORY, "NULL == EVP_MD_CTX_new()", FALSE);
    TESSEL_CHECK(1 != EVP_DigestInit_ex(ctx.get(), EVP_md5(), NULL), TESSEL_ERR_UNEXPECTED,
                 "1 != EVP_DigestInit_ex(ctx, EVP_md5(), NULL)", FALSE);
    unsigned char buf[kBlockSize];
    size_t n = 0;
    while (0 < (n = fread(buf, 1, sizeof(buf), inFile))) {
        TESSEL_CHECK(1 != EVP_DigestUpdate(ctx.get(), buf, n), TESSEL_ERR_UNEXPECTED,
                     "1 != EVP_DigestUpdate(ctx, buf, n)", FALSE);
    }
    // A directory opens for reading but cannot be read: it has no digest.
    TESSEL_CHECK(ferror(inFile), TESSEL_ERR_OPEN_FILE, "ferror(inFile)", FALSE);
    unsigned char digest[EVP_MAX_MD_SIZE];
    unsigned int len = 0;
    TESSEL_CHECK(1 != EVP_DigestFinal_ex(ctx.get(), digest, &len), TESSEL_ERR_UNEXPECTED,
                 "1 != EVP_DigestFinal_ex(ctx, digest, &len)", FALSE);
    static const char kHex[] = "0123456789abcdef";
    for (unsigned int i = 0; i < len; ++i) {
        strMd5.push_back(kHex[digest[i] >> 4]);
        strMd5.push_back(kHex[digest[i] & 0x0F]);
    }
    return TRUE;
}
