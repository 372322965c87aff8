/*
 * The index database "tessel" (tables object and person) that mirrors the
 * searchable fields of every object. The file-system store stays the
 * authority; the index can be emptied and rebuilt from it at any time. One
 * connection per process, opened on first use (a forked child opens its own).
 */
#ifndef TESSEL_INDEX_H
#define TESSEL_INDEX_H

#include <sys/types.h>

#include <string>

#include <json/value.h>
#include <quor/quor_db.h>

#include "tessel_export.h"
#include "tesselobject.h"

TESSEL_EXPORT DBConnect_tag *TesselOpenConn();
/* Connections are kept for the life of the process: this does nothing. */
TESSEL_EXPORT void TesselCloseConn(DBConnect_tag *pConn);
/* Closes the process's connection and starts the vacuum check. */
TESSEL_EXPORT void TesselCloseGlobalConn();
TESSEL_EXPORT bool TesselCreateObjectTable(DBConnect_tag *pConn);
TESSEL_EXPORT bool TesselAppendPersonTable();
/* Counts a closing in "/tmp/tessel.tmp" in a child process and runs "VACUUM
 * ANALYZE" after 50000; returns the child's pid in the parent, or -1. */
TESSEL_EXPORT pid_t TesselCheckVaccum();
/* Empties the index of namespace jParam["ns"], or of everything. */
TESSEL_EXPORT bool TesselDeleteIndex(const Json::Value &jParam);
/* Rebuilds the index of namespace jParam["ns"], or of everything, from the store. */
TESSEL_EXPORT bool TesselReindex(const Json::Value &jParam);

/* Indexes one record (update in place, or insert). */
TESSEL_EXPORT bool TesselObjectIndexEx(DBConnect_tag *pConn, TESSEL_OBJECT *pObj);
/* Reads the object and indexes it. */
TESSEL_EXPORT bool TesselObjectIndexEx(DBConnect_tag *pConn, const char *szID, const char *szNs,
                                       unsigned int requester);
TESSEL_EXPORT bool TesselObjectIndex(TESSEL_OBJECT *pObj);
TESSEL_EXPORT bool TesselObjectIndex(const char *szID, const char *szNs, unsigned int requester);
/* Replaces the rows of every record of the chain in one execution. */
TESSEL_EXPORT bool TesselObjectBatchIndexEx(DBConnect_tag *pConn, TESSEL_OBJECT *pList);
TESSEL_EXPORT bool TesselObjectBatchIndex(TESSEL_OBJECT *pList);
/* The object and person value tuples of one stored object, for bulk inserts. */
TESSEL_EXPORT bool TesselObjectCreateIndexValue(std::string &strObjectValues, std::string &strPersonValues,
                                                const char *szID, const char *szNs, unsigned int owner,
                                                const Json::Value &jsFilter);
/* "('a','b')" lists for IN clauses; "('')" for an empty array. */
TESSEL_EXPORT bool TesselObjectEscapeStringArray(std::string &strOut, const Json::Value &jsArray);
TESSEL_EXPORT bool TesselObjectEscapeUIntArray(std::string &strOut, const Json::Value &jsArray);

#endif /* TESSEL_INDEX_H */
