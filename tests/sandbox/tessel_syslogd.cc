// The sandbox's system-log receiver: binds a datagram socket (the sandbox's
// /dev/log) and appends every message it receives to a file, one line each,
// exactly as the sender formatted it. Tests read that file to check the log
// lines the library writes.
//
//   tessel-syslogd SOCKET FILE
#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <string>

namespace {

bool WriteAll(int fd, const char *p, size_t n) {
    while (n > 0) {
        ssize_t w = write(fd, p, n);
        if (w < 0 && errno == EINTR) {
            continue;
        }
        if (w <= 0) {
            return false;
        }
        p += w;
        n -= static_cast<size_t>(w);
    }
    return true;
}

}  // namespace

int main(int argc, char **argv) {
    if (argc != 3) {
        fprintf(stderr, "usage: %s SOCKET FILE\n", argv[0]);
        return 2;
    }
    int out = open(argv[2], O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0644);
    if (out < 0) {
        perror(argv[2]);
        return 1;
    }
    int sock = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    struct sockaddr_un addr;
    memset(&addr, 0, sizeof(addr));
    addr.sun_family = AF_UNIX;
    if (sock < 0 || strlen(argv[1]) >= sizeof(addr.sun_path)) {
        perror("socket");
        return 1;
    }
    strcpy(addr.sun_path, argv[1]);
    unlink(argv[1]);
    if (bind(sock, reinterpret_cast<struct sockaddr *>(&addr), sizeof(addr)) < 0) {
        perror(argv[1]);
        return 1;
    }
    // Every process of the sandbox, whatever its user, logs here.
    chmod(argv[1], 0666);
    signal(SIGPIPE, SIG_IGN);

    std::string buf(64 * 1024, '\0');
    for (;;) {
        ssize_t n = recv(sock, &buf[0], buf.size(), 0);
        if (n < 0) {
            if (errno == EINTR) {
                continue;
            }
            perror("recv");
            return 1;
        }
        size_t len = static_cast<size_t>(n);
        while (len > 0 && (buf[len - 1] == '\n' || buf[len - 1] == '\0')) {
            --len;
        }
        // Embedded line breaks would split one message into two lines.
        for (size_t i = 0; i < len; ++i) {
            if (buf[i] == '\n') {
                buf[i] = ' ';
            }
        }
        std::string line = buf.substr(0, len) + "\n";
        if (!WriteAll(out, line.data(), line.size())) {
            perror(argv[2]);
            return 1;
        }
    }
}
