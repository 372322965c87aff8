/*
 * Permissions on objects: the acl's words, the word a requester holds on an
 * object, and the editing of an acl by one sharing request.
 *
 * An acl is a JSON object:
 *
 *     {"enabled": true,
 *      "public":    {"perm": "ro", "inherit": false},
 *      "zem_app":   {"perm": "ro", "inherit": false},
 *      "zem_user":  {"1001": {"perm": "rw", "inherit": true}},
 *      "zem_group": {"1100": {"perm": "ro", "inherit": false}}}
 *
 * "inherit" marks an entry written by a recursive request on an ancestor;
 * a later recursive request may overwrite or remove only such entries.
 * Words: "owner", "rw", "ro"; the empty word is no permission.
 */
#ifndef TESSEL_OBJECT_OBJECT_PERM_H
#define TESSEL_OBJECT_OBJECT_PERM_H

#include <map>
#include <string>

#include <json/value.h>

/* Ranks of the comparable words: "ro" 1, "rw" 2. "owner" has no rank on
 * purpose: it is decided before any comparison, and a comparison that meets
 * it fails. */
class PermissionOrder {
public:
    /* The rank, or -1 for a word without one. */
    static int GetOrder(const std::string &strPerm);

private:
    static const std::map<std::string, int> s_order;
};

/*
 * The word requester holds on an object of owner with this acl: "owner",
 * "rw" or "ro". False when the requester holds nothing (1023), the object
 * does not share (1020), the acl is malformed (1015) or the requester is
 * unknown (1022); false with the error stack untouched for a null acl.
 */
bool TesselObjectPermCalculate(unsigned int requester, unsigned int owner, const Json::Value &jACL,
                               std::string &perm);

/* acl["public"]["perm"], or "" when there is none. */
bool get_public_perm(const Json::Value &acl, std::string &perm);
/* The word of the application, user and group entries for requester. */
bool get_specific_perm(unsigned int requester, unsigned int owner, const Json::Value &acl, std::string &perm);
/* Raises final_perm to added_perm when that ranks higher (an empty
 * final_perm takes any ranked word). */
bool max_perm(std::string &final_perm, const std::string &added_perm);

/*
 * Edits acl by one sharing request ("type", "op", "perm", "uid", "gid",
 * "enabled", "recursive", "force_inherit"). Negative on a bad request (1007)
 * or acl (1015), 0 when the acl stayed as it was, positive when it changed.
 */
int prepare_acl(unsigned int owner, const Json::Value &jsParm, Json::Value &acl);

/* Copies the sharing keys of jsParm, and every key starting with '@', into
 * jParm (made an object first); false when nothing was copied. */
bool FilterParam(const Json::Value &jsParm, Json::Value &jParm);

#endif /* TESSEL_OBJECT_OBJECT_PERM_H */
