// Small pieces every benchmark program needs around its subject: JSON text
// in and out, a whole file written at once, the namespace they work in.
#ifndef TESSEL_BENCH_BENCH_SUPPORT_H
#define TESSEL_BENCH_BENCH_SUPPORT_H

#include <string>

#include <json/value.h>

namespace tessel_bench {

// The value of strText; null when it is no JSON.
Json::Value Parse(const std::string &strText);
// The value as one line; blUtf8 keeps non-ASCII characters as they are
// instead of escaping them.
std::string Compact(const Json::Value &jVal, bool blUtf8 = false);
// Opens namespace "bench" to every user and links its store directory
// /volume1/@Tessel/bench into place; false when the configuration cannot be
// written. Only inside the sandbox: these are the store's fixed paths.
bool PlaceBenchNamespace();
// strData as the whole of strPath; false when any part could not be written.
bool WriteWhole(const std::string &strPath, const std::string &strData);

}  // namespace tessel_bench

#endif /* TESSEL_BENCH_BENCH_SUPPORT_H */
