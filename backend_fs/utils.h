/*
 * The file-system store's layout: the names of the entries of an object's
 * path information, the field table that says in which of them each object
 * field lives, and how the entries are joined onto an object directory.
 */
#ifndef TESSEL_BACKEND_FS_UTILS_H
#define TESSEL_BACKEND_FS_UTILS_H

#include <string>
#include <vector>

#include <json/value.h>

/* Entries of the path information (and storage places of the field table). */
#define TESSEL_ID_PATH "id_path"
#define TESSEL_BASIC "basic.json"
#define TESSEL_META_TEXT "metatext.json"
#define TESSEL_META_BIN "metabinary"
#define TESSEL_META_BIN_INFO "metabinary_info"
#define TESSEL_VERSION "version"
#define TESSEL_TEXT_PATH "version/text"
#define TESSEL_BIN_PATH "version/binary"
#define TESSEL_BIN_INFO_PATH "version/binary_info"
#define TESSEL_GIT_INFO "git_info.json"
#define TESSEL_PERSON_PATH "person"
/* The request's private work area inside the namespace scratch directory. */
#define TESSEL_TMP_PATH "tmp"
/* Entries of a version work tree, relative to its Git base. */
#define TESSEL_GIT_TEXT "text"
#define TESSEL_GIT_BIN "binary"
#define TESSEL_GIT_BIN_INFO "binary_info"

namespace tessel {

/*
 * The field table as compiled in: field name -> [storage place, got by
 * default, third flag, fourth flag]. The key "listable_commit_cmt" is spelt
 * that way in stored data and stays so.
 */
const char *FsFieldTableText();

/*
 * Parses the field table into jTable and gives its field names in their
 * stored order in order (a parsed JSON object forgets the order, and the
 * read decision walks the table in it).
 */
bool FsParseFieldTable(Json::Value &jTable, std::vector<std::string> &order);

/* The entries of an object directory strBase. */
void FsPathInfoByBase(const std::string &strBase, Json::Value &jPathInfo);
/* The entries of a version work tree based at strBase. */
void FsPathInfoByGitBase(const std::string &strBase, Json::Value &jPathInfo);

/* "<pid><kernel tid>": unique to the calling thread among running ones. */
std::string FsScratchName();

}  // namespace tessel

#endif /* TESSEL_BACKEND_FS_UTILS_H */
