// The file-system store's field table and path layout; see utils.h.
#include "backend_fs/utils.h"

#include <stdio.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>

#include "common/tessel_json.h"
#include "common/tessel_report.h"

static constexpr const char kTesselModule[] = "backend_fs/utils";

namespace {

// Every member is written "<name>":[ so that its place in the text can be
// found again after parsing.
constexpr const char kFieldTable[] =
    "{"
    "\"ns\":[\"id_path\",true,false,false],"
    "\"owner\":[\"id_path\",true,false,false],"
    "\"id\":[\"id_path\",true,false,false],"
    "\"category\":[\"basic.json\",true,false,false],"
    "\"parent_id\":[\"basic.json\",true,true,false],"
    "\"ctime\":[\"basic.json\",true,false,false],"
    "\"acl\":[\"basic.json\",true,true,false],"
    "\"ver\":[\"version\",true,false,false],"
    "\"mtime\":[\"version\",true,false,false],"
    "\"commit_msg\":[\"version\",false,false,false],"
    "\"text\":[\"version\",false,false,true],"
    "\"binary_info\":[\"version\",false,false,true],"
    "\"binary\":[\"version\",false,false,true],"
    "\"commit_cnt\":[\"git_info.json\",false,false,false],"
    "\"listable_commit_cmt\":[\"git_info.json\",false,false,false],"
    "\"person\":[\"person\",false,false,true],"
    "\"metatext\":[\"metatext.json\",false,true,true],"
    "\"metabinary_info\":[\"metabinary_info\",false,false,true],"
    "\"metabinary_files\":[\"metabinary\",false,true,true]"
    "}";

}  // namespace

namespace tessel {

const char *FsFieldTableText() { return kFieldTable; }

bool FsParseFieldTable(Json::Value &jTable, std::vector<std::string> &order) {
    const std::string strText = kFieldTable;
    TESSEL_CHECK(!fromString(jTable, strText) || !jTable.isObject(), TESSEL_ERR_UNEXPECTED,
                 "!jTable.fromString(kFieldTable)", false);
    order = jTable.getMemberNames();
    std::sort(order.begin(), order.end(), [&strText](const std::string &a, const std::string &b) {
        return strText.find("\"" + a + "\":[") < strText.find("\"" + b + "\":[");
    });
    return true;
}

void FsPathInfoByBase(const std::string &strBase, Json::Value &jPathInfo) {
    jPathInfo[TESSEL_ID_PATH] = strBase;
    for (const char *szEntry :
         {TESSEL_BASIC, TESSEL_META_TEXT, TESSEL_META_BIN, TESSEL_META_BIN_INFO, TESSEL_VERSION, TESSEL_TEXT_PATH,
          TESSEL_BIN_PATH, TESSEL_BIN_INFO_PATH, TESSEL_GIT_INFO, TESSEL_PERSON_PATH}) {
        jPathInfo[szEntry] = strBase + "/" + szEntry;
    }
}

void FsPathInfoByGitBase(const std::string &strBase, Json::Value &jPathInfo) {
    for (const char *szEntry : {TESSEL_GIT_TEXT, TESSEL_GIT_BIN, TESSEL_GIT_BIN_INFO}) {
        jPathInfo[szEntry] = strBase + "/" + szEntry;
    }
}

std::string FsScratchName() {
    char szName[64];
    snprintf(szName, sizeof(szName), "%d%ld", static_cast<int>(getpid()), static_cast<long>(syscall(SYS_gettid)));
    return szName;
}

}  // namespace tessel
