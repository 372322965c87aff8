// See tessel_pathname.h.
#include "common/tessel_pathname.h"

namespace tessel {

bool TesselIsPathComponent(const std::string &strName) {
    if (strName.empty() || "." == strName || ".." == strName) {
        return false;
    }
    return std::string::npos == strName.find_first_of(std::string("/\0", 2));
}

}  // namespace tessel
