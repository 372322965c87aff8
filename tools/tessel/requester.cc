/* Who a call is made for, and with which effective ids. */
#include <errno.h>
#include <grp.h>
#include <pwd.h>
#include <stdlib.h>
#include <unistd.h>

#include <vector>

#include <tessel/tessel.h>

#include "cli.h"

namespace tessel_cli {

namespace {

/*
 * Back to root's effective ids when the program ends: the leak check of a
 * sanitized build stops the process with ptrace at exit, which a process
 * whose effective ids differ from its real ones is not allowed to do.
 */
void RestoreRootAtExit() {
    if (0 != setresuid(static_cast<uid_t>(-1), 0, static_cast<uid_t>(-1)) ||
        0 != setresgid(static_cast<gid_t>(-1), 0, static_cast<gid_t>(-1))) {
        _exit(kExitFailed);
    }
}

}  // namespace

bool ParseUnsigned(const std::string &option, const std::string &text, unsigned &out) {
    if (text.empty() || text.find_first_not_of("0123456789") != std::string::npos) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, option + " needs a number: " + text);
        return false;
    }
    errno = 0;
    unsigned long long value = strtoull(text.c_str(), nullptr, 10);
    if (0 != errno || value > 0xFFFFFFFFULL) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, option + " is out of range: " + text);
        return false;
    }
    out = static_cast<unsigned>(value);
    return true;
}

bool ResolveUser(const std::string &who, unsigned &uid, const std::string &what) {
    if (!who.empty() && who.find_first_not_of("0123456789") == std::string::npos) {
        return ParseUnsigned(what, who, uid);
    }
    struct passwd pw;
    struct passwd *found = nullptr;
    std::vector<char> buf(16384);
    if (who.empty() || 0 != getpwnam_r(who.c_str(), &pw, buf.data(), buf.size(), &found) || nullptr == found) {
        CLI_REFUSE(TESSEL_ERR_USER_NOT_EXISTS, "NULL == getpwnam(\"" + who + "\")");
        return false;
    }
    uid = found->pw_uid;
    return true;
}

bool ApplyAs(Context &ctx, const std::string &who) {
    unsigned uid = 0;
    if (!ResolveUser(who, uid, "--as")) {
        return false;
    }
    if (ctx.asGiven) {
        if (uid != ctx.requester) {
            CLI_REFUSE(TESSEL_ERR_USER_INPUT, "--as given twice with different users");
            return false;
        }
        return true;
    }
    if (0 != getuid()) {
        // Only a process that can switch back to root may act for others;
        // anyone else is the requester it is.
        if (uid != getuid()) {
            CLI_REFUSE(TESSEL_ERR_USER_INPUT, "--as names another user and the caller is not root");
            return false;
        }
    } else if (0 != uid) {
        struct passwd pw;
        struct passwd *found = nullptr;
        std::vector<char> buf(16384);
        if (0 != getpwuid_r(uid, &pw, buf.data(), buf.size(), &found) || nullptr == found) {
            CLI_REFUSE(TESSEL_ERR_USER_NOT_EXISTS, "NULL == getpwuid(" + std::to_string(uid) + ")");
            return false;
        }
        // The user's groups, then the effective gid, then the effective uid:
        // once the uid is the user's, the rest can no longer be changed. Real
        // and saved ids stay root so the library can raise itself where it must.
        int ngroups = 64;
        std::vector<gid_t> groups(static_cast<size_t>(ngroups));
        if (getgrouplist(found->pw_name, found->pw_gid, groups.data(), &ngroups) < 0) {
            groups.resize(static_cast<size_t>(ngroups));
            getgrouplist(found->pw_name, found->pw_gid, groups.data(), &ngroups);
        }
        groups.resize(static_cast<size_t>(ngroups));
        if (0 != setgroups(groups.size(), groups.data())) {
            CLI_REFUSE(TESSEL_ERR_OPERATION_FAILED, "0 != setgroups(user's groups)");
            return false;
        }
        if (0 != setresgid(static_cast<gid_t>(-1), found->pw_gid, static_cast<gid_t>(-1)) ||
            0 != setresuid(static_cast<uid_t>(-1), uid, static_cast<uid_t>(-1))) {
            CLI_REFUSE(TESSEL_ERR_OPERATION_FAILED, "setresgid/setresuid to " + who + " failed");
            return false;
        }
        atexit(RestoreRootAtExit);
    }
    ctx.requester = uid;
    ctx.asGiven = true;
    return true;
}

bool CompleteRequester(const Context &ctx, Json::Value &params) {
    if (ctx.asGiven) {
        params["requester"] = ctx.requester;
    } else if (!params.isMember("requester")) {
        params["requester"] = static_cast<unsigned>(getuid());
    }
    const Json::Value &jReq = params["requester"];
    if (0 != getuid() && !(jReq.isIntegral() && jReq.asLargestInt() == static_cast<Json::LargestInt>(getuid()))) {
        CLI_REFUSE(TESSEL_ERR_USER_INPUT, "\"requester\" names another user and the caller is not root");
        return false;
    }
    return true;
}

}  // namespace tessel_cli
