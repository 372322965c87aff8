#include "support/scratch.h"

#include <ftw.h>
#include <stdio.h>
#include <stdlib.h>

#include <fstream>
#include <iterator>

namespace tessel_test {

namespace {

// Keeps going past an entry that cannot be removed, so that one stubborn
// file does not leave the rest of the tree behind.
int RemoveEntry(const char *path, const struct stat *, int, struct FTW *) {
    remove(path);
    return 0;
}

}  // namespace

ScratchDir::ScratchDir(const std::string &base) {
    std::string tmpl = base + "/tessel-test-XXXXXX";
    if (nullptr != mkdtemp(&tmpl[0])) {
        path_ = tmpl;
    }
}

ScratchDir::~ScratchDir() {
    if (!path_.empty()) {
        // Children first, and links are removed, never followed.
        nftw(path_.c_str(), RemoveEntry, 16, FTW_DEPTH | FTW_PHYS);
    }
}

bool WriteFile(const std::string &path, const std::string &content) {
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    out.write(content.data(), static_cast<std::streamsize>(content.size()));
    return static_cast<bool>(out);
}

std::string ReadFile(const std::string &path) {
    std::ifstream in(path, std::ios::binary);
    return std::string((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
}

}  // namespace tessel_test
