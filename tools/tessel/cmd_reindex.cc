/*
 * tessel reindex: rebuilds the index of one namespace, or of all, from the
 * store. On a terminal a second process watches the index fill up and draws
 * a progress bar; it has a connection of its own, since a connection serves
 * one process.
 */
#include <dirent.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <tessel/tessel.h>

#include "cli.h"
#include "progress.h"

namespace tessel_cli {

namespace {

/* Entries of a directory other than "." and ".."; 0 when it cannot be read. */
unsigned long CountEntries(const std::string &dir) {
    unsigned long n = 0;
    DIR *d = opendir(dir.c_str());
    if (nullptr == d) {
        return 0;
    }
    for (struct dirent *e; (e = readdir(d)) != nullptr;) {
        const std::string name = e->d_name;
        n += (name != "." && name != "..") ? 1 : 0;
    }
    closedir(d);
    return n;
}

/* The objects the store holds: the sub-directories of the namespace folders. */
unsigned long CountStored(const Json::Value &params) {
    if (params.isMember("ns")) {
        std::string path;
        return TesselGetNSPath(params["ns"].asString(), path) ? CountEntries(path) : 0;
    }
    std::string root;
    if (!TesselGetRepoDir(root)) {
        return 0;
    }
    unsigned long n = 0;
    DIR *d = opendir(root.c_str());
    if (nullptr == d) {
        return 0;
    }
    for (struct dirent *e; (e = readdir(d)) != nullptr;) {
        const std::string name = e->d_name;
        if (name != "." && name != "..") {
            n += CountEntries(root + "/" + name);
        }
    }
    closedir(d);
    return n;
}

/* Rows of the index for the namespace (or all); -1 when the question failed. */
long CountIndexed(DBConnect_tag *pConn, const Json::Value &params) {
    std::string sql = "SELECT count(*) AS n FROM object;";
    if (params.isMember("ns")) {
        char *szSQL = QUORDBEscapeStringEX3(QUOR_DB_PGSQL, "SELECT count(*) AS n FROM object WHERE ns='@QUOR:VAR';",
                                            params["ns"].asCString());
        if (nullptr == szSQL) {
            return -1;
        }
        sql = szSQL;
        free(szSQL);
    }
    DBResult_tag *pResult = nullptr;
    long n = -1;
    if (QUORDBExecute(pConn, sql.c_str(), &pResult) >= 0 && QUORDBNumRows(pResult) == 1) {
        const char *szN = QUORDBFetchField(pResult, 0, "n");
        n = (nullptr == szN) ? -1 : atol(szN);
    }
    QUORDBFreeResult(pResult);
    return n;
}

/* The watcher: redraws the bar until the parent ends it. */
[[noreturn]] void Watch(const Json::Value &params, const std::string &label, unsigned long total) {
    DBConnect_tag *pConn = TesselOpenConn();
    for (;;) {
        long n = (nullptr == pConn) ? -1 : CountIndexed(pConn, params);
        if (n >= 0) {
            DrawProgress(label, static_cast<unsigned long>(n), total);
        }
        usleep(200000);
    }
}

int Reindex(Context &ctx, const Command &cmd, const Args &args) {
    Json::Value params;
    if (!ReadParams(args, params)) {
        return UsageFailed(cmd.name);
    }
    if (args.Has("ns")) {
        params["ns"] = args.Get("ns");
    }
    if (params.isMember("ns") && (!params["ns"].isString() || params["ns"].asString().empty())) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, "\"ns\" must be a namespace name");
        return UsageFailed(cmd.name);
    }
    const std::string label = params.isMember("ns") ? "reindex " + params["ns"].asString() : "reindex";
    const unsigned long total = CountStored(params);
    pid_t watcher = -1;
    if (isatty(STDERR_FILENO) && !args.Has("no-progress")) {
        fflush(stdout);
        watcher = fork();
        if (0 == watcher) {
            Watch(params, label, total);
        }
    }
    ClearErrors();
    const bool ok = TesselReindex(params);
    if (watcher > 0) {
        kill(watcher, SIGTERM);
        waitpid(watcher, nullptr, 0);
    }
    DBConnect_tag *pConn = ok ? TesselOpenConn() : nullptr;
    const long indexed = (nullptr == pConn) ? -1 : CountIndexed(pConn, params);
    if (watcher > 0) {
        DrawProgress(label, indexed < 0 ? 0 : static_cast<unsigned long>(indexed), total);
        EndProgress();
    }
    if (!ok || indexed < 0) {
        if (ok) {
            CLI_REFUSE(TESSEL_ERR_OPERATION_FAILED, "cannot count the index's rows");
        }
        return Failed();
    }
    Json::Value out;
    out["ns"] = params.isMember("ns") ? params["ns"] : Json::Value();
    out["stored"] = static_cast<Json::UInt64>(total);
    out["indexed"] = static_cast<Json::Int64>(indexed);
    PrintJson(ctx, out);
    return kExitOk;
}

}  // namespace

void AddReindexCommands(std::vector<Command> &t) {
    t.push_back({"reindex", "[PARAMS] [--ns NS]", "rebuild the index of a namespace (or of all) from the store",
                 "Prints {\"ns\", \"stored\": objects found in the store, \"indexed\": rows in the index}.\n"
                 "On a terminal a progress bar shows on standard error.",
                 {{"ns", "NS", "the namespace (default: every namespace)"},
                  {"no-progress", nullptr, "no progress bar, even on a terminal"}},
                 0, 1, Reindex});
}

}  // namespace tessel_cli
