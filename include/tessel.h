/*
 * libtessel: stores, versions, indexes and guards small documents ("objects")
 * for the applications of a network-storage appliance.
 *
 * Include this header and link with `pkg-config --cflags --libs tessel`.
 */
#ifndef TESSEL_TESSEL_H
#define TESSEL_TESSEL_H

#include "tessel_export.h"
#include "tessel_error.h"
#include "tesselobject.h"
#include "tesselobjectgetter.h"
#include "tesselobjectsetter.h"
#include "tesselobjectversion.h"
#include "tesselobjectversiongetter.h"
#include "tesselobjectversionsetter.h"

#ifdef __cplusplus
#include "tessel_backend.h"
#include "tessel_binary.h"
#include "tessel_conf.h"
#include "tessel_file.h"
#include "tessel_git.h"
#include "tessel_hook.h"
#include "tessel_id.h"
#include "tessel_index.h"
#include "tessel_lock.h"
#include "tessel_ns.h"
#include "tessel_user.h"
#endif

#endif /* TESSEL_TESSEL_H */
