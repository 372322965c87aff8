/*
 * tessel download: a stored binary or meta-binary. The library writes a web
 * response (headers, an empty line, the body) to standard output, as for a
 * gateway program; --cgi passes that on unchanged, otherwise the tool keeps
 * the body alone, in --output FILE or on standard output.
 */
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <sstream>

#include <tessel/tessel.h>

#include "cli.h"

namespace tessel_cli {

namespace {

/* Standard output redirected into an unlinked scratch file for the duration. */
class CapturedStdout {
public:
    CapturedStdout() {
        fflush(stdout);
        char name[] = "/tmp/tessel-download-XXXXXX";
        m_fd = mkostemp(name, O_CLOEXEC);
        if (m_fd >= 0) {
            unlink(name);
            m_saved = dup(STDOUT_FILENO);
            if (m_saved < 0 || dup2(m_fd, STDOUT_FILENO) < 0) {
                close(m_fd);
                m_fd = -1;
            }
        }
    }
    ~CapturedStdout() { Restore(); if (m_fd >= 0) close(m_fd); }
    bool ok() const { return m_fd >= 0; }
    /* Ends the capture; the bytes written meanwhile. */
    std::string Take() {
        Restore();
        std::string data;
        if (m_fd < 0 || lseek(m_fd, 0, SEEK_SET) != 0) {
            return data;
        }
        char buf[65536];
        for (ssize_t n; (n = read(m_fd, buf, sizeof(buf))) > 0;) {
            data.append(buf, static_cast<size_t>(n));
        }
        return data;
    }

private:
    void Restore() {
        if (m_saved >= 0) {
            fflush(stdout);
            dup2(m_saved, STDOUT_FILENO);
            close(m_saved);
            m_saved = -1;
        }
    }
    int m_fd = -1;
    int m_saved = -1;
};

/* Splits a response at its empty line; the header lines into headers. */
bool SplitResponse(const std::string &response, Json::Value &headers, std::string &body) {
    size_t end = response.find("\r\n\r\n");
    if (std::string::npos == end) {
        return false;
    }
    std::istringstream in(response.substr(0, end));
    headers = Json::Value(Json::objectValue);
    for (std::string line; std::getline(in, line);) {
        if (!line.empty() && '\r' == line.back()) {
            line.pop_back();
        }
        size_t colon = line.find(':');
        if (std::string::npos != colon) {
            size_t value = line.find_first_not_of(' ', colon + 1);
            headers[line.substr(0, colon)] = (std::string::npos == value) ? "" : line.substr(value);
        }
    }
    body = response.substr(end + 4);
    return true;
}

/* FILE appears whole or not at all: written beside it, then renamed over it. */
bool WriteWhole(const std::string &path, const std::string &data) {
    std::string tmp = path + ".XXXXXX";
    int fd = mkostemp(&tmp[0], O_CLOEXEC);
    if (fd < 0) {
        CLI_REFUSE(TESSEL_ERR_OPEN_FILE, "cannot write beside " + path);
        return false;
    }
    size_t done = 0;
    while (done < data.size()) {
        ssize_t n = write(fd, data.data() + done, data.size() - done);
        if (n <= 0) {
            break;
        }
        done += static_cast<size_t>(n);
    }
    // mkostemp makes the file 0600; a downloaded file gets the usual mode.
    const mode_t mask = umask(0);
    umask(mask);
    const bool written = done == data.size() && 0 == fchmod(fd, 0666 & ~mask);
    const bool closed = 0 == close(fd);
    if (!written || !closed || 0 != rename(tmp.c_str(), path.c_str())) {
        unlink(tmp.c_str());
        CLI_REFUSE(TESSEL_ERR_OPEN_FILE, "cannot write " + path);
        return false;
    }
    return true;
}

int Download(Context &ctx, const Command &cmd, const Args &args) {
    Json::Value params;
    if (!ReadParams(args, params)) {
        return UsageFailed(cmd.name);
    }
    for (const char *key : {"ns", "id", "version", "segment", "format"}) {
        if (args.Has(key)) {
            params[key] = args.Get(key);
        }
    }
    if (args.Has("name")) {
        params["field"] = args.Get("name");
    }
    if (!params.isMember("segment")) {
        params["segment"] = "binary";
    }
    if (!params.isMember("format")) {
        params["format"] = "raw";
    }
    if (!CompleteRequester(ctx, params)) {
        return UsageFailed(cmd.name);
    }
    if (args.Has("cgi")) {
        ClearErrors();
        fflush(stdout);
        TESSEL_OBJECT obj;
        return obj.Download(params) ? kExitOk : Failed();
    }
    // A stale validator in the caller's environment would turn the file into
    // a "not modified" answer without a body.
    unsetenv("HTTP_IF_NONE_MATCH");
    std::string response;
    ClearErrors();
    {
        CapturedStdout capture;
        if (!capture.ok()) {
            CLI_REFUSE(TESSEL_ERR_OPEN_FILE, "cannot capture the response in /tmp");
            return Failed();
        }
        TESSEL_OBJECT obj;
        bool ok = obj.Download(params);
        response = capture.Take();
        if (!ok) {
            return Failed();
        }
    }
    Json::Value headers;
    std::string body;
    if (!SplitResponse(response, headers, body)) {
        CLI_REFUSE(TESSEL_ERR_READ_FILE, "the response has no empty line after its headers");
        return Failed();
    }
    if (!args.Has("output")) {
        fwrite(body.data(), 1, body.size(), stdout);
        return (0 == fflush(stdout)) ? kExitOk : kExitFailed;
    }
    const std::string path = args.Get("output");
    if (!WriteWhole(path, body)) {
        return Failed();
    }
    Json::Value result;
    result["ns"] = params["ns"];
    result["id"] = params["id"];
    result["segment"] = params["segment"];
    result["name"] = params["field"];
    result["output"] = path;
    result["size"] = static_cast<Json::UInt64>(body.size());
    result["headers"] = headers;
    PrintJson(ctx, result);
    return kExitOk;
}

}  // namespace

void AddDownloadCommands(std::vector<Command> &t) {
    t.push_back({"download", "[PARAMS] --ns NS --id ID --name NAME [--output FILE]",
                 "a stored binary (or meta-binary) of an object",
                 "Without --output the file's bytes go to standard output; with it, the tool\n"
                 "writes FILE and prints what it wrote and the response headers as JSON.",
                 {{"ns", "NS", "the namespace"}, {"id", "ID", "the object's identifier"},
                  {"name", "NAME", "the file's name (the request's \"field\")"},
                  {"version", "VERSION", "the version to take a versioned binary from"},
                  {"segment", "SEGMENT", "binary (versioned, the default) or metabinary"},
                  {"format", "FORMAT", "raw (the default) or base64"},
                  {"output", "FILE", "write the file's bytes to FILE"},
                  {"cgi", nullptr, "write the whole web response (headers and body) unchanged"}},
                 0, 1, Download});
}

}  // namespace tessel_cli
