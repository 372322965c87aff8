// Reading many objects: the dealing to worker threads, per-record failures
// that leave the call standing, the checks before any read, the permission
// pass, and the one-object form. Also built under ThreadSanitizer.
#include <unistd.h>

#include <map>
#include <set>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "get_fixture.h"
#include "object/list_object_get.h"

using namespace tessel_test;
using get_test::GetFixture;
using get_test::Msgs;

namespace {

const char kListPermFrame[] =
    "!TesselObjectPermCalculate((uid_t)jParm[\"requester\"].asInt64(), pObj->get_owner(), pObj->get_ref_acl(), "
    "strPerm)";
const char kShared[] = R"({"enabled": true, "zem_user": {"1002": {"perm": "ro"}}})";

class ListGet : public GetFixture {
protected:
    static Json::Value Ids(const std::vector<std::string> &vIds) {
        Json::Value jIds(Json::arrayValue);
        for (const std::string &strId : vIds) {
            jIds.append(strId);
        }
        return jIds;
    }
    static std::vector<TESSEL_OBJECT *> Records(const TESSEL_OBJECT_LIST &list) {
        std::vector<TESSEL_OBJECT *> v;
        for (TESSEL_OBJECT *p = list.head(); p; p = p->next) {
            v.push_back(p);
        }
        return v;
    }
    // Which thread read the record: the store's work area is named
    // "<id>.<pid><tid>" after the reading thread.
    static std::string Reader(const TESSEL_OBJECT *pObj) {
        const std::string strTmp = pObj->get_ref_path_info()["tmp"].asString();
        return strTmp.substr(strTmp.rfind('.') + 1);
    }
};

TEST_F(ListGet, ThirtyWorkersByPositionModuloThirty) {
    std::vector<std::string> vIds;
    for (int i = 0; i < 31; ++i) {
        vIds.push_back(Create(kUidAlice, kShared, "n" + std::to_string(i)));
    }
    TESSEL_OBJECT_LIST list;
    Json::Value jsResult;
    Json::Value jParm = Req(0, "");
    jParm["id"] = Ids(vIds);
    ASSERT_TRUE(list.Get(jParm, jsResult)) << ::testing::PrintToString(ErrMsgs());
    const std::vector<TESSEL_OBJECT *> vRecords = Records(list);
    ASSERT_EQ(31u, vRecords.size());

    const std::string strCaller = std::to_string(getpid()) + std::to_string(getpid());
    std::set<std::string> readers;
    for (int i = 0; i < 31; ++i) {
        SCOPED_TRACE(i);
        EXPECT_EQ(vIds[i], vRecords[i]->get_id());
        EXPECT_EQ("n" + std::to_string(i), vRecords[i]->get_category());
        EXPECT_EQ("rw", vRecords[i]->get_perm());
        EXPECT_EQ(Json::Value(false), vRecords[i]->get_err());
        EXPECT_EQ(Json::Value(true), jsResult[vIds[i]]);
        EXPECT_NE(strCaller, Reader(vRecords[i]));
        readers.insert(Reader(vRecords[i]));
    }
    // Thirty threads; the thirty-first record went to the first of them.
    EXPECT_EQ(30u, readers.size());
    EXPECT_EQ(Reader(vRecords[0]), Reader(vRecords[30]));
    EXPECT_EQ(31u, jsResult.size());

    // The dealing itself: worker k holds records k, k+30, k+60 in list order.
    std::map<unsigned int, Thread_Info> mapThreads;
    tessel::DealToWorkers(jParm, list.head(), mapThreads);
    ASSERT_EQ(30u, mapThreads.size());
    EXPECT_EQ((std::vector<TESSEL_OBJECT *>{vRecords[0], vRecords[30]}), mapThreads[0].vObjs);
    EXPECT_EQ((std::vector<TESSEL_OBJECT *>{vRecords[29]}), mapThreads[29].vObjs);
    EXPECT_EQ(&jParm, mapThreads[1].pParm);

    // One record is read on the calling thread.
    TESSEL_OBJECT_LIST one;
    jParm["id"] = vIds[5];
    ASSERT_TRUE(one.Get(jParm, jsResult));
    ASSERT_EQ(1u, one.size());
    EXPECT_EQ(strCaller, Reader(one.head()));
    EXPECT_EQ("n5", one.head()->get_category());
}

TEST_F(ListGet, RecordsThatCannotBeReadDoNotFailTheCall) {
    const std::string strId = Create(kUidAlice, kShared);
    const std::string strMissing = "1001_0123456789";
    for (unsigned requester : {0u, kUidAlice}) {
        SCOPED_TRACE(requester);
        TESSEL_OBJECT_LIST list;
        Json::Value jsResult;
        Json::Value jParm = Req(requester, "");
        jParm["id"] = Ids({strId, strMissing});
        ErrClear();
        ASSERT_TRUE(list.Get(jParm, jsResult)) << ::testing::PrintToString(ErrMsgs());
        Json::Value jExpected;
        jExpected[strId] = true;
        jExpected[strMissing] = false;
        EXPECT_EQ(jExpected, jsResult);
        const std::vector<TESSEL_OBJECT *> v = Records(list);
        ASSERT_EQ(2u, v.size());
        EXPECT_EQ(Json::Value(false), v[0]->get_err());
        EXPECT_EQ(Json::Value(true), v[1]->get_err());
        EXPECT_EQ("note", v[0]->get_category());
        EXPECT_EQ(strMissing, v[1]->get_id());
        EXPECT_EQ(0u == requester ? "rw" : "owner", v[0]->get_perm());
    }
}

TEST_F(ListGet, WordsAclAndDelegationPerRecord) {
    const std::string strOwn = Create(kUidBob, "null");
    const std::string strShared = Create(kUidAlice, kShared);
    TESSEL_OBJECT_LIST list;
    Json::Value jsResult;
    Json::Value jParm = Req(kUidBob, "", R"({"field": {"acl": true}, "delegate_perm": "rw"})");
    jParm["id"] = Ids({strOwn, strShared});
    ASSERT_TRUE(list.Get(jParm, jsResult)) << ::testing::PrintToString(ErrMsgs());
    std::vector<TESSEL_OBJECT *> v = Records(list);
    EXPECT_EQ("rw", v[0]->get_perm());  // "owner", delegated
    EXPECT_EQ("ro", v[1]->get_perm());
    EXPECT_EQ(Parse(kShared), v[1]->get_acl());

    // A list already filled is read again as it stands; "id" is not needed.
    Json::Value jAgain = Req(kUidBob, "");
    jAgain.removeMember("id");
    ASSERT_TRUE(list.Get(jAgain, jsResult));
    v = Records(list);
    ASSERT_EQ(2u, v.size());
    EXPECT_EQ("owner", v[0]->get_perm());
    EXPECT_EQ(Json::Value(Json::objectValue), v[1]->get_acl());
}

TEST_F(ListGet, RefusedRecordsKeepOnlyTheirNames) {
    const std::string strShared = Create(kUidAlice, kShared);
    const std::string strClosed = Create(kUidAlice, R"({"enabled": true, "public": {"perm": ""}})");
    TESSEL_OBJECT_LIST list;
    Json::Value jsResult;
    Json::Value jParm = Req(kUidBob, "", R"({"field": {"acl": true, "metatext": true}})");
    jParm["id"] = Ids({strShared, strClosed, strShared});
    ErrClear();
    EXPECT_FALSE(list.Get(jParm, jsResult));
    EXPECT_EQ(1023, ErrCode());
    EXPECT_EQ((Msgs{"Requester no permission: 1002", kListPermFrame}), ErrMsgs());
    const std::vector<TESSEL_OBJECT *> v = Records(list);
    ASSERT_EQ(3u, v.size());
    EXPECT_EQ("ro", v[0]->get_perm());
    EXPECT_EQ("note", v[0]->get_category());
    for (int i : {1, 2}) {
        SCOPED_TRACE(i);
        EXPECT_EQ(i == 1 ? strClosed : strShared, v[i]->get_id());
        EXPECT_EQ("ledger", v[i]->get_ns());
        EXPECT_EQ("", v[i]->get_perm());
        EXPECT_EQ("", v[i]->get_category());
        EXPECT_TRUE(v[i]->get_acl().empty());
        EXPECT_TRUE(v[i]->get_metatext().empty());
        EXPECT_EQ(Json::Value(false), v[i]->get_err());
    }
}

TEST_F(ListGet, ChecksBeforeAnyRead) {
    const std::string strShared = Create(kUidAlice, kShared);
    const std::string kTypes =
        "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || (pList->empty() && !jParm.isMember(\"id\")) || "
        "!jParm.isMember(\"requester\") || !jParm[\"requester\"].isIntegral()";
    Json::Value jNoId = Req(kUidBob, "");
    jNoId.removeMember("id");
    Json::Value jNoRequester = Req(kUidBob, strShared);
    jNoRequester.removeMember("requester");
    Json::Value jIdNumber = Req(kUidBob, "");
    jIdNumber["id"] = 5;
    Json::Value jIdNumbers = Req(kUidBob, "");
    jIdNumbers["id"] = Parse("[1]");
    struct Row {
        const char *name;
        Json::Value jParm;
        const char *conf;
        int code;
        Msgs msgs;
    };
    const std::vector<Row> rows = {
        {"no id", jNoId, get_test::kConfOpen, 1007, {"!jParm.isMember(\"id\")", "!PrepareList(jParm, &m_head)"}},
        {"id a number", jIdNumber, get_test::kConfOpen, 1007,
         {"!jParm[\"id\"].isArray()", "!PrepareList(jParm, &m_head)"}},
        {"id of a number", jIdNumbers, get_test::kConfOpen, 1007,
         {"!(*jsIt).isString()", "!PrepareList(jParm, &m_head)"}},
        {"no requester", jNoRequester, get_test::kConfOpen, 1007, {kTypes, "!PreCheck(jParm, this)"}},
        {"version a number", Req(kUidBob, strShared, R"({"version": 1})"), get_test::kConfOpen, 1007,
         {"jParm.isMember(\"version\") && !jParm[\"version\"].isString() && !jParm[\"version\"].isObject()",
          "!PreCheck(jParm, this)"}},
        {"field not an object", Req(kUidBob, strShared, R"({"field": true})"), get_test::kConfOpen, 1007,
         {"jParm.isMember(\"field\") && !jParm[\"field\"].isObject()", "!PreCheck(jParm, this)"}},
        {"owner not a number", Req(kUidBob, "x_1"), get_test::kConfOpen, 1007,
         {"UID_ERR == (owner = TesselObjectGetOwnerByID(pObj->get_ref_id()))", "!PreCheck(jParm, this)"}},
        {"owner's sharing switched off", Req(kUidBob, strShared),
         R"({"Access": {"enable": true, "enable_ns_ledger": true}, "Sharing": {"1001": {"disable": true}}})", 1023,
         {"FALSE == TesselSharingCheck(jParm[\"ns\"].asCString(), owner)", "!PreCheck(jParm, this)"}},
    };
    for (const Row &row : rows) {
        SCOPED_TRACE(row.name);
        ASSERT_TRUE(WriteFile(get_test::kConf, row.conf));
        TESSEL_OBJECT_LIST list;
        Json::Value jsResult;
        ErrClear();
        EXPECT_FALSE(list.Get(row.jParm, jsResult));
        EXPECT_EQ(row.code, ErrCode());
        // The owner look-up reports its own frame first.
        Msgs msgs = ErrMsgs();
        if (msgs.size() > row.msgs.size()) {
            msgs.erase(msgs.begin(), msgs.end() - row.msgs.size());
        }
        EXPECT_EQ(row.msgs, msgs);
        EXPECT_TRUE(jsResult.isNull());
        EXPECT_EQ("", list.empty() ? std::string() : list.head()->get_category());
    }
    // Root is not held by the sharing switches.
    TESSEL_OBJECT_LIST list;
    Json::Value jsResult;
    EXPECT_TRUE(list.Get(Req(0, strShared), jsResult));
    EXPECT_EQ("rw", list.head()->get_perm());
}

TEST_F(ListGet, GetObjectReplacesTheListOnlyOnSuccess) {
    const std::string strA = Create(kUidAlice, kShared, "a");
    const std::string strB = Create(kUidAlice, kShared, "b");
    TESSEL_OBJECT_LIST list;
    Json::Value jsResult;
    Json::Value jParm = Req(kUidBob, "");
    jParm["id"] = Ids({strA, strB});
    ASSERT_TRUE(list.Get(jParm, jsResult));
    const TESSEL_OBJECT *pFirst = list.head();

    ErrClear();
    EXPECT_FALSE(list.GetObject(Req(kUidDave, strA)));
    EXPECT_EQ((Msgs{"Requester no permission: 1004",
                    "!TesselObjectPermCalculate((uid_t)jParm[\"requester\"].asInt64(), m_impl->owner, m_impl->acl, "
                    "m_impl->perm)",
                    "!pObj->Get(jParm)"}),
              ErrMsgs());
    EXPECT_EQ(2u, list.size());
    EXPECT_EQ(pFirst, list.head());

    ASSERT_TRUE(list.GetObject(Req(kUidBob, strB)));
    ASSERT_EQ(1u, list.size());
    EXPECT_EQ(strB, list.head()->get_id());
    EXPECT_EQ("b", list.head()->get_category());
    EXPECT_EQ("ro", list.head()->get_perm());
}

}  // namespace
