// KEY="value" files: reading the forms found in real files, and rewriting one
// key without disturbing anything else in the file.
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <memory>
#include <set>
#include <string>

#include <gtest/gtest.h>

#include "quor/qlib.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "platform/quor_test_files.h"

namespace {

using quor_test::PlatformErrorIs;
using tessel_test::ReadFile;
using tessel_test::WriteFile;

class KeyValueFile : public ::testing::Test {
protected:
    void SetUp() override {
        if (!tessel_test::InSandbox()) {
            GTEST_SKIP() << "writes under /tmp: run inside tests/sandbox/tessel-sandbox";
        }
        scratch_ = std::make_unique<tessel_test::ScratchDir>();
        ASSERT_TRUE(scratch_->ok());
        path_ = scratch_->file("settings");
        QLIBCErrClear();
    }

    // The value of key, or "<missing>".
    std::string Get(const char *key) {
        char buf[256];
        int n = QLIBCFileGetKeyValue(path_.c_str(), key, buf, sizeof(buf));
        if (n < 0) {
            return "<missing>";
        }
        EXPECT_EQ(static_cast<size_t>(n), strlen(buf)) << key;
        return buf;
    }

    // Made in SetUp, once it is known that /tmp is the sandbox's.
    std::unique_ptr<tessel_test::ScratchDir> scratch_;
    std::string path_;
};

TEST_F(KeyValueFile, ReadsQuotedUnquotedAndCommentedLines) {
    ASSERT_TRUE(WriteFile(path_,
                          "# a comment line\n"
                          "quoted=\"value one\"\n"
                          "plain=value2\n"
                          "   indented=\"three\"\n"
                          "#commented=\"no\"\n"
                          "eq=\"a=b=c\"\n"
                          "url=http://host/?x=1\n"
                          "empty=\"\"\n"
                          "single='it is'\n"
                          "trailing=\"kept \" # note\n"
                          "crlf=\"dos\"\r\n"
                          "not a pair\n"
                          "dup=\"first\"\n"
                          "dup=\"second\"\n"
                          "last=\"no newline\""));
    EXPECT_EQ("value one", Get("quoted"));
    EXPECT_EQ("value2", Get("plain"));
    EXPECT_EQ("three", Get("indented"));
    EXPECT_EQ("<missing>", Get("commented"));
    EXPECT_EQ("a=b=c", Get("eq"));
    EXPECT_EQ("http://host/?x=1", Get("url"));
    EXPECT_EQ("", Get("empty"));
    EXPECT_EQ("it is", Get("single"));
    EXPECT_EQ("kept ", Get("trailing"));
    EXPECT_EQ("dos", Get("crlf"));
    EXPECT_EQ("second", Get("dup")) << "the last assignment wins, as when a shell sources the file";
    EXPECT_EQ("no newline", Get("last"));
    EXPECT_EQ("<missing>", Get("absent"));
    EXPECT_EQ("<missing>", Get("quote")) << "a prefix of a key is not the key";
}

TEST_F(KeyValueFile, MissingFileOrKeyIsNotFound) {
    char buf[16] = "untouched";
    EXPECT_EQ(-1, QLIBCFileGetKeyValue(path_.c_str(), "key", buf, sizeof(buf)));
    EXPECT_STREQ("", buf);
    ASSERT_TRUE(WriteFile(path_, "other=\"1\"\n"));
    EXPECT_EQ(-1, QLIBCFileGetKeyValue(path_.c_str(), "key", buf, sizeof(buf)));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_NOT_FOUND, "qlib_keyvalue.cc"));
}

TEST_F(KeyValueFile, LongValueIsCutToTheBufferAndReportsItsLength) {
    ASSERT_TRUE(WriteFile(path_, "key=\"abcdefgh\"\n"));
    char buf[8];
    memset(buf, 'X', sizeof(buf));
    EXPECT_EQ(8, QLIBCFileGetKeyValue(path_.c_str(), "key", buf, 4));
    EXPECT_STREQ("abc", buf);
    EXPECT_EQ('X', buf[4]) << "nothing written past cbBuf";
    EXPECT_EQ(8, QLIBCFileGetKeyValue(path_.c_str(), "key", buf, 1));
    EXPECT_STREQ("", buf);
}

TEST_F(KeyValueFile, BadArgumentsAreRecorded) {
    ASSERT_TRUE(WriteFile(path_, "key=\"v\"\n"));
    char buf[16];
    const struct {
        const char *path;
        const char *key;
        char *buf;
        size_t cb;
    } cases[] = {{nullptr, "key", buf, sizeof(buf)}, {path_.c_str(), nullptr, buf, sizeof(buf)},
                 {path_.c_str(), "key", nullptr, sizeof(buf)}, {path_.c_str(), "key", buf, 0},
                 {path_.c_str(), "", buf, sizeof(buf)},   {path_.c_str(), "k=ey", buf, sizeof(buf)},
                 {path_.c_str(), "k ey", buf, sizeof(buf)}};
    for (const auto &c : cases) {
        QLIBCErrClear();
        EXPECT_EQ(-1, QLIBCFileGetKeyValue(c.path, c.key, c.buf, c.cb)) << (c.key ? c.key : "(null)");
        EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "qlib_keyvalue.cc"));
    }
    for (const char *value : {"two\nlines", "cr\r"}) {
        QLIBCErrClear();
        EXPECT_EQ(-1, QLIBCFileSetKeyValue(path_.c_str(), "key", value));
        EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "qlib_keyvalue.cc"));
    }
    QLIBCErrClear();
    EXPECT_EQ(-1, QLIBCFileSetKeyValue(path_.c_str(), "#key", "v"));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "qlib_keyvalue.cc"));
    EXPECT_EQ("key=\"v\"\n", ReadFile(path_)) << "a refused set leaves the file alone";
}

