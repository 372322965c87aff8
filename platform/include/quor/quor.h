/*
 * QUOR: the system half of the appliance platform: users and groups, shares
 * and volumes, directories and file copy. The database wrapper is in
 * quor/quor_db.h, HTTP output in quor/quor_web.h.
 *
 * Shares, volumes and services are described by the platform configuration
 * file QUOR_PLATFORM_CONF, a file of KEY="value" lines:
 *
 *   share_<name>_path="/volume1/<name>"   a share and its directory
 *   userhome_local="yes"                 user homes for local users  (AUTH_LOCAL)
 *   userhome_domain="yes"                ... for domain users        (AUTH_DOMAIN)
 *   userhome_ldap="yes"                  ... for directory users     (AUTH_LDAP)
 *   removable_model="no"                 the device is a removable-storage model
 *
 * A missing file or key falls back to the defaults of a fresh machine: the
 * "homes" share at /volume1/homes, user homes enabled, not a removable model.
 * A switch is on for "yes" and off for "no" (any case); another value keeps
 * the default. A file that exists but cannot be read, or a share path that is
 * not absolute, is an error rather than a reason to use the defaults.
 * A share's volume is the "/volumeN" prefix of its path; its temporary
 * directory is that volume followed by "/@tmp".
 */
#ifndef QUOR_QUOR_H
#define QUOR_QUOR_H

#include <stddef.h>
#include <sys/types.h>

#include "qlib.h"

#ifdef __cplusplus
extern "C" {
#endif

#define QUOR_PLATFORM_CONF "/usr/quor/etc/platform.conf"

/* ---- users and groups (NSS and the shadow database) ---------------------- */
/*
 * A user record. szRealName and szMail come from the GECOS field
 * ("full name,room,work phone,home phone,other"): the full name is its first
 * comma-separated part (possibly empty), the mail address its last part when
 * that part holds an "@" (empty otherwise), which is where account tools keep
 * it ("Alice Able,Room 1,555-0101,,alice@example.com"). A GECOS of one part
 * is the full name, and the mail address too when it holds an "@".
 */
struct _tag_QUORUSER {
    char *szName;
    uid_t uid;
    gid_t gid;      /* primary group */
    char *szRealName;
    char *szMail;
    char *szHomeDir;
    char *szShell;
};

typedef struct _tag_QUORGROUP {
    char *szName;
    gid_t gid;
} QUORGROUP;

/* 0 with *ppUser allocated (free with QUORUserFree), -1 when unknown or on error. */
QUOR_EXPORT int QUORUserGetByUID(uid_t uid, QUORUSER **ppUser);
QUOR_EXPORT int QUORUserGet(const char *szName, QUORUSER **ppUser);
QUOR_EXPORT void QUORUserFree(QUORUSER *pUser);
/*
 * 1 when the account has expired (the shadow entry's account expiry day,
 * counted in days since 1970-01-01, is today or earlier: the account is closed
 * from that day on, as login and PAM see it), 0 when it has not (or has no
 * expiry date), -1 for a user without a shadow entry or when the shadow
 * database cannot be read (needs root).
 */
QUOR_EXPORT int QUORUserCheckExpired(const char *szName);
QUOR_EXPORT int QUORGroupGetByGID(gid_t gid, QUORGROUP **ppGroup);
QUOR_EXPORT void QUORGroupFree(QUORGROUP *pGroup);

/* Whether the user-home service is enabled for the authentication type (AUTH_*). */
QUOR_EXPORT BOOL QUORServiceUserHomeIsEnabled(int authType, void *pReserved);

/* ---- shares and volumes -------------------------------------------------- */
typedef struct _tag_QUORSHARE {
    char *szName;
    char *szPath;
} QUORSHARE;

/* 0 with *ppShare allocated (free with QUORShareFree), -1 when the share is unknown. */
QUOR_EXPORT int QUORShareGet(const char *szName, QUORSHARE **ppShare);
QUOR_EXPORT void QUORShareFree(QUORSHARE *pShare);
/* The volume ("/volumeN") that holds szPath; 0, or -1 when the path is on no volume. */
QUOR_EXPORT int QUORShareBinPathGet(const char *szPath, char *szVolume, size_t cbVolume);
/* The temporary directory of the volume that holds szPath (volume + "/@tmp"); 0, or -1. */
QUOR_EXPORT int QUORShareTmpPathGet(const char *szPath, char *szTmpPath, size_t cbTmpPath);
/* Whether this device is a removable-storage appliance model. */
QUOR_EXPORT BOOL QUORIsRemovableModel(void);

typedef struct _tag_QUORVOLINFO {
    char szVolPath[64];   /* "/volumeN" */
    int volNumber;        /* N */
    char szRelPath[4096]; /* the rest of the path from its "/", "" for the volume itself;
                             szVolPath followed by szRelPath is the path */
} QUORVOLINFO;
/* Splits a path into its volume and the rest; 0, or -1 when it is on no volume.
 * A path is on volume N when it starts with "/volume" and N (decimal, at least
 * 1, no leading zeros) followed by "/" or its end: "/volume1x" and "/volumes"
 * are on none. A path with a ".." component is on none either. */
QUOR_EXPORT int VolumePathParseEx(const char *szPath, QUORVOLINFO *pVolInfo);

/* ---- directories and files ----------------------------------------------- */
/*
 * mkdir -p: creates szPath (and, with blParents, every missing parent). Each
 * directory it creates gets owner uid, group gid (either may be (uid_t)-1 /
 * (gid_t)-1 to leave it as created) and mode; directories that already exist
 * are left alone. When pCreated is not NULL, the created directories are
 * pushed onto *pCreated, outermost first. 0, or -1: a failure removes the
 * directories this call created; a path with a "." or ".." component, or a
 * mode beyond 07777, is refused.
 */
QUOR_EXPORT int QUORFSMkdirP(const char *szPath, QLIBSZLIST **pCreated, BOOL blParents, uid_t uid,
                             gid_t gid, mode_t mode);

typedef struct _tag_QUORFILECOPYARG {
    BOOL blOverwrite;    /* replace an existing destination (else fail) */
    BOOL blKeepOwner;    /* give the copy the source's owner and group */
    BOOL blKeepMode;     /* give the copy the source's permission bits (else 0600) */
} QUORFILECOPYARG;
/* Copies a regular file through a temporary file in the destination's
 * directory (fsync'ed, then renamed into place), so a failure leaves the
 * destination as it was; 0, or -1. A NULL pArg means overwrite, keep neither
 * owner nor mode. A directory is never replaced. */
QUOR_EXPORT int QUORFileCopy(const char *szSrc, const char *szDest, const QUORFILECOPYARG *pArg);

#ifdef __cplusplus
}
#endif

#endif /* QUOR_QUOR_H */
