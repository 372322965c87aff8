// Running programs without a shell, and forking with options.
#include <errno.h>
#include <fcntl.h>
#include <spawn.h>
#include <stdarg.h>
#include <sys/wait.h>
#include <unistd.h>

#include <vector>

#include "quor/qlib.h"

extern char **environ;

namespace {

// posix_spawn rather than fork + exec: it reports a program that cannot be
// started as an error of the call instead of an exit status that a real
// program could return too, and it is safe in a threaded process.
int SpawnAndWait(const char *szPath, char *const argv[]) {
    pid_t pid = -1;
    int err = posix_spawn(&pid, szPath, NULL, NULL, argv, environ);
    if (0 != err) {
        QLIBCErrSetEx(QLIBC_ERR_EXEC, __FILE__, __LINE__);
        errno = err;
        return -1;
    }
    int status = 0;
    while (waitpid(pid, &status, 0) < 0) {
        if (EINTR != errno) {
            QLIBCErrSetEx(QLIBC_ERR_EXEC, __FILE__, __LINE__);
            return -1;
        }
    }
    if (!WIFEXITED(status)) {
        QLIBCErrSetEx(QLIBC_ERR_EXEC, __FILE__, __LINE__);
        return -1;
    }
    return WEXITSTATUS(status);
}

// Runs in the new child, where only async-signal-safe calls are allowed.
// Neither call can fail here in practice: a fresh child never leads a process
// group, and nullFd is a valid descriptor. Everything that can fail is done
// by the parent before the fork.
bool PrepareChild(int flags, int nullFd) {
    if ((flags & QLIBC_FORK_SETSID) && setsid() < 0) {
        return false;
    }
    if (nullFd >= 0) {
        for (int target = STDIN_FILENO; target <= STDERR_FILENO; ++target) {
            // dup2 onto itself keeps close-on-exec, which the stream must lose.
            int ret = (target == nullFd) ? fcntl(target, F_SETFD, 0) : dup2(nullFd, target);
            if (ret < 0) {
                return false;
            }
        }
        if (nullFd > STDERR_FILENO) {
            close(nullFd);
        }
    }
    return true;
}

}  // namespace

extern "C" {

int QLIBCExecv(const char *szPath, char *const argv[]) {
    if (NULL == szPath || '\0' == szPath[0] || NULL == argv || NULL == argv[0]) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    return SpawnAndWait(szPath, argv);
}

int QLIBCExec(const char *szPath, ...) {
    if (NULL == szPath || '\0' == szPath[0]) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    std::vector<char *> argv;
    argv.push_back(const_cast<char *>(szPath));
    va_list ap;
    va_start(ap, szPath);
    for (;;) {
        char *arg = va_arg(ap, char *);
        argv.push_back(arg);
        if (NULL == arg) {
            break;
        }
    }
    va_end(ap);
    return SpawnAndWait(szPath, argv.data());
}

pid_t QLIBCProcForkEx(int flags) {
    if (0 != (flags & ~(QLIBC_FORK_SETSID | QLIBC_FORK_NULL_STDIO))) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    int nullFd = -1;
    if (flags & QLIBC_FORK_NULL_STDIO) {
        nullFd = open("/dev/null", O_RDWR | O_CLOEXEC);
        if (nullFd < 0) {
            QLIBCErrSetEx(QLIBC_ERR_FILE_OPEN, __FILE__, __LINE__);
            return -1;
        }
    }
    pid_t pid = fork();
    if (0 == pid) {
        if (!PrepareChild(flags, nullFd)) {
            _exit(127);
        }
        return 0;
    }
    int saved = errno;
    if (nullFd >= 0) {
        close(nullFd);
    }
    if (pid < 0) {
        QLIBCErrSetEx(QLIBC_ERR_UNKNOWN, __FILE__, __LINE__);
        errno = saved;
        return -1;
    }
    return pid;
}

}  // extern "C"
