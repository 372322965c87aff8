/*
 * The file-system store ("fs"): the authoritative copy of every object, one
 * directory per object, with its versioned fields in a Git repository of its
 * own. Made by CreateFsBackend through the backend registry; one instance per
 * operation and thread.
 *
 * Listing and child queries belong to the index store: List, ListChildren
 * and HasChildren answer "nothing" here, silently, so that a caller may ask
 * both stores the same question.
 */
#ifndef TESSEL_BACKEND_FS_TESSELBACKEND_FS_H
#define TESSEL_BACKEND_FS_TESSELBACKEND_FS_H

#include <stdint.h>

#include <string>
#include <vector>

#include <json/value.h>
#include <quor/qlib.h>

#include "tessel_backend.h"

class TESSEL_BACKEND_FS : public TESSEL_BACKEND_OP {
public:
    TESSEL_BACKEND_FS();
    ~TESSEL_BACKEND_FS() override;

    /* The store's own operations. */
    bool Get(const Json::Value &jParm, TESSEL_OBJECT *pObject) override;
    bool Download(const Json::Value &jParm) override;
    bool Set(const Json::Value &jParm, std::string &strNewVer) override;
    bool FieldRename(const Json::Value &jParm, std::string &strNewVer) override;
    bool Create(const Json::Value &jParm, std::string &strNewID, std::string &strNewVer) override;
    bool Delete(const Json::Value &jParm) override;
    bool VersionGet(const Json::Value &jParm, TESSEL_OBJECT_VERSION *pVersion) override;
    bool VersionDiff(const Json::Value &jParm, Json::Value &jDiff) override;
    int VersionList(const Json::Value &jParm, TESSEL_OBJECT_VERSION **addrPHead, unsigned int &total,
                    unsigned int &listable_total) override;
    bool SetOwner(const Json::Value &jParm, std::string &strNewVer) override;

    /* The index store's questions: no records, no children. */
    int List(const Json::Value &jParm, TESSEL_OBJECT **addrPHead, unsigned int &total) override;
    bool ListChildren(const Json::Value &jParm, Json::Value &jsIds) override;
    bool HasChildren(const Json::Value &jParm) override;

private:
    bool mf_init(const Json::Value &jParm, bool bCreate = false, TESSEL_OBJECT *pObject = NULL);
    bool mf_GetPathInfo(const Json::Value &jParm, Json::Value &jPathInfo, TESSEL_OBJECT *pObject);
    bool mf_GetPathInfoByBase(const std::string &strBase, Json::Value &jPathInfo);
    bool mf_GetPathInfoByGitBase(const std::string &strBase, Json::Value &jPathInfo);
    bool mf_CreatePath();

    /* Whether a read touches / a write changes the storage place szType. */
    bool mf_NeedToGet(const char *szType);
    bool mf_NeedToGetCheckOne(const Json::Value &jValue);
    bool mf_NeedToSave(const char *szType);

    bool mf_GetConfigFieldFromJson(const char *szType, Json::Value &jOut);
    bool mf_GetJsonFile(const char *szType, Json::Value &jOut);
    bool mf_SetJsonFile(const char *szType);
    bool mf_MergeAndCheckMtime(const char *szType, Json::Value &jOld, const Json::Value &jNew);
    bool mf_SaveConfig(std::string &strNewVer);

    bool mf_GetBasic(TESSEL_OBJECT *pObject);
    bool mf_SaveBasic();
    bool mf_GetMetaText(TESSEL_OBJECT *pObject);
    bool mf_SaveMetaText();
    bool mf_GetMetaBinaryInfo(TESSEL_OBJECT *pObject, bool blForce);
    bool mf_SaveMetaBinary();
    bool mf_GetGit(TESSEL_OBJECT *pObject);
    bool mf_SaveGit(std::string &strNewVer);

    /* The version side: an object's text and binaries in its own repository. */
    bool TesselObjectVersionDataToDisk(QLIBSZHASH *&pAddHash, QLIBSZHASH *&pDelHash, const Json::Value &jParm,
                                       const std::string &strDir);
    bool mf_VersionDataFromDisk(const std::string &strDir, TESSEL_OBJECT *pObject);
    /* strDir holds the requested version afterwards; remove it unless *pblIsLatest. */
    bool mf_LoadGitVersion(std::string &strDir, bool *pblIsLatest, Json::Value &jCommitInfo);
    bool mf_GetVersionGit(TESSEL_OBJECT_VERSION *pVersion);
    int mf_ListVersionGit(TESSEL_OBJECT_VERSION **addrPHead);
    bool mf_DiffVersionGit(Json::Value &jDiff);
    bool mf_RenameGitField(std::string &strNewVer);
    bool mf_DownloadVersionBinary();
    bool mf_CountCommit(const Json::Value &jCommitMsg);
    bool mf_GetPerson(TESSEL_OBJECT *pObject);
    bool mf_SavePerson();

    /*
     * Stored files and their descriptions. A file ".../binary/<enc>" or
     * ".../metabinary/<enc>" is described by the file of the same name in
     * the sibling "binary_info" or "metabinary_info".
     */
    bool mf_GetBinaryInfoPath(const std::string &strFile, std::string &strInfo);
    /* Describes strFile: {"md5", "name", "auto_mtime"}. blMerge keeps the
     * other members of a description already there (a copy from another
     * object brings its source's description along). */
    bool mf_MakeBinaryInfo(const std::string &strFile, const std::string &strFileName, int64_t mtime,
                           bool blMerge);
    /* jOut[szMember] = every description of strDir (the request's
     * field[szMember] may name the files wanted). */
    bool mf_GetBinaryInfoByDir(const std::string &strDir, Json::Value &jOut, const char *szMember);
    bool mf_CopyFile(const std::string &strSrc, const std::string &strDest);
    /* The path information of the object jItem["id"] of the request's namespace. */
    bool mf_GetBinaryObjectPath(const Json::Value &jItem, Json::Value &jPathInfo);
    /* Sends the request's "field" from strBinaryDir as the HTTP response. */
    bool mf_DownloadBinaryByDir(const std::string &strBinaryDir, const std::string &strBinaryInfoDir);
    bool mf_DownloadMetaBinary();

    Json::Value m_jParm;
    Json::Value m_jPathInfo;
    Json::Value m_jFieldTable;
    /* The table's field names in their stored order. */
    std::vector<std::string> m_fieldOrder;
};

#endif /* TESSEL_BACKEND_FS_TESSELBACKEND_FS_H */
