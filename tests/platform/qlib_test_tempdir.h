// A fresh directory for one test, removed with everything in it afterwards.
#ifndef TESSEL_TESTS_PLATFORM_QLIB_TEST_TEMPDIR_H
#define TESSEL_TESTS_PLATFORM_QLIB_TEST_TEMPDIR_H

#include <stdlib.h>

#include <filesystem>
#include <string>

namespace qlib_test {

class TempDir {
public:
    TempDir() {
        char tmpl[] = "/tmp/qlib-test-XXXXXX";
        const char *dir = mkdtemp(tmpl);
        path_ = (nullptr == dir) ? std::string() : std::string(dir);
    }
    ~TempDir() {
        if (!path_.empty()) {
            std::error_code ec;
            std::filesystem::remove_all(path_, ec);
        }
    }
    TempDir(const TempDir &) = delete;
    TempDir &operator=(const TempDir &) = delete;

    bool ok() const { return !path_.empty(); }
    const std::string &path() const { return path_; }
    std::string file(const std::string &name) const { return path_ + "/" + name; }

private:
    std::string path_;
};

}  // namespace qlib_test

#endif
