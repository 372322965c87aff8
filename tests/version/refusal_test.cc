// Refusals of the version operations: bad requests and hash keys, and a
// requester who may not read the object.
#include <functional>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "version_test_util.h"

using namespace version_test;

namespace {

// Refusals on an object without versions: each operation stops before the
// store is asked for one.
class VersionRefusal : public VersionApi {
protected:
    static void SetUpTestSuite() { s_id = MakeObject(false); }
    void SetUp() override { ErrClear(); }
};

TEST_F(VersionRefusal, AStrangerGetsTheObjectReadsRefusalAndNoVersionData) {
    TESSEL_OBJECT_VERSION ver;
    ver.set_version("kept");
    TESSEL_OBJECT_VERSION *pHead = nullptr;
    unsigned total = 7, listable = 7;
    Json::Value jDiff(Json::objectValue);
    const std::pair<std::function<bool()>, const char *> calls[] = {
        {[&] { return ver.Get(Ask(kUidDave)); }, "!tmpObj.Get(jGetParm)"},
        {[&] { return 0 <= TesselObjectVersionList(Ask(kUidDave), &pHead, total, listable); }, "!tmpObj.Get(jGetParm)"},
        {[&] { return ver.Diff(Ask(kUidDave, R"("old_version": "x")"), jDiff); }, "!tmpOldObj.Get(jGetParm)"},
    };
    for (const auto &c : calls) {
        ErrClear();
        EXPECT_FALSE(c.first()) << c.second;
        EXPECT_EQ(TESSEL_ERR_NO_PERMISSION, ErrCode()) << c.second;
        EXPECT_EQ(c.second, ErrMsgs().back());
    }
    EXPECT_EQ("kept", ver.get_version());
    EXPECT_EQ(nullptr, pHead);
    EXPECT_EQ(7u, total);
    EXPECT_EQ("{}", Text(jDiff));
}

TEST_F(VersionRefusal, BadRequestsAndHashKeys) {
    const std::string kBasic =
        "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"id\") || "
        "!jParm[\"id\"].isString() || !jParm.isMember(\"requester\") || !jParm[\"requester\"].isIntegral()";
    const std::string kDiffBasic =
        "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"id\") || "
        "!jParm[\"id\"].isString() || !jParm.isMember(\"old_version\") || !jParm[\"old_version\"].isString() || "
        "!jParm.isMember(\"requester\") || !jParm[\"requester\"].isIntegral()";
    const std::string kMissing = "NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"";
    TESSEL_OBJECT_VERSION ver;
    Json::Value jDiff(Json::objectValue), jArray(Json::arrayValue);
    TESSEL_OBJECT_VERSION *pHead = nullptr;
    unsigned t = 0, l = 0;
    auto get = [&](Json::Value j) { return ver.Get(j) ? 0 : -1; };
    auto list = [&](Json::Value j) { return TesselObjectVersionList(j, &pHead, t, l); };
    auto diff = [&](Json::Value j) { return ver.Diff(j, jDiff) ? 0 : -1; };
    auto hashGet = [&](std::vector<std::pair<std::string, std::string>> kv) {
        Hash h(kv);
        return TesselObjectVersionGet(h.p, &ver);
    };
    Json::Value jNoRequester = Ask(kUidAlice);
    jNoRequester.removeMember("requester");
    const std::string id = s_id;
    const struct {
        std::function<int()> call;
        int code;
        std::string condition;
    } cases[] = {
        {[&] { return get(jNoRequester); }, 1007, kBasic},
        {[&] { return list(jNoRequester); }, 1007, kBasic},
        {[&] { return diff(Ask(kUidAlice)); }, 1007, kDiffBasic},
        {[&] { return get(Ask(kUidAlice, R"("version": 1)")); }, 1007,
         "jParm.isMember(\"version\") && !jParm[\"version\"].isString()"},
        {[&] { return diff(Ask(kUidAlice, R"("old_version": "x", "new_version": ["y"])")); }, 1007,
         "jParm.isMember(\"new_version\") && !jParm[\"new_version\"].isString()"},
        {[&] { return list(Ask(kUidAlice, R"("offset": -1)")); }, 1007,
         "jParm.isMember(\"offset\") && !jParm[\"offset\"].isUInt()"},
        {[&] { return TesselObjectVersionList(Ask(kUidAlice), nullptr, t, l); }, 1015, "NULL == addrPHead"},
        {[&] { return ver.Diff(Ask(kUidAlice, R"("old_version": "x")"), jArray) ? 0 : -1; }, 1015,
         "!jDiff.isObject()"},
        {[&] { return hashGet({{"ns", "ledger"}, {"requester", "1001"}}); }, 1007, kMissing + "id\"))"},
        {[&] { return hashGet({{"ns", "ledger"}, {"id", id}}); }, 1007, kMissing + "requester\"))"},
        {[&] { return hashGet({{"ns", "ledger"}, {"id", id}, {"requester", "12x"}}); }, 1007, "endPtr && *endPtr"},
        {[&] { return hashGet({{"ns", "ledger"}, {"id", id}, {"requester", ""}}); }, 1007, "endPtr == pParm"},
        {[&] { return hashGet({{"ns", "ledger"}, {"id", id}, {"requester", "4294967296"}}); }, 1007,
         "UID_ERR < ulRequester"},
        {[&] { return TesselObjectVersionGet(Hash().p, nullptr); }, 1015, "NULL == pVersion"},
        {[&] {
             Hash h({{"ns", "ledger"}, {"id", id}, {"requester", "1001"}}), text;
             return TesselObjectVersionDiff(h.p, &text.p, &text.p);
         },
         1007, kMissing + "old_version\"))"},
        {[&] {
             QLIBSZHASH *pNone = nullptr;
             return TesselObjectVersionDiff(Hash().p, &pNone, &pNone);
         },
         1015, "NULL == ppTextDiffHash || NULL == *ppTextDiffHash"},
        {[&] {
             Hash h({{"ns", "ledger"}, {"id", id}, {"requester", "1001"}, {"limit", "2x"}});
             return TesselObjectVersionList(h.p, &pHead, &t, &l);
         },
         1007, "endPtr && *endPtr"},
    };
    for (const auto &c : cases) {
        ErrClear();
        EXPECT_EQ(-1, c.call()) << c.condition;
        EXPECT_EQ(c.code, ErrCode()) << c.condition;
        EXPECT_EQ(Msgs{c.condition}, ErrMsgs());
    }
    EXPECT_EQ(nullptr, pHead);

    // A namespace that is not enabled, an identifier without an owner.
    Json::Value jParm = Ask(kUidAlice);
    jParm["ns"] = "closed";
    EXPECT_EQ(-1, get(jParm));
    EXPECT_EQ(TESSEL_ERR_NS_DISABLED, ErrCode());
    EXPECT_EQ("FALSE == TesselAccessCheck(jParm[\"ns\"].asCString())", ErrMsgs().back());
    ErrClear();
    jParm = Ask(kUidAlice);
    jParm["id"] = "nobody_" + std::string(96, 'a');
    EXPECT_EQ(-1, get(jParm));
    EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
    EXPECT_EQ("FALSE == TesselObjectIDIsValid(jParm[\"id\"].asCString())", ErrMsgs().back());
}

}  // namespace