TEST_F(KeyValueFile, ReadsTheSystemVersionFile) {
    char buf[64];
    int n = QLIBCFileGetKeyValue("/etc.defaults/VERSION", "buildnumber", buf, sizeof(buf));
    ASSERT_GT(n, 0);
    EXPECT_STREQ("69057", buf);
}

TEST_F(KeyValueFile, SetCreatesAMissingFile) {
    ASSERT_EQ(0, QLIBCFileSetKeyValue(path_.c_str(), "key", "value"));
    EXPECT_EQ("key=\"value\"\n", ReadFile(path_));
    struct stat st;
    ASSERT_EQ(0, stat(path_.c_str(), &st));
    EXPECT_EQ(0644u, st.st_mode & 07777);
    EXPECT_EQ(-1, QLIBCFileSetKeyValue(scratch_->file("no/such/dir").c_str(), "key", "value"));
    EXPECT_FALSE(quor_test::Exists(scratch_->file("no")));
}

TEST_F(KeyValueFile, SetReplacesOneKeyAndKeepsEveryOtherLine) {
    const std::string before =
        "# settings\n"
        "\n"
        "alpha=\"1\"\n"
        "target=\"old\"\n"
        "  # indented comment with target=\"x\"\n"
        "beta=2\n"
        "target=old-again\n"
        "gamma=\"3\"";
    ASSERT_TRUE(WriteFile(path_, before));
    ASSERT_EQ(0, QLIBCFileSetKeyValue(path_.c_str(), "target", "new"));
    EXPECT_EQ(
        "# settings\n"
        "\n"
        "alpha=\"1\"\n"
        "target=\"new\"\n"
        "  # indented comment with target=\"x\"\n"
        "beta=2\n"
        "gamma=\"3\"\n",
        ReadFile(path_));
    ASSERT_EQ(0, QLIBCFileSetKeyValue(path_.c_str(), "delta", "4"));
    EXPECT_EQ("gamma=\"3\"\ndelta=\"4\"\n", ReadFile(path_).substr(ReadFile(path_).rfind("gamma")));
    EXPECT_EQ(std::set<std::string>{"settings"}, quor_test::ListDir(scratch_->path())) << "no temporary file left";
}

TEST_F(KeyValueFile, SetValuesReadBackUnchanged) {
    for (const char *value : {"", "a=b", "say \"hi\"", "\"quoted\"", "#not a comment", "  spaced  ", "it's",
                              "back\\slash", "\xc3\xa9t\xc3\xa9"}) {
        ASSERT_EQ(0, QLIBCFileSetKeyValue(path_.c_str(), "key", value)) << value;
        EXPECT_EQ(value, Get("key"));
    }
}

TEST_F(KeyValueFile, SetKeepsModeOwnerAndSymbolicLink) {
    ASSERT_TRUE(WriteFile(path_, "key=\"1\"\n"));
    ASSERT_EQ(0, chown(path_.c_str(), tessel_test::kUidAlice, tessel_test::kGidUsers));
    ASSERT_EQ(0, chmod(path_.c_str(), 0640));
    std::string link = scratch_->file("link");
    ASSERT_EQ(0, symlink(path_.c_str(), link.c_str()));

    ASSERT_EQ(0, QLIBCFileSetKeyValue(link.c_str(), "key", "2"));
    struct stat st;
    ASSERT_EQ(0, lstat(link.c_str(), &st));
    EXPECT_TRUE(S_ISLNK(st.st_mode)) << "the link still points at the file";
    ASSERT_EQ(0, stat(path_.c_str(), &st));
    EXPECT_EQ(tessel_test::kUidAlice, st.st_uid);
    EXPECT_EQ(tessel_test::kGidUsers, st.st_gid);
    EXPECT_EQ(0640u, st.st_mode & 07777);
    EXPECT_EQ("key=\"2\"\n", ReadFile(path_));
}

TEST_F(KeyValueFile, SetIsAtomicForReaders) {
    ASSERT_TRUE(WriteFile(path_, "key=\"old\"\n"));
    // A reader that opened the file before the update keeps reading the old
    // content in full: the update replaced the file instead of rewriting it.
    FILE *reader = fopen(path_.c_str(), "r");
    ASSERT_NE(nullptr, reader);
    ASSERT_EQ(0, QLIBCFileSetKeyValue(path_.c_str(), "key", "new"));
    char line[64] = {0};
    ASSERT_NE(nullptr, fgets(line, sizeof(line), reader));
    fclose(reader);
    EXPECT_STREQ("key=\"old\"\n", line);
    EXPECT_EQ("new", Get("key"));
}

TEST_F(KeyValueFile, UnreadableFileIsAnErrorNotAMissingKey) {
    ASSERT_EQ(0, mkdir(path_.c_str(), 0755));
    char buf[16];
    QLIBCErrClear();
    EXPECT_EQ(-1, QLIBCFileGetKeyValue(path_.c_str(), "key", buf, sizeof(buf)));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_FILE_READ, "qlib_keyvalue.cc"));
    EXPECT_EQ(-1, QLIBCFileSetKeyValue(path_.c_str(), "key", "v"));
    struct stat st;
    ASSERT_EQ(0, stat(path_.c_str(), &st));
    EXPECT_TRUE(S_ISDIR(st.st_mode)) << "a directory in the way is not replaced";
}

}  // namespace
