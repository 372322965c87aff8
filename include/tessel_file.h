/*
 * Name encoding and whole-file JSON I/O.
 *
 * TesselEncode turns any bytes into a name safe on every file system: base64,
 * then every character other than A-Z and 0-9 written as "{code}" (so "a"
 * becomes "{97}"). Files are written atomically (temporary file + rename)
 * under an exclusive flock of the target and read under a shared one.
 */
#ifndef TESSEL_FILE_H
#define TESSEL_FILE_H

#include <stddef.h>

#include <string>

#include <json/value.h>

#include "tessel_export.h"

TESSEL_EXPORT bool TesselEncode(const unsigned char *szIn, size_t nIn, std::string &strOut,
                                bool blBase64Only = false);
TESSEL_EXPORT bool TesselEncode(const std::string &strIn, std::string &strOut, bool blBase64Only = false);
/*
 * Decodes into szOut, at most nOut bytes. The decoded length is not returned:
 * pass a zero-filled buffer when the data's end must be found afterwards.
 */
TESSEL_EXPORT bool TesselDecode(const std::string &strIn, unsigned char *szOut, size_t nOut,
                                bool blBase64Only = false);
/* Decodes into a text; the result stops at its first zero byte. */
TESSEL_EXPORT bool TesselDecode(std::string &strIn, std::string &strOut, bool blBase64Only = false);

/* Writes strData to strPath atomically, keeping an existing file's owner and mode. */
TESSEL_EXPORT bool TesselRawToFile(const std::string &strData, const std::string &strPath);
/* Writes jVal's JSON text with TesselRawToFile. */
TESSEL_EXPORT bool TesselJsonToFile(const Json::Value &jVal, const std::string &strPath);
/* Reads the whole file into jOut as a JSON string holding the raw text (not parsed). */
TESSEL_EXPORT bool TesselRawFromFile(Json::Value &jOut, const std::string &strPath);
/*
 * One-level difference of two objects: an array of {"key", "type": "sub",
 * "old_value", "new_value"}, {"key", "type": "del", "value"} and {"key",
 * "type": "ins", "value"}; jOut is left untouched when nothing differs.
 */
TESSEL_EXPORT bool TesselJsonDiff(const Json::Value &jData1, const Json::Value &jData2, Json::Value &jOut);

#endif /* TESSEL_FILE_H */
