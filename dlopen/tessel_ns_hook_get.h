/*
 * The one loader that serves the hook look-ups of the whole process.
 *
 * It is filled by the first look-up that finds a module and then kept until
 * the process ends, whatever namespace later look-ups ask for.
 */
#ifndef TESSEL_DLOPEN_TESSEL_NS_HOOK_GET_H
#define TESSEL_DLOPEN_TESSEL_NS_HOOK_GET_H

#include "tessel_hook.h"

namespace tessel {

TESSEL_DLOPEN &NsHookLoader();

}  // namespace tessel

#endif /* TESSEL_DLOPEN_TESSEL_NS_HOOK_GET_H */
