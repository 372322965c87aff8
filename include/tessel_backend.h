/*
 * The two stores behind one interface: the file-system store ("fs"), which
 * holds objects and their versions, and the PostgreSQL index ("pgsql"), which
 * answers listings and child queries. Operations obtain a fresh backend by
 * name from the registry, use it on one thread and delete it.
 */
#ifndef TESSEL_BACKEND_H
#define TESSEL_BACKEND_H

#include <map>
#include <string>

#include <json/value.h>

#include "tessel_export.h"
#include "tesselobject.h"
#include "tesselobjectversion.h"

class TESSEL_EXPORT TESSEL_BACKEND_OP {
public:
    virtual ~TESSEL_BACKEND_OP();
    virtual bool Get(const Json::Value &jParm, TESSEL_OBJECT *pObject) = 0;
    /* The number of records chained at *addrPHead (negative on failure); total matches. */
    virtual int List(const Json::Value &jParm, TESSEL_OBJECT **addrPHead, unsigned int &total) = 0;
    virtual bool Download(const Json::Value &jParm) = 0;
    virtual bool Set(const Json::Value &jParm, std::string &strNewVer) = 0;
    virtual bool FieldRename(const Json::Value &jParm, std::string &strNewVer) = 0;
    virtual bool Create(const Json::Value &jParm, std::string &strNewID, std::string &strNewVer) = 0;
    virtual bool Delete(const Json::Value &jParm) = 0;
    virtual bool VersionGet(const Json::Value &jParm, TESSEL_OBJECT_VERSION *pVersion) = 0;
    virtual bool VersionDiff(const Json::Value &jParm, Json::Value &jDiff) = 0;
    /* The number of records chained at *addrPHead (negative on failure). */
    virtual int VersionList(const Json::Value &jParm, TESSEL_OBJECT_VERSION **addrPHead,
                            unsigned int &total, unsigned int &listable_total) = 0;
    virtual bool ListChildren(const Json::Value &jParm, Json::Value &jsIds) = 0;
    virtual bool HasChildren(const Json::Value &jParm) = 0;
    virtual bool SetOwner(const Json::Value &jParm, std::string &strNewVer) = 0;
};

typedef TESSEL_BACKEND_OP *(*TESSEL_BACKEND_FACTORY)();

class TESSEL_EXPORT RegisterBackend {
public:
    /* Registers factory under name (a later registration replaces an earlier one). */
    RegisterBackend(const std::string &name, TESSEL_BACKEND_FACTORY factory);
    /* The registry: backend name -> factory. */
    static std::map<std::string, TESSEL_BACKEND_FACTORY> &get_list();
    /* A new backend (owned by the caller), or NULL for an unknown name. */
    static TESSEL_BACKEND_OP *New(const std::string &name);
};

TESSEL_EXPORT TESSEL_BACKEND_OP *CreateFsBackend();
TESSEL_EXPORT TESSEL_BACKEND_OP *CreatePgsqlBackend();

#endif /* TESSEL_BACKEND_H */
