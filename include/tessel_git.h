/*
 * The Git version store: one non-bare repository per object. A change on an
 * older version starts a new branch, so history is a tree; the latest version
 * is the local branch tip with the greatest commit time. Versions are 40-digit
 * lower-case commit identifiers. Each function returns 0 (GitListCommitHistory:
 * a count) or the negative libgit2 result (-1), with 1008 on the error stack
 * for something not found and 1037 for any other Git failure. A null argument
 * is refused with 1015 "bad parameter", and a path of a change table of 4095
 * characters or more with 1007 "strlen(szPath) >= 4095".
 *
 * The add table maps a repository path to a file on disk whose content it
 * gets; the delete table names repository paths to remove; the rename table
 * maps a path of the base version to its new path.
 */
#ifndef TESSEL_GIT_H
#define TESSEL_GIT_H

#include <string>

#include <json/value.h>
#include <quor/qlib.h>

#include "tessel_export.h"

TESSEL_EXPORT int GitCreateRepository(const char *szRepoPath, long long mtime, QLIBSZHASH *pAddHash,
                                      QLIBSZHASH *pDelHash, const char *szAuther, const char *szMail,
                                      const char *szCommitMsg, std::string &strOutCommit);
TESSEL_EXPORT int GitCommit(const char *szRepoPath, const char *szBaseVersion, long long mtime,
                            QLIBSZHASH *pAddHash, QLIBSZHASH *pDelHash, QLIBSZHASH *pRenameHash,
                            const char *szAuther, const char *szMail, const char *szCommitMsg,
                            std::string &strOutCommit);
/* Checks version out into szDir (the repository's own work tree and HEAD stay). */
TESSEL_EXPORT int GitLoadCommit(const char *szRepoPath, const char *szVersion, const char *szDir,
                                Json::Value &jInfo);
/* Checks the latest version out into the repository's work tree. */
TESSEL_EXPORT int GitRestoreLastestCommit(const char *szRepoPath);
/* {"version", "auther", "email", "mtime", "msg", "parent"} of version (latest when NULL). */
TESSEL_EXPORT int GitGetCommitInfo(const char *szRepoPath, const char *szVersion, Json::Value &jInfo);
/* path -> "created" / "deleted" / "modified" between two versions (new: latest when NULL). */
TESSEL_EXPORT int GitDiff(const char *szRepoPath, const char *szOldVersion, const char *szNewVersion,
                          QLIBSZHASH *pOut);
TESSEL_EXPORT int GitListCommitHistory(const char *szRepoPath, unsigned int limit, unsigned int offset,
                                       bool blReverse, const Json::Value &jFilter, Json::Value &jOut);

#endif /* TESSEL_GIT_H */
