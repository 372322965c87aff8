// The object plug-in: a real platform plug-in of module "object" (built from
// object_plugin.cc) writes each action's arguments to TEST_OBJECT_PLUGIN_OUT.
#include <stdio.h>
#include <syslog.h>

#include <functional>
#include <string>

#include <gtest/gtest.h>

#include <quor/qlib.h>

#include "common/tessel_json.h"
#include "support/json_text.h"
#include "support/error_stack.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_hook.h"

using namespace tessel_test;
using Msgs = std::vector<std::string>;

namespace {

const std::string kOrgArgs =
    "Org_NameSpace|text|notes|0\nOrg_ID|text|1001_aa|0\nOrg_Category|text|memo|0\nOrg_Version|text|v1|0\n"
    "Org_CommitMsg|text|{\"m\":\"old\"}|0\nOrg_ParentID|text|1001_00|0\nOrg_Owner|text|1001|0\n"
    "Org_MetaText|text|{\"t\":\"T\"}|0\nOrg_Text|text|{\"b\":\"a\"}|0\nOrg_MetaBinary_info|text|{\"m\":1}|0\n"
    "Org_Binary_info|text|[\"x.bin\"]|0\nOrg_ACL|text|{\"public\":\"ro\"}|0\nOrg_CreateTime|text|1700000000|0\n"
    "Org_ModifyTime|text|1700000001|0\nOrg_ExtraInfo|text|{\"k\":true}|0\n";
// A fresh record (empty texts, null JSON fields), owner and ctime at the
// edges of their formats.
const std::string kNewArgs =
    "New_NameSpace|text||0\nNew_ID|text|1001_bb|0\nNew_Category|text||0\nNew_Version|text||0\n"
    "New_CommitMsg|text|null|0\nNew_ParentID|text||0\nNew_Owner|text|4294967295|0\nNew_MetaText|text|null|0\n"
    "New_Text|text|{\"b\":\"\xC3\xA9\"}|0\nNew_MetaBinary_info|text|null|0\nNew_Binary_info|text|null|0\n"
    "New_ACL|text|null|0\nNew_CreateTime|text|-1|0\nNew_ModifyTime|text|0|0\nNew_ExtraInfo|text|null|0\n";


void Refused(const std::function<bool()> &call, int code, const Msgs &msgs) {
    ErrClear();
    EXPECT_FALSE(call());
    EXPECT_EQ(code, ErrCode());
    EXPECT_EQ(msgs, ErrMsgs());
}

}  // namespace

TEST(ObjectPlugin, HandsResultAndBothRecordsToThePlugin) {
    TESSEL_OBJECT oldObj, newObj;
    oldObj.fromJson(Parse("{\"ns\":\"notes\",\"id\":\"1001_aa\",\"category\":\"memo\",\"version\":\"v1\","
                      "\"commit_msg\":{\"m\":\"old\"},\"parent_id\":\"1001_00\",\"owner\":1001,"
                      "\"metatext\":{\"t\":\"T\"},\"text\":{\"b\":\"a\"},\"acl\":{\"public\":\"ro\"},"
                      "\"ctime\":1700000000,\"mtime\":1700000001}"));
    oldObj.set_metabinary_info(Parse("{\"m\":1}"));
    oldObj.set_binary_info(Parse("[\"x.bin\"]"));
    oldObj.set_extra_info(Parse("{\"k\":true}"));
    newObj.fromJson(Parse("{\"id\":\"1001_bb\",\"owner\":-1,\"ctime\":-1,\"text\":{\"b\":\"\xC3\xA9\"}}"));
    TESSEL_OBJECT_ENV env;
    ASSERT_TRUE(TesselObjectPlugin_init(&env, TEST_OBJECT_PLUGIN, &oldObj, &newObj));
    env.result = -7;
    ASSERT_TRUE(TesselObjectPlugin("set", &env));
    EXPECT_EQ("set\nRESULT|int|-7|-7\n" + kOrgArgs + kNewArgs, ReadFile(TEST_OBJECT_PLUGIN_OUT));
    EXPECT_TRUE(TesselObjectPlugin_exit(&env));
    EXPECT_EQ(nullptr, env.pPlugin);

    ASSERT_TRUE(TesselObjectPlugin_init(&env, TEST_OBJECT_PLUGIN, NULL, &newObj));
    ASSERT_TRUE(TesselObjectPlugin("create", &env));
    EXPECT_EQ("create\nRESULT|int|0|0\n" + kNewArgs, ReadFile(TEST_OBJECT_PLUGIN_OUT));
    Refused([&] { return TesselObjectPlugin("fail", &env); }, TESSEL_ERR_PLUGIN_EXEC,
            {"0 > QLIBPluginAction(action, pstEnvVar->pPlugin)"});
    env.pNew = NULL;
    Refused([&] { return TesselObjectPlugin("set", &env); }, TESSEL_ERR_PLUGIN_NOT_INIT,
            {"(NULL == pstEnvVar->pOrg && NULL == pstEnvVar->pNew)", "!TesselObjectPluginSetEnv(pstEnvVar)"});
    EXPECT_TRUE(TesselObjectPlugin_exit(&env));
}

