// Small file helpers shared by the platform_quor_test and platform_db_test programs.
#ifndef TESSEL_TESTS_PLATFORM_QUOR_TEST_FILES_H
#define TESSEL_TESTS_PLATFORM_QUOR_TEST_FILES_H

#include <dirent.h>
#include <stdlib.h>
#include <sys/stat.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <set>
#include <string>

#include <gtest/gtest.h>

#include "quor/qlib.h"

namespace quor_test {

// The platform error state names the code and the source file that recorded it.
inline ::testing::AssertionResult PlatformErrorIs(int code, const std::string &file) {
    std::string recorded = QLIBCErrFileGet();
    bool fileMatches = recorded.size() >= file.size() && 0 == recorded.compare(recorded.size() - file.size(), file.size(), file);
    if (code == QLIBCErrGet() && fileMatches && QLIBCErrLineGet() > 0) {
        return ::testing::AssertionSuccess();
    }
    return ::testing::AssertionFailure() << "platform error 0x" << std::hex << QLIBCErrGet() << " at " << recorded
                                         << ":" << std::dec << QLIBCErrLineGet() << ", expected 0x" << std::hex
                                         << code << " from " << file;
}

// A fresh directory under base, removed with everything in it afterwards.
class ScratchDir {
public:
    explicit ScratchDir(const std::string &base = "/tmp") {
        std::string tmpl = base + "/quor-test-XXXXXX";
        const char *dir = mkdtemp(&tmpl[0]);
        path_ = (nullptr == dir) ? std::string() : std::string(dir);
    }
    ~ScratchDir() {
        if (!path_.empty()) {
            std::error_code ec;
            std::filesystem::remove_all(path_, ec);
        }
    }
    ScratchDir(const ScratchDir &) = delete;
    ScratchDir &operator=(const ScratchDir &) = delete;

    bool ok() const { return !path_.empty(); }
    const std::string &path() const { return path_; }
    std::string file(const std::string &name) const { return path_ + "/" + name; }

private:
    std::string path_;
};

inline bool WriteFile(const std::string &path, const std::string &content) {
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    out.write(content.data(), static_cast<std::streamsize>(content.size()));
    return static_cast<bool>(out);
}

inline std::string ReadFile(const std::string &path) {
    std::ifstream in(path, std::ios::binary);
    return std::string((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
}

inline bool Exists(const std::string &path) {
    struct stat st;
    return 0 == lstat(path.c_str(), &st);
}

// The names in a directory, "." and ".." left out.
inline std::set<std::string> ListDir(const std::string &path) {
    std::set<std::string> names;
    DIR *dir = opendir(path.c_str());
    if (nullptr == dir) {
        return names;
    }
    while (struct dirent *entry = readdir(dir)) {
        std::string name = entry->d_name;
        if ("." != name && ".." != name) {
            names.insert(name);
        }
    }
    closedir(dir);
    return names;
}

}  // namespace quor_test

#endif  // TESSEL_TESTS_PLATFORM_QUOR_TEST_FILES_H
