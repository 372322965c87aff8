/*
 * tessel: the command line of libtessel. Global options, then the command
 * words, then the command's own options and arguments:
 *
 *     tessel [--as UID|NAME] [--compact] COMMAND... [OPTIONS] [ARGS]
 */
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include <sstream>

#include <tessel/tessel.h>

#include "cli.h"

namespace tessel_cli {

const std::vector<Command> &Commands() {
    static const std::vector<Command> table = [] {
        std::vector<Command> t;
        AddGetCommands(t);
        AddCreateSetCommands(t);
        AddNamespaceCommands(t);
        AddSettingsCommands(t);
        AddReindexCommands(t);
        AddVersionCommands(t);
        AddDownloadCommands(t);
        return t;
    }();
    return table;
}

namespace {

std::vector<std::string> Words(const char *name) {
    std::istringstream in(name);
    std::vector<std::string> words;
    std::string w;
    while (in >> w) {
        words.push_back(w);
    }
    return words;
}

/* The command whose words start argv (the longest such), and how many words it took. */
const Command *FindCommand(int argc, char **argv, int &taken) {
    const Command *best = nullptr;
    taken = 0;
    for (const Command &cmd : Commands()) {
        std::vector<std::string> words = Words(cmd.name);
        if (static_cast<int>(words.size()) > argc || static_cast<int>(words.size()) <= taken) {
            continue;
        }
        bool match = true;
        for (size_t i = 0; i < words.size() && match; ++i) {
            match = (words[i] == argv[i]);
        }
        if (match) {
            best = &cmd;
            taken = static_cast<int>(words.size());
        }
    }
    return best;
}

/* The leading words that name a group of commands ("settings", "settings access"). */
std::string GroupPrefix(int argc, char **argv) {
    std::string prefix;
    for (int i = 0; i < argc; ++i) {
        std::string candidate = prefix.empty() ? argv[i] : prefix + " " + argv[i];
        bool any = false;
        for (const Command &cmd : Commands()) {
            any = any || 0 == std::string(cmd.name).compare(0, candidate.size() + 1, candidate + " ");
        }
        if (!any) {
            break;
        }
        prefix = candidate;
    }
    return prefix;
}

int Main(int argc, char **argv) {
    Context ctx;
    std::string as;
    bool help = false;
    int i = 1;
    for (; i < argc && '-' == argv[i][0]; ++i) {
        if (0 == strcmp(argv[i], "--compact")) {
            ctx.compact = true;
        } else if (0 == strcmp(argv[i], "--help") || 0 == strcmp(argv[i], "-h")) {
            help = true;
        } else if (0 == strcmp(argv[i], "--as") && i + 1 < argc) {
            as = argv[++i];
        } else if (0 == strncmp(argv[i], "--as=", 5)) {
            as = argv[i] + 5;
        } else if (0 == strcmp(argv[i], "--version")) {
            printf("tessel (libtessel.so.6, store format %u)\n", TesselVersionGet());
            return kExitOk;
        } else {
            CLI_REFUSE(TESSEL_ERR_USER_INPUT, std::string("unknown option: ") + argv[i]);
            return UsageFailed("");
        }
    }
    int taken = 0;
    const Command *cmd = FindCommand(argc - i, argv + i, taken);
    if (nullptr == cmd) {
        std::string prefix = GroupPrefix(argc - i, argv + i);
        const int prefixWords = prefix.empty() ? 0 : static_cast<int>(Words(prefix.c_str()).size());
        if (i + prefixWords == argc || help ||
            (i + prefixWords + 1 == argc && (0 == strcmp(argv[argc - 1], "--help") ||
                                             0 == strcmp(argv[argc - 1], "-h")))) {
            PrintCommandList(prefix);
            return (help || i + prefixWords < argc) ? kExitOk : kExitUsage;
        }
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, std::string("unknown command: ") + argv[i + prefixWords]);
        return UsageFailed(prefix);
    }
    Args args;
    if (!ParseArgs(*cmd, argc - i - taken, argv + i + taken, args)) {
        return UsageFailed(cmd->name);
    }
    if (help || args.Has("help")) {
        PrintHelp(*cmd);
        return kExitOk;
    }
    ctx.compact = ctx.compact || args.Has("compact");
    if (!as.empty() && !ApplyAs(ctx, as)) {
        return UsageFailed(cmd->name);
    }
    if (args.Has("as") && !ApplyAs(ctx, args.Get("as"))) {
        return UsageFailed(cmd->name);
    }
    if (!ctx.asGiven) {
        ctx.requester = static_cast<unsigned>(getuid());
    }
    return cmd->run(ctx, *cmd, args);
}

}  // namespace
}  // namespace tessel_cli

int main(int argc, char **argv) { return tessel_cli::Main(argc, argv); }
