// A namespace module that records every call of its create and set hooks,
// single and batch, as one line "<hook> <jParm parent_id> <object>" in the
// file jParm["@hook_log"] (nothing without it). <object> is "null", or
// "<id>/<parent_id>/<version>" per record, records of a chain joined by ",".
#include <stdio.h>

#include <string>

#include "tessel_hook.h"

namespace {

std::string Describe(const TESSEL_OBJECT *pObj, bool blChain) {
    if (!pObj) {
        return "null";
    }
    std::string strOut;
    for (; pObj; pObj = blChain ? pObj->next : nullptr) {
        strOut += (strOut.empty() ? "" : ",") + pObj->get_ref_id() + "/" + pObj->get_ref_parent_id() + "/" +
                  pObj->get_ref_version();
    }
    return strOut;
}

void Record(const char *szHook, const Json::Value &jParm, const TESSEL_OBJECT *pObj, bool blChain) {
    if (!jParm["@hook_log"].isString()) {
        return;
    }
    if (FILE *fp = fopen(jParm["@hook_log"].asCString(), "a")) {
        fprintf(fp, "%s %s %s\n", szHook, jParm["parent_id"].isString() ? jParm["parent_id"].asCString() : "-",
                Describe(pObj, blChain).c_str());
        fclose(fp);
    }
}

#define HOOK(fn, name, chain) \
    void fn(const Json::Value &jParm, const TESSEL_OBJECT *pObj) { Record(name, jParm, pObj, chain); }
HOOK(CreatePre, "create-pre", false)
HOOK(CreatePost, "create-post", false)
HOOK(SetPre, "set-pre", false)
HOOK(SetPost, "set-post", false)
HOOK(BatchCreatePre, "batch-create-pre", true)
HOOK(BatchCreatePost, "batch-create-post", true)
HOOK(BatchSetPre, "batch-set-pre", true)
HOOK(BatchSetPost, "batch-set-post", true)

const TESSEL_NS_HOOK_ENTRY kTable[] = {
    {"create", CreatePre, CreatePost}, {"set", SetPre, SetPost}, {nullptr, nullptr, nullptr}};
const TESSEL_NS_HOOK_ENTRY kBatchTable[] = {
    {"create", BatchCreatePre, BatchCreatePost}, {"set", BatchSetPre, BatchSetPost}, {nullptr, nullptr, nullptr}};

}  // namespace

extern "C" __attribute__((visibility("default"))) const TESSEL_NS_HOOK_ENTRY *GetTable() { return kTable; }
extern "C" __attribute__((visibility("default"))) const TESSEL_NS_HOOK_ENTRY *GetBatchTable() { return kBatchTable; }
