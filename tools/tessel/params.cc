/* Parameters given as JSON: as text, from a file (@FILE) or from standard input (-). */
#include <fstream>
#include <iostream>
#include <iterator>
#include <memory>
#include <sstream>

#include <json/reader.h>
#include <tessel/tessel.h>

#include "cli.h"

namespace tessel_cli {

namespace {

/* The parser's report on one line, so that it fits one frame. */
std::string OneLine(std::string text) {
    for (char &c : text) {
        if ('\n' == c || '\r' == c) {
            c = ' ';
        }
    }
    while (!text.empty() && ' ' == text.back()) {
        text.pop_back();
    }
    return text;
}

}  // namespace

bool ReadJsonArg(const std::string &source, Json::Value &out, bool mustBeObject) {
    std::string text;
    std::string where = "the argument";
    if ("-" == source) {
        where = "standard input";
        text.assign(std::istreambuf_iterator<char>(std::cin), std::istreambuf_iterator<char>());
    } else if (!source.empty() && '@' == source[0]) {
        where = source.substr(1);
        std::ifstream in(where, std::ios::binary);
        if (!in) {
            CLI_REFUSE(TESSEL_ERR_OPEN_FILE, "cannot read " + where);
            return false;
        }
        std::ostringstream buf;
        buf << in.rdbuf();
        text = buf.str();
    } else {
        text = source;
    }
    Json::CharReaderBuilder builder;
    builder["collectComments"] = false;
    builder["rejectDupKeys"] = true;
    builder["failIfExtra"] = true;
    std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    std::string errs;
    Json::Value value;
    if (!reader->parse(text.data(), text.data() + text.size(), &value, &errs)) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, "not JSON in " + where + ": " + OneLine(errs));
        return false;
    }
    if (mustBeObject && !value.isObject()) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, "not a JSON object in " + where);
        return false;
    }
    out.swap(value);
    return true;
}

bool ReadParams(const Args &args, Json::Value &params) {
    params = Json::Value(Json::objectValue);
    if (args.positional.empty()) {
        return true;
    }
    return ReadJsonArg(args.positional.front(), params, true);
}

bool SplitPair(const std::string &option, const std::string &pair, std::string &key, std::string &value) {
    size_t eq = pair.find('=');
    if (std::string::npos == eq || 0 == eq) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, option + " needs NAME=VALUE: " + pair);
        return false;
    }
    key = pair.substr(0, eq);
    value = pair.substr(eq + 1);
    return true;
}

}  // namespace tessel_cli
