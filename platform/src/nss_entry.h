// Reentrant look-ups in the name service (passwd, group, shadow) that copy
// the answer out, so callers never see the C library's buffers. Internal to
// the platform layer.
#ifndef QUOR_NSS_ENTRY_H
#define QUOR_NSS_ENTRY_H

#include <stdio.h>
#include <sys/types.h>

#include <string>
#include <vector>

struct passwd;

namespace quor_nss {

enum class Lookup {
    kFound,
    kNotFound,  // the database answered: no such entry
    kError,     // the database could not answer (unreadable, out of memory)
};

struct PasswdEntry {
    std::string name;
    uid_t uid = 0;
    gid_t gid = 0;
    std::string gecos;
    std::string dir;
    std::string shell;
};

struct GroupEntry {
    std::string name;
    gid_t gid = 0;
};

Lookup PasswdByUid(uid_t uid, PasswdEntry *pEntry);
Lookup PasswdByName(const char *szName, PasswdEntry *pEntry);
Lookup GroupByGid(gid_t gid, GroupEntry *pEntry);
// The account expiry day of the shadow entry (days since the epoch, -1 when
// none is set).
Lookup ShadowExpireByName(const char *szName, long *pExpireDay);
// Every group of the user, the primary group first, each gid once.
bool GroupList(const char *szUser, gid_t primary, std::vector<gid_t> *pGids);

// Reads the next well-formed entry of a passwd-format stream: kFound, or
// kNotFound at the end of the stream.
Lookup NextPasswdEntry(FILE *fp, PasswdEntry *pEntry);

// The GECOS field is "full name,room,work phone,home phone,other". The full
// name is the first part; the mail address is the last part when it holds an
// '@' (the "other" field, where account tools keep it), else empty.
std::string GecosRealName(const std::string &gecos);
std::string GecosMail(const std::string &gecos);

}  // namespace quor_nss

#endif /* QUOR_NSS_ENTRY_H */
