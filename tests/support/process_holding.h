/*
 * A second process that takes something (a file lock, typically) and keeps
 * it while the test checks how the code under test copes.
 */
#ifndef TESSEL_TESTS_SUPPORT_PROCESS_HOLDING_H
#define TESSEL_TESTS_SUPPORT_PROCESS_HOLDING_H

#include <sys/types.h>

#include <functional>

namespace tessel_test {

/*
 * Forks a child that runs take() and reports to the parent whether it
 * succeeded; the constructor returns once it has. On success the child keeps
 * what it took until Release() or, with holdMs >= 0, for at most that long,
 * runs letGo() and exits with 0; whatever it still holds (an open file and
 * its flock) goes with it. A failed take() ends the child with 1.
 *
 * Only one at a time: a child forked while another is holding inherits the
 * other's release pipe, and that one's Release() would then wait for both.
 */
class ProcessHolding {
public:
    explicit ProcessHolding(const std::function<bool()> &take, int holdMs = -1,
                            const std::function<void()> &letGo = {});
    ~ProcessHolding();
    ProcessHolding(const ProcessHolding &) = delete;
    ProcessHolding &operator=(const ProcessHolding &) = delete;

    /* True when take() succeeded in the child. */
    bool ready() const { return ready_; }
    /* Tells the child to let go and reaps it: its wait status, or -1 when there was no child. */
    int Release();

private:
    pid_t pid_ = -1;
    int releaseFd_ = -1;
    bool ready_ = false;
};

}  // namespace tessel_test

#endif /* TESSEL_TESTS_SUPPORT_PROCESS_HOLDING_H */
