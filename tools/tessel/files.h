/*
 * Files attached from the command line (--binary, --metabinary). The library
 * reads them with root's rights, so the tool first copies each one with the
 * caller's own rights into a private scratch file: what the caller cannot
 * read never reaches the store, and the caller's file is never touched.
 */
#ifndef TESSEL_TOOLS_FILES_H
#define TESSEL_TOOLS_FILES_H

#include <string>
#include <vector>

namespace tessel_cli {

class ScratchCopies {
public:
    ScratchCopies() = default;
    ~ScratchCopies();  // removes the copies that are left
    ScratchCopies(const ScratchCopies &) = delete;
    ScratchCopies &operator=(const ScratchCopies &) = delete;

    /* The copy's path; false with 1002 when the file cannot be read as a regular file. */
    bool Add(const std::string &path, std::string &copy);

private:
    std::vector<std::string> m_paths;
};

}  // namespace tessel_cli

#endif /* TESSEL_TOOLS_FILES_H */
