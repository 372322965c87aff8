/*
 * The file-system store's layout: the names of the entries of an object's
 * path information, the field table that says in which of them each object
 * field lives, and how the entries are joined onto an object directory.
 * Also the stored files of an object (binaries and meta-binaries) as they
 * are described and sent to a web client.
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

/*
 * Reads the file descriptions of directory strDir into jOut (an object:
 * decoded file name -> description). jSelect narrows the names: an object
 * takes the members whose value is true, an array the names it lists;
 * anything else takes every file. A description that cannot be parsed is
 * logged and left out. False when the directory cannot be listed or a file
 * name does not decode.
 */
bool FsReadBinaryInfos(const std::string &strDir, const Json::Value &jSelect, Json::Value &jOut);

/* The whole file into strData; false (with a frame) when it cannot be read. */
bool FsReadWholeFile(const std::string &strFile, std::string &strData);

/*
 * Writes a stored file to standard output as a gateway (CGI) response.
 * blBase64: "Content-Type", the attachment header, "Content-Length" (the
 * size of the encoding buffer: one more than the text sent), "ETag",
 * "Expires", the extra headers jHeaders (name -> text), an empty line and
 * the base64 text. Otherwise the attachment and extra headers, then the
 * platform's file output (its own type and length headers, the bytes).
 * strFileName gives the MIME type and the attachment name; a client whose
 * "HTTP_USER_AGENT" names "MSIE" or "Trident/7" gets that name URL-encoded.
 * Header texts holding a line break are refused before anything is printed;
 * once printing began, a failure only shows in the result.
 */
bool OpenBinaryAndPrint(bool blBase64, const std::string &strFile, const std::string &strFileName,
                        const std::string &strEtag, bool blAttachment, const Json::Value &jHeaders);

}  // namespace tessel

#endif /* TESSEL_BACKEND_FS_UTILS_H */
