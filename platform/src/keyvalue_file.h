// Reading KEY="value" files without touching the platform error state, for
// callers (the platform configuration) to whom a missing file or key is an
// ordinary answer rather than a failure.
#ifndef QUOR_SRC_KEYVALUE_FILE_H
#define QUOR_SRC_KEYVALUE_FILE_H

#include <string>

namespace quor_internal {

enum class KeyValueLookup { kFound, kMissing, kError };

// kFound with *pValue set; kMissing when the file or the key is absent;
// kError when the file exists but cannot be read (errno tells why).
KeyValueLookup KeyValueRead(const char *szPath, const std::string &key, std::string *pValue);

// True for a key that can be written as KEY="value" and read back: not empty,
// no '=', blanks, quotes, line breaks, and not starting with '#'.
bool KeyValueKeyIsValid(const std::string &key);

}  // namespace quor_internal

#endif  // QUOR_SRC_KEYVALUE_FILE_H
