// The JSON form of a record: which fields toJson writes for a selection, and
// what fromJson takes over.
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "object_test_util.h"
#include "support/error_stack.h"
#include "support/sandbox.h"
#include "tessel_error.h"
#include "tessel_id.h"
#include "tesselobject.h"

using object_test::ExpectBadArgument;
using object_test::Parse;
using object_test::Text;

namespace {

// A record with every field set; perm as given.
void Fill(TESSEL_OBJECT &object, const std::string &strPerm = "ro") {
    object.set_ns("notes");
    object.set_id("1001_ABCDEF");
    object.set_category("memo");
    object.set_version("0123456789abcdef0123456789abcdef01234567");
    object.set_commit_msg(Parse(R"({"msg":"first"})"));
    object.set_parent_id("1001_PARENT");
    object.set_owner(tessel_test::kUidAlice);
    object.set_metatext(Parse(R"({"tag":"x","color":"red"})"));
    object.set_text(Parse(R"({"title":"T","body":"B","none":null})"));
    object.set_metabinary_info(Parse(R"({"icon.png":{"size":4}})"));
    object.set_binary_info(Parse(R"({"a.bin":{"size":3},"b.bin":{"size":5}})"));
    object.set_path_info(Parse(R"({"dir":"/volume1/x"})"));
    object.set_acl(Parse(R"({"1002":"rw"})"));
    object.set_perm(strPerm);
    object.set_ctime(1700000000);
    object.set_mtime(1700000500);
    object.set_err(Parse(R"({"code":1008})"));
    object.set_extra_info(Parse(R"({"x":true})"));
    object.set_person(Parse(R"({"1001":{"n":1}})"));
}

const char kDefaults[] =
    R"({"category":"memo","ctime":1700000000,"id":"1001_ABCDEF","mtime":1700000500,"ns":"notes",)"
    R"("owner":{"display_name":"alice","uid":1001},"parent_id":"1001_PARENT","perm":"ro",)"
    R"("version":"0123456789abcdef0123456789abcdef01234567"})";

std::string ToJson(const TESSEL_OBJECT &object, const Json::Value &jField, bool blShowAcl = false) {
    Json::Value jRet(Json::objectValue);
    EXPECT_TRUE(object.toJson(jField, jRet, blShowAcl));
    return Text(jRet);
}

TEST(ToJson, RefusesAResultThatIsNotAnObject) {
    TESSEL_OBJECT object;
    Fill(object);
    for (const char *szRet : {"null", "[]", "\"text\"", "7"}) {
        Json::Value jRet = Parse(szRet);
        size_t mark = tessel_test::SyslogMark();
        EXPECT_FALSE(object.toJson(Json::Value(), jRet, true)) << szRet;
        EXPECT_EQ(szRet, Text(jRet)) << "left as it was";
        EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, tessel_test::ErrCode()) << szRet;
        EXPECT_EQ(std::vector<std::string>{"!jRet.isObject()"}, tessel_test::ErrMsgs());
        const Json::Value &jFrame = TesselErrMsgGet()[0u];
        EXPECT_EQ("object/object_json", jFrame["file"].asString());
        std::string strLine = "object/object_json:" + std::to_string(jFrame["line"].asInt()) +
                              " Failed [!jRet.isObject()], err=";
        EXPECT_TRUE(tessel_test::WaitForSyslog(strLine, mark, LOG_USER | LOG_ERR).has_value()) << strLine;
    }
}

TEST(ToJson, NoSelectionWritesTheDefaultFieldsOnlyAndKeepsTheRest) {
    TESSEL_OBJECT object;
    Fill(object);
    EXPECT_EQ(kDefaults, ToJson(object, Json::Value(Json::objectValue)));
    EXPECT_EQ(kDefaults, ToJson(object, Json::Value()));
    // Not even blShowAcl adds anything that was not asked for.
    EXPECT_EQ(kDefaults, ToJson(object, Json::Value(), true));
    Json::Value jRet = Parse(R"({"keep":1,"ns":"overwritten"})");
    ASSERT_TRUE(object.toJson(Parse(R"({"id":false})"), jRet, false));
    EXPECT_EQ(1, jRet["keep"].asInt());
    EXPECT_EQ("notes", jRet["ns"].asString());
    EXPECT_FALSE(jRet.isMember("id"));
}

struct DefaultKeyCase {
    const char *selection;
    bool written;
};

