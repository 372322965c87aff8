/*
 * tessel settings ...: the settings file, through the library's settings
 * functions. Questions (get, check) answer with exit code 0 for yes and 1
 * for no; a no comes with the error stack that says why.
 */
#include <tessel/tessel.h>

#include "cli.h"

namespace tessel_cli {

namespace {

const Option kNs = {"ns", "NS", "the namespace (without it: the store as a whole)"};
const Option kNsRequired = {"ns", "NS", "the namespace (required)"};
const Option kUid = {"uid", "UID|NAME", "the user (required)"};

Json::Value NsValue(const Args &args) { return args.Has("ns") ? Json::Value(args.Get("ns")) : Json::Value(); }

/* NULL for no --ns; the library takes a missing namespace as "the store". */
const char *NsOrNull(const Args &args, std::string &holder) {
    if (!args.Has("ns")) {
        return nullptr;
    }
    holder = args.Get("ns");
    return holder.c_str();
}

bool RequireNs(const Args &args) {
    if (!args.Has("ns") || args.Get("ns").empty()) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, "--ns is required");
        return false;
    }
    return true;
}

/* "on" is 1 and "off" 0, the values the setters know. */
bool OnOff(const std::string &word, int &enable) {
    if ("on" == word || "off" == word) {
        enable = ("on" == word) ? 1 : 0;
        return true;
    }
    CLI_REFUSE(TESSEL_ERR_USER_INPUT, "expected on or off: " + word);
    return false;
}

int Answer(const Context &ctx, Json::Value out, const char *key, BOOL yes) {
    out[key] = (FALSE != yes);
    PrintJson(ctx, out);
    return yes ? kExitOk : Failed();
}

int AccessGet(Context &ctx, const Command &, const Args &args) {
    std::string ns;
    Json::Value out;
    out["ns"] = NsValue(args);
    ClearErrors();
    return Answer(ctx, out, "enabled", TesselSettingsAccessGet(NsOrNull(args, ns)));
}

int AccessCheck(Context &ctx, const Command &, const Args &args) {
    std::string ns;
    Json::Value out;
    out["ns"] = NsValue(args);
    ClearErrors();
    return Answer(ctx, out, "enabled", TesselAccessCheck(NsOrNull(args, ns)));
}

int AccessSet(Context &ctx, const Command &cmd, const Args &args) {
    int enable = 0;
    if (!OnOff(args.positional[0], enable)) {
        return UsageFailed(cmd.name);
    }
    if (args.Has("pkg") && !args.Has("ns")) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, "--pkg needs --ns");
        return UsageFailed(cmd.name);
    }
    std::string ns;
    std::string pkg = args.Get("pkg");
    ClearErrors();
    if (0 != TesselSettingsAccessSet(NsOrNull(args, ns), args.Has("pkg") ? pkg.c_str() : nullptr, enable)) {
        return Failed();
    }
    Json::Value out;
    out["ns"] = NsValue(args);
    out["enabled"] = (1 == enable);
    if (args.Has("pkg")) {
        out["pkg_id"] = pkg;
    }
    PrintJson(ctx, out);
    return kExitOk;
}

int SharingQuestion(Context &ctx, const Args &args, bool check) {
    unsigned uid = 0;
    if (!ResolveUser(args.Get("uid"), uid, "--uid")) {
        return Failed();
    }
    std::string ns;
    Json::Value out;
    out["ns"] = NsValue(args);
    out["uid"] = uid;
    ClearErrors();
    return Answer(ctx, out, "sharing",
                  check ? TesselSharingCheck(NsOrNull(args, ns), uid) : TesselSettingsSharingGet(NsOrNull(args, ns), uid));
}

int SharingGet(Context &ctx, const Command &cmd, const Args &args) {
    if (!args.Has("uid")) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, "--uid is required");
        return UsageFailed(cmd.name);
    }
    return SharingQuestion(ctx, args, false);
}

int SharingCheck(Context &ctx, const Command &cmd, const Args &args) {
    if (!args.Has("uid")) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, "--uid is required");
        return UsageFailed(cmd.name);
    }
    return SharingQuestion(ctx, args, true);
}

int SharingSet(Context &ctx, const Command &cmd, const Args &args) {
    int enable = 0;
    unsigned uid = 0;
    if (!OnOff(args.positional[0], enable)) {
        return UsageFailed(cmd.name);
    }
    if (!args.Has("uid")) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, "--uid is required");
        return UsageFailed(cmd.name);
    }
    if (!ResolveUser(args.Get("uid"), uid, "--uid")) {
        return Failed();
    }
    std::string ns;
    ClearErrors();
    if (0 != TesselSettingsSharingSet(NsOrNull(args, ns), uid, enable)) {
        return Failed();
    }
    Json::Value out;
    out["ns"] = NsValue(args);
    out["uid"] = uid;
    out["sharing"] = (1 == enable);
    PrintJson(ctx, out);
    return kExitOk;
}

