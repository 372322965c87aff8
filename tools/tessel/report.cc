/* Errors and results of the tool: the library's error stack on standard
 * error, JSON on standard output. */
#include <errno.h>
#include <stdio.h>
#include <syslog.h>

#include <iostream>
#include <memory>

#include <json/writer.h>
#include <tessel/tessel.h>

#include "cli.h"

namespace tessel_cli {

void Refuse(int code, int line, const std::string &condition) {
    syslog(LOG_ERR, "%s:%d Failed [%s], err=%m\n", kModule, line, condition.c_str());
    TesselErrSetEx(code, kModule, line, "%s", condition.c_str());
}

void Append(int line, const std::string &condition) {
    syslog(LOG_ERR, "%s:%d Failed [%s], err=%m\n", kModule, line, condition.c_str());
    TesselErrAppendEx(kModule, line, "%s", condition.c_str());
}

void ClearErrors() { TesselErrMsgGet() = Json::Value(Json::arrayValue); }

int Failed() {
    fflush(stdout);
    if (TesselErrMsgGet().empty()) {
        // Every failing library call leaves a frame; say so rather than
        // fail without a word should one ever not.
        fprintf(stderr, "tessel: the call failed without an error report\n");
    }
    TesselErrPrint(stderr);
    return kExitFailed;
}

int UsageFailed(const std::string &cmdName) {
    fflush(stdout);
    TesselErrPrint(stderr);
    fprintf(stderr, "Try 'tessel %s%s--help'.\n", cmdName.c_str(), cmdName.empty() ? "" : " ");
    return kExitUsage;
}

void PrintJson(const Context &ctx, const Json::Value &value) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = ctx.compact ? "" : "  ";
    builder["emitUTF8"] = true;
    std::unique_ptr<Json::StreamWriter> writer(builder.newStreamWriter());
    writer->write(value, &std::cout);
    std::cout << "\n";
    std::cout.flush();
}

}  // namespace tessel_cli
