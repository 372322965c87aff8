/* Scratch copies of attached files. */
#include <errno.h>
#include <fcntl.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <tessel/tessel.h>

#include "cli.h"
#include "files.h"

namespace tessel_cli {

namespace {

bool CopyAll(int in, int out) {
    char buf[65536];
    for (;;) {
        ssize_t n = read(in, buf, sizeof(buf));
        if (n < 0 && EINTR == errno) {
            continue;
        }
        if (n <= 0) {
            return 0 == n;
        }
        for (ssize_t done = 0; done < n;) {
            ssize_t w = write(out, buf + done, static_cast<size_t>(n - done));
            if (w < 0 && EINTR == errno) {
                continue;
            }
            if (w <= 0) {
                return false;
            }
            done += w;
        }
    }
}

}  // namespace

ScratchCopies::~ScratchCopies() {
    for (const std::string &path : m_paths) {
        unlink(path.c_str());
    }
}

bool ScratchCopies::Add(const std::string &path, std::string &copy) {
    int in = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY);
    struct stat st;
    if (in < 0 || 0 != fstat(in, &st) || !S_ISREG(st.st_mode)) {
        if (in >= 0) {
            close(in);
        }
        CLI_REFUSE(TESSEL_ERR_OPEN_FILE, "cannot read " + path + " as a regular file");
        return false;
    }
    std::string name = "/tmp/tessel-attach-XXXXXX";
    int out = mkostemp(&name[0], O_CLOEXEC);
    if (out < 0) {
        close(in);
        CLI_REFUSE(TESSEL_ERR_OPEN_FILE, "0 > mkostemp(" + name + ")");
        return false;
    }
    m_paths.push_back(name);
    const bool ok = CopyAll(in, out);
    close(in);
    if (0 != close(out) || !ok) {
        CLI_REFUSE(TESSEL_ERR_READ_FILE, "cannot copy " + path);
        return false;
    }
    copy = name;
    return true;
}

}  // namespace tessel_cli
