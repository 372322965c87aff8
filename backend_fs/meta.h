/*
 * The person records of an object: its "person" directory holds
 * "summary.json" and one JSON file per person, named by the person's key (a
 * decimal uid) passed through TesselEncode.
 */
#ifndef TESSEL_BACKEND_FS_META_H
#define TESSEL_BACKEND_FS_META_H

#include <string>

#include <json/value.h>

namespace tessel {

/*
 * Reads into jPerson what the request's person selection asks for:
 *   "summary"            jPerson becomes the content of "summary.json";
 *   "<key>"              that one person, under its key;
 *   ["<key>", ...]       those persons (keys may also be integers);
 *   {"<key>": true, ...} those persons;
 *   true                 every person file, and "summary".
 * A file that cannot be read is logged and skipped. False only when a key
 * cannot be encoded into a file name.
 */
bool ReadPersons(const std::string &strPersonDir, const Json::Value &jSelect, Json::Value &jPerson);

/*
 * Stores the person records of jPerson: members whose name begins with a
 * decimal digit, and "summary". Each is merged into the stored record
 * (mergeJsonObject: a null member deletes that key) unless "@clear" is true;
 * then the given records replace the stored ones, and person files that the
 * value no longer names are removed ("summary.json" stays unless given).
 * Failures are logged and the other records still written; the result says
 * whether everything was stored.
 */
bool SavePersons(const std::string &strPersonDir, const Json::Value &jPerson);

}  // namespace tessel

#endif /* TESSEL_BACKEND_FS_META_H */
