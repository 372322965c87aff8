/*
 * The object record TESSEL_OBJECT, chains of records (TESSEL_OBJECT_LIST) and
 * the operations on objects.
 *
 * Records and chains handed to an application belong to it and are freed with
 * TesselObjectFreeList. A record is used by one thread at a time.
 */
#ifndef TESSEL_OBJECT_H
#define TESSEL_OBJECT_H

#include <stddef.h>

#include <quor/qlib.h>

#include "tessel_export.h"

#ifdef __cplusplus
#include <string>

#include <json/value.h>

struct TESSEL_OBJECT_PRIVATE;

class TESSEL_EXPORT TESSEL_OBJECT {
public:
    /* The following record of a result chain; first member, so a chain can be
     * walked without knowing the rest of the record. */
    TESSEL_OBJECT *next;
    /* Per-record request parameters of the list operations. */
    Json::Value m_param;
    /* The data block; every accessor answers empty / false when it is missing. */
    TESSEL_OBJECT_PRIVATE *m_impl;

    TESSEL_OBJECT();
    ~TESSEL_OBJECT();  /* frees the data block; does not follow next */
    TESSEL_OBJECT(const TESSEL_OBJECT &) = delete;
    TESSEL_OBJECT &operator=(const TESSEL_OBJECT &) = delete;

    /* Resets the fields: texts empty, times 0, JSON arrays and objects
     * emptied (other JSON values null); owner becomes 4294967295 (no user),
     * person an empty object; path_info and perm are kept. A new record
     * instead has owner 0 and every JSON field null. */
    void clear();

    std::string get_ns() const;
    std::string get_id() const;
    std::string get_category() const;
    std::string get_version() const;
    Json::Value get_commit_msg() const;
    std::string get_parent_id() const;
    unsigned long get_owner() const;
    Json::Value get_metatext() const;
    Json::Value get_text() const;
    Json::Value get_metabinary_info() const;
    Json::Value get_binary_info() const;
    Json::Value get_path_info() const;
    Json::Value get_acl() const;
    std::string get_perm() const;
    long get_ctime() const;
    long get_mtime() const;
    Json::Value get_err() const;
    Json::Value get_extra_info() const;
    Json::Value get_person() const;

    const std::string &get_ref_ns() const;
    const std::string &get_ref_id() const;
    const std::string &get_ref_category() const;
    const std::string &get_ref_version() const;
    const Json::Value &get_ref_commit_msg() const;
    const std::string &get_ref_parent_id() const;
    const Json::Value &get_ref_metatext() const;
    const Json::Value &get_ref_text() const;
    const Json::Value &get_ref_metabinary_info() const;
    const Json::Value &get_ref_binary_info() const;
    const Json::Value &get_ref_path_info() const;
    const Json::Value &get_ref_acl() const;
    const std::string &get_ref_perm() const;
    const Json::Value &get_ref_err() const;
    const Json::Value &get_ref_extra_info() const;
    const Json::Value &get_ref_person() const;

    bool set_ns(const std::string &v);
    bool set_id(const std::string &v);
    bool set_category(const std::string &v);
    bool set_version(const std::string &v);
    bool set_commit_msg(const Json::Value &v);
    bool set_parent_id(const std::string &v);
    bool set_owner(unsigned long v);
    bool set_metatext(const Json::Value &v);
    bool set_text(const Json::Value &v);
    bool set_metabinary_info(const Json::Value &v);
    bool set_binary_info(const Json::Value &v);
    bool set_path_info(const Json::Value &v);
    bool set_acl(const Json::Value &v);
    bool set_perm(const std::string &v);
    bool set_ctime(long v);
    bool set_mtime(long v);
    bool set_err(const Json::Value &v);
    bool set_extra_info(const Json::Value &v);
    bool set_person(const Json::Value &v);

    /* Exchange a JSON field with the caller's value without copying. */
    bool swap_commit_msg(Json::Value &v);
    bool swap_metatext(Json::Value &v);
    bool swap_text(Json::Value &v);
    bool swap_metabinary_info(Json::Value &v);
    bool swap_binary_info(Json::Value &v);
    bool swap_path_info(Json::Value &v);
    bool swap_acl(Json::Value &v);
    bool swap_err(Json::Value &v);
    bool swap_extra_info(Json::Value &v);
    bool swap_person(Json::Value &v);

