/*
 * The privilege-raising section: root-only work (the settings file, namespace
 * links and directories, lock files, module descriptors, the database)
 * happens inside one of these and nowhere else.
 *
 * Entering switches the effective gid and then the effective uid to 0
 * (setresgid(-1, 0, -1), setresuid(-1, 0, -1)); leaving switches the gid and
 * then the uid back (the gid must be restored while still root, or a caller
 * whose saved gid is not its own group could not get its group back). Each switch is logged at LOG_AUTH|LOG_INFO as
 * "<module>:<line> WARNING: setresgid(-1, 0, -1)" (or ERROR with the reason,
 * followed by "ERROR: ENTERCriticalSection" / "ERROR: LEAVECriticalSection");
 * errno is 0 afterwards, or 1 when a switch failed. A failed switch never
 * aborts the caller: the work then runs with the caller's own rights.
 *
 * The effective ids belong to the whole process, so sections are counted
 * process-wide: the first section entered raises and the last one left
 * restores. A section on one thread therefore never drops root from under a
 * section running on another, and nested sections cost nothing.
 */
#ifndef TESSEL_COMMON_TESSEL_PRIV_H
#define TESSEL_COMMON_TESSEL_PRIV_H

namespace tessel {

class RootSection {
public:
    RootSection(const char *szModule, int line);
    ~RootSection();
    RootSection(const RootSection &) = delete;
    RootSection &operator=(const RootSection &) = delete;

private:
    const char *m_szModule;
    int m_line;
};

}  // namespace tessel

#define TESSEL_PRIV_CONCAT2(a, b) a##b
#define TESSEL_PRIV_CONCAT(a, b) TESSEL_PRIV_CONCAT2(a, b)
/* Root for the rest of the enclosing scope. */
#define TESSEL_AS_ROOT() \
    ::tessel::RootSection TESSEL_PRIV_CONCAT(tesselRootSection_, __LINE__)(kTesselModule, __LINE__)

#endif /* TESSEL_COMMON_TESSEL_PRIV_H */
