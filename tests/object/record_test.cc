// The record itself: construction against reset, the member accessors,
// allocation and chains, and the user names that toJson shows.
#include <functional>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "object_test_util.h"
#include "support/sandbox.h"
#include "tessel_error.h"
#include "tessel_id.h"
#include "tessel_user.h"
#include "tesselobject.h"

using object_test::Parse;
using object_test::Text;

namespace {

// One field as seen through its member getter, the value a test stores in it,
// and what a new record and a reset record show.
struct FieldCase {
    const char *name;
    std::function<std::string(const TESSEL_OBJECT &)> read;
    std::function<bool(TESSEL_OBJECT &)> fill;
    std::string fresh;
    std::string cleared;  // after fill, then clear()
};

std::vector<FieldCase> Fields() {
    auto json = [](const char *text) { return Parse(text); };
    return {
        {"ns", [](const TESSEL_OBJECT &o) { return o.get_ns(); },
         [](TESSEL_OBJECT &o) { return o.set_ns("notes"); }, "", ""},
        {"id", [](const TESSEL_OBJECT &o) { return o.get_id(); },
         [](TESSEL_OBJECT &o) { return o.set_id("1001_ABCDEF"); }, "", ""},
        {"category", [](const TESSEL_OBJECT &o) { return o.get_category(); },
         [](TESSEL_OBJECT &o) { return o.set_category("memo"); }, "", ""},
        {"version", [](const TESSEL_OBJECT &o) { return o.get_version(); },
         [](TESSEL_OBJECT &o) { return o.set_version("0123456789abcdef0123456789abcdef01234567"); }, "", ""},
        {"commit_msg", [](const TESSEL_OBJECT &o) { return Text(o.get_commit_msg()); },
         [json](TESSEL_OBJECT &o) { return o.set_commit_msg(json(R"({"msg":"first"})")); }, "null", "{}"},
        {"parent_id", [](const TESSEL_OBJECT &o) { return o.get_parent_id(); },
         [](TESSEL_OBJECT &o) { return o.set_parent_id("1001_PARENT"); }, "", ""},
        {"owner", [](const TESSEL_OBJECT &o) { return std::to_string(o.get_owner()); },
         [](TESSEL_OBJECT &o) { return o.set_owner(1001); }, "0", "4294967295"},
        {"metatext", [](const TESSEL_OBJECT &o) { return Text(o.get_metatext()); },
         [json](TESSEL_OBJECT &o) { return o.set_metatext(json(R"({"tag":"x"})")); }, "null", "{}"},
        {"text", [](const TESSEL_OBJECT &o) { return Text(o.get_text()); },
         [json](TESSEL_OBJECT &o) { return o.set_text(json(R"({"title":"t","body":"b"})")); }, "null", "{}"},
        {"metabinary_info", [](const TESSEL_OBJECT &o) { return Text(o.get_metabinary_info()); },
         [json](TESSEL_OBJECT &o) { return o.set_metabinary_info(json(R"([{"name":"a.png"}])")); }, "null", "[]"},
        {"binary_info", [](const TESSEL_OBJECT &o) { return Text(o.get_binary_info()); },
         [json](TESSEL_OBJECT &o) { return o.set_binary_info(json(R"({"f.bin":{"size":3}})")); }, "null", "{}"},
        {"path_info", [](const TESSEL_OBJECT &o) { return Text(o.get_path_info()); },
         [json](TESSEL_OBJECT &o) { return o.set_path_info(json(R"({"dir":"/volume1/x"})")); }, "null",
         R"({"dir":"/volume1/x"})"},
        {"acl", [](const TESSEL_OBJECT &o) { return Text(o.get_acl()); },
         [json](TESSEL_OBJECT &o) { return o.set_acl(json(R"({"1002":"rw"})")); }, "null", "{}"},
        {"perm", [](const TESSEL_OBJECT &o) { return o.get_perm(); },
         [](TESSEL_OBJECT &o) { return o.set_perm("owner"); }, "", "owner"},
        {"ctime", [](const TESSEL_OBJECT &o) { return std::to_string(o.get_ctime()); },
         [](TESSEL_OBJECT &o) { return o.set_ctime(1700000000); }, "0", "0"},
        {"mtime", [](const TESSEL_OBJECT &o) { return std::to_string(o.get_mtime()); },
         [](TESSEL_OBJECT &o) { return o.set_mtime(1700000500); }, "0", "0"},
        {"err", [](const TESSEL_OBJECT &o) { return Text(o.get_err()); },
         [json](TESSEL_OBJECT &o) { return o.set_err(json(R"({"code":1008})")); }, "null", "{}"},
        {"extra_info", [](const TESSEL_OBJECT &o) { return Text(o.get_extra_info()); },
         [json](TESSEL_OBJECT &o) { return o.set_extra_info(json(R"({"x":true})")); }, "null", "{}"},
        {"person", [](const TESSEL_OBJECT &o) { return Text(o.get_person()); },
         [json](TESSEL_OBJECT &o) { return o.set_person(json(R"({"1001":{"n":1}})")); }, "null", "{}"},
    };
}

TEST(ObjectRecord, NewRecordAndResetRecordDifferWhereIntended) {
    TESSEL_OBJECT fresh;
    TESSEL_OBJECT filled;
    for (const FieldCase &field : Fields()) {
        EXPECT_EQ(field.fresh, field.read(fresh)) << field.name << " of a new record";
        ASSERT_TRUE(field.fill(filled)) << field.name;
        EXPECT_NE(field.fresh, field.read(filled)) << field.name << ": the fill value must differ";
    }
    filled.clear();
    for (const FieldCase &field : Fields()) {
        EXPECT_EQ(field.cleared, field.read(filled)) << field.name << " after clear()";
    }
    // Emptied JSON keeps its kind: an array stays an array.
    EXPECT_TRUE(filled.get_metabinary_info().isArray());
    EXPECT_TRUE(filled.get_person().isObject());
    EXPECT_TRUE(filled.get_ref_text().isObject());
}

TEST(ObjectRecord, ClearOfANewRecordSetsNoOwnerAndAnEmptyPerson) {
    TesselObjectClear(NULL);
    TESSEL_OBJECT object;
    object.set_ns("notes");
    object.set_perm("rw");
    TesselObjectClear(&object);
    EXPECT_EQ("", object.get_ns());
    EXPECT_EQ("rw", object.get_perm());
    EXPECT_EQ(UID_ERR, object.get_owner());
    EXPECT_EQ("{}", Text(object.get_person()));
    EXPECT_TRUE(object.get_text().isNull()) << "null stays null";
    EXPECT_TRUE(object.get_path_info().isNull());
}

TEST(ObjectRecord, ClearCopesWithScalarJsonFields) {
    // A scalar cannot be emptied in place (jsoncpp throws); fromJson leaves
    // the binary descriptors as text, and callers may store any JSON value.
    TESSEL_OBJECT object;
    ASSERT_TRUE(object.set_binary_info(Json::Value("{\"a\":1}")) && object.set_commit_msg(Json::Value(42)) &&
                object.set_acl(Json::Value(true)) && object.set_err(Json::Value(1.5)));
    object.clear();
    for (const Json::Value &jField :
         {object.get_binary_info(), object.get_commit_msg(), object.get_acl(), object.get_err()}) {
        EXPECT_TRUE(jField.isNull()) << Text(jField);
    }
}

TEST(ObjectRecord, RefGettersReferToTheFieldItself) {
    TESSEL_OBJECT object;
    const std::string &strNs = object.get_ref_ns();
    const Json::Value &jText = object.get_ref_text();
    object.set_ns("first");
    object.set_text(Parse(R"({"a":1})"));
    EXPECT_EQ("first", strNs);
    EXPECT_EQ(R"({"a":1})", Text(jText));
    object.set_ns("second");
    EXPECT_EQ("second", strNs);
}

TEST(ObjectRecord, IntegersAreStoredIn32Bits) {
    TESSEL_OBJECT object;
    object.set_owner(0x100000000UL + 1001);
    EXPECT_EQ(1001u, object.get_owner());
    object.set_owner(0xFFFFFFFFUL);
    EXPECT_EQ(4294967295UL, object.get_owner());
    object.set_ctime(-1);
    EXPECT_EQ(-1, object.get_ctime());
    object.set_mtime(2147483647L);
    EXPECT_EQ(2147483647L, object.get_mtime());
}

// Each JSON field's swap_ member, with the getter to look at the field.
struct SwapCase {
    const char *name;
    bool (TESSEL_OBJECT::*swap)(Json::Value &);
    const Json::Value &(TESSEL_OBJECT::*ref)() const;
};

const SwapCase kSwaps[] = {
    {"commit_msg", &TESSEL_OBJECT::swap_commit_msg, &TESSEL_OBJECT::get_ref_commit_msg},
    {"metatext", &TESSEL_OBJECT::swap_metatext, &TESSEL_OBJECT::get_ref_metatext},
    {"text", &TESSEL_OBJECT::swap_text, &TESSEL_OBJECT::get_ref_text},
    {"metabinary_info", &TESSEL_OBJECT::swap_metabinary_info, &TESSEL_OBJECT::get_ref_metabinary_info},
    {"binary_info", &TESSEL_OBJECT::swap_binary_info, &TESSEL_OBJECT::get_ref_binary_info},
    {"path_info", &TESSEL_OBJECT::swap_path_info, &TESSEL_OBJECT::get_ref_path_info},
    {"acl", &TESSEL_OBJECT::swap_acl, &TESSEL_OBJECT::get_ref_acl},
    {"err", &TESSEL_OBJECT::swap_err, &TESSEL_OBJECT::get_ref_err},
    {"extra_info", &TESSEL_OBJECT::swap_extra_info, &TESSEL_OBJECT::get_ref_extra_info},
    {"person", &TESSEL_OBJECT::swap_person, &TESSEL_OBJECT::get_ref_person},
};

TEST(ObjectRecord, SwapExchangesWithoutCopying) {
    for (const SwapCase &c : kSwaps) {
        TESSEL_OBJECT object;
        Json::Value jBig(Json::objectValue);
        jBig["body"] = std::string(100000, 'b');
        const char *pBody = jBig["body"].asCString();

        ASSERT_TRUE((object.*c.swap)(jBig)) << c.name;
        EXPECT_TRUE(jBig.isNull()) << c.name << ": the caller gets the old (null) field";
        const Json::Value &jField = (object.*c.ref)();
        ASSERT_TRUE(jField.isObject()) << c.name;
        EXPECT_EQ(pBody, jField["body"].asCString()) << c.name << ": the body was copied";

        Json::Value jOut(Json::arrayValue);
        ASSERT_TRUE((object.*c.swap)(jOut)) << c.name;
        EXPECT_EQ(pBody, jOut["body"].asCString()) << c.name;
        EXPECT_TRUE((object.*c.ref)().isArray()) << c.name;
    }
}

TEST(ObjectRecord, WithoutDataBlockGettersAnswerEmptyAndSettersRefuse) {
    TESSEL_OBJECT object;
    for (const FieldCase &field : Fields()) {
        field.fill(object);
    }
    TESSEL_OBJECT_PRIVATE *pImpl = object.m_impl;
    object.m_impl = NULL;

    for (const FieldCase &field : Fields()) {
        EXPECT_EQ(field.fresh, field.read(object)) << field.name;
        EXPECT_FALSE(field.fill(object)) << field.name;
    }
    EXPECT_EQ("", object.get_ref_ns());
    EXPECT_TRUE(object.get_ref_person().isNull());
    for (const SwapCase &c : kSwaps) {
        Json::Value jVal("kept");
        EXPECT_FALSE((object.*c.swap)(jVal)) << c.name;
        EXPECT_EQ("kept", jVal.asString()) << c.name;
    }
    object.clear();

    object.m_impl = pImpl;
    EXPECT_EQ("notes", object.get_ns()) << "the detached block was not touched";
}

TEST(ObjectAlloc, AllocatedRecordIsUsable) {
    TESSEL_OBJECT *pObject = TesselObjectAlloc();
    ASSERT_NE(nullptr, pObject);
    EXPECT_EQ(nullptr, pObject->next);
    EXPECT_TRUE(pObject->m_param.isObject());
    EXPECT_TRUE(pObject->set_ns("notes"));
    EXPECT_EQ("notes", pObject->get_ns());
    TesselObjectFreeList(pObject);
}

TEST(ObjectAlloc, ChainsAreWalkedAndFreedWhole) {
    // Leaks show up as failures of the sanitizer build.
    EXPECT_EQ(nullptr, TesselObjectNext(NULL));
    TesselObjectFreeList(NULL);

    TESSEL_OBJECT *pHead = NULL;
    for (int i = 0; i < 5; ++i) {
        TESSEL_OBJECT *pObject = TesselObjectAlloc();
        ASSERT_NE(nullptr, pObject);
        pObject->set_id(std::to_string(i));
        pObject->next = pHead;
        pHead = pObject;
    }
    std::string strIds;
    for (TESSEL_OBJECT *p = pHead; NULL != p; p = TesselObjectNext(p)) {
        strIds += p->get_id();
    }
    EXPECT_EQ("43210", strIds);
    TesselObjectFreeList(pHead);

    // A record's destructor frees only itself.
    TESSEL_OBJECT *pSecond = new TESSEL_OBJECT;
    {
        TESSEL_OBJECT first;
        first.next = pSecond;
    }
    pSecond->set_ns("still here");
    EXPECT_EQ("still here", pSecond->get_ns());
    delete pSecond;
}

TEST(ObjectList, OwnsAndFreesItsChain) {
    TESSEL_OBJECT_LIST list;
    EXPECT_TRUE(list.empty() && 0u == list.size());
    list.clear();

    for (int i = 0; i < 3; ++i) {
        TESSEL_OBJECT *pObject = TesselObjectAlloc();
        ASSERT_NE(nullptr, pObject);
        pObject->next = list.m_head;
        list.m_head = pObject;
    }
    EXPECT_EQ(3u, list.size());
    EXPECT_FALSE(list.empty());
    EXPECT_EQ(list.m_head, list.head());
    list.clear();
    EXPECT_EQ(nullptr, list.head());
    EXPECT_EQ(0u, list.size());

    // The destructor frees a chain still held.
    TESSEL_OBJECT_LIST *pList = new TESSEL_OBJECT_LIST;
    pList->m_head = TesselObjectAlloc();
    ASSERT_NE(nullptr, pList->m_head);
    pList->m_head->next = TesselObjectAlloc();
    delete pList;
}

TEST(ObjectFieldAll, AsksForEveryOptionalField) {
    EXPECT_EQ(R"({"acl":true,"binary_info":true,"commit_msg":true,"metabinary_info":true,)"
              R"("metatext":true,"person":"summary","text":true})",
              Text(TesselObjectFieldAll()));
}

TEST(UserName, FromTheUserDatabase) {
    const struct {
        unsigned int uid;
        bool mustExist;
        bool found;
        const char *name;  // what strName holds afterwards
    } cases[] = {
        {tessel_test::kUidAlice, true, true, "alice"},
        {tessel_test::kUidBob, false, true, "bob"},
        {tessel_test::kUidErin, true, true, "Erin Example"},   // domain user: the real name
        {tessel_test::kUidGrace, true, true, "grace@example.com"},
        {0, true, true, "root"},
        {tessel_test::kUidUnknown, false, true, "Deleted user #4242"},
        {tessel_test::kUidUnknown, true, false, "untouched"},
        {UID_ERR, false, true, "Anonymous"},
        {UID_ERR, true, false, "untouched"},
    };
    for (const auto &c : cases) {
        std::string strName = "untouched";
        EXPECT_EQ(c.found ? TRUE : FALSE, TesselGetUserName(c.uid, strName, c.mustExist))
            << c.uid << (c.mustExist ? " must exist" : "");
        EXPECT_EQ(c.name, strName) << c.uid << (c.mustExist ? " must exist" : "");
    }
}

}  // namespace
