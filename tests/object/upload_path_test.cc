// Files a create or set attaches are read with the caller's own rights: a
// user cannot attach what she cannot read (a root-only file, a directory, a
// device, a FIFO, a missing path) nor copy the binaries of an object she may
// not read, and a refusal writes nothing.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "change_fixture.h"

using namespace tessel_test;
using namespace change_test;

namespace {

const char kCreate[] = "!PrepareCreateParm(jParm)";
const char kListCreate[] = "!PrepareCreateParm(pObj->m_param)";
const char kSet[] = "!PrepareSetParm(jParm, tmpOldObj.get_ref_acl(), &tmpOldObj)";
const char kUpload[] = "!CheckUploadSources(jParm)";
const char kBinary[] = "!CheckItems(jParm, \"binary_files\")";
const char kMetaBinary[] = "!CheckItems(jParm, \"metabinary_files\")";

class UploadPath : public ChangeFixture {
protected:
    void SetUp() override {
        ChangeFixture::SetUp();
        ASSERT_TRUE(dir_.ok());
        ASSERT_EQ(0, chmod(dir_.path().c_str(), 0755));
        ASSERT_TRUE(WriteFile(Secret(), "root:$6$salt$hash:19000:0:99999:7:::\n"));
        ASSERT_EQ(0, chmod(Secret().c_str(), 0600));
        ASSERT_TRUE(WriteFile(Own(), "alice's notes\n"));
        ASSERT_EQ(0, chown(Own().c_str(), kUidAlice, kGidUsers));
        ASSERT_EQ(0, chmod(Own().c_str(), 0600));
        ASSERT_EQ(0, mkdir(dir_.file("folder").c_str(), 0755));
        ASSERT_EQ(0, mkfifo(dir_.file("fifo").c_str(), 0666));
    }
    std::string Secret() const { return dir_.file("shadow"); }
    std::string Own() const { return dir_.file("own.txt"); }

    // One attached file of the given kind and format.
    static std::string Item(const char *szKey, const std::string &strPath, const char *szFormat = "raw") {
        return std::string("\"") + szKey + "\": [{\"name\": \"f\", \"format\": \"" + szFormat +
               "\", \"path\": \"" + strPath + "\"}]";
    }
    // The frames of a refused path, the innermost first.
    static Msgs Refused(const std::string &strFirst, const char *szItems, const char *szOuter) {
        return {strFirst, szItems, kUpload, szOuter};
    }
    static std::string NoOpen(const std::string &strPath) {
        return "0 > (fd = open(jItem[\"path\"].asCString(), O_RDONLY)) [" + strPath + "]";
    }
    static std::string NotRegular(const std::string &strPath) { return "!S_ISREG(st.st_mode) [" + strPath + "]"; }

    // The contents of the one file stored in strDir ("" for none or more).
    static std::string OnlyFile(const std::string &strDir) {
        std::vector<std::string> names;
        if (DIR *dir = opendir(strDir.c_str())) {
            while (dirent *ent = readdir(dir)) {
                if (ent->d_name[0] != '.') {
                    names.push_back(ent->d_name);
                }
            }
            closedir(dir);
        }
        return 1 == names.size() ? ReadFile(strDir + "/" + names[0]) : std::string();
    }

