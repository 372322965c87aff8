/* tessel versions list / get / diff: the versions of one object. */
#include <tessel/tessel.h>

#include "cli.h"

namespace tessel_cli {

namespace {

const Option kNs = {"ns", "NS", "the namespace"};
const Option kId = {"id", "ID", "the object's identifier"};

bool VersionParams(const Context &ctx, const Args &args, Json::Value &params) {
    if (!ReadParams(args, params)) {
        return false;
    }
    for (const char *key : {"ns", "id", "version"}) {
        if (args.Has(key)) {
            params[key] = args.Get(key);
        }
    }
    if (args.Has("old")) {
        params["old_version"] = args.Get("old");
    }
    if (args.Has("new")) {
        params["new_version"] = args.Get("new");
    }
    for (const char *key : {"offset", "limit"}) {
        unsigned n = 0;
        if (args.Has(key)) {
            if (!ParseUnsigned(std::string("--") + key, args.Get(key), n)) {
                return false;
            }
            params[key] = n;
        }
    }
    if (args.Has("oldest-first")) {
        params["sort_direction"] = "ASC";
    }
    return CompleteRequester(ctx, params);
}

/* A version as shown: the record's own JSON form. */
bool VersionJson(const TESSEL_OBJECT_VERSION &ver, Json::Value &out) {
    out = Json::Value(Json::objectValue);
    return ver.toJson(Json::Value(Json::objectValue), out);
}

int List(Context &ctx, const Command &cmd, const Args &args) {
    Json::Value params;
    if (!VersionParams(ctx, args, params)) {
        return UsageFailed(cmd.name);
    }
    TESSEL_OBJECT_VERSION_LIST list;
    unsigned total = 0;
    unsigned listable = 0;
    ClearErrors();
    int count = list.ListVersion(params, total, listable);
    if (count < 0) {
        return Failed();
    }
    Json::Value out;
    out["count"] = count;
    out["total"] = total;
    out["listable_total"] = listable;
    out["versions"] = Json::Value(Json::arrayValue);
    for (const TESSEL_OBJECT_VERSION *ver = list.head(); ver != nullptr; ver = ver->next) {
        Json::Value item;
        if (!VersionJson(*ver, item)) {
            return Failed();
        }
        out["versions"].append(item);
    }
    PrintJson(ctx, out);
    return kExitOk;
}

int Show(Context &ctx, const Command &cmd, const Args &args) {
    Json::Value params;
    if (!VersionParams(ctx, args, params)) {
        return UsageFailed(cmd.name);
    }
    TESSEL_OBJECT_VERSION ver;
    ClearErrors();
    Json::Value out;
    if (!ver.Get(params) || !VersionJson(ver, out)) {
        return Failed();
    }
    PrintJson(ctx, out);
    return kExitOk;
}

int Diff(Context &ctx, const Command &cmd, const Args &args) {
    Json::Value params;
    if (!VersionParams(ctx, args, params)) {
        return UsageFailed(cmd.name);
    }
    TESSEL_OBJECT_VERSION ver;
    Json::Value diff(Json::objectValue);
    ClearErrors();
    if (!ver.Diff(params, diff)) {
        return Failed();
    }
    PrintJson(ctx, diff);
    return kExitOk;
}

}  // namespace

void AddVersionCommands(std::vector<Command> &t) {
    t.push_back({"versions list", "[PARAMS] --ns NS --id ID [--offset N] [--limit N] [--oldest-first]",
                 "list an object's versions, newest first",
                 "Prints {\"count\", \"total\", \"listable_total\", \"versions\": [...]}; each version\n"
                 "with \"version\", \"author\" (a user name), \"mtime\", \"commit_msg\", \"last_version\".",
                 {kNs, kId, {"offset", "N", "skip the first N versions"}, {"limit", "N", "at most N versions"},
                  {"oldest-first", nullptr, "list the oldest version first"}},
                 0, 1, List});
    t.push_back({"versions get", "[PARAMS] --ns NS --id ID [--version VERSION]",
                 "one version of an object (default: the latest)", "",
                 {kNs, kId, {"version", "VERSION", "the version (40 hexadecimal digits)"}}, 0, 1, Show});
    t.push_back({"versions diff", "[PARAMS] --ns NS --id ID --old VERSION [--new VERSION]",
                 "what changed in text and binaries between two versions", "",
                 {kNs, kId, {"old", "VERSION", "the older version"},
                  {"new", "VERSION", "the newer version (default: the latest)"}},
                 0, 1, Diff});
}

}  // namespace tessel_cli
