/*
 * The frame every subcommand of the `tessel` tool shares: options, parameters
 * as JSON, the requester, output and exit codes.
 *
 * The tool is an application of the library like any other: it includes only
 * the exported headers and links only the shared library.
 */
#ifndef TESSEL_TOOLS_CLI_H
#define TESSEL_TOOLS_CLI_H

#include <map>
#include <string>
#include <vector>

#include <json/value.h>

namespace tessel_cli {

/* Module name in the tool's log lines and error frames. */
constexpr const char kModule[] = "tools/tessel";

/* Exit codes: the operation succeeded (or the answer asked for is yes); the
 * library refused or failed (or the answer is no); the command line was wrong. */
enum { kExitOk = 0, kExitFailed = 1, kExitUsage = 2 };

struct Context {
    unsigned requester = 0;   // who the call is made for ("requester")
    bool asGiven = false;     // --as named the requester
    bool compact = false;     // one-line JSON
};

/* One option of a subcommand. argName nullptr: a switch without a value. */
struct Option {
    const char *name;
    const char *argName;
    const char *help;
};

/* What a subcommand received: option values in order, and the other words. */
struct Args {
    std::map<std::string, std::vector<std::string>> values;
    std::vector<std::string> positional;

    bool Has(const std::string &name) const { return values.count(name) > 0; }
    /* The last value given (an option given twice keeps the later one). */
    std::string Get(const std::string &name) const;
    std::vector<std::string> All(const std::string &name) const;
};

struct Command;
typedef int (*RunFn)(Context &ctx, const Command &cmd, const Args &args);

struct Command {
    const char *name;      // the words after "tessel", e.g. "settings access set"
    const char *synopsis;  // what follows the name in the usage line
    const char *summary;   // one line for the command list
    const char *details;   // further text for --help ("" when none)
    std::vector<Option> options;
    size_t minArgs;
    size_t maxArgs;
    RunFn run;
};

/* Every subcommand, in the order of the command list. */
const std::vector<Command> &Commands();
/* Appends the commands of one area to the table (called once per area). */
void AddSettingsCommands(std::vector<Command> &table);
void AddNamespaceCommands(std::vector<Command> &table);
void AddGetCommands(std::vector<Command> &table);
void AddCreateSetCommands(std::vector<Command> &table);
void AddVersionCommands(std::vector<Command> &table);
void AddDownloadCommands(std::vector<Command> &table);
void AddReindexCommands(std::vector<Command> &table);

/* ---- errors -------------------------------------------------------------- */

/*
 * Reports a refused input the way the library reports its own failures: the
 * log line "<module>:<line> Failed [<condition>], err=%m" and a new error
 * stack holding one frame with the code.
 */
void Refuse(int code, int line, const std::string &condition);
/* Adds a frame to the current error (no code), with the log line. */
void Append(int line, const std::string &condition);
#define CLI_REFUSE(code, condition) ::tessel_cli::Refuse((code), __LINE__, (condition))
#define CLI_APPEND(condition) ::tessel_cli::Append(__LINE__, (condition))

/* Empties the error stack before a library call whose failure is to be shown. */
void ClearErrors();
/* Prints the error stack on standard error; kExitFailed. */
int Failed();
/* Prints the error stack and a pointer to the command's help; kExitUsage. */
int UsageFailed(const std::string &cmdName);

/* ---- options and help ---------------------------------------------------- */

/* Parses the words after the command name; false (error recorded) on a bad one. */
bool ParseArgs(const Command &cmd, int argc, char **argv, Args &args);
void PrintHelp(const Command &cmd);
void PrintCommandList(const std::string &prefix);

/* ---- the requester -------------------------------------------------------- */

/*
 * --as UID or NAME: the requester of every call. Run as root, the process
 * also takes that user's effective ids (real and saved ids stay root), as an
 * application that dropped its privileges does; a caller other than root can
 * only name itself.
 */
bool ApplyAs(Context &ctx, const std::string &who);
/* A user id from a number or a user name; false with 1022 when unknown. */
bool ResolveUser(const std::string &who, unsigned &uid, const std::string &what);
/* params["requester"]: --as wins, then the parameters' own, then the caller's uid. */
bool CompleteRequester(const Context &ctx, Json::Value &params);

/* ---- parameters ----------------------------------------------------------- */

/*
 * A JSON value from "-" (standard input), "@FILE" or the text itself; false
 * with 1007 when it is not JSON (or, with mustBeObject, not an object).
 */
bool ReadJsonArg(const std::string &source, Json::Value &out, bool mustBeObject);
/* The parameter object of an operation: the positional JSON, if any, else {}. */
bool ReadParams(const Args &args, Json::Value &params);
/* "key=value" split at the first '='; false with 1007 otherwise. */
bool SplitPair(const std::string &option, const std::string &pair, std::string &key, std::string &value);
/* A non-negative integer fitting 32 bits; false with 1007 otherwise. */
bool ParseUnsigned(const std::string &option, const std::string &text, unsigned &out);

/* ---- output ---------------------------------------------------------------- */

void PrintJson(const Context &ctx, const Json::Value &value);

}  // namespace tessel_cli

#endif /* TESSEL_TOOLS_CLI_H */
