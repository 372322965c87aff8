/*
 * HTTP output for handlers running as gateway (CGI) programs: MIME types,
 * sending a file to standard output, URL encoding.
 */
#ifndef QUOR_QUOR_WEB_H
#define QUOR_QUOR_WEB_H

#ifdef __cplusplus

#include <string>

#include "quor_export.h"

class QUOR_EXPORT HTTPFileOutputer {
public:
    HTTPFileOutputer();
    ~HTTPFileOutputer();
    /* MIME type of a file name from the system's mime.types (by extension,
     * case-insensitive); "application/octet-stream" when unknown. */
    std::string GetMimeType(const char *szFileName);
    /* Writes "Content-Type:", "Content-Length:" and an empty line, then the
     * file's bytes, to standard output through stdio (after whatever the
     * caller printed). A NULL or empty type is taken from the file name. 0, or
     * -1 (nothing written when the file cannot be opened or is not a regular
     * file, or when the type holds a line break). */
    int Output(const char *szPath, const char *szMimeType);
};

/* Percent-encodes everything but unreserved characters (RFC 3986). */
QUOR_EXPORT std::string QUOR_WebAPIUtil_URLEncode(const std::string &strIn);

#endif /* __cplusplus */

#endif /* QUOR_QUOR_WEB_H */
