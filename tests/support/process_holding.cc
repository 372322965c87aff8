#include "support/process_holding.h"

#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

namespace tessel_test {

ProcessHolding::ProcessHolding(const std::function<bool()> &take, int holdMs, const std::function<void()> &letGo) {
    int ready[2];
    int release[2];
    if (0 != pipe(ready)) {
        return;
    }
    if (0 != pipe(release)) {
        close(ready[0]);
        close(ready[1]);
        return;
    }
    pid_ = fork();
    if (0 == pid_) {
        close(ready[0]);
        close(release[1]);
        char result = take() ? 'y' : 'n';
        if (1 != write(ready[1], &result, 1) || 'y' != result) {
            _exit(1);
        }
        // Wakes on EOF, when the parent closes its end, or when the time is up.
        struct pollfd pfd = {release[0], POLLIN, 0};
        poll(&pfd, 1, holdMs);
        if (letGo) {
            letGo();
        }
        _exit(0);
    }
    close(ready[1]);
    close(release[0]);
    if (0 > pid_) {
        close(ready[0]);
        close(release[1]);
        return;
    }
    releaseFd_ = release[1];
    char result = 'n';
    ready_ = (1 == read(ready[0], &result, 1) && 'y' == result);
    close(ready[0]);
}

ProcessHolding::~ProcessHolding() { Release(); }

int ProcessHolding::Release() {
    if (0 <= releaseFd_) {
        close(releaseFd_);
        releaseFd_ = -1;
    }
    int status = -1;
    if (0 < pid_) {
        if (pid_ != waitpid(pid_, &status, 0)) {
            status = -1;
        }
        pid_ = -1;
    }
    return status;
}

}  // namespace tessel_test
