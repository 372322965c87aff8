/* Plain-function getters of TESSEL_OBJECT_VERSION; same rules as tesselobjectgetter.h. The record
 * argument is named pObject there and here, so a bad-argument report reads the same for both. */
#ifndef TESSEL_OBJECT_VERSION_GETTER_H
#define TESSEL_OBJECT_VERSION_GETTER_H

#include "tesselobjectversion.h"

TESSEL_C_BEGIN

TESSEL_EXPORT int TesselObjectVersionItemGetNameSpace(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject);
TESSEL_EXPORT int TesselObjectVersionItemGetID(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject);
TESSEL_EXPORT int TesselObjectVersionItemGetVersion(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject);
TESSEL_EXPORT int TesselObjectVersionItemGetCommitMsg(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject);
TESSEL_EXPORT int TesselObjectVersionItemGetLastVersion(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject);
TESSEL_EXPORT int TesselObjectVersionItemGetAuthor(unsigned long *pVal, const TESSEL_OBJECT_VERSION *pObject);
TESSEL_EXPORT int TesselObjectVersionItemGetModifyTime(long *pVal, const TESSEL_OBJECT_VERSION *pObject);
TESSEL_EXPORT int TesselObjectVersionItemGetExtraInfo(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject);

TESSEL_C_END

#endif /* TESSEL_OBJECT_VERSION_GETTER_H */
