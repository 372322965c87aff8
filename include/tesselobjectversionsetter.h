/* Plain-function setters of TESSEL_OBJECT_VERSION; same rules as tesselobjectsetter.h. */
#ifndef TESSEL_OBJECT_VERSION_SETTER_H
#define TESSEL_OBJECT_VERSION_SETTER_H

#include "tesselobjectversion.h"

TESSEL_C_BEGIN

TESSEL_EXPORT int TesselObjectVersionItemSetNameSpace(TESSEL_OBJECT_VERSION *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectVersionItemSetID(TESSEL_OBJECT_VERSION *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectVersionItemSetVersion(TESSEL_OBJECT_VERSION *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectVersionItemSetCommitMsg(TESSEL_OBJECT_VERSION *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectVersionItemSetLastVersion(TESSEL_OBJECT_VERSION *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectVersionItemSetAuthor(TESSEL_OBJECT_VERSION *pObject, unsigned long val);
TESSEL_EXPORT int TesselObjectVersionItemSetModifyTime(TESSEL_OBJECT_VERSION *pObject, long val);
TESSEL_EXPORT int TesselObjectVersionItemSetExtraInfo(TESSEL_OBJECT_VERSION *pObject, const char *szVal);

TESSEL_C_END

#endif /* TESSEL_OBJECT_VERSION_SETTER_H */
