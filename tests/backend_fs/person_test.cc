// Person records of an object: what a selection reads, how writes merge or
// replace, and loading one person into a record.
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <string>

#include <gtest/gtest.h>

#include "backend_fs/meta.h"
#include "common/tessel_json.h"
#include "support/json_text.h"
#include "support/error_stack.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_file.h"
#include "tessel_user.h"
#include "tesselobject.h"

using namespace tessel_test;

namespace {


std::string PersonFile(const std::string &strDir, const std::string &strKey) {
    std::string strEncoded;
    EXPECT_TRUE(TesselEncode(strKey, strEncoded));
    return strDir + "/" + strEncoded;
}


TEST(PersonRecords, WritesMergeUnlessCleared) {
    ScratchDir dir;
    const std::string strDir = dir.path();
    ASSERT_TRUE(tessel::SavePersons(strDir, Parse(R"({"1001": {"role": "author", "seen": 3},
                                                    "summary": {"count": 1},
                                                    "label": {"ignored": true}})")));
    EXPECT_EQ(Parse(R"({"role": "author", "seen": 3})"), ReadJson(PersonFile(strDir, "1001")));
    EXPECT_EQ(Parse(R"({"count": 1})"), ReadJson(strDir + "/summary.json"));
    // Only digit-led names and "summary" are records.
    EXPECT_NE(0, access(PersonFile(strDir, "label").c_str(), F_OK));

    // A merge: a null member deletes its key, others replace or add.
    ASSERT_TRUE(tessel::SavePersons(strDir, Parse(R"({"1001": {"seen": null, "role": "editor", "at": 7},
                                                    "1002": {"role": "reader"}})")));
    EXPECT_EQ(Parse(R"({"role": "editor", "at": 7})"), ReadJson(PersonFile(strDir, "1001")));
    EXPECT_EQ(Parse(R"({"role": "reader"})"), ReadJson(PersonFile(strDir, "1002")));

    // "@clear": the given records replace the stored ones, persons no longer
    // named are gone, the summary stays as it was.
    ASSERT_TRUE(tessel::SavePersons(strDir, Parse(R"({"@clear": true, "1002": {"role": "owner"}})")));
    EXPECT_EQ(Parse(R"({"role": "owner"})"), ReadJson(PersonFile(strDir, "1002")));
    EXPECT_NE(0, access(PersonFile(strDir, "1001").c_str(), F_OK));
    EXPECT_EQ(Parse(R"({"count": 1})"), ReadJson(strDir + "/summary.json"));

    // A person set to null is dropped.
    ASSERT_TRUE(tessel::SavePersons(strDir, Parse(R"({"1002": null})")));
    EXPECT_NE(0, access(PersonFile(strDir, "1002").c_str(), F_OK));
}

TEST(PersonRecords, AFailedRecordIsLoggedAndTheOthersStillWritten) {
    ScratchDir dir;
    const std::string strDir = dir.path();
    size_t mark = SyslogMark();
    // A record that is not an object cannot be merged.
    EXPECT_FALSE(tessel::SavePersons(strDir, Parse(R"({"1001": [1, 2], "1002": {"role": "reader"}})")));
    EXPECT_TRUE(WaitForSyslog("failed to mergeJsonObject[1001][[1,2]]", mark, LOG_USER | LOG_ERR).has_value());
    EXPECT_NE(0, access(PersonFile(strDir, "1001").c_str(), F_OK));
    EXPECT_EQ(Parse(R"({"role": "reader"})"), ReadJson(PersonFile(strDir, "1002")));

    // Nowhere to write: logged with the record's key and file.
    mark = SyslogMark();
    EXPECT_FALSE(tessel::SavePersons(strDir + "/missing", Parse(R"({"1003": {"a": 1}})")));
    EXPECT_TRUE(WaitForSyslog("failed to write [1003] from [" + PersonFile(strDir + "/missing", "1003") + "]", mark,
                              LOG_USER | LOG_ERR)
                    .has_value());
}

TEST(PersonRecords, TheSelectionDecidesWhatIsRead) {
    ScratchDir dir;
    const std::string strDir = dir.path();
    ASSERT_TRUE(tessel::SavePersons(strDir, Parse(R"({"1001": {"r": 1}, "1002": {"r": 2}, "1003": {"r": 3},
                                                    "summary": {"count": 3}})")));
    Json::Value jPerson(Json::objectValue);
    ASSERT_TRUE(tessel::ReadPersons(strDir, "summary", jPerson));
    EXPECT_EQ(Parse(R"({"count": 3})"), jPerson);

    jPerson = Json::Value(Json::objectValue);
    ASSERT_TRUE(tessel::ReadPersons(strDir, "1002", jPerson));
    EXPECT_EQ(Parse(R"({"1002": {"r": 2}})"), jPerson);

    jPerson = Json::Value(Json::objectValue);
    ASSERT_TRUE(tessel::ReadPersons(strDir, Parse(R"(["1001", 1003])"), jPerson));
    EXPECT_EQ(Parse(R"({"1001": {"r": 1}, "1003": {"r": 3}})"), jPerson);

    jPerson = Json::Value(Json::objectValue);
    ASSERT_TRUE(tessel::ReadPersons(strDir, Parse(R"({"1001": true, "1002": false})"), jPerson));
    EXPECT_EQ(Parse(R"({"1001": {"r": 1}})"), jPerson);

    jPerson = Json::Value(Json::objectValue);
    ASSERT_TRUE(tessel::ReadPersons(strDir, true, jPerson));
    EXPECT_EQ(Parse(R"({"1001": {"r": 1}, "1002": {"r": 2}, "1003": {"r": 3}, "summary": {"count": 3}})"), jPerson);

    // A person without a record is logged and left out.
    size_t mark = SyslogMark();
    jPerson = Json::Value(Json::objectValue);
    ASSERT_TRUE(tessel::ReadPersons(strDir, Parse(R"(["1001", "1009"])"), jPerson));
    EXPECT_EQ(Parse(R"({"1001": {"r": 1}})"), jPerson);
    const std::string strLine = "failed to read [1009] from [" + PersonFile(strDir, "1009") + "]";
    EXPECT_TRUE(WaitForSyslog(strLine, mark, LOG_USER | LOG_ERR)
                    .has_value());
}

TEST(PersonRecords, UpdatePersonLoadsOneRecordAsRoot) {
    // An object directory readable by root alone, in a linked namespace.
    const std::string strId = "1001_" + std::string(96, 'A');
    const std::string strObj = "/volume1/@Tessel/ledger/" + strId;
    ASSERT_EQ(0, system(("mkdir -p " + strObj + "/person /usr/quor/etc/tessel/ns && chmod 0700 " + strObj +
                         " && ln -sfn /volume1/@Tessel/ledger /usr/quor/etc/tessel/ns/ledger")
                            .c_str()));
    ASSERT_TRUE(tessel::SavePersons(strObj + "/person", Parse(R"({"1002": {"role": "reader"}})")));

    int rc = RunAsUser(kUidAlice, kGidUsers, [&]() {
        TESSEL_OBJECT obj;
        obj.set_ns("ledger");
        obj.set_id(strId);
        obj.set_person(Parse(R"({"1001": {"role": "author"}})"));
        EXPECT_TRUE(TesselUpdatePerson(&obj, kUidBob));
        EXPECT_EQ(Parse(R"({"1001": {"role": "author"}, "1002": {"role": "reader"}})"), obj.get_person());

        ErrClear();
        EXPECT_FALSE(TesselUpdatePerson(&obj, kUidCarol));
        EXPECT_EQ(std::vector<std::string>{"!jsUser.fromFile(strPath)"}, ErrMsgs());

        ErrClear();
        obj.set_id("../ledger");
        EXPECT_FALSE(TesselUpdatePerson(&obj, kUidBob));
        EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());

        ErrClear();
        EXPECT_FALSE(TesselUpdatePerson(NULL, kUidBob));
        EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, ErrCode());
        EXPECT_EQ(std::vector<std::string>{"!pObj"}, ErrMsgs());

        EXPECT_EQ(kUidAlice, geteuid());
        EXPECT_EQ(kGidUsers, getegid());
        return ::testing::Test::HasFailure() ? 1 : 0;
    });
    EXPECT_EQ(0, rc);
}

}  // namespace
