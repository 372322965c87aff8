/* Plain-function getters of TESSEL_OBJECT_VERSION; same rules as tesselobjectgetter.h. */
#ifndef TESSEL_OBJECT_VERSION_GETTER_H
#define TESSEL_OBJECT_VERSION_GETTER_H

#include "tesselobjectversion.h"

TESSEL_C_BEGIN

TESSEL_EXPORT int TesselObjectVersionItemGetNameSpace(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pVersion);
TESSEL_EXPORT int TesselObjectVersionItemGetID(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pVersion);
TESSEL_EXPORT int TesselObjectVersionItemGetVersion(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pVersion);
TESSEL_EXPORT int TesselObjectVersionItemGetCommitMsg(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pVersion);
TESSEL_EXPORT int TesselObjectVersionItemGetLastVersion(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pVersion);
TESSEL_EXPORT int TesselObjectVersionItemGetAuthor(unsigned long *pVal, const TESSEL_OBJECT_VERSION *pVersion);
TESSEL_EXPORT int TesselObjectVersionItemGetModifyTime(long *pVal, const TESSEL_OBJECT_VERSION *pVersion);
TESSEL_EXPORT int TesselObjectVersionItemGetExtraInfo(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pVersion);

TESSEL_C_END

#endif /* TESSEL_OBJECT_VERSION_GETTER_H */
