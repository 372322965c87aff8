/* Digests of stored files. */
#ifndef TESSEL_BINARY_H
#define TESSEL_BINARY_H

#include <string>

#include <quor/qlib.h>

#include "tessel_export.h"

/* The MD5 digest of a file as 32 lower-case hexadecimal digits. */
TESSEL_EXPORT BOOL TesselObjectEvalFileMd5(const char *szPath, std::string &strMd5);

#endif /* TESSEL_BINARY_H */
