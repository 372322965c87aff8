// Running real programs, and forking with options.
#include <fcntl.h>
#include <stdio.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fstream>
#include <string>

#include <gtest/gtest.h>

#include "quor/qlib.h"
#include "support/scratch.h"

namespace {

using tessel_test::ScratchDir;

TEST(Exec, ReturnsTheExitStatus) {
    EXPECT_EQ(0, QLIBCExec("/bin/true", NULL));
    EXPECT_EQ(7, QLIBCExec("/bin/sh", "-c", "exit 7", NULL));
    char *const argv[] = {const_cast<char *>("/bin/sh"), const_cast<char *>("-c"), const_cast<char *>("exit 200"),
                          NULL};
    EXPECT_EQ(200, QLIBCExecv("/bin/sh", argv));
}

TEST(Exec, PassesArgumentsVerbatimWithoutAShell) {
    // test(1) compares its arguments: spaces, quotes and shell syntax must
    // arrive as they were given, one argument each.
    EXPECT_EQ(0, QLIBCExec("/usr/bin/test", "a b;c $HOME", "=", "a b;c $HOME", NULL));
    EXPECT_EQ(1, QLIBCExec("/usr/bin/test", "a b", "=", "a", NULL));
    EXPECT_EQ(0, QLIBCExec("/usr/bin/test", "*", "=", "*", NULL));

    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    const std::string target = dir.file("made by touch; rm -rf x");
    EXPECT_EQ(0, QLIBCExec("/usr/bin/touch", target.c_str(), NULL));
    EXPECT_TRUE(QLIBCFileExist(target.c_str()));
}

TEST(Exec, ReportsProgramsThatCannotRunOrDie) {
    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    const std::string script = dir.file("not-executable");
    std::ofstream(script) << "#!/bin/sh\nexit 0\n";
    ASSERT_EQ(0, chmod(script.c_str(), 0644));

    const std::string missing = dir.file("missing");
    for (const std::string &path : {missing, script, dir.path()}) {
        QLIBCErrClear();
        EXPECT_EQ(-1, QLIBCExec(path.c_str(), NULL)) << path;
        EXPECT_EQ(QLIBC_ERR_EXEC, QLIBCErrGet()) << path;
    }
    // The search path is not consulted: a bare name is a relative path.
    EXPECT_EQ(-1, QLIBCExec("true", NULL));

    // Killed by a signal: no exit status to give.
    QLIBCErrClear();
    EXPECT_EQ(-1, QLIBCExec("/bin/sh", "-c", "kill -KILL $$", NULL));
    EXPECT_EQ(QLIBC_ERR_EXEC, QLIBCErrGet());
}

TEST(Exec, RecordsBadArguments) {
    QLIBCErrClear();
    EXPECT_EQ(-1, QLIBCExec(NULL, NULL));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    QLIBCErrClear();
    EXPECT_EQ(-1, QLIBCExecv("/bin/true", NULL));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    char *const empty[] = {NULL};
    QLIBCErrClear();
    EXPECT_EQ(-1, QLIBCExecv("/bin/true", empty));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
}

// Forks with flags; the child runs check() and exits with its result.
template <typename Check>
int ForkAndCheck(int flags, Check check) {
    pid_t pid = QLIBCProcForkEx(flags);
    if (0 == pid) {
        _exit(check());
    }
    if (pid < 0) {
        return -1;
    }
    int status = 0;
    if (waitpid(pid, &status, 0) != pid || !WIFEXITED(status)) {
        return -1;
    }
    return WEXITSTATUS(status);
}

bool IsDevNull(int fd) {
    struct stat st;
    struct stat null;
    return 0 == fstat(fd, &st) && 0 == stat("/dev/null", &null) && S_ISCHR(st.st_mode) && st.st_rdev == null.st_rdev;
}

TEST(ProcFork, AppliesTheFlagsInTheChild) {
    const pid_t ourSession = getsid(0);
    // Without flags the child stays in our session with our streams.
    EXPECT_EQ(0, ForkAndCheck(QLIBC_FORK_NONE, [ourSession] { return (getsid(0) == ourSession) ? 0 : 1; }));
    EXPECT_EQ(0, ForkAndCheck(QLIBC_FORK_SETSID, [] { return (getsid(0) == getpid()) ? 0 : 1; }));

    // Give the test's own stdout something that is surely not /dev/null.
    fflush(stdout);
    int saved = dup(STDOUT_FILENO);
    ASSERT_GE(saved, 0);
    int devZero = open("/dev/zero", O_RDONLY);
    ASSERT_GE(devZero, 0);
    ASSERT_EQ(STDOUT_FILENO, dup2(devZero, STDOUT_FILENO));
    int plain = ForkAndCheck(QLIBC_FORK_NONE, [] { return IsDevNull(STDOUT_FILENO) ? 1 : 0; });
    int nulled = ForkAndCheck(QLIBC_FORK_NULL_STDIO | QLIBC_FORK_SETSID, [] {
        bool all = IsDevNull(STDIN_FILENO) && IsDevNull(STDOUT_FILENO) && IsDevNull(STDERR_FILENO);
        // The streams survive an exec, unlike a close-on-exec descriptor.
        bool inherited = (0 == (fcntl(STDOUT_FILENO, F_GETFD) & FD_CLOEXEC));
        return (all && inherited && getsid(0) == getpid()) ? 0 : 1;
    });
    dup2(saved, STDOUT_FILENO);
    close(saved);
    close(devZero);
    EXPECT_EQ(0, plain);
    EXPECT_EQ(0, nulled);
}

TEST(ProcFork, RefusesUnknownFlags) {
    QLIBCErrClear();
    EXPECT_EQ(-1, QLIBCProcForkEx(0x100));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
}

}  // namespace
