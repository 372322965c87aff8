/*
 * The version record TESSEL_OBJECT_VERSION and the version operations: get
 * one version, list the versions of an object, compare two versions. A
 * version is a commit of the object's own Git repository.
 */
#ifndef TESSEL_OBJECT_VERSION_H
#define TESSEL_OBJECT_VERSION_H

#include <quor/qlib.h>

#include "tessel_export.h"

#ifdef __cplusplus
#include <string>

#include <json/value.h>

struct TESSEL_OBJECT_VERSION_PRIVATE;

class TESSEL_EXPORT TESSEL_OBJECT_VERSION {
public:
    TESSEL_OBJECT_VERSION *next;
    TESSEL_OBJECT_VERSION_PRIVATE *m_impl;

    TESSEL_OBJECT_VERSION();
    ~TESSEL_OBJECT_VERSION();  /* does not follow next */
    TESSEL_OBJECT_VERSION(const TESSEL_OBJECT_VERSION &) = delete;
    TESSEL_OBJECT_VERSION &operator=(const TESSEL_OBJECT_VERSION &) = delete;

    void clear();

    std::string get_ns() const;
    std::string get_id() const;
    unsigned long get_author() const;
    long get_mtime() const;
    std::string get_version() const;
    Json::Value get_commit_msg() const;
    Json::Value get_last_version() const;
    Json::Value get_extra_info() const;

    const std::string &get_ref_ns() const;
    const std::string &get_ref_id() const;
    const std::string &get_ref_version() const;
    const Json::Value &get_ref_commit_msg() const;
    const Json::Value &get_ref_last_version() const;
    const Json::Value &get_ref_extra_info() const;

    bool set_ns(const std::string &v);
    bool set_id(const std::string &v);
    bool set_author(unsigned long v);
    bool set_mtime(long v);
    bool set_version(const std::string &v);
    bool set_commit_msg(const Json::Value &v);
    bool set_last_version(const Json::Value &v);
    bool set_extra_info(const Json::Value &v);

    bool swap_commit_msg(Json::Value &v);
    bool swap_last_version(Json::Value &v);
    bool swap_extra_info(Json::Value &v);

    /* "version", "author" (a user name), "mtime", "commit_msg", "last_version"
     * unless deselected; "ns" and "id" only when selected. */
    bool toJson(const Json::Value &jField, Json::Value &jRet) const;

    /* Fills this record with the version "version" of the object (the latest when absent). */
    bool Get(const Json::Value &jParm);
    /* Compares "old_version" with "new_version" (the latest when absent). */
    bool Diff(const Json::Value &jParm, Json::Value &jDiff);
};

class TESSEL_EXPORT TESSEL_OBJECT_VERSION_LIST {
public:
    TESSEL_OBJECT_VERSION *m_head;

    TESSEL_OBJECT_VERSION_LIST();
    ~TESSEL_OBJECT_VERSION_LIST();
    TESSEL_OBJECT_VERSION_LIST(const TESSEL_OBJECT_VERSION_LIST &) = delete;
    TESSEL_OBJECT_VERSION_LIST &operator=(const TESSEL_OBJECT_VERSION_LIST &) = delete;

    TESSEL_OBJECT_VERSION *head() const { return m_head; }
    void clear();
    /* Reads one version and, on success, makes it the only record. */
    bool GetVersion(const Json::Value &jParm);
    /* Lists versions into this holder; the count, or a negative number. */
    int ListVersion(const Json::Value &jParm, unsigned int &total, unsigned int &listable_total);
};

/* Lists the versions of an object into a new chain at *addrPHead; the count, or negative. */
TESSEL_EXPORT int TesselObjectVersionList(const Json::Value &jParm, TESSEL_OBJECT_VERSION **addrPHead,
                                          unsigned int &total, unsigned int &listable_total);

/* Hash-parameter forms (keys "ns", "id", "requester" and as needed "version",
 * "old_version", "new_version", "offset", "limit"); 0, or -1. */
TESSEL_EXPORT int TesselObjectVersionGet(QLIBSZHASH *pParmHash, TESSEL_OBJECT_VERSION *pVersion);
TESSEL_EXPORT int TesselObjectVersionDiff(QLIBSZHASH *pParmHash, QLIBSZHASH **ppTextDiffHash,
                                          QLIBSZHASH **ppBinaryDiffHash);
TESSEL_EXPORT int TesselObjectVersionList(QLIBSZHASH *pParmHash, TESSEL_OBJECT_VERSION **addrPHead,
                                          unsigned int *pTotal, unsigned int *pListableTotal);

#else
typedef struct TESSEL_OBJECT_VERSION TESSEL_OBJECT_VERSION;
#endif /* __cplusplus */

TESSEL_C_BEGIN
TESSEL_EXPORT TESSEL_OBJECT_VERSION *TesselObjectVersionAlloc(void);
TESSEL_EXPORT void TesselObjectVersionFreeList(TESSEL_OBJECT_VERSION *pHead);
TESSEL_EXPORT TESSEL_OBJECT_VERSION *TesselObjectVersionNext(TESSEL_OBJECT_VERSION *pVersion);
TESSEL_EXPORT void TesselObjectVersionClear(TESSEL_OBJECT_VERSION *pVersion);
TESSEL_C_END

#endif /* TESSEL_OBJECT_VERSION_H */