TEST(ToJson, DefaultFieldsAreTurnedOffOnlyByFalseValues) {
    const DefaultKeyCase cases[] = {
        {"false", false}, {"0", false}, {"null", false}, {"0.0", false},
        {"true", true},   {"1", true},  {"\"yes\"", true}, {"{\"a\":1}", true},
    };
    for (const char *szKey : {"ns", "id", "category", "version", "perm", "parent_id", "owner", "ctime", "mtime"}) {
        for (const DefaultKeyCase &c : cases) {
            TESSEL_OBJECT object;
            Fill(object);
            Json::Value jField(Json::objectValue);
            jField[szKey] = Parse(c.selection);
            Json::Value jRet(Json::objectValue);
            ASSERT_TRUE(object.toJson(jField, jRet, false));
            EXPECT_EQ(c.written, jRet.isMember(szKey)) << szKey << ": " << c.selection;
            EXPECT_EQ(c.written ? 9u : 8u, jRet.size()) << szKey << ": only that key changes";
        }
    }
}

TEST(ToJson, OwnerCarriesTheUserName) {
    const struct {
        unsigned int uid;
        const char *owner;
    } cases[] = {
        {tessel_test::kUidAlice, R"({"display_name":"alice","uid":1001})"},
        {tessel_test::kUidBob, R"({"display_name":"bob","uid":1002})"},
        {tessel_test::kUidErin, R"({"display_name":"Erin Example","uid":1005})"},
        {0, R"({"display_name":"root","uid":0})"},
        {tessel_test::kUidUnknown, R"({"display_name":"","uid":4242})"},
        {UID_ERR, R"({"display_name":"","uid":4294967295})"},
    };
    for (const auto &c : cases) {
        TESSEL_OBJECT object;
        object.set_owner(c.uid);
        Json::Value jRet(Json::objectValue);
        ASSERT_TRUE(object.toJson(Json::Value(), jRet, false));
        EXPECT_EQ(c.owner, Text(jRet["owner"])) << c.uid;
    }
}

TEST(ToJson, CommitMessageOnlyWhenAskedFor) {
    TESSEL_OBJECT object;
    Fill(object);
    const DefaultKeyCase cases[] = {{"true", true}, {"1", true}, {"false", false}, {"null", false}};
    for (const DefaultKeyCase &c : cases) {
        Json::Value jField(Json::objectValue);
        jField["commit_msg"] = Parse(c.selection);
        Json::Value jRet = Parse(ToJson(object, jField));
        EXPECT_EQ(c.written, jRet.isMember("commit_msg")) << c.selection;
        if (c.written) {
            EXPECT_EQ(R"({"msg":"first"})", Text(jRet["commit_msg"]));
        }
    }
}

TEST(ToJson, DocumentFieldsWholeOrByMember) {
    // The same document in each of the five fields that can be selected by member.
    const char kDoc[] = R"({"title":"T","body":"B","none":null})";
    const struct {
        const char *selection;
        const char *written;  // the key's value in the result, or nullptr for none
    } cases[] = {
        {"true", R"({"body":"B","none":null,"title":"T"})"},
        {R"({"title":true,"body":false})", R"({"title":"T"})"},
        {R"({"title":true,"missing":true})", R"({"title":"T"})"},
        {R"({"none":true})", R"({"none":null})"},
        {R"({"title":1,"body":"yes"})", "{}"},  // only the boolean true picks a member
        {"{}", "{}"},
        {"false", nullptr},
        {"1", nullptr},  // only the boolean true writes the whole field
        {"\"summary\"", nullptr},
        {"null", nullptr},
    };
    typedef bool (TESSEL_OBJECT::*Setter)(const Json::Value &);
    const std::pair<const char *, Setter> fields[] = {
        {"metatext", &TESSEL_OBJECT::set_metatext},
        {"text", &TESSEL_OBJECT::set_text},
        {"person", &TESSEL_OBJECT::set_person},
        {"metabinary_info", &TESSEL_OBJECT::set_metabinary_info},
        {"binary_info", &TESSEL_OBJECT::set_binary_info},
    };
    for (const auto &field : fields) {
        for (const auto &c : cases) {
            TESSEL_OBJECT object;
            (object.*field.second)(Parse(kDoc));
            Json::Value jField(Json::objectValue);
            jField[field.first] = Parse(c.selection);
            Json::Value jRet = Parse(ToJson(object, jField, true));
            if (nullptr == c.written) {
                EXPECT_FALSE(jRet.isMember(field.first)) << field.first << ": " << c.selection;
            } else {
                EXPECT_EQ(c.written, Text(jRet[field.first])) << field.first << ": " << c.selection;
            }
            EXPECT_FALSE(jRet.isMember("acl")) << "acl was not asked for";
        }
    }
}

