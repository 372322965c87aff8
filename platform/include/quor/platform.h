/* The whole platform layer. */
#ifndef QUOR_PLATFORM_H
#define QUOR_PLATFORM_H

#include "qlib.h"
#include "qlib_plugin.h"
#include "quor.h"
#include "quor_db.h"
#include "quor_web.h"

#endif /* QUOR_PLATFORM_H */
