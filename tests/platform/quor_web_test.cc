// HTTP output: MIME types from the system table, a file sent to standard
// output (captured in a child whose stdout is a file), URL encoding.
#include <fcntl.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <memory>
#include <string>

#include <gtest/gtest.h>

#include "platform/quor_test_files.h"
#include "quor/quor_web.h"
#include "support/sandbox.h"
#include "support/scratch.h"

namespace {

using tessel_test::ReadFile;
using tessel_test::WriteFile;

TEST(MimeType, ComesFromTheSystemTableByExtension) {
    HTTPFileOutputer outputer;
    EXPECT_EQ("text/html", outputer.GetMimeType("index.html"));
    EXPECT_EQ("text/html", outputer.GetMimeType("INDEX.HTM"));
    EXPECT_EQ("application/pdf", outputer.GetMimeType("Report.PdF"));
    EXPECT_EQ("image/jpeg", outputer.GetMimeType("/volume1/homes/alice/photo.JPG"));
    EXPECT_EQ("image/png", outputer.GetMimeType("a.b.c.png"));
    EXPECT_EQ("application/json", outputer.GetMimeType("data.json"));
    EXPECT_EQ("text/plain", outputer.GetMimeType("notes.txt"));
    EXPECT_EQ("application/gzip", outputer.GetMimeType("backup.tar.gz"));
    EXPECT_EQ("application/x-font-pcf", outputer.GetMimeType("font.pcf.Z")) << "compound extension";
    EXPECT_EQ("audio/AMR", outputer.GetMimeType("voice.amr")) << "the type is kept as written";
    EXPECT_EQ("application/x-sh", outputer.GetMimeType("run.sh")) << "the first line listing an extension wins";
}

TEST(MimeType, UnknownIsOctetStream) {
    HTTPFileOutputer outputer;
    for (const char *name : {"README", "archive.unknownext", "file.", "", ".html", "dir.html/README", "a.html.qqq"}) {
        EXPECT_EQ("application/octet-stream", outputer.GetMimeType(name)) << name;
    }
    QLIBCErrClear();
    EXPECT_EQ("application/octet-stream", outputer.GetMimeType(nullptr));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
}

TEST(UrlEncode, KeepsOnlyUnreservedCharacters) {
    EXPECT_EQ("AZaz09-._~", QUOR_WebAPIUtil_URLEncode("AZaz09-._~"));
    EXPECT_EQ("a%20b%2Fc%3Fd%23e%5Bf%5D%40%21%24%26%27%28%29%2A%2B%2C%3B%3D%25",
              QUOR_WebAPIUtil_URLEncode("a b/c?d#e[f]@!$&'()*+,;=%"));
    EXPECT_EQ("%22%3C%3E%5C%5E%60%7B%7C%7D", QUOR_WebAPIUtil_URLEncode("\"<>\\^`{|}"));
    EXPECT_EQ("r%C3%A9sum%C3%A9%20%E4%B8%AD.pdf", QUOR_WebAPIUtil_URLEncode("r\xc3\xa9sum\xc3\xa9 \xe4\xb8\xad.pdf"));
    EXPECT_EQ("%00%0D%0A%7F%FF", QUOR_WebAPIUtil_URLEncode(std::string("\0\r\n\x7f\xff", 5)));
    EXPECT_EQ("", QUOR_WebAPIUtil_URLEncode(""));
}

class FileOutput : public ::testing::Test {
protected:
    void SetUp() override {
        if (!tessel_test::InSandbox()) {
            GTEST_SKIP() << "writes under /tmp: run inside tests/sandbox/tessel-sandbox";
        }
        scratch_ = std::make_unique<tessel_test::ScratchDir>();
        ASSERT_TRUE(scratch_->ok());
    }

    // Runs Output in a child whose standard output is a file, after the
    // caller's own header line printed through stdio; returns what the child
    // wrote, and its result in *pRet.
    std::string Capture(const std::string &path, const char *mime, int *pRet) {
        std::string out = scratch_->file("stdout");
        fflush(stdout);  // nothing of ours may end up in the child's copy of the buffer
        int status = tessel_test::RunInChild([&]() {
            int fd = open(out.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
            if (fd < 0 || dup2(fd, STDOUT_FILENO) < 0) {
                return 100;
            }
            close(fd);
            printf("X-Before: 1\r\n");
            HTTPFileOutputer outputer;
            int ret = outputer.Output(path.c_str(), mime);
            fflush(stdout);
            return ret + 1;
        });
        *pRet = status - 1;
        return ReadFile(out);
    }

    std::unique_ptr<tessel_test::ScratchDir> scratch_;
};

TEST_F(FileOutput, WritesHeadersThenTheExactBytes) {
    std::string body("binary\0\r\n\r\ndata\xff", 16);
    ASSERT_TRUE(WriteFile(scratch_->file("blob.bin"), body));
    int ret = -2;
    std::string out = Capture(scratch_->file("blob.bin"), "application/x-test", &ret);
    EXPECT_EQ(0, ret);
    EXPECT_EQ("X-Before: 1\r\nContent-Type: application/x-test\r\nContent-Length: 16\r\n\r\n" + body, out);
}

TEST_F(FileOutput, LargeAndEmptyFiles) {
    std::string big(1 << 20, 'x');
    for (size_t i = 0; i < big.size(); i += 4093) {
        big[i] = static_cast<char>(i % 256);
    }
    ASSERT_TRUE(WriteFile(scratch_->file("big"), big));
    int ret = -2;
    std::string out = Capture(scratch_->file("big"), "application/octet-stream", &ret);
    EXPECT_EQ(0, ret);
    std::string head = "X-Before: 1\r\nContent-Type: application/octet-stream\r\nContent-Length: 1048576\r\n\r\n";
    ASSERT_EQ(head.size() + big.size(), out.size());
    EXPECT_EQ(head, out.substr(0, head.size()));
    EXPECT_TRUE(out.compare(head.size(), big.size(), big) == 0);

    ASSERT_TRUE(WriteFile(scratch_->file("empty.txt"), ""));
    out = Capture(scratch_->file("empty.txt"), nullptr, &ret);
    EXPECT_EQ(0, ret);
    EXPECT_EQ("X-Before: 1\r\nContent-Type: text/plain\r\nContent-Length: 0\r\n\r\n", out)
        << "without a type the file name decides";
}

TEST_F(FileOutput, NothingIsWrittenForAFileThatCannotBeSent) {
    ASSERT_EQ(0, mkdir(scratch_->file("dir").c_str(), 0755));
    ASSERT_TRUE(WriteFile(scratch_->file("ok.txt"), "ok"));
    for (const std::string &path : {scratch_->file("missing"), scratch_->file("dir")}) {
        int ret = 0;
        EXPECT_EQ("X-Before: 1\r\n", Capture(path, "text/plain", &ret)) << path;
        EXPECT_EQ(-1, ret) << path;
    }
    int ret = 0;
    EXPECT_EQ("X-Before: 1\r\n", Capture(scratch_->file("ok.txt"), "text/plain\r\nX-Injected: 1", &ret));
    EXPECT_EQ(-1, ret) << "a type with a line break would smuggle in headers";
}

}  // namespace
