// Where a namespace's hook module is: its descriptor file names the library.
#include <unistd.h>

#include <string>

#include <json/value.h>

#include "common/tessel_json.h"
#include "common/tessel_ns_hook.h"
#include "common/tessel_pathname.h"
#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_hook.h"

static constexpr const char kTesselModule[] = "common/tessel_ns_hook";

namespace {

// The directory of module descriptors; the descriptor path joins another "/"
// onto it, and the doubled slash is left as it is.
constexpr const char SZD_TESSEL_NS_MODULE[] = "/usr/local/libexec/tessel/";
constexpr const char SZ_TESSEL_NS_MODULE_SUFFIX[] = ".lib";

}  // namespace

std::string tessel::NsModuleDescriptorPath(const std::string &strNs) {
    return std::string(SZD_TESSEL_NS_MODULE) + "/" + strNs + SZ_TESSEL_NS_MODULE_SUFFIX;
}

std::string TesselNsHookPath(const std::string &strNs) {
    TESSEL_CHECK(!tessel::TesselIsPathComponent(strNs), TESSEL_ERR_USER_INPUT, "!TesselIsPathComponent(strNs)",
                 std::string());
    const std::string strPath = tessel::NsModuleDescriptorPath(strNs);
    // No descriptor is the common case (a namespace without hooks), not an error.
    if (0 != access(strPath.c_str(), R_OK)) {
        return std::string();
    }
    Json::Value jDesc;
    bool blParsed = false;
    {
        // Descriptors are installed readable by root alone.
        TESSEL_AS_ROOT();
        blParsed = tessel::fromFile(jDesc, strPath);
    }
    TESSEL_CHECK_APPEND(!blParsed, "!jDesc.fromFile(strPath)", std::string());
    if (!jDesc.isObject() || !jDesc["lib"].isString()) {
        return std::string();
    }
    return jDesc["lib"].asString();
}
