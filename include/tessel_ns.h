/*
 * Where each namespace's data lives.
 *
 * Fixed scheme (no volume move): "<volume of the homes share>/@Tessel/<ns>".
 * Linked scheme (volume move supported): "/usr/quor/etc/tessel/ns/<ns>" is a
 * symbolic link to "<volume>/@Tessel/<ns>" on whichever volume holds it.
 * Namespace paths are cached for the life of the process.
 */
#ifndef TESSEL_NS_H
#define TESSEL_NS_H

#include <string>

#include <json/value.h>
#include <quor/qlib.h>

#include "tessel_export.h"

TESSEL_EXPORT BOOL TesselSupportVolumeMove(void);
TESSEL_EXPORT BOOL TesselGetRepoDir(std::string &strRepo);
TESSEL_EXPORT BOOL TesselGetNSPath(const std::string &strNS, std::string &strNSPath);
TESSEL_EXPORT BOOL TesselFindNSPath(const std::string &strNS, const std::string &strPkgId, std::string &strNSPath);
/*
 * Places the namespace (an existing link that resolves to a directory is kept
 * as it is), links it, and creates its directory and scratch directory. The
 * link directory is created (root only) when missing; a link that resolves to
 * no directory is replaced.
 */
TESSEL_EXPORT BOOL TesselSetNSPath(const std::string &strNS, const std::string &strPkgId, std::string &strNSPath);
/* Re-points the namespace's link after a move; this process forgets its cached
 * path and uses the new one from then on (other processes keep theirs). */
TESSEL_EXPORT BOOL TesselResetNSPath(const std::string &strNS, const std::string &strNSPath);
TESSEL_EXPORT BOOL TesselGetNSStatus(const std::string &strNS);
TESSEL_EXPORT BOOL TesselGetNSVolumePath(const std::string &strNS, std::string &strVolPath);
TESSEL_EXPORT BOOL TesselGetNSTmpDir(const std::string &strNS, std::string &strTmpDir);
/* A new empty scratch file; the caller removes it. */
TESSEL_EXPORT BOOL TesselGetNSTmpFile(const std::string &strNS, std::string &strTmpFile);
/* The path of a stored text / meta-binary file; the result says whether it exists. */
TESSEL_EXPORT BOOL TesselGetTextPath(const std::string &strNs, const std::string &strId,
                                     const std::string &strName, std::string &strPath);
TESSEL_EXPORT BOOL TesselGetMetaBinaryPath(const std::string &strNs, const std::string &strId,
                                           const std::string &strName, std::string &strPath);
/* mkdir -p as root; created directories get owner uid (UID_ERR: unchanged), group users, mode. */
TESSEL_EXPORT BOOL TesselRootFSMkdirP(const char *szPath, unsigned int uid, mode_t mode = 0700);
/* Clears the parent of the objects jIds (an id or an array of ids) of the namespace. */
TESSEL_EXPORT BOOL TesselResetParentID(const std::string &strNs, const Json::Value &jIds);

#endif /* TESSEL_NS_H */