TEST(ObjectPlugin, RefusesBadUseBeforeLoadingAnything) {
    TESSEL_OBJECT obj;
    TESSEL_OBJECT_ENV env = {NULL, 42, &obj, NULL};
    QLIBPLUGIN *pPlugin = NULL;
    Refused([&] { return TesselObjectPlugin_init(&env, TEST_OBJECT_PLUGIN, NULL, NULL); }, TESSEL_ERR_BAD_PARAMETERS,
            {"NULL == pOrg && NULL == pNew"});
    EXPECT_TRUE(NULL == env.pPlugin && 42 == env.result && &obj == env.pOrg);
    Refused([&] { return TesselObjectPlugin_init(NULL, TEST_OBJECT_PLUGIN, &obj, NULL); }, TESSEL_ERR_BAD_PARAMETERS,
            {"NULL == pstEnvVar"});
    Refused([&] { return TesselObjectPlugin_init(&env, NULL, &obj, NULL); }, TESSEL_ERR_BAD_PARAMETERS,
            {"NULL == szPlugin"});
    Refused([&] { return TesselObjectPlugin("set", NULL); }, TESSEL_ERR_BAD_PARAMETERS, {"NULL == pstEnvVar"});
    Refused([&] { return TesselObjectPlugin("set", &env); }, TESSEL_ERR_PLUGIN_NOT_INIT,
            {"!QLIBPluginHasInit(pstEnvVar->pPlugin)"});
    Refused([&] { return TesselObjectPlugin_exit(NULL); }, TESSEL_ERR_BAD_PARAMETERS, {"NULL == pstEnvVar"});
    Refused([&] { return 0 == TesselPluginInit("object", TEST_OBJECT_PLUGIN, NULL); }, TESSEL_ERR_BAD_PARAMETERS,
            {"NULL == ppPlugin"});
    Refused([&] { return 0 == TesselPluginInit(NULL, TEST_OBJECT_PLUGIN, &pPlugin); }, TESSEL_ERR_BAD_PARAMETERS,
            {"NULL == szModuleName"});
    Refused([&] { return 0 == TesselPluginInit("version", TEST_OBJECT_PLUGIN, &pPlugin); }, TESSEL_ERR_BAD_PARAMETERS,
            {"-1 == iRet", "0 > TesselPluginModuleVersion(szModule, &major, &minor)"});
    // A namespace module is no platform plug-in.
    Refused([&] { return 0 == TesselPluginInit("object", TEST_HOOK_MODULE_FULL, &pPlugin); }, TESSEL_ERR_PLUGIN_INIT,
            {"0 > QLIBPluginInit(szPath, pslSearchPath, major, minor, ppPlugin)"});

    // No search path: a bare file name is not found, even beside the program.
    size_t mark = SyslogMark();
    Refused([&] { return TesselObjectPlugin_init(&env, TEST_OBJECT_PLUGIN_NAME, &obj, NULL); },
            TESSEL_ERR_PLUGIN_INIT, {"0 > QLIBPluginInit(szPath, pslSearchPath, major, minor, ppPlugin)"});
    char szWant[256];
    snprintf(szWant, sizeof(szWant), " Fail to init plugin [object] [0x%04X %s:%d]", QLIBC_ERR_NOT_FOUND,
             QLIBCErrFileGet(), QLIBCErrLineGet());
    auto line = WaitForSyslog(szWant, mark, LOG_USER | LOG_ERR);
    ASSERT_TRUE(line) << szWant;
    EXPECT_EQ(0u, line->message.find("object/object_plugin:")) << line->message;
}
