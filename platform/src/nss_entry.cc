#include "nss_entry.h"

#include <errno.h>
#include <grp.h>
#include <pwd.h>
#include <shadow.h>

namespace quor_nss {

namespace {

// Entries are small; the cap only stops a corrupt database from making the
// retry loop allocate without end.
constexpr size_t kFirstBuffer = 1024;
constexpr size_t kMaxBuffer = 1 << 20;

// Runs a *_r look-up with a growing buffer. fn(buf, size, &found) returns
// the look-up's error number.
template <typename Fn>
Lookup WithBuffer(Fn fn) {
    std::vector<char> buf(kFirstBuffer);
    for (;;) {
        bool found = false;
        int err = fn(buf.data(), buf.size(), &found);
        if (ERANGE == err && buf.size() < kMaxBuffer) {
            buf.resize(buf.size() * 2);
            continue;
        }
        if (found) {
            return Lookup::kFound;
        }
        // The *_r calls report "no such entry" as 0 or, depending on the
        // backend, ENOENT or ESRCH.
        return (0 == err || ENOENT == err || ESRCH == err) ? Lookup::kNotFound : Lookup::kError;
    }
}

void CopyPasswd(const struct passwd &pw, PasswdEntry *pEntry) {
    pEntry->name = pw.pw_name ? pw.pw_name : "";
    pEntry->uid = pw.pw_uid;
    pEntry->gid = pw.pw_gid;
    pEntry->gecos = pw.pw_gecos ? pw.pw_gecos : "";
    pEntry->dir = pw.pw_dir ? pw.pw_dir : "";
    pEntry->shell = pw.pw_shell ? pw.pw_shell : "";
}

std::vector<std::string> SplitGecos(const std::string &gecos) {
    std::vector<std::string> parts;
    size_t start = 0;
    for (;;) {
        size_t comma = gecos.find(',', start);
        parts.push_back(gecos.substr(start, (std::string::npos == comma) ? std::string::npos : comma - start));
        if (std::string::npos == comma) {
            return parts;
        }
        start = comma + 1;
    }
}

}  // namespace

Lookup PasswdByUid(uid_t uid, PasswdEntry *pEntry) {
    return WithBuffer([&](char *buf, size_t size, bool *pFound) {
        struct passwd pw;
        struct passwd *result = NULL;
        int err = getpwuid_r(uid, &pw, buf, size, &result);
        if (0 == err && NULL != result) {
            CopyPasswd(pw, pEntry);
            *pFound = true;
        }
        return err;
    });
}

Lookup PasswdByName(const char *szName, PasswdEntry *pEntry) {
    return WithBuffer([&](char *buf, size_t size, bool *pFound) {
        struct passwd pw;
        struct passwd *result = NULL;
        int err = getpwnam_r(szName, &pw, buf, size, &result);
        if (0 == err && NULL != result) {
            CopyPasswd(pw, pEntry);
            *pFound = true;
        }
        return err;
    });
}

Lookup GroupByGid(gid_t gid, GroupEntry *pEntry) {
    return WithBuffer([&](char *buf, size_t size, bool *pFound) {
        struct group gr;
        struct group *result = NULL;
        int err = getgrgid_r(gid, &gr, buf, size, &result);
        if (0 == err && NULL != result) {
            pEntry->name = gr.gr_name ? gr.gr_name : "";
            pEntry->gid = gr.gr_gid;
            *pFound = true;
        }
        return err;
    });
}

Lookup ShadowExpireByName(const char *szName, long *pExpireDay) {
    return WithBuffer([&](char *buf, size_t size, bool *pFound) {
        struct spwd sp;
        struct spwd *result = NULL;
        int err = getspnam_r(szName, &sp, buf, size, &result);
        if (0 == err && NULL != result) {
            *pExpireDay = sp.sp_expire;
            *pFound = true;
        }
        return err;
    });
}

bool GroupList(const char *szUser, gid_t primary, std::vector<gid_t> *pGids) {
    std::vector<gid_t> groups(32);
    for (;;) {
        int n = static_cast<int>(groups.size());
        if (getgrouplist(szUser, primary, groups.data(), &n) >= 0) {
            groups.resize(static_cast<size_t>(n));
            break;
        }
        // n now holds the number needed.
        if (n <= static_cast<int>(groups.size()) || static_cast<size_t>(n) > kMaxBuffer) {
            return false;
        }
        groups.resize(static_cast<size_t>(n));
    }
    pGids->clear();
    pGids->push_back(primary);
    for (gid_t gid : groups) {
        bool seen = false;
        for (gid_t have : *pGids) {
            seen = seen || (have == gid);
        }
        if (!seen) {
            pGids->push_back(gid);
        }
    }
    return true;
}

Lookup NextPasswdEntry(FILE *fp, PasswdEntry *pEntry) {
    std::vector<char> buf(kFirstBuffer);
    for (;;) {
        off_t start = ftello(fp);
        struct passwd pw;
        struct passwd *result = NULL;
        int err = fgetpwent_r(fp, &pw, buf.data(), buf.size(), &result);
        if (0 == err && NULL != result) {
            CopyPasswd(pw, pEntry);
            return Lookup::kFound;
        }
        if (ERANGE == err && buf.size() < kMaxBuffer && start >= 0 && 0 == fseeko(fp, start, SEEK_SET)) {
            buf.resize(buf.size() * 2);
            continue;
        }
        return (ENOENT == err) ? Lookup::kNotFound : Lookup::kError;
    }
}

std::string GecosRealName(const std::string &gecos) { return SplitGecos(gecos).front(); }

std::string GecosMail(const std::string &gecos) {
    std::vector<std::string> parts = SplitGecos(gecos);
    const std::string &last = parts.back();
    return (std::string::npos != last.find('@')) ? last : std::string();
}

}  // namespace quor_nss
