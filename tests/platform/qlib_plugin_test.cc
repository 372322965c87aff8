// Plug-ins: real modules built beside this test (plugins/test_plugin.cc), one
// that works and variants that must be refused.
#include <dlfcn.h>
#include <syslog.h>

#include <fstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "quor/platform.h"
#include "support/sandbox.h"
#include "support/scratch.h"

namespace {

using tessel_test::ScratchDir;

std::string ModuleName(const std::string &variant) { return "libquor_test_plugin_" + variant + ".so"; }
std::string ModulePath(const std::string &variant) {
    return std::string(QUOR_TEST_PLUGIN_DIR) + "/" + ModuleName(variant);
}

bool ModuleLoaded(const std::string &path) {
    void *handle = dlopen(path.c_str(), RTLD_NOW | RTLD_NOLOAD);
    if (NULL == handle) {
        return false;
    }
    dlclose(handle);
    return true;
}

std::vector<std::string> Lines(const std::string &path) {
    std::ifstream in(path);
    std::vector<std::string> lines;
    std::string line;
    while (std::getline(in, line)) {
        lines.push_back(line);
    }
    return lines;
}

// A platform string list, freed at the end of the scope.
struct SzList {
    QLIBSZLIST *list = QLIBCSzListAlloc(4);
    ~SzList() { QLIBCSzListFree(list); }
    void Push(const std::string &value) { QLIBCSzListPush(&list, value.c_str()); }
};

TEST(Plugin, RunsActionsWithTheArgumentsSetForThem) {
    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    const std::string out = dir.file("out");
    const std::string path = ModulePath("good");
    QLIBPLUGIN *plugin = NULL;
    ASSERT_EQ(0, QLIBPluginInit(path.c_str(), NULL, 1, 0, &plugin));
    ASSERT_NE(nullptr, plugin);
    EXPECT_TRUE(QLIBPluginHasInit(plugin));
    EXPECT_TRUE(ModuleLoaded(path));

    // Set in this order; setting a name again replaces its value in place.
    ASSERT_EQ(0, QLIBPluginSetArg(plugin, "Org_ID", "first"));
    ASSERT_EQ(0, QLIBPluginSetArgByInt(plugin, "RESULT", -3));
    ASSERT_EQ(0, QLIBPluginSetArg(plugin, "OUT", out.c_str()));
    ASSERT_EQ(0, QLIBPluginSetArg(plugin, "Org_ID", "second, with | and \xC3\xA9"));
    ASSERT_EQ(0, QLIBPluginSetArg(plugin, "Empty", ""));
    EXPECT_EQ(4, QLIBPluginAction("record", plugin));
    EXPECT_EQ((std::vector<std::string>{"Org_ID|text|second, with | and \xC3\xA9|0", "RESULT|int|-3|-3",
                                        "OUT|text|" + out + "|0", "Empty|text||0"}),
              Lines(out));

    // The next action sees only what was set for it.
    ASSERT_EQ(0, QLIBPluginSetArg(plugin, "OUT", out.c_str()));
    ASSERT_EQ(0, QLIBPluginSetArgByInt(plugin, "N", 2147483647));
    EXPECT_EQ(2, QLIBPluginAction("record", plugin));
    EXPECT_EQ((std::vector<std::string>{"OUT|text|" + out + "|0", "N|int|2147483647|2147483647"}), Lines(out));

    // A failing action: its own result, and the platform error.
    QLIBCErrClear();
    EXPECT_EQ(-5, QLIBPluginAction("fail", plugin));
    EXPECT_EQ(QLIBC_ERR_PLUGIN, QLIBCErrGet());
    EXPECT_EQ(-1, QLIBPluginAction("no such action", plugin));

    // Exit runs the module's exit with its context, then unloads it.
    EXPECT_EQ(0, QLIBPluginExit(plugin));
    std::vector<std::string> lines = Lines(out);
    ASSERT_FALSE(lines.empty());
    EXPECT_EQ("exit after 4 actions", lines.back());
    EXPECT_FALSE(ModuleLoaded(path));
}

TEST(Plugin, ChecksTheInterfaceVersion) {
    // The module implements 1.2: it serves 1.0 to 1.2 and nothing else.
    const std::string path = ModulePath("good");
    for (int minor : {0, 1, 2}) {
        QLIBPLUGIN *plugin = NULL;
        ASSERT_EQ(0, QLIBPluginInit(path.c_str(), NULL, 1, minor, &plugin)) << minor;
        EXPECT_EQ(0, QLIBPluginExit(plugin));
    }
    const int refused[][2] = {{1, 3}, {2, 0}, {0, 2}};
    for (const auto &version : refused) {
        QLIBPLUGIN *plugin = reinterpret_cast<QLIBPLUGIN *>(1);
        QLIBCErrClear();
        EXPECT_EQ(-1, QLIBPluginInit(path.c_str(), NULL, version[0], version[1], &plugin));
        EXPECT_EQ(nullptr, plugin);
        EXPECT_EQ(QLIBC_ERR_PLUGIN, QLIBCErrGet());
    }
    EXPECT_FALSE(ModuleLoaded(path));
}

TEST(Plugin, LooksBareNamesUpInTheSearchPathOnly) {
    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    SzList search;
    search.Push(dir.path());  // exists, but holds no module
    search.Push(dir.file("missing"));
    search.Push(QUOR_TEST_PLUGIN_DIR);
    QLIBPLUGIN *plugin = NULL;
    ASSERT_EQ(0, QLIBPluginInit(ModuleName("good").c_str(), search.list, 1, 0, &plugin));
    EXPECT_TRUE(QLIBPluginHasInit(plugin));
    EXPECT_EQ(0, QLIBPluginExit(plugin));

    // Not in the list: not found, whatever the dynamic loader would find.
    SzList elsewhere;
    elsewhere.Push(dir.path());
    const QLIBSZLIST *lists[] = {elsewhere.list, NULL};
    for (const QLIBSZLIST *list : lists) {
        QLIBCErrClear();
        EXPECT_EQ(-1, QLIBPluginInit(ModuleName("good").c_str(), list, 1, 0, &plugin));
        EXPECT_EQ(QLIBC_ERR_NOT_FOUND, QLIBCErrGet());
        EXPECT_EQ(-1, QLIBPluginInit("libc.so.6", list, 1, 0, &plugin));
    }
}

TEST(Plugin, RefusesBrokenModules) {
    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    const std::string notElf = dir.file("text.so");
    std::ofstream(notElf) << "not a shared object\n";

    std::vector<std::string> paths = {ModulePath("bad_init"), ModulePath("no_descriptor"), ModulePath("wrong_abi"),
                                      notElf, dir.file("missing.so")};
    for (const std::string &path : paths) {
        QLIBPLUGIN *plugin = NULL;
        QLIBCErrClear();
        EXPECT_EQ(-1, QLIBPluginInit(path.c_str(), NULL, 1, 0, &plugin)) << path;
        EXPECT_EQ(nullptr, plugin) << path;
        EXPECT_EQ(QLIBC_ERR_PLUGIN, QLIBCErrGet()) << path;
        EXPECT_FALSE(ModuleLoaded(path)) << "a refused module stays loaded: " << path;
    }
}

TEST(Plugin, LogsWhyAModuleWasRefused) {
    if (!tessel_test::InSandbox()) {
        GTEST_SKIP() << "needs the sandbox's captured system log";
    }
    size_t mark = tessel_test::SyslogMark();
    QLIBPLUGIN *plugin = NULL;
    EXPECT_EQ(-1, QLIBPluginInit(ModulePath("wrong_abi").c_str(), NULL, 1, 0, &plugin));
    auto line = tessel_test::WaitForSyslog("built for another plug-in ABI", mark, LOG_USER | LOG_ERR);
    ASSERT_TRUE(line.has_value());
    EXPECT_NE(std::string::npos, line->message.find(ModuleName("wrong_abi")));

    EXPECT_EQ(-1, QLIBPluginInit(ModulePath("bad_init").c_str(), NULL, 1, 0, &plugin));
    EXPECT_TRUE(tessel_test::WaitForSyslog("failed to initialise (-3)", mark).has_value());
}

TEST(Plugin, RecordsBadArguments) {
    QLIBPLUGIN *plugin = NULL;
    auto expectBad = [](int ret) {
        EXPECT_EQ(-1, ret);
        EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
        QLIBCErrClear();
    };
    QLIBCErrClear();
    expectBad(QLIBPluginInit(NULL, NULL, 1, 0, &plugin));
    expectBad(QLIBPluginInit(ModulePath("good").c_str(), NULL, 1, 0, NULL));
    expectBad(QLIBPluginInit(ModulePath("good").c_str(), NULL, -1, 0, &plugin));
    EXPECT_FALSE(QLIBPluginHasInit(NULL));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    QLIBCErrClear();
    expectBad(QLIBPluginSetArg(NULL, "a", "b"));
    expectBad(QLIBPluginSetArgByInt(NULL, "a", 1));
    expectBad(QLIBPluginAction("record", NULL));
    expectBad(QLIBPluginExit(NULL));

    ASSERT_EQ(0, QLIBPluginInit(ModulePath("good").c_str(), NULL, 1, 0, &plugin));
    expectBad(QLIBPluginSetArg(plugin, NULL, "b"));
    expectBad(QLIBPluginSetArg(plugin, "", "b"));
    expectBad(QLIBPluginSetArg(plugin, "a", NULL));
    expectBad(QLIBPluginSetArgByInt(plugin, NULL, 1));
    expectBad(QLIBPluginAction(NULL, plugin));
    expectBad(QLIBPluginAction("", plugin));
    EXPECT_EQ(0, QLIBPluginExit(plugin));
}

}  // namespace
