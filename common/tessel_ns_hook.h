/*
 * Where a namespace's module descriptor lives: "<dir>/" + "/" + ns + ".lib"
 * under the module directory (the doubled slash is how the path is built).
 * The hook loader reads the library from it, the settings its "app priv".
 */
#ifndef TESSEL_COMMON_TESSEL_NS_HOOK_H
#define TESSEL_COMMON_TESSEL_NS_HOOK_H

#include <string>

namespace tessel {

/* The descriptor path of strNs, which must already be a path component. */
std::string NsModuleDescriptorPath(const std::string &strNs);

}  // namespace tessel

#endif /* TESSEL_COMMON_TESSEL_NS_HOOK_H */
