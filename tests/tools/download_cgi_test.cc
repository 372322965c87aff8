/*
 * The download program behind a real web server: lighttpd on 127.0.0.1 runs
 * tessel-download through mod_cgi, authenticates its users with mod_auth,
 * and curl fetches stored files of objects laid out by the file-system store.
 */
#include <arpa/inet.h>
#include <netinet/in.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <memory>
#include <sstream>
#include <string>
#include <tuple>
#include <vector>

#include <gtest/gtest.h>

#include "support/error_stack.h"
#include "support/json_text.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_backend.h"
#include "tessel_binary.h"
#include "tessel_file.h"

namespace {

using namespace tessel_test;
using Lines = std::vector<std::string>;

const std::string kNsDir = "/volume1/@Tessel/ledger";
const char kConf[] = "/usr/quor/etc/tessel.conf";

struct sockaddr_in Loopback(int port) {
    struct sockaddr_in addr = {};
    addr.sin_family = AF_INET;
    addr.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    addr.sin_port = htons(static_cast<uint16_t>(port));
    return addr;
}

// A port nobody listens on right now.
int FreePort() {
    const int fd = socket(AF_INET, SOCK_STREAM, 0);
    struct sockaddr_in addr = Loopback(0);
    socklen_t len = sizeof(addr);
    const bool ok = fd >= 0 && 0 == bind(fd, reinterpret_cast<sockaddr *>(&addr), sizeof(addr)) &&
                    0 == getsockname(fd, reinterpret_cast<sockaddr *>(&addr), &len);
    close(fd);
    return ok ? ntohs(addr.sin_port) : -1;
}

bool Accepts(int port) {
    const int fd = socket(AF_INET, SOCK_STREAM, 0);
    struct sockaddr_in addr = Loopback(port);
    const bool ok = fd >= 0 && 0 == connect(fd, reinterpret_cast<sockaddr *>(&addr), sizeof(addr));
    close(fd);
    return ok;
}

// What curl received: its exit code, the status line, the header lines
// (less Date and Server, which the server adds on its own) and the body.
struct Fetched {
    int rc = -1;
    std::string status;
    Lines headers;
    std::string body;
};

class DownloadCgi : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(InSandbox()) << "run through ctest: this test writes " << kConf;
        ASSERT_TRUE(dir_.ok());
        ASSERT_EQ(0, system(("mkdir -p " + kNsDir + " /usr/quor/etc/tessel/ns && ln -sfn " + kNsDir +
                             " /usr/quor/etc/tessel/ns/ledger")
                                .c_str()));
        ASSERT_TRUE(WriteFile(kConf, R"({"Access": {"enable": true, "enable_ns_ledger": true}})"));
        ASSERT_EQ(0, mkdir(dir_.file("www").c_str(), 0755));
        ASSERT_EQ(0, symlink(TESSEL_DOWNLOAD_PATH, dir_.file("www/tessel-download").c_str()));
        ASSERT_TRUE(WriteFile(dir_.file("users"), "alice:alice-pw\nbob:bob-pw\n"));
        port_ = FreePort();
        ASSERT_LT(0, port_);
        ASSERT_TRUE(WriteFile(dir_.file("lighttpd.conf"),
                              "server.modules = (\"mod_auth\", \"mod_authn_file\", \"mod_cgi\")\n"
                              "server.document-root = \"" + dir_.file("www") + "\"\n"
                              "server.bind = \"127.0.0.1\"\n"
                              "server.port = " + std::to_string(port_) + "\n"
                              "server.errorlog = \"" + dir_.file("error.log") + "\"\n"
                              "auth.backend = \"plain\"\n"
                              "auth.backend.plain.userfile = \"" + dir_.file("users") + "\"\n"
                              "auth.require = (\"/\" => (\"method\" => \"basic\", \"realm\" => \"tessel\", "
                              "\"require\" => \"valid-user\"))\n"
                              "cgi.assign = (\"/tessel-download\" => \"\")\n"));
        server_ = fork();
        ASSERT_LE(0, server_);
        if (0 == server_) {
            execl(TESSEL_LIGHTTPD_PATH, "lighttpd", "-D", "-f", dir_.file("lighttpd.conf").c_str(), (char *)NULL);
            _exit(127);
        }
        // Until the server listens (it may also have died: then stop asking).
        bool up = false;
        for (int i = 0; i < 500 && !(up = Accepts(port_)) && 0 == waitpid(server_, NULL, WNOHANG); ++i) {
            struct timespec pause = {0, 10 * 1000 * 1000};
            nanosleep(&pause, NULL);
        }
        ASSERT_TRUE(up) << ReadFile(dir_.file("error.log"));
    }

    void TearDown() override {
        if (server_ > 0) {
            kill(server_, SIGTERM);
            waitpid(server_, NULL, 0);
        }
    }

    // A new object of alice's with the given meta-binaries (name, content).
    std::string CreateWithFiles(const std::vector<std::pair<std::string, std::string>> &files) {
        std::unique_ptr<TESSEL_BACKEND_OP> pFs(RegisterBackend::New("fs"));
        Json::Value jParm = Parse(R"({"ns": "ledger", "owner": 1001, "category": "note", "ctime": 100,
                                     "acl": {"enabled": true}})");
        std::string strId, strVer;
        EXPECT_TRUE(pFs->Create(jParm, strId, strVer)) << ::testing::PrintToString(ErrMsgs());
        Json::Value jSet = Parse(R"({"ns": "ledger", "version": "0123456789012345678901234567890123456789"})");
        jSet["id"] = strId;
        for (size_t i = 0; i < files.size(); ++i) {
            const std::string strUpload = dir_.file("upload" + std::to_string(i));
            EXPECT_TRUE(WriteFile(strUpload, files[i].second));
            Json::Value jItem(Json::objectValue);
            jItem["name"] = files[i].first;
            jItem["format"] = "raw";
            jItem["path"] = strUpload;
            jSet["metabinary_files"].append(jItem);
        }
        EXPECT_TRUE(pFs->Set(jSet, strVer)) << ::testing::PrintToString(ErrMsgs());
        return strId;
    }

    // curl as user (":" for nobody) with the query and extra request headers.
    Fetched Fetch(const std::string &strUser, const std::string &strQuery, const Lines &requestHeaders = {}) {
        std::string cmd = "curl -s --max-time 30 -H 'Connection: close' -D '" + dir_.file("headers") + "' -o '" +
                          dir_.file("body") + "'";
        if (":" != strUser) {
            cmd += " -u '" + strUser + "'";
        }
        for (const std::string &h : requestHeaders) {
            cmd += " -H '" + h + "'";
        }
        cmd += " 'http://127.0.0.1:" + std::to_string(port_) + "/tessel-download?" + strQuery + "'";
        unlink(dir_.file("headers").c_str());
        unlink(dir_.file("body").c_str());
        Fetched f;
        const int status = system(cmd.c_str());
        f.rc = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
        std::istringstream in(ReadFile(dir_.file("headers")));
        std::string line;
        // With authentication the server answers 401 first: keep the last response.
        while (std::getline(in, line)) {
            if (!line.empty() && '\r' == line.back()) {
                line.pop_back();
            }
            if (0 == line.rfind("HTTP/", 0)) {
                f.status = line;
                f.headers.clear();
            } else if (!line.empty() && 0 != line.rfind("Date:", 0) && 0 != line.rfind("Server:", 0)) {
                f.headers.push_back(line);
            }
        }
        f.body = ReadFile(dir_.file("body"));
        return f;
    }

    ScratchDir dir_{"/tmp"};
    int port_ = -1;
    pid_t server_ = -1;
};

