/* Options of the subcommands (GNU getopt_long) and their help texts. */
#include <getopt.h>
#include <stdio.h>
#include <string.h>

#include <tessel/tessel.h>

#include "cli.h"

namespace tessel_cli {

namespace {

/* Options every subcommand knows besides its own. */
const std::vector<Option> &CommonOptions() {
    static const std::vector<Option> common = {
        {"as", "UID|NAME", "call as this user (the requester; as root also the user's effective ids)"},
        {"compact", nullptr, "print JSON on one line"},
        {"help", nullptr, "show this help and exit"},
    };
    return common;
}

constexpr int kFirstLong = 256;

}  // namespace

std::string Args::Get(const std::string &name) const {
    auto it = values.find(name);
    return (it == values.end() || it->second.empty()) ? std::string() : it->second.back();
}

std::vector<std::string> Args::All(const std::string &name) const {
    auto it = values.find(name);
    return (it == values.end()) ? std::vector<std::string>() : it->second;
}

bool ParseArgs(const Command &cmd, int argc, char **argv, Args &args) {
    std::vector<Option> all = cmd.options;
    all.insert(all.end(), CommonOptions().begin(), CommonOptions().end());
    std::vector<struct option> longopts;
    for (size_t i = 0; i < all.size(); ++i) {
        longopts.push_back({all[i].name, all[i].argName ? required_argument : no_argument, nullptr,
                            kFirstLong + static_cast<int>(i)});
    }
    longopts.push_back({nullptr, 0, nullptr, 0});

    // getopt_long permutes its vector and keeps state in globals: give it a
    // copy whose first word stands for the program, and start it afresh.
    std::vector<char *> words;
    words.push_back(const_cast<char *>("tessel"));
    for (int i = 0; i < argc; ++i) {
        words.push_back(argv[i]);
    }
    words.push_back(nullptr);
    optind = 0;
    opterr = 0;
    const int count = static_cast<int>(words.size()) - 1;
    for (;;) {
        int longIndex = -1;
        int ch = getopt_long(count, words.data(), ":h", longopts.data(), &longIndex);
        if (-1 == ch) {
            break;
        }
        if ('h' == ch) {
            args.values["help"].push_back("");
            continue;
        }
        if (':' == ch) {
            CLI_REFUSE(TESSEL_ERR_USER_INPUT, std::string("option needs a value: ") + words[optind - 1]);
            return false;
        }
        if ('?' == ch) {
            CLI_REFUSE(TESSEL_ERR_USER_INPUT, std::string("unknown option: ") + words[optind - 1]);
            return false;
        }
        const Option &opt = all[static_cast<size_t>(ch - kFirstLong)];
        args.values[opt.name].push_back(optarg ? optarg : "");
    }
    for (int i = optind; i < count; ++i) {
        args.positional.push_back(words[static_cast<size_t>(i)]);
    }
    if (args.Has("help")) {
        return true;  // the help needs no complete command line
    }
    if (args.positional.size() < cmd.minArgs) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, std::string("missing argument: ") + cmd.synopsis);
        return false;
    }
    if (args.positional.size() > cmd.maxArgs) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, "unexpected argument: " + args.positional[cmd.maxArgs]);
        return false;
    }
    return true;
}

void PrintHelp(const Command &cmd) {
    printf("Usage: tessel %s %s\n\n%s\n", cmd.name, cmd.synopsis, cmd.summary);
    if (cmd.details[0] != '\0') {
        printf("\n%s\n", cmd.details);
    }
    printf("\nOptions:\n");
    std::vector<Option> all = cmd.options;
    all.insert(all.end(), CommonOptions().begin(), CommonOptions().end());
    for (const Option &opt : all) {
        std::string left = std::string("--") + opt.name;
        if (opt.argName) {
            left += std::string(" ") + opt.argName;
        }
        printf("  %-24s %s\n", left.c_str(), opt.help);
    }
}

void PrintCommandList(const std::string &prefix) {
    if (prefix.empty()) {
        printf("Usage: tessel [--as UID|NAME] [--compact] COMMAND [ARGS...]\n\n"
               "Stores, versions, indexes and guards the objects of the library libtessel.\n"
               "Results are JSON on standard output; failures print the library's error\n"
               "stack on standard error. Exit codes: 0 success (or yes), 1 failure (or no),\n"
               "2 a wrong command line.\n\n"
               "Parameters: where a command takes PARAMS, give a JSON object as text, as\n"
               "@FILE, or as - for standard input; its options add to it (and win).\n\n"
               "Commands:\n");
    } else {
        printf("Commands of 'tessel %s':\n", prefix.c_str());
    }
    for (const Command &cmd : Commands()) {
        const std::string name = cmd.name;
        if (prefix.empty() || 0 == name.compare(0, prefix.size() + 1, prefix + " ")) {
            printf("  %-26s %s\n", cmd.name, cmd.summary);
        }
    }
    printf("\nRun 'tessel COMMAND --help' for the options of a command.\n");
}

}  // namespace tessel_cli
