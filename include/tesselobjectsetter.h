/*
 * Plain-function setters of TESSEL_OBJECT for applications: the record first,
 * the value second. JSON setters parse the text and store whatever the parse
 * produced (null for text that is not JSON). Each returns 0, or -1 on a bad
 * argument (a NULL record or text; logged and recorded in the platform error
 * state, 0xD00) or when the record has lost its data block.
 */
#ifndef TESSEL_OBJECT_SETTER_H
#define TESSEL_OBJECT_SETTER_H

#include "tesselobject.h"

TESSEL_C_BEGIN

TESSEL_EXPORT int TesselObjectItemSetNameSpace(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetID(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetCategory(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetVersion(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetPerm(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetCommitMsg(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetParentID(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetOwner(TESSEL_OBJECT *pObject, unsigned long val);
TESSEL_EXPORT int TesselObjectItemSetMetaText(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetText(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetMetaBinaryInfo(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetBinaryInfo(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetPathInfo(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetACL(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetCreateTime(TESSEL_OBJECT *pObject, long val);
TESSEL_EXPORT int TesselObjectItemSetModifyTime(TESSEL_OBJECT *pObject, long val);
TESSEL_EXPORT int TesselObjectItemSetExtraInfo(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetPerson(TESSEL_OBJECT *pObject, const char *szVal);
TESSEL_EXPORT int TesselObjectItemSetErr(TESSEL_OBJECT *pObject, const char *szVal);

TESSEL_C_END

#endif /* TESSEL_OBJECT_SETTER_H */
