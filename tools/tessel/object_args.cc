/* What get, create and set share. */
#include "object_args.h"

namespace tessel_cli {

namespace {

bool AddPairs(const Args &args, Json::Value &params, const char *option, const char *key) {
    if (!args.Has(option)) {
        return true;
    }
    if (!ObjectMember(params, key, (std::string("--") + option).c_str())) {
        return false;
    }
    for (const std::string &pair : args.All(option)) {
        std::string name, value;
        if (!SplitPair(std::string("--") + option, pair, name, value)) {
            return false;
        }
        params[key][name] = value;
    }
    return true;
}

bool AddFiles(const Args &args, Json::Value &params, const char *option, const char *key, ScratchCopies &copies) {
    if (!args.Has(option)) {
        return true;
    }
    if (!ArrayMember(params, key, (std::string("--") + option).c_str())) {
        return false;
    }
    for (const std::string &pair : args.All(option)) {
        std::string name, path, copy;
        if (!SplitPair(std::string("--") + option, pair, name, path) || !copies.Add(path, copy)) {
            return false;
        }
        Json::Value item;
        item["name"] = name;
        item["format"] = "raw";
        item["path"] = copy;
        params[key].append(item);
    }
    return true;
}

}  // namespace

extern const Option kNs = {"ns", "NS", "the namespace"};
extern const Option kId = {"id", "ID", "the object's identifier"};
extern const Option kVersion = {"version", "VERSION", "a version of the object (40 hexadecimal digits)"};
extern const Option kField = {"field", "NAME", "an optional field to read (repeatable; default: all)"};
extern const Option kText = {"text", "NAME=VALUE", "set the text field NAME to the string VALUE (repeatable)"};
extern const Option kMetatext = {"metatext", "NAME=VALUE", "set the meta-text field NAME (repeatable)"};
extern const Option kBinary = {"binary", "NAME=FILE", "attach FILE as the versioned binary NAME (repeatable)"};
extern const Option kMetabinary = {"metabinary", "NAME=FILE", "attach FILE as the meta-binary NAME (repeatable)"};
extern const Option kCommitMsg = {"commit-msg", "TEXT", "the version's message: {\"message\": TEXT}"};

/* The fields shown of a record: everything a reader may see. */
Json::Value ShownFields() {
    Json::Value jField(Json::objectValue);
    for (const char *name : {"commit_msg", "acl", "metatext", "text", "binary_info", "metabinary_info", "person"}) {
        jField[name] = true;
    }
    return jField;
}

/* params[key] must be an object (or absent) so that options can add members to it. */
bool ObjectMember(Json::Value &params, const char *key, const char *option) {
    if (params.isMember(key) && !params[key].isObject()) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, std::string(option) + " needs \"" + key + "\" of PARAMS to be an object");
        return false;
    }
    if (!params.isMember(key)) {
        params[key] = Json::Value(Json::objectValue);
    }
    return true;
}

bool ArrayMember(Json::Value &params, const char *key, const char *option) {
    if (params.isMember(key) && !params[key].isArray()) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, std::string(option) + " needs \"" + key + "\" of PARAMS to be an array");
        return false;
    }
    if (!params.isMember(key)) {
        params[key] = Json::Value(Json::arrayValue);
    }
    return true;
}

/* Options shared by the three commands: namespace, identifier, version, fields. */
bool CommonParams(const Context &ctx, const Args &args, Json::Value &params) {
    if (!ReadParams(args, params)) {
        return false;
    }
    for (const char *key : {"ns", "id", "version"}) {
        if (args.Has(key)) {
            params[key] = args.Get(key);
        }
    }
    if (args.Has("field")) {
        if (!ObjectMember(params, "field", "--field")) {
            return false;
        }
        for (const std::string &name : args.All("field")) {
            params["field"][name] = true;
        }
    }
    return CompleteRequester(ctx, params);
}

/* Content options of create and set. */
bool ContentParams(const Args &args, Json::Value &params, ScratchCopies &copies) {
    if (args.Has("commit-msg")) {
        params["commit_msg"] = Json::Value(Json::objectValue);
        params["commit_msg"]["message"] = args.Get("commit-msg");
    }
    return AddPairs(args, params, "text", "text") && AddPairs(args, params, "metatext", "metatext") &&
           AddFiles(args, params, "binary", "binary_files", copies) &&
           AddFiles(args, params, "metabinary", "metabinary_files", copies);
}

int PrintRecord(const Context &ctx, const TESSEL_OBJECT &obj, const Json::Value &jField) {
    Json::Value out(Json::objectValue);
    if (!obj.toJson(jField, out, false)) {
        return Failed();
    }
    PrintJson(ctx, out);
    return kExitOk;
}

}  // namespace tessel_cli
