// Namespace hook modules: descriptors in the sandbox's private
// /usr/local/libexec/tessel/ naming real modules built beside this test. The
// process-wide loader is never emptied, so look-ups run in fresh children.
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <functional>
#include <string>

#include <gtest/gtest.h>

#include "common/tessel_json.h"
#include "dlopen/tessel_ns_hook_get.h"
#include "support/error_stack.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_hook.h"

using namespace tessel_test;
using Msgs = std::vector<std::string>;

namespace {

const std::string kDescDir = "/usr/local/libexec/tessel/";
TESSEL_NS_HOOK pre, post;

void Describe(const std::string &ns, const std::string &lib) {
    ASSERT_TRUE(WriteFile(kDescDir + ns + ".lib", "{\"lib\": \"" + lib + "\"}"));
}
void InFreshProcess(const std::function<void()> &scenario) {
    EXPECT_EQ(0, RunInChild([&] { return scenario(), ::testing::Test::HasFailure() ? 1 : 0; }));
}
void Sentinel(const Json::Value &, const TESSEL_OBJECT *) {}
// The LOG_ERR line logged after mark that contains text.
std::string ErrorLine(const std::string &text, size_t mark) {
    auto line = WaitForSyslog(text, mark, LOG_USER | LOG_ERR);
    return line ? line->message : "(no line)";
}

}  // namespace

TEST(NsHookPath, ReadsTheLibMemberAsRootAndNeverLeavesTheDirectory) {
    Describe("paths", "/opt/hooks.so");
    ASSERT_TRUE(WriteFile(kDescDir + "nolib.lib", "{\"app priv\": \"x\"}"));
    ASSERT_TRUE(WriteFile(kDescDir + "broken.lib", "{\"lib\": "));
    ErrClear();
    EXPECT_EQ("", TesselNsHookPath("nolib"));
    EXPECT_EQ("", TesselNsHookPath("missing"));
    EXPECT_EQ(0, ErrCode());
    EXPECT_EQ("", TesselNsHookPath("broken"));
    EXPECT_EQ(Msgs{"!jDesc.fromFile(strPath)"}, ErrMsgs());
    // Installed descriptors are root's alone; a caller running as a user gets
    // the path all the same, and its own ids back.
    ASSERT_EQ(0, chmod((kDescDir + "paths.lib").c_str(), 0600));
    EXPECT_EQ(0, RunAsUser(kUidAlice, kGidUsers, [] {
        Json::Value jDesc;
        EXPECT_FALSE(tessel::fromFile(jDesc, kDescDir + "paths.lib"));
        EXPECT_EQ("/opt/hooks.so", TesselNsHookPath("paths"));
        EXPECT_TRUE(kUidAlice == geteuid() && kGidUsers == getegid());
        return ::testing::Test::HasFailure() ? 1 : 0;
    }));

    // Descriptors a name could reach by leaving the directory are never read.
    ScratchDir scratch;
    ASSERT_TRUE(WriteFile(scratch.file("evil.lib"), "{\"lib\": \"/evil.so\"}"));
    ASSERT_TRUE(WriteFile(kDescDir + "nul", "{\"lib\": \"/evil.so\"}"));
    Describe("..", "/evil.so");
    const std::string escape = "../../../.." + scratch.path() + "/evil";
    for (const std::string &ns : {escape, std::string(".."), std::string(""), std::string("nul\0x", 5)}) {
        ErrClear();
        EXPECT_EQ("", TesselNsHookPath(ns)) << ns;
        EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode()) << ns;
        EXPECT_EQ(Msgs{"!TesselIsPathComponent(strNs)"}, ErrMsgs()) << ns;
    }
    InFreshProcess([&] {
        EXPECT_EQ(0, TesselNsHookGet(escape, "set", &pre, &post));
        EXPECT_TRUE(tessel::NsHookLoader().Empty());
    });
}

TEST(NsHookGet, NamespaceWithoutModuleHasNoHooks) {
    ASSERT_TRUE(WriteFile(kDescDir + "bare.lib", "{}"));
    InFreshProcess([] {
        ErrClear();
        EXPECT_EQ(0, TesselNsHookGet("unknown", "create", &pre, &post));
        EXPECT_EQ(0, TesselNsBatchHookGet("bare", "create", &pre, &post));
        EXPECT_EQ(0, ErrCode());
        EXPECT_TRUE(tessel::NsHookLoader().Empty());
    });
}

