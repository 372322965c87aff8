/*
 * QLIBC / QLIB: the general-purpose half of the appliance platform, built on
 * Linux facilities. Every call that receives an invalid argument records the
 * platform error state (QLIBCErrSetEx with QLIBC_ERR_BAD_PARAMETERS, the
 * source file and line) before it fails.
 */
#ifndef QUOR_QLIB_H
#define QUOR_QLIB_H

#include <stddef.h>
#include <sys/types.h>

#include "quor_export.h"

#ifdef __cplusplus
extern "C" {
#endif

typedef int BOOL;
#ifndef TRUE
#define TRUE 1
#endif
#ifndef FALSE
#define FALSE 0
#endif

/* ---- platform error state (per thread) ----------------------------------- */
#define QLIBC_ERR_NONE 0x0000
#define QLIBC_ERR_UNKNOWN 0x0100
#define QLIBC_ERR_OUT_OF_MEMORY 0x0200
#define QLIBC_ERR_FILE_OPEN 0x0400
#define QLIBC_ERR_FILE_READ 0x0500
#define QLIBC_ERR_FILE_WRITE 0x0600
#define QLIBC_ERR_NOT_FOUND 0x0A00
#define QLIBC_ERR_BAD_PARAMETERS 0x0D00
#define QLIBC_ERR_LOCK_TIMEOUT 0x0E00
#define QLIBC_ERR_EXEC 0x0F00
#define QLIBC_ERR_PLUGIN 0x1000
#define QLIBC_ERR_DB 0x1100

QUOR_EXPORT void QLIBCErrSetEx(int code, const char *szFile, int line);
QUOR_EXPORT int QLIBCErrGet(void);               /* 0 when nothing was recorded */
QUOR_EXPORT const char *QLIBCErrFileGet(void);   /* "" when nothing was recorded */
QUOR_EXPORT int QLIBCErrLineGet(void);
QUOR_EXPORT void QLIBCErrClear(void);

/* ---- string lists ---------------------------------------------------------- */
typedef struct _tag_QLIBSZLIST QLIBSZLIST;

QUOR_EXPORT QLIBSZLIST *QLIBCSzListAlloc(int nInitialSize);
QUOR_EXPORT void QLIBCSzListFree(QLIBSZLIST *pList);
/* Appends a copy of szValue; may reallocate *ppList. Returns the new count, or -1. */
QUOR_EXPORT int QLIBCSzListPush(QLIBSZLIST **ppList, const char *szValue);
QUOR_EXPORT int QLIBCSzListCount(const QLIBSZLIST *pList);
/* The idx-th entry, or NULL when out of range. */
QUOR_EXPORT const char *QLIBCSzListGet(const QLIBSZLIST *pList, int idx);
QUOR_EXPORT void QLIBCSzListClear(QLIBSZLIST *pList);

/* ---- string hashes (string -> string, insertion order kept) -------------- */
typedef struct _tag_QLIBSZHASH QLIBSZHASH;

QUOR_EXPORT QLIBSZHASH *QLIBCSzHashAlloc(int nInitialSize);
QUOR_EXPORT void QLIBCSzHashFree(QLIBSZHASH *pHash);
/* Sets or replaces; returns 0, or -1. */
QUOR_EXPORT int QLIBCSzHashSetValue(QLIBSZHASH *pHash, const char *szKey, const char *szValue);
/* The value, or NULL when the key is absent. */
QUOR_EXPORT const char *QLIBCSzHashGetValue(const QLIBSZHASH *pHash, const char *szKey);
QUOR_EXPORT int QLIBCSzHashRemove(QLIBSZHASH *pHash, const char *szKey);
QUOR_EXPORT int QLIBCSzHashCount(const QLIBSZHASH *pHash);
/* Pushes every key, in insertion order, onto *ppList; returns the key count or -1. */
QUOR_EXPORT int QLIBCSzHashEnumKey(const QLIBSZHASH *pHash, QLIBSZLIST **ppList);

/* ---- files --------------------------------------------------------------- */
QUOR_EXPORT BOOL QLIBCFileExist(const char *szPath);    /* anything at the path (follows links) */
QUOR_EXPORT BOOL QLIBCFileCheckDir(const char *szPath); /* a directory (follows links) */

#define QLIBC_FILE_LOCK_SH 0
#define QLIBC_FILE_LOCK_EX 1
/*
 * flock()s szPath (created 0644 when missing) in the given mode, retrying until
 * timeoutUs microseconds have passed (0: one try; negative: wait for ever).
 * Returns 1 with *pFd holding the locked descriptor (release with
 * flock(fd, LOCK_UN) and close), 0 on time-out (QLIBC_ERR_LOCK_TIMEOUT), -1 on
 * error. *pFd is -1 unless locked. A symbolic link or anything but a regular
 * file at szPath is an error.
 */
QUOR_EXPORT int QLIBCFileLockTimeByFile(const char *szPath, int mode, long long timeoutUs, int *pFd);

/*
 * Reads key from a file of KEY="value" (or KEY=value) lines; '#' starts a
 * comment line, a value may contain '=', and when a key appears twice the last
 * line wins. Returns the value's full length (the value copied, always
 * terminated, cut to cbBuf - 1, so a result >= cbBuf means it was cut), or -1
 * when the file or key is missing (QLIBC_ERR_NOT_FOUND) or unreadable.
 */
QUOR_EXPORT int QLIBCFileGetKeyValue(const char *szPath, const char *szKey, char *szBuf, size_t cbBuf);
/* Sets key in such a file (as KEY="value"), creating the file (0644) when
 * missing. The file is replaced atomically, keeping its other lines, mode and
 * owner; a value with a line break is refused. 0, or -1. */
QUOR_EXPORT int QLIBCFileSetKeyValue(const char *szPath, const char *szKey, const char *szValue);

/* ---- base64 (standard alphabet, '=' padding) ----------------------------- */
/*
 * Encodes nIn bytes into szOut (terminated); blLineBreak puts a newline after
 * every 76 characters except at the end. Needs cbOut >= 4 * ceil(nIn / 3) + 1
 * (plus the newlines); a shorter buffer fails as a bad parameter.
 */
QUOR_EXPORT BOOL QLIBCBase64SzEncodeFull(const unsigned char *pIn, size_t nIn, char *szOut,
                                         size_t cbOut, BOOL blLineBreak);
/*
 * Decodes; *pnOut is the capacity of pOut on entry and the decoded length on
 * return. Blanks and line breaks are skipped; anything else that is not a
 * whole number of padded groups, or data that does not fit, fails as a bad
 * parameter with pOut's bytes unspecified but never written past *pnOut.
 */
QUOR_EXPORT BOOL QLIBCBase64Decode(const char *szIn, size_t nIn, char *pOut, size_t *pnOut);

/* ---- text ---------------------------------------------------------------- */
/*
 * Upper-cases UTF-8 text into szOut (terminated) by the simple (one code point
 * to one code point) Unicode mapping, so the length in bytes may change.
 * 0, or -1 on invalid UTF-8 or a short buffer.
 */
QUOR_EXPORT int QLIBCUTF8StrToUpper(const char *szIn, char *szOut, size_t cbOut);

/* ---- processes ----------------------------------------------------------- */
/*
 * Runs szPath with the NULL-terminated argument list (argv[0] is szPath) and
 * waits for it. Returns its exit status, or -1 when it could not be run or
 * was killed by a signal.
 */
QUOR_EXPORT int QLIBCExec(const char *szPath, ...);
/* As QLIBCExec with an argument vector (argv[0] included, NULL-terminated). */
QUOR_EXPORT int QLIBCExecv(const char *szPath, char *const argv[]);

#define QLIBC_FORK_NONE 0x0
#define QLIBC_FORK_SETSID 0x1   /* the child starts a new session */
#define QLIBC_FORK_NULL_STDIO 0x2 /* the child's standard streams go to /dev/null */
/* fork() with options. Returns the child's pid in the parent, 0 in the child, -1 on failure. */
QUOR_EXPORT pid_t QLIBCProcForkEx(int flags);

/* ---- services ------------------------------------------------------------ */
/* "pgsql": the PostgreSQL server answers on the default connection (PQping). */
QUOR_EXPORT BOOL QLIBServiceIsRunning(const char *szService);

/* ---- users and groups ---------------------------------------------------- */
#define AUTH_LOCAL 0x01
#define AUTH_DOMAIN 0x02
#define AUTH_LDAP 0x08

typedef struct _tag_QUORUSER QUORUSER; /* defined in quor.h */

/* The display (real) name of a user: the full-name part of the GECOS field,
 * or the login name when that is empty. 0, or -1 for an unknown user or a
 * buffer too short for the whole name. */
QUOR_EXPORT int QLIBUserRealNameGet(const char *szUser, char *szBuf, size_t cbBuf);
/* Pushes the decimal gid of every group the user belongs to (primary first,
 * each once) onto *ppList, an allocated list. Returns the count pushed, or -1
 * for an unknown user. */
QUOR_EXPORT int QLIBGroupInfoListGet(const char *szUser, QLIBSZLIST **ppList);

/* Called once per user; a negative result stops the enumeration. */
typedef int (*QLIBUSERENUMCALLBACK)(const QUORUSER *pUser, void *pData);
/*
 * Enumerates the users of authType (only AUTH_LOCAL: the accounts of the local
 * passwd file; any other type is a bad parameter) whose name contains szQuery
 * (ignoring ASCII case; NULL: all), skipping the first offset and returning at
 * most limit (-1: no limit), in passwd order. The record passed to the
 * callback is valid during the call only. Returns the number of users handed
 * to the callback (the one that stopped it included), or -1.
 */
QUOR_EXPORT int QLIBUserInfoEnum(int authType, const char *szQuery, int offset, int limit,
                                 QLIBUSERENUMCALLBACK callback, void *pData);

/* ---- plug-ins ------------------------------------------------------------ */
typedef struct _tag_QLIBPLUGIN QLIBPLUGIN;

/*
 * Loads the plug-in module szPath (a shared object; a path without "/" is
 * looked for in each directory of pSearchPath, in order, and nowhere else),
 * checks that it implements the interface version major.minor and runs its
 * init. See quor/qlib_plugin.h for what a module exports and how arguments
 * reach it. 0 with *ppPlugin set, or -1 (QLIBC_ERR_NOT_FOUND, QLIBC_ERR_PLUGIN).
 */
QUOR_EXPORT int QLIBPluginInit(const char *szPath, const QLIBSZLIST *pSearchPath, int major, int minor,
                               QLIBPLUGIN **ppPlugin);
QUOR_EXPORT BOOL QLIBPluginHasInit(const QLIBPLUGIN *pPlugin);
QUOR_EXPORT int QLIBPluginSetArg(QLIBPLUGIN *pPlugin, const char *szName, const char *szValue);
QUOR_EXPORT int QLIBPluginSetArgByInt(QLIBPLUGIN *pPlugin, const char *szName, int value);
/* Runs the module's action with the arguments set since the last action;
 * its result (negative on failure, recorded as QLIBC_ERR_PLUGIN). */
QUOR_EXPORT int QLIBPluginAction(const char *szAction, QLIBPLUGIN *pPlugin);
/* Unloads the module and frees the plug-in; 0, or -1. */
QUOR_EXPORT int QLIBPluginExit(QLIBPLUGIN *pPlugin);

#ifdef __cplusplus
}
#endif

#endif /* QUOR_QLIB_H */
