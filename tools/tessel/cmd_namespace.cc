/*
 * tessel namespace ...: where a namespace keeps its objects. An application's
 * installer places its namespace once (a folder on the volume of its package,
 * and the link to it); reads and writes find it there.
 */
#include <tessel/tessel.h>

#include "cli.h"

namespace tessel_cli {

namespace {

bool NsGiven(const Args &args) {
    if (!args.Has("ns") || args.Get("ns").empty()) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, "--ns is required");
        return false;
    }
    return true;
}

int Place(Context &ctx, const Command &cmd, const Args &args) {
    if (!NsGiven(args)) {
        return UsageFailed(cmd.name);
    }
    std::string path;
    ClearErrors();
    if (!TesselSetNSPath(args.Get("ns"), args.Get("pkg"), path)) {
        return Failed();
    }
    Json::Value out;
    out["ns"] = args.Get("ns");
    out["path"] = path;
    PrintJson(ctx, out);
    return kExitOk;
}

int Path(Context &ctx, const Command &cmd, const Args &args) {
    if (!NsGiven(args)) {
        return UsageFailed(cmd.name);
    }
    std::string path;
    ClearErrors();
    if (!TesselGetNSPath(args.Get("ns"), path)) {
        return Failed();
    }
    Json::Value out;
    out["ns"] = args.Get("ns");
    out["path"] = path;
    PrintJson(ctx, out);
    return kExitOk;
}

}  // namespace

void AddNamespaceCommands(std::vector<Command> &t) {
    t.push_back({"namespace create", "--ns NS [--pkg ID]", "give a namespace its folder (once, by its installer)",
                 "The folder goes to the volume of the package's target (--pkg, else the package\n"
                 "named for the namespace in the settings); with neither, the namespace cannot be\n"
                 "placed. Where volumes cannot move, every namespace lives on the homes share's volume.",
                 {{"ns", "NS", "the namespace (required)"}, {"pkg", "ID", "the application package"}}, 0, 0,
                 Place});
    t.push_back({"namespace path", "--ns NS", "the folder that holds the namespace's objects", "",
                 {{"ns", "NS", "the namespace (required)"}}, 0, 0, Path});
}

}  // namespace tessel_cli
