/*
 * Thin helpers over jsoncpp for the four things the library does with JSON
 * text: parse text, parse a file, write compact text, write a file.
 *
 * toString is jsoncpp's compact form (no indentation, no trailing newline,
 * UTF-8 left as it is); every JSON column, file and argument the library
 * writes uses it, so equal values always give equal text.
 */
#ifndef TESSEL_COMMON_TESSEL_JSON_H
#define TESSEL_COMMON_TESSEL_JSON_H

#include <string>

#include <json/value.h>

namespace tessel {

/* Parses strText into jOut; false (jOut null) when it is not JSON. */
bool fromString(Json::Value &jOut, const std::string &strText);
/* Parses the file at strPath into jOut; false when unreadable or not JSON. */
bool fromFile(Json::Value &jOut, const std::string &strPath);
std::string toString(const Json::Value &jVal);
/* Writes toString(jVal) to strPath (truncating, not atomic); false on failure. */
bool toFile(const Json::Value &jVal, const std::string &strPath);

}  // namespace tessel

#endif /* TESSEL_COMMON_TESSEL_JSON_H */