TEST_F(DownloadCgi, ServesStoredFilesThroughTheWebServer) {
    const std::string strId = CreateWithFiles({{"four.txt", "abcd"}, {"résumé 1.txt", "cv"}});
    std::string strEncoded, strMd5;
    ASSERT_TRUE(TesselEncode(std::string("four.txt"), strEncoded));
    ASSERT_TRUE(TesselObjectEvalFileMd5((kNsDir + "/" + strId + "/metabinary/" + strEncoded).c_str(), strMd5));
    const std::string strBase = "ns=ledger&id=" + strId + "&segment=metabinary";

    Fetched f = Fetch("alice:alice-pw", strBase + "&field=four.txt&format=raw");
    EXPECT_EQ(0, f.rc);
    EXPECT_EQ("HTTP/1.1 200 OK", f.status);
    EXPECT_EQ((Lines{"Content-Type: text/plain", "Content-Length: 4", "Accept-Ranges: bytes", "Connection: close"}),
              f.headers);
    EXPECT_EQ("abcd", f.body);

    // Base64 announces one byte more than it sends: the client sees the
    // body of 8 and a transfer cut short (curl's 18).
    f = Fetch("alice:alice-pw", strBase + "&field=four.txt&format=base64&mode=download");
    EXPECT_EQ(18, f.rc);
    EXPECT_EQ("HTTP/1.1 200 OK", f.status);
    ASSERT_EQ(7u, f.headers.size()) << ::testing::PrintToString(f.headers);
    EXPECT_EQ(0u, f.headers[4].rfind("Expires: ", 0));
    struct tm tmExpires = {};
    EXPECT_NE(nullptr, strptime(f.headers[4].c_str() + 9, "%a, %d %b %Y %T GMT", &tmExpires)) << f.headers[4];
    f.headers[4] = "Expires: ...";
    EXPECT_EQ((Lines{"Content-Type: text/plain", "Content-Disposition: attachment; filename=\"four.txt\"",
                     "Content-Length: 9", "ETag: " + strMd5, "Expires: ...", "Accept-Ranges: bytes",
                     "Connection: close"}),
              f.headers);
    EXPECT_EQ("YWJjZA==", f.body);

    // The browser's copy is current.
    f = Fetch("alice:alice-pw", strBase + "&field=four.txt&format=base64", {"If-None-Match: " + strMd5});
    EXPECT_EQ(0, f.rc);
    EXPECT_EQ("HTTP/1.1 304 Not Modified", f.status);
    EXPECT_EQ("", f.body);

    // An older browser gets the name URL-encoded.
    f = Fetch("alice:alice-pw", strBase + "&field=r%C3%A9sum%C3%A9+1.txt&format=raw&mode=download",
              {"User-Agent: Mozilla/5.0 (Windows NT 10.0; WOW64; Trident/7.0; rv:11.0) like Gecko"});
    EXPECT_EQ(0, f.rc);
    EXPECT_EQ("HTTP/1.1 200 OK", f.status);
    EXPECT_EQ((Lines{"Content-Disposition: attachment; filename=\"r%C3%A9sum%C3%A9%201.txt\"",
                     "Content-Type: text/plain", "Content-Length: 2", "Accept-Ranges: bytes", "Connection: close"}),
              f.headers);
    EXPECT_EQ("cv", f.body);

    // Refusals: bob holds no word on alice's shared object; a request without a
    // file name; a file the object does not have.
    const std::vector<std::tuple<std::string, std::string, std::string, std::string>> refusals = {
        {"bob:bob-pw", "&field=four.txt&format=raw", "HTTP/1.1 403 Forbidden", "error 1023\n"},
        {"alice:alice-pw", "&format=raw", "HTTP/1.1 400 Bad Request", "error 1007\n"},
        {"alice:alice-pw", "&field=none.txt&format=raw", "HTTP/1.1 404 Not Found", "error 1016\n"},
    };
    for (const auto &r : refusals) {
        f = Fetch(std::get<0>(r), strBase + std::get<1>(r));
        EXPECT_EQ(std::get<2>(r), f.status) << std::get<1>(r);
        EXPECT_EQ(std::get<3>(r), f.body) << std::get<1>(r);
    }
}

}  // namespace
