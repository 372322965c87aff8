// Small file helpers shared by the platform_quor_test and platform_db_test programs.
#ifndef TESSEL_TESTS_PLATFORM_QUOR_TEST_FILES_H
#define TESSEL_TESTS_PLATFORM_QUOR_TEST_FILES_H

#include <dirent.h>
#include <sys/stat.h>

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