    /*
     * Writes the fields chosen by jField into jRet, which must be an object
     * (otherwise false, with 1015 on the error stack).
     *
     * ns, id, category, version, perm, parent_id, owner (as {"uid",
     * "display_name"}, the name empty for an unknown user), ctime and mtime
     * are written unless jField turns them off with a false value.
     * commit_msg is written when jField asks for it with a true value.
     * metatext, text, person, metabinary_info and binary_info: true writes
     * the whole field; an object such as {"title": true} writes the key as an
     * object holding those members marked true that the field has.
     * The acl is written only when asked for and the written perm is "owner"
     * or "rw", or blShowAcl is true. path_info, extra_info and err are never
     * written. A jField that is not an object selects the defaults.
     */
    bool toJson(const Json::Value &jField, Json::Value &jRet, bool blShowAcl) const;
    /*
     * Fills the fields named in jVal: ns, id, category, version, parent_id,
     * commit_msg, metatext, text, acl, owner, ctime and mtime as given (owner
     * -1 is 4294967295); metabinary_info and binary_info are stored as a JSON
     * string holding the given value's JSON text. Other keys are ignored.
     * False when jVal is not an object or a value cannot become its field
     * (owner, ctime, mtime not numbers; a text field given an array or
     * object); the record is then unchanged and the platform error state is
     * QLIBC_ERR_BAD_PARAMETERS.
     */
    bool fromJson(const Json::Value &jVal);

    /* Reads one object with the requester's permission word. */
    bool Get(const Json::Value &jParm);
    /* Creates one object; this record then holds it as read back. */
    bool Create(const Json::Value &jParm);
    bool Create(const Json::Value &jParm, std::string &strNewID, std::string &strNewVer);
    /* Changes one object, making a new version; this record then holds it. */
    bool Set(const Json::Value &jParm);
    bool Set(const Json::Value &jParm, std::string &strNewVer);
    /* Sends a stored binary or meta-binary file to standard output (CGI). */
    bool Download(const Json::Value &jParm);
};

/* A chain of records owned by the holder. */
class TESSEL_EXPORT TESSEL_OBJECT_LIST {
public:
    TESSEL_OBJECT *m_head;

    TESSEL_OBJECT_LIST();
    ~TESSEL_OBJECT_LIST();
    TESSEL_OBJECT_LIST(const TESSEL_OBJECT_LIST &) = delete;
    TESSEL_OBJECT_LIST &operator=(const TESSEL_OBJECT_LIST &) = delete;

    TESSEL_OBJECT *head() const { return m_head; }
    bool empty() const { return m_head == NULL; }
    size_t size() const;
    /* Frees the chain. */
    void clear();

    /* Reads one object and, on success, makes it the only record; on
     * failure the list is left as it was. */
    bool GetObject(const Json::Value &jParm);
    /* Reads every record (or the ids of jParm into an empty list); jsResult
     * maps each id to whether it was read. */
    bool Get(const Json::Value &jParm, Json::Value &jsResult);
    bool Create(const Json::Value &jParm, Json::Value &jsResult);
    bool Set(const Json::Value &jParm, Json::Value &jsResult);
};

/* The field selection that asks for every optional field. */
TESSEL_EXPORT Json::Value TesselObjectFieldAll();

/* Hash-parameter forms of the operations. */
TESSEL_EXPORT int TesselObjectGet(QLIBSZHASH *pParmHash, TESSEL_OBJECT *pObject);
TESSEL_EXPORT int TesselObjectCreate(QLIBSZHASH *pParmHash, char *szId, size_t idLen, char *szVer,
                                     size_t verLen);
TESSEL_EXPORT int TesselObjectSet(QLIBSZHASH *pParmHash, char *szVer, size_t verLen);
TESSEL_EXPORT BOOL TesselObjectDownload(QLIBSZHASH *pParmHash);
/* Records an action of an operation; this library keeps no action log. */
TESSEL_EXPORT bool TesselObjectLog(int action, int result, const TESSEL_OBJECT *pOld,
                                   const TESSEL_OBJECT *pNew);

#else
typedef struct TESSEL_OBJECT TESSEL_OBJECT;
#endif /* __cplusplus */

TESSEL_C_BEGIN
/* Allocates a record; NULL (with 1014 on the error stack) when memory runs out. */
TESSEL_EXPORT TESSEL_OBJECT *TesselObjectAlloc(void);
/* Frees a record and every record reached through next; NULL is accepted. */
TESSEL_EXPORT void TesselObjectFreeList(TESSEL_OBJECT *pHead);
TESSEL_EXPORT TESSEL_OBJECT *TesselObjectNext(TESSEL_OBJECT *pObject);
TESSEL_EXPORT void TesselObjectClear(TESSEL_OBJECT *pObject);
TESSEL_C_END

#endif /* TESSEL_OBJECT_H */
