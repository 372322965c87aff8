// Reading what the sandbox provides: its environment, the captured log and
// the private PostgreSQL server.
#include "support/sandbox.h"

#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fstream>
#include <sstream>
#include <thread>

#include <libpq-fe.h>

namespace tessel_test {

namespace {

std::string Env(const char *name) {
    const char *value = getenv(name);
    return (NULL == value) ? std::string() : std::string(value);
}

std::string ReadLogFrom(size_t mark) {
    std::ifstream in(Env("TESSEL_SANDBOX_SYSLOG"), std::ios::binary);
    if (!in) {
        return std::string();
    }
    in.seekg(0, std::ios::end);
    std::streamoff size = in.tellg();
    if (size < 0 || static_cast<size_t>(size) <= mark) {
        return std::string();
    }
    in.seekg(static_cast<std::streamoff>(mark));
    std::string text(static_cast<size_t>(size) - mark, '\0');
    in.read(&text[0], static_cast<std::streamsize>(text.size()));
    text.resize(static_cast<size_t>(in.gcount()));
    return text;
}

// "<PRI>Mmm dd hh:mm:ss ident[pid]: message" as glibc's syslog() sends it.
SyslogLine Parse(const std::string &raw) {
    SyslogLine line;
    line.raw = raw;
    size_t rest = 0;
    if (raw.size() > 2 && raw[0] == '<') {
        size_t close = raw.find('>');
        if (close != std::string::npos) {
            line.priority = atoi(raw.substr(1, close - 1).c_str());
            rest = close + 1;
        }
    }
    // Skip the fixed-width time stamp "Mmm dd hh:mm:ss ".
    if (raw.size() >= rest + 16 && raw[rest + 15] == ' ') {
        rest += 16;
    }
    size_t colon = raw.find(": ", rest);
    if (colon == std::string::npos) {
        line.message = raw.substr(rest);
        return line;
    }
    std::string tag = raw.substr(rest, colon - rest);
    size_t bracket = tag.find('[');
    line.ident = (bracket == std::string::npos) ? tag : tag.substr(0, bracket);
    line.message = raw.substr(colon + 2);
    return line;
}

}  // namespace

bool InSandbox() { return Env("TESSEL_SANDBOX") == "1"; }

bool HasPostgres() { return Env("TESSEL_SANDBOX_PG") == "1"; }

size_t SyslogMark() {
    std::ifstream in(Env("TESSEL_SANDBOX_SYSLOG"), std::ios::binary | std::ios::ate);
    std::streamoff size = in ? static_cast<std::streamoff>(in.tellg()) : 0;
    return size < 0 ? 0 : static_cast<size_t>(size);
}

std::vector<SyslogLine> SyslogSince(size_t mark) {
    std::vector<SyslogLine> lines;
    std::string log = ReadLogFrom(mark);
    // The daemon may be half-way through writing the last line: only whole
    // lines count, the rest is read again on the next look.
    log.erase(log.find_last_of('\n') == std::string::npos ? 0 : log.find_last_of('\n') + 1);
    std::istringstream text(log);
    std::string raw;
    while (std::getline(text, raw)) {
        lines.push_back(Parse(raw));
    }
    return lines;
}

std::optional<SyslogLine> WaitForSyslog(const std::string &needle, size_t mark, int priority,
                                        std::chrono::milliseconds timeout) {
    auto deadline = std::chrono::steady_clock::now() + timeout;
    for (;;) {
        for (const SyslogLine &line : SyslogSince(mark)) {
            if (line.message.find(needle) != std::string::npos && (priority < 0 || priority == line.priority)) {
                return line;
            }
        }
        if (std::chrono::steady_clock::now() >= deadline) {
            return std::nullopt;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
}

PGconn *PgConnect(const std::string &db) {
    std::string conninfo = "user=postgres dbname=" + db;
    PGconn *conn = PQconnectdb(conninfo.c_str());
    if (CONNECTION_OK != PQstatus(conn)) {
        PQfinish(conn);
        return nullptr;
    }
    return conn;
}

std::optional<std::string> PgValue(PGconn *conn, const std::string &sql) {
    PGresult *res = PQexec(conn, sql.c_str());
    std::optional<std::string> value;
    if (PGRES_TUPLES_OK == PQresultStatus(res) && PQntuples(res) > 0 && PQnfields(res) > 0) {
        value = std::string(PQgetvalue(res, 0, 0));
    }
    PQclear(res);
    return value;
}

int RunInChild(const std::function<int()> &fn) {
    pid_t pid = fork();
    if (pid < 0) {
        return -1;
    }
    if (0 == pid) {
        _exit(fn());
    }
    int status = 0;
    if (waitpid(pid, &status, 0) != pid || !WIFEXITED(status)) {
        return -1;
    }
    return WEXITSTATUS(status);
}

int RunAsUser(unsigned uid, unsigned gid, const std::function<int()> &fn) {
    return RunInChild([&]() {
        // Group first: once the effective uid is a user's, the gid can no
        // longer be changed to an arbitrary one.
        if (0 != setresgid(-1, static_cast<gid_t>(gid), -1) || 0 != setresuid(-1, static_cast<uid_t>(uid), -1)) {
            return 125;
        }
        return fn();
    });
}

}  // namespace tessel_test
