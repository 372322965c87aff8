/*
 * The index store ("pgsql"): answers listings and child queries from the
 * index database and removes index rows. Made by CreatePgsqlBackend through
 * the backend registry; one instance per operation and thread.
 *
 * Everything else belongs to the file-system store. Those operations succeed
 * here without doing anything, so that a caller can run both stores in turn
 * without special cases; VersionList alone answers 0 (false).
 */
#ifndef TESSEL_BACKEND_PGSQL_TESSEL_BACKEND_PGSQL_H
#define TESSEL_BACKEND_PGSQL_TESSEL_BACKEND_PGSQL_H

#include <string>

#include <json/value.h>
#include <quor/quor_db.h>

#include "tessel_backend.h"

class TESSEL_BACKEND_PGSQL : public TESSEL_BACKEND_OP {
public:
    TESSEL_BACKEND_PGSQL();
    ~TESSEL_BACKEND_PGSQL() override;

    /* The store's own operations. */
    int List(const Json::Value &jParm, TESSEL_OBJECT **addrPHead, unsigned int &total) override;
    bool ListChildren(const Json::Value &jParm, Json::Value &jsIds) override;
    bool HasChildren(const Json::Value &jParm) override;
    bool Delete(const Json::Value &jParm) override;

    /* The file-system store's operations: success without action. */
    bool Get(const Json::Value &jParm, TESSEL_OBJECT *pObject) override;
    bool Download(const Json::Value &jParm) override;
    bool Set(const Json::Value &jParm, std::string &strNewVer) override;
    bool FieldRename(const Json::Value &jParm, std::string &strNewVer) override;
    bool Create(const Json::Value &jParm, std::string &strNewID, std::string &strNewVer) override;
    bool VersionGet(const Json::Value &jParm, TESSEL_OBJECT_VERSION *pVersion) override;
    bool VersionDiff(const Json::Value &jParm, Json::Value &jDiff) override;
    int VersionList(const Json::Value &jParm, TESSEL_OBJECT_VERSION **addrPHead, unsigned int &total,
                    unsigned int &listable_total) override;
    bool SetOwner(const Json::Value &jParm, std::string &strNewVer) override;

private:
    /* The process-wide index connection; null when it could not be opened. */
    DBConnect_tag *m_conn;
};

#endif /* TESSEL_BACKEND_PGSQL_TESSEL_BACKEND_PGSQL_H */