int SharingOffList(Context &ctx, const Command &cmd, const Args &args) {
    if (!RequireNs(args)) {
        return UsageFailed(cmd.name);
    }
    QLIBSZLIST *pList = QLIBCSzListAlloc(16);
    if (nullptr == pList) {
        CLI_REFUSE(TESSEL_ERR_OUT_OF_MEMORY, "NULL == QLIBCSzListAlloc(16)");
        return Failed();
    }
    ClearErrors();
    const std::string ns = args.Get("ns");
    if (0 != TesselSettingsNoSharingUserList(ns.c_str(), &pList)) {
        QLIBCSzListFree(pList);
        return Failed();
    }
    Json::Value out;
    out["ns"] = ns;
    out["uids"] = Json::Value(Json::arrayValue);
    for (int i = 0; i < QLIBCSzListCount(pList); ++i) {
        out["uids"].append(Json::Value::UInt(std::stoul(QLIBCSzListGet(pList, i))));
    }
    QLIBCSzListFree(pList);
    PrintJson(ctx, out);
    return kExitOk;
}

int IndexGet(Context &ctx, const Command &cmd, const Args &args) {
    if (!RequireNs(args)) {
        return UsageFailed(cmd.name);
    }
    Json::Value out;
    out["ns"] = args.Get("ns");
    ClearErrors();
    if (!TesselSettingsIndexGet(args.Get("ns"), out["filter"])) {
        return Failed();
    }
    PrintJson(ctx, out);
    return kExitOk;
}

int IndexSet(Context &ctx, const Command &cmd, const Args &args) {
    Json::Value filter;
    if (!RequireNs(args) || !ReadJsonArg(args.positional[0], filter, true)) {
        return UsageFailed(cmd.name);
    }
    ClearErrors();
    Json::Value out;
    out["ns"] = args.Get("ns");
    // What the file holds now, read back: the setter keeps text and metatext only.
    if (!TesselSettingsIndexSet(args.Get("ns"), filter) || !TesselSettingsIndexGet(args.Get("ns"), out["filter"])) {
        return Failed();
    }
    PrintJson(ctx, out);
    return kExitOk;
}

int Show(Context &ctx, const Command &cmd, const Args &args) {
    if (!RequireNs(args)) {
        return UsageFailed(cmd.name);
    }
    Json::Value conf;
    ClearErrors();
    if (!TesselSettingsGet(args.Get("ns").c_str(), conf)) {
        return Failed();
    }
    PrintJson(ctx, conf);
    return kExitOk;
}

}  // namespace

void AddSettingsCommands(std::vector<Command> &t) {
    t.push_back({"settings show", "--ns NS", "print the whole settings file (the namespace must be listed in it)",
                 "", {kNsRequired}, 0, 0, Show});
    t.push_back({"settings access get", "[--ns NS]", "is the store (or the namespace's own switch) on?",
                 "With --ns only the namespace's switch is read; 'access check' reads both.",
                 {kNs}, 0, 0, AccessGet});
    t.push_back({"settings access check", "[--ns NS]", "may applications use the store (and the namespace)?", "",
                 {kNs}, 0, 0, AccessCheck});
    t.push_back({"settings access set", "[--ns NS] [--pkg ID] on|off", "switch the store or a namespace on or off",
                 "The first switch also prepares the index database.",
                 {kNs, {"pkg", "ID", "the application package the namespace belongs to (with --ns)"}}, 1, 1,
                 AccessSet});
    t.push_back({"settings sharing get", "--uid UID|NAME [--ns NS]",
                 "may the user share (with --ns: in that namespace, by its own switch)?", "", {kUid, kNs}, 0, 0,
                 SharingGet});
    t.push_back({"settings sharing check", "--uid UID|NAME [--ns NS]",
                 "may the user share, everywhere and (with --ns) in the namespace?", "", {kUid, kNs}, 0, 0,
                 SharingCheck});
    t.push_back({"settings sharing set", "--uid UID|NAME [--ns NS] on|off",
                 "switch sharing on or off for a user, everywhere or in one namespace", "", {kUid, kNs}, 1, 1,
                 SharingSet});
    t.push_back({"settings sharing off-list", "--ns NS", "the users who cannot share in the namespace", "",
                 {kNsRequired}, 0, 0, SharingOffList});
    t.push_back({"settings index get", "--ns NS", "the namespace's index filter", "", {kNsRequired}, 0, 0,
                 IndexGet});
    t.push_back({"settings index set", "--ns NS FILTER",
                 "set the namespace's index filter (JSON with \"text\" and/or \"metatext\")",
                 "FILTER is JSON text, @FILE or - for standard input. Other members are dropped;\n"
                 "processes that already read the filter keep the one they read.",
                 {kNsRequired}, 1, 1, IndexSet});
}

}  // namespace tessel_cli
