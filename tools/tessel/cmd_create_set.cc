/*
 * tessel create / set: one object at a time. The parameters are the
 * library's own (a JSON object); the options fill in the common ones.
 */
#include <tessel/tessel.h>

#include "cli.h"
#include "object_args.h"

namespace tessel_cli {

namespace {

int Create(Context &ctx, const Command &cmd, const Args &args) {
    Json::Value params;
    ScratchCopies copies;
    if (!CommonParams(ctx, args, params) || !ContentParams(args, params, copies)) {
        return UsageFailed(cmd.name);
    }
    if (args.Has("category")) {
        params["category"] = args.Get("category");
    }
    if (args.Has("parent")) {
        params["parent_id"] = args.Get("parent");
    }
    if (args.Has("owner")) {
        unsigned owner = 0;
        if (!ResolveUser(args.Get("owner"), owner, "--owner")) {
            return UsageFailed(cmd.name);
        }
        params["owner"] = owner;
    }
    TESSEL_OBJECT obj;
    ClearErrors();
    if (!obj.Create(params)) {
        return Failed();
    }
    return PrintRecord(ctx, obj, ShownFields());
}

int Set(Context &ctx, const Command &cmd, const Args &args) {
    Json::Value params;
    ScratchCopies copies;
    if (!CommonParams(ctx, args, params) || !ContentParams(args, params, copies)) {
        return UsageFailed(cmd.name);
    }
    if (args.Has("parent")) {
        params["parent_id"] = args.Get("parent");
    }
    for (const std::string &name : args.All("delete-text")) {
        if (!ObjectMember(params, "text", "--delete-text")) {
            return UsageFailed(cmd.name);
        }
        params["text"][name] = Json::Value();
    }
    for (const std::string &name : args.All("delete-binary")) {
        if (!ArrayMember(params, "binary_files", "--delete-binary")) {
            return UsageFailed(cmd.name);
        }
        Json::Value item;
        item["name"] = name;
        item["format"] = "delete";
        params["binary_files"].append(item);
    }
    ClearErrors();
    if (!params.isMember("version") && (params.isMember("text") || params.isMember("binary_files"))) {
        // A change of versioned content names the version it builds on; from
        // the command line that is the latest one, read just before.
        TESSEL_OBJECT latest;
        Json::Value jGetParm;
        for (const char *key : {"ns", "id", "requester"}) {
            if (params.isMember(key)) {
                jGetParm[key] = params[key];
            }
        }
        if (!latest.Get(jGetParm)) {
            CLI_APPEND("!latest.Get(jGetParm)");
            return Failed();
        }
        params["version"] = latest.get_ref_version();
    }
    TESSEL_OBJECT obj;
    if (!obj.Set(params)) {
        return Failed();
    }
    return PrintRecord(ctx, obj, ShownFields());
}

}  // namespace

void AddCreateSetCommands(std::vector<Command> &t) {
    t.push_back({"create", "[PARAMS] --ns NS --category C [--text NAME=VALUE]... [--binary NAME=FILE]...",
                 "create an object and print it as stored",
                 "PARAMS are those of the library's object create (\"ns\", \"category\", \"owner\",\n"
                 "\"parent_id\", \"acl\", \"text\", \"metatext\", \"binary_files\", \"commit_msg\", ...).\n"
                 "Attached files are copied with the caller's rights before the library reads them.",
                 {kNs, kId, {"category", "CATEGORY", "the object's category"},
                  {"parent", "ID", "the parent object (default: the owner's root)"},
                  {"owner", "UID|NAME", "the owner (required when root creates)"}, kText, kMetatext, kBinary,
                  kMetabinary, kCommitMsg},
                 0, 1, Create});
    t.push_back({"set", "[PARAMS] --ns NS --id ID [--version VERSION] [--text NAME=VALUE]...",
                 "change an object, making a new version when text or binaries change",
                 "PARAMS are those of the library's object set. Without --version (or \"version\"),\n"
                 "a change of text or binaries builds on the latest version, read just before.",
                 {kNs, kId, kVersion, kText, kMetatext, kBinary, kMetabinary,
                  {"delete-text", "NAME", "remove the text field NAME (repeatable)"},
                  {"delete-binary", "NAME", "remove the versioned binary NAME (repeatable)"},
                  {"parent", "ID", "move the object under another parent of the same owner"}, kCommitMsg},
                 0, 1, Set});
}

}  // namespace tessel_cli