TEST(NsHookGet, FirstModuleLoadedServesEveryNamespace) {
    Describe("alpha", TEST_HOOK_MODULE_FULL);
    Describe("beta", TEST_HOOK_MODULE_NULL_TABLES);
    ScratchDir scratch;
    InFreshProcess([&] {
        Json::Value jParm;
        jParm["@hook_log"] = scratch.file("hooks");
        jParm["tag"] = "p";
        TESSEL_OBJECT obj;
        obj.m_param["tag"] = "o";
        ASSERT_EQ(1, TesselNsHookGet("alpha", "set", &pre, &post));
        pre(jParm, NULL);
        post(jParm, &obj);
        // beta's own module has no tables: an answer means alpha's served it.
        ErrClear();
        ASSERT_EQ(1, TesselNsBatchHookGet("beta", "set", &pre, &post));
        pre(jParm, &obj);
        post(jParm, &obj);
        EXPECT_EQ(0, ErrCode());
        EXPECT_EQ("set-pre p null\nset-post p o\nbatch-set-pre p o\nbatch-set-post p o\n",
                  ReadFile(scratch.file("hooks")));
        pre = post = Sentinel;
        EXPECT_EQ(1, TesselNsHookGet("beta", "create", &pre, &post));
        EXPECT_TRUE(NULL == pre && NULL == post);
        EXPECT_EQ(0, TesselNsBatchHookGet("alpha", "create", &pre, &post));
    });
    // The other way round: the first module's null tables answer for alpha.
    InFreshProcess([] {
        ErrClear();
        EXPECT_EQ(0, TesselNsHookGet("beta", "set", &pre, &post));
        EXPECT_EQ(TESSEL_ERR_NO_HOOK_TABLE, ErrCode());
        EXPECT_EQ(Msgs{"NULL == pHookTable"}, ErrMsgs());
        ErrClear();
        EXPECT_EQ(0, TesselNsBatchHookGet("alpha", "set", &pre, &post));
        EXPECT_EQ(TESSEL_ERR_NO_HOOK_TABLE, ErrCode());
        EXPECT_EQ(Msgs{"NULL == pTable"}, ErrMsgs());
    });
}

TEST(NsHookGet, LibraryWithoutTablesOrUnloadable) {
    Describe("plain", TEST_OBJECT_PLUGIN);  // loadable, but no tables
    Describe("gone", "/tmp/no/module.so");
    InFreshProcess([] {
        size_t mark = SyslogMark();
        EXPECT_EQ(0, TesselNsHookGet("gone", "set", &pre, &post));
        EXPECT_TRUE(tessel::NsHookLoader().Empty());
        std::string line = ErrorLine("cannot open library", mark);
        EXPECT_EQ(0u, line.find("dlopen/tessel_dlopen:")) << line;
        EXPECT_NE(std::string::npos, line.find(" cannot open library: /tmp/no/module.so. error = /tmp/no/module.so: "
                                               "cannot open shared object file: No such file or directory"))
            << line;
        ErrClear();
        EXPECT_EQ(0, TesselNsBatchHookGet("plain", "set", &pre, &post));
        EXPECT_FALSE(tessel::NsHookLoader().Empty());
        EXPECT_EQ(0, ErrCode());
        line = ErrorLine("cannot load symbol", mark);
        EXPECT_EQ(0u, line.find("dlopen/tessel_dlopen:")) << line;
        EXPECT_NE(std::string::npos, line.find(" cannot load symbol: GetBatchTable")) << line;
    });
}

TEST(Dlopen, KeepsTheFirstLibraryUntilUnloaded) {
    Describe("epsilon", TEST_HOOK_MODULE_NULL_TABLES);
    TESSEL_DLOPEN loader;
    ASSERT_TRUE(loader.LoadLibByPath(TEST_HOOK_MODULE_FULL));
    EXPECT_TRUE(loader.LoadLibByNS("epsilon"));
    EXPECT_NE(nullptr, reinterpret_cast<TESSEL_NS_HOOK_TABLE_FUNC>(loader.LoadFunc("GetTable"))());
    loader.Unload();
    EXPECT_EQ(nullptr, loader.LoadFunc("GetTable"));
    // A stale cache would hand out the unloaded module's function.
    ASSERT_TRUE(loader.LoadLibByNS("epsilon"));
    EXPECT_EQ(nullptr, reinterpret_cast<TESSEL_NS_HOOK_TABLE_FUNC>(loader.LoadFunc("GetTable"))());
}