TEST(ToJson, MemberSelectionOfAFieldThatIsNotAnObject) {
    TESSEL_OBJECT object;
    object.set_text(Parse(R"(["title"])"));
    object.set_binary_info(Json::Value(R"({"a.bin":1})"));  // as fromJson leaves it
    Json::Value jRet = Parse(ToJson(object, Parse(R"({"text":{"title":true},"binary_info":{"a.bin":true}})")));
    EXPECT_EQ("{}", Text(jRet["text"]));
    EXPECT_EQ("{}", Text(jRet["binary_info"]));
}

TEST(ToJson, AclOnlyForWritersOrWhenLetOut) {
    const struct {
        const char *perm;
        const char *selection;
        bool showAcl;
        bool written;
    } cases[] = {
        {"ro", R"({"acl":true})", false, false},
        {"ro", R"({"acl":true})", true, true},
        {"", R"({"acl":true})", false, false},
        {"rw", R"({"acl":true})", false, true},
        {"owner", R"({"acl":true})", false, true},
        {"owner", R"({"acl":1})", false, true},
        {"owner", R"({"acl":false})", true, false},
        {"owner", R"({})", true, false},
        // perm not written: only the boolean decides
        {"owner", R"({"acl":true,"perm":false})", false, false},
        {"ro", R"({"acl":true,"perm":false})", true, true},
    };
    for (const auto &c : cases) {
        TESSEL_OBJECT object;
        Fill(object, c.perm);
        Json::Value jRet = Parse(ToJson(object, Parse(c.selection), c.showAcl));
        EXPECT_EQ(c.written, jRet.isMember("acl")) << c.perm << " " << c.selection << " " << c.showAcl;
        if (c.written) {
            EXPECT_EQ(R"({"1002":"rw"})", Text(jRet["acl"]));
        }
    }
}

TEST(ToJson, EverythingAskedForButNeverTheInternalFields) {
    TESSEL_OBJECT object;
    Fill(object, "owner");
    Json::Value jField = TesselObjectFieldAll();
    jField["person"] = true;
    jField["path_info"] = true;
    jField["extra_info"] = true;
    jField["err"] = true;
    EXPECT_EQ(
        R"({"acl":{"1002":"rw"},"binary_info":{"a.bin":{"size":3},"b.bin":{"size":5}},"category":"memo",)"
        R"("commit_msg":{"msg":"first"},"ctime":1700000000,"id":"1001_ABCDEF",)"
        R"("metabinary_info":{"icon.png":{"size":4}},"metatext":{"color":"red","tag":"x"},)"
        R"("mtime":1700000500,"ns":"notes","owner":{"display_name":"alice","uid":1001},)"
        R"("parent_id":"1001_PARENT","perm":"owner","person":{"1001":{"n":1}},)"
        R"("text":{"body":"B","none":null,"title":"T"},"version":"0123456789abcdef0123456789abcdef01234567"})",
        ToJson(object, jField));
}

TEST(FromJson, TakesOverTheStoredFieldsAndIgnoresTheRest) {
    const char kDoc[] =
        R"({"ns":"notes","id":"1002_ABC","category":"memo","version":"v1","parent_id":"1002_P",)"
        R"("commit_msg":{"msg":"m"},"metatext":{"tag":"x"},"text":{"title":"T"},"acl":{"1001":"ro"},)"
        R"("owner":1002,"ctime":1700000000,"mtime":1700000001,)"
        R"("metabinary_info":{"icon.png":{"size":4}},"binary_info":{"a":1},)"
        R"("perm":"owner","person":{"1002":{}},"extra_info":{"x":1},"path_info":{"dir":"/x"},"err":{"code":1}})";
    TESSEL_OBJECT object;
    ASSERT_TRUE(object.fromJson(Parse(kDoc)));

    EXPECT_EQ("", object.get_perm());
    for (const Json::Value &jIgnored :
         {object.get_person(), object.get_extra_info(), object.get_path_info(), object.get_err()}) {
        EXPECT_TRUE(jIgnored.isNull()) << Text(jIgnored);
    }
    // The binary descriptors become JSON text.
    EXPECT_EQ(R"({"acl":{"1001":"ro"},"binary_info":"{\"a\":1}","category":"memo","commit_msg":{"msg":"m"},)"
              R"("ctime":1700000000,"id":"1002_ABC","metabinary_info":"{\"icon.png\":{\"size\":4}}",)"
              R"("metatext":{"tag":"x"},"mtime":1700000001,"ns":"notes",)"
              R"("owner":{"display_name":"bob","uid":1002},"parent_id":"1002_P","perm":"",)"
              R"("text":{"title":"T"},"version":"v1"})",
              ToJson(object, TesselObjectFieldAll(), true));
}

