/*
 * Object identifiers: the owner's uid, "_", and 96 upper-case hexadecimal
 * digits (or "#00000000" for a user's default object), so that the owner of
 * any object is known from its name alone.
 */
#ifndef TESSEL_ID_H
#define TESSEL_ID_H

#include <string>

#include <quor/qlib.h>

#include "tessel_export.h"

/* No valid owner. */
#define UID_ERR ((unsigned int)0xFFFFFFFF)
#define UID_ROOT ((unsigned int)0)

/* "<uid>_#00000000". */
TESSEL_EXPORT std::string TesselObjectDefaultID(unsigned int uid);
/* A new identifier for owner uid (the namespace does not enter the identifier). */
TESSEL_EXPORT std::string TesselObjectGenerateID(unsigned int uid, const std::string &strNs);
/* A new identifier that names no object of the namespace yet. */
TESSEL_EXPORT std::string TesselObjectGenerateUniqueID(unsigned int uid, const std::string &strNs);
/* Whether the object's directory exists in the namespace. */
TESSEL_EXPORT bool TesselIDIsExist(const std::string &strNs, const std::string &strId);
/* The owner part of an identifier; UID_ERR (with 1007) when it is not a number. */
TESSEL_EXPORT unsigned int TesselObjectGetOwnerByID(const std::string &strId);
/* The owner part with explicit limits (at most 31 digits); -1 on failure. */
TESSEL_EXPORT long long TesselExtractUid(const char *szId);
/* The identifier parses and its owner may own objects now. */
TESSEL_EXPORT BOOL TesselObjectIDIsValid(const char *szID);
/* The user exists. */
TESSEL_EXPORT bool TesselCheckUID(unsigned int uid);

#endif /* TESSEL_ID_H */
