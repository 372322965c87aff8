/*
 * Plain-function getters of TESSEL_OBJECT for applications.
 *
 * Text and JSON getters write the field (JSON fields as JSON text) into szBuf
 * with snprintf semantics: cut to cbBuf - 1 bytes and always terminated.
 * Every getter returns 0, or -1 on a bad argument (a NULL buffer, cbBuf not
 * above 0, a NULL record or value pointer); a bad argument is logged and
 * recorded in the platform error state (QLIBCErrGet() == 0xD00), not on the
 * library's error stack, and the buffer is left untouched.
 */
#ifndef TESSEL_OBJECT_GETTER_H
#define TESSEL_OBJECT_GETTER_H

#include "tesselobject.h"

TESSEL_C_BEGIN

TESSEL_EXPORT int TesselObjectItemGetNameSpace(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetID(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetCategory(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetVersion(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetPerm(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetCommitMsg(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetParentID(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetOwner(unsigned long *pVal, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetMetaText(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetText(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetMetaBinary_info(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetBinary_info(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetPath_info(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetACL(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetCreateTime(long *pVal, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetModifyTime(long *pVal, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetExtraInfo(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetPerson(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectItemGetErr(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject);

TESSEL_C_END

#endif /* TESSEL_OBJECT_GETTER_H */
