/*
 * Scratch directories and whole-file helpers for tests that work on real
 * files. Tests make their scratch directories inside the sandbox only: its
 * /tmp and /volume1 are private tmpfs mounts.
 */
#ifndef TESSEL_TESTS_SUPPORT_SCRATCH_H
#define TESSEL_TESTS_SUPPORT_SCRATCH_H

#include <string>

namespace tessel_test {

/* A fresh directory under base, removed with everything in it afterwards. */
class ScratchDir {
public:
    explicit ScratchDir(const std::string &base = "/tmp");
    ~ScratchDir();
    ScratchDir(const ScratchDir &) = delete;
    ScratchDir &operator=(const ScratchDir &) = delete;

    /* False when the directory could not be made; path() is then "". */
    bool ok() const { return !path_.empty(); }
    const std::string &path() const { return path_; }
    std::string file(const std::string &name) const { return path_ + "/" + name; }

private:
    std::string path_;
};

/* Replaces the file with exactly content; false when that failed. */
bool WriteFile(const std::string &path, const std::string &content);
/* The file's bytes, or "" when it cannot be read. */
std::string ReadFile(const std::string &path);

}  // namespace tessel_test

#endif /* TESSEL_TESTS_SUPPORT_SCRATCH_H */