    ScratchDir dir_;
};

TEST_F(UploadPath, CreateRefusesWhatTheCallerCannotRead) {
    const std::string strMissing = dir_.file("missing");
    const std::string strFolder = dir_.file("folder");
    const std::string strFifo = dir_.file("fifo");
    const std::string strKept = Made(kUidAlice);
    ASSERT_EQ(0, RunAsUser(kUidAlice, kGidUsers, [&] {
        struct Case {
            std::string strMembers;
            Msgs msgs;
        } cases[] = {
            {Item("binary_files", Secret()), Refused(NoOpen(Secret()), kBinary, kCreate)},
            {Item("metabinary_files", Secret(), "base64"), Refused(NoOpen(Secret()), kMetaBinary, kCreate)},
            {Item("binary_files", strMissing, "path"), Refused(NoOpen(strMissing), kBinary, kCreate)},
            {Item("binary_files", strFolder), Refused(NotRegular(strFolder), kBinary, kCreate)},
            {Item("metabinary_files", strFifo), Refused(NotRegular(strFifo), kMetaBinary, kCreate)},
            {Item("binary_files", "/dev/null"), Refused(NotRegular("/dev/null"), kBinary, kCreate)},
        };
        for (const Case &c : cases) {
            SCOPED_TRACE(c.strMembers);
            ErrClear();
            TESSEL_OBJECT obj;
            EXPECT_FALSE(obj.Create(Req(kUidAlice, "\"category\": \"note\", " + c.strMembers)));
            EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
            EXPECT_EQ(c.msgs, ErrMsgs());
        }
        // The list form checks every record before any is made.
        ErrClear();
        TESSEL_OBJECT_LIST list;
        Json::Value jResult(Json::objectValue);
        EXPECT_FALSE(list.Create(Req(kUidAlice, "\"category\": \"note\", " + Item("binary_files", Secret())),
                                 jResult));
        EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
        EXPECT_EQ(Refused(NoOpen(Secret()), kBinary, kListCreate), ErrMsgs());
        return ::testing::Test::HasFailure() ? 1 : 0;
    }));
    // Root may read the secret, but a FIFO is no file to attach for anyone.
    ErrClear();
    TESSEL_OBJECT byRoot;
    EXPECT_FALSE(byRoot.Create(Req(0, "\"category\": \"note\", \"owner\": 1001, " + Item("binary_files", strFifo))));
    EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
    EXPECT_EQ(Refused(NotRegular(strFifo), kBinary, kCreate), ErrMsgs());

    EXPECT_EQ((std::set<std::string>{strKept}), ObjectDirs());
    EXPECT_EQ("1", Sql("SELECT count(*) FROM object"));
    EXPECT_EQ(2u, HookLines().size()) << "only the first create reached the hooks";
}

TEST_F(UploadPath, OwnFileAttachedSecretNotSet) {
    ASSERT_EQ(0, RunAsUser(kUidAlice, kGidUsers, [&] {
        TESSEL_OBJECT obj;
        EXPECT_TRUE(obj.Create(Req(kUidAlice, "\"category\": \"note\", " + Item("binary_files", Own()) + ", " +
                                                  Item("metabinary_files", Own()))))
            << ::testing::PrintToString(ErrMsgs());
        return ::testing::Test::HasFailure() ? 1 : 0;
    }));
    ASSERT_EQ(1u, ObjectDirs().size());
    const std::string strId = *ObjectDirs().begin();
    const std::string strVer = Stored(strId)["version"].asString();
    ASSERT_EQ(40u, strVer.size());
    const std::string strObjDir = kNsDir + "/" + strId;
    EXPECT_EQ("alice's notes\n", OnlyFile(strObjDir + "/version/binary"));
    EXPECT_EQ("alice's notes\n", OnlyFile(strObjDir + "/metabinary"));

    ASSERT_EQ(0, RunAsUser(kUidAlice, kGidUsers, [&] {
        Json::Value jSet = Req(kUidAlice, Item("binary_files", Secret()));
        jSet["id"] = strId;
        jSet["version"] = strVer;
        ErrClear();
        TESSEL_OBJECT obj;
        EXPECT_FALSE(obj.Set(jSet));
        EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
        EXPECT_EQ(Refused(NoOpen(Secret()), kBinary, kSet), ErrMsgs());

        jSet = Req(kUidAlice, Item("metabinary_files", dir_.file("fifo")));
        jSet["id"].append(strId);
        ErrClear();
        TESSEL_OBJECT_LIST list;
        Json::Value jResult(Json::objectValue);
        EXPECT_FALSE(list.Set(jSet, jResult));
        EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
        EXPECT_EQ((Msgs{NotRegular(dir_.file("fifo")), kMetaBinary, kUpload,
                        "!PrepareSetParm(pObj->m_param, pObj->get_ref_acl(), pObj)"}),
                  ErrMsgs());
        return ::testing::Test::HasFailure() ? 1 : 0;
    }));
    EXPECT_EQ(strVer, Stored(strId)["version"].asString());
    EXPECT_EQ("alice's notes\n", OnlyFile(strObjDir + "/version/binary"));
    EXPECT_EQ("alice's notes\n", OnlyFile(strObjDir + "/metabinary"));
    EXPECT_EQ(strVer, Sql("SELECT version FROM object WHERE id = '" + strId + "'"));
}

TEST_F(UploadPath, CopyFromAnObjectTheRequesterCannotRead) {
    const std::string strSource = Made(kUidAlice, Item("binary_files", Own()));
    const std::string strCopy =
        "\"binary_files\": [{\"name\": \"f\", \"format\": \"object\", \"id\": \"" + strSource + "\"}]";
    ASSERT_EQ(0, RunAsUser(kUidBob, kGidUsers, [&] {
        ErrClear();
        TESSEL_OBJECT obj;
        EXPECT_FALSE(obj.Create(Req(kUidBob, "\"category\": \"note\", " + strCopy)));
        // Refused the way bob's own read of it is: her sharing is off.
        EXPECT_EQ(TESSEL_ERR_SHARING_DISABLED, ErrCode());
        EXPECT_EQ((Msgs{"!jACL.isMember(\"enabled\")",
                        "!TesselObjectPermCalculate((uid_t)jParm[\"requester\"].asInt64(), m_impl->owner, "
                        "m_impl->acl, m_impl->perm)",
                        "!src.Get(jGetParm)", "!CheckReadableObject(jParm, jItem[\"id\"].asString())", kBinary,
                        kUpload, kCreate}),
                  ErrMsgs());
        return ::testing::Test::HasFailure() ? 1 : 0;
    }));
    EXPECT_EQ((std::set<std::string>{strSource}), ObjectDirs());
    EXPECT_EQ("1", Sql("SELECT count(*) FROM object"));
}

}  // namespace
