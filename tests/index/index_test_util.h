// The vacuum counter file as both index test programs read it back after
// one closing has been counted.
#ifndef TESSEL_TESTS_INDEX_INDEX_TEST_UTIL_H
#define TESSEL_TESTS_INDEX_INDEX_TEST_UTIL_H

#include <sys/wait.h>

#include <string>

#include <gtest/gtest.h>

#include "support/scratch.h"
#include "tessel_index.h"

namespace index_test {

constexpr char kCounter[] = "/tmp/tessel.tmp";
constexpr char kCounterLock[] = "/tmp/tessel.tmp.lock";

// Runs the vacuum check, waits for its child and returns the counter file.
inline std::string CountOneClosing() {
    pid_t pid = TesselCheckVaccum();
    int status = -1;
    EXPECT_LT(0, pid);
    EXPECT_EQ(pid, waitpid(pid, &status, 0));
    EXPECT_TRUE(WIFEXITED(status) && 0 == WEXITSTATUS(status)) << "status " << status;
    return tessel_test::ReadFile(kCounter);
}

}  // namespace index_test

#endif  // TESSEL_TESTS_INDEX_INDEX_TEST_UTIL_H
