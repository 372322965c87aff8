// The backend registry: backend name -> factory, filled by the backends' own
// static registrations while the library loads and only read afterwards.
#include "tessel_backend.h"

TESSEL_BACKEND_OP::~TESSEL_BACKEND_OP() {}

RegisterBackend::RegisterBackend(const std::string &name, TESSEL_BACKEND_FACTORY factory) {
    get_list()[name] = factory;
}

std::map<std::string, TESSEL_BACKEND_FACTORY> &RegisterBackend::get_list() {
    // A function-local static, so that registrations running from other
    // files' static initialisers find it constructed whatever the link order.
    static std::map<std::string, TESSEL_BACKEND_FACTORY> s_list;
    return s_list;
}

TESSEL_BACKEND_OP *RegisterBackend::New(const std::string &name) {
    const std::map<std::string, TESSEL_BACKEND_FACTORY> &list = get_list();
    std::map<std::string, TESSEL_BACKEND_FACTORY>::const_iterator it = list.find(name);
    if (list.end() == it || NULL == it->second) {
        return NULL;
    }
    return it->second();
}
