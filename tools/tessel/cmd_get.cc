/* tessel get: one object, read with the requester's permission word. */
#include <tessel/tessel.h>

#include "cli.h"
#include "object_args.h"

namespace tessel_cli {

namespace {

int Get(Context &ctx, const Command &cmd, const Args &args) {
    Json::Value params;
    if (!CommonParams(ctx, args, params)) {
        return UsageFailed(cmd.name);
    }
    if (!params.isMember("field")) {
        params["field"] = TesselObjectFieldAll();
    }
    Json::Value shown = ShownFields();
    if (params["field"].isObject()) {
        for (const std::string &name : params["field"].getMemberNames()) {
            shown[name] = params["field"][name];
        }
    }
    TESSEL_OBJECT obj;
    ClearErrors();
    if (!obj.Get(params)) {
        return Failed();
    }
    return PrintRecord(ctx, obj, shown);
}

}  // namespace

void AddGetCommands(std::vector<Command> &t) {
    t.push_back({"get", "[PARAMS] --ns NS --id ID [--version VERSION] [--field NAME]...",
                 "read an object (as the requester, with its permission word)",
                 "PARAMS are those of the library's object get: {\"ns\", \"id\", \"requester\", \"version\",\n"
                 "\"field\", \"delegate_perm\"}. The requester is --as, else PARAMS' own, else the caller.",
                 {kNs, kId, kVersion, kField}, 0, 1, Get});
}

}  // namespace tessel_cli