// Fields a document does not name are left as they were.
TEST(FromJson, NumbersGoThrough64BitsInto32BitFields) {
    const struct {
        const char *doc;
        unsigned long owner;
        long ctime;
    } cases[] = {
        {R"({"owner":-1,"ctime":-5})", 4294967295UL, -5},
        {R"({"owner":4294967297,"ctime":4294967303})", 1, 7},
        {R"({"owner":18446744073709551615,"ctime":1.9e9})", 4294967295UL, 1900000000},
        {R"({"owner":1001.7,"ctime":true})", 1001, 1},
        {R"({"owner":null,"ctime":null})", 0, 0},
        {R"({"category":"memo"})", 77, 77},
    };
    for (const auto &c : cases) {
        TESSEL_OBJECT object;
        object.set_ns("notes");
        object.set_owner(77);
        object.set_ctime(77);
        object.set_text(Parse(R"({"title":"T"})"));
        ASSERT_TRUE(object.fromJson(Parse(c.doc))) << c.doc;
        EXPECT_EQ(c.owner, object.get_owner()) << c.doc;
        EXPECT_EQ(c.ctime, object.get_ctime()) << c.doc;
        EXPECT_EQ("notes", object.get_ns()) << c.doc;
        EXPECT_EQ(R"({"title":"T"})", Text(object.get_text())) << c.doc;
    }
    TESSEL_OBJECT object;
    ASSERT_TRUE(object.fromJson(Parse(R"({"category":"memo"})")));
    EXPECT_EQ("memo", object.get_category());
}

TEST(FromJson, AValueThatCannotBecomeItsFieldChangesNothing) {
    const struct {
        const char *doc;
        const char *condition;
        Json::ValueType type;
    } cases[] = {
        {"null", "jVal.isObject()", Json::nullValue},
        {R"([{"ns":"x"}])", "jVal.isObject()", Json::arrayValue},
        {R"("ns")", "jVal.isObject()", Json::stringValue},
        {"3", "jVal.isObject()", Json::intValue},
        {R"({"ns":"other","owner":"alice"})", R"(ToUInt64(jVal["owner"], u64))", Json::stringValue},
        {R"({"ns":"other","owner":-1e30})", R"(ToUInt64(jVal["owner"], u64))", Json::realValue},
        {R"({"ns":"other","ctime":{}})", R"(ToInt64(jVal["ctime"], i64))", Json::objectValue},
        {R"({"ns":"other","mtime":1e300})", R"(ToInt64(jVal["mtime"], i64))", Json::realValue},
        {R"({"ns":"other","id":["x"]})", R"(jVal["id"].isConvertibleTo(Json::stringValue))", Json::arrayValue},
        {R"({"text":{},"parent_id":{"a":1}})", R"(jVal["parent_id"].isConvertibleTo(Json::stringValue))",
         Json::objectValue},
    };
    for (const auto &c : cases) {
        TESSEL_OBJECT object;
        object.set_ns("kept");
        object.set_owner(tessel_test::kUidBob);
        QLIBCErrClear();
        size_t mark = tessel_test::SyslogMark();
        EXPECT_FALSE(object.fromJson(Parse(c.doc))) << c.doc;
        ExpectBadArgument(mark, "object/object_json", c.condition, c.type);
        EXPECT_EQ("kept", object.get_ns()) << c.doc;
        EXPECT_EQ(tessel_test::kUidBob, object.get_owner()) << c.doc;
        EXPECT_TRUE(object.get_text().isNull()) << c.doc;
    }
}

}  // namespace
