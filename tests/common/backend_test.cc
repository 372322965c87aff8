// The backend registry and the fixed answers each store gives to the other
// store's operations.
#include <syslog.h>
#include <unistd.h>

#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "backend_fs/tesselBackend_fs.h"
#include "backend_pgsql/tessel_backend_pgsql.h"
#include "support/sandbox.h"
#include "tessel_backend.h"
#include "tessel_error.h"

namespace {

TEST(BackendRegistry, NamesAreLookedUpExactly) {
    struct Case {
        const char *name;
        bool fs;
        bool pgsql;
    } cases[] = {
        {"fs", true, false}, {"pgsql", false, true}, {"FS", false, false},   {"PGSQL", false, false},
        {"", false, false},  {"fs ", false, false},  {"pgsq", false, false}, {"git", false, false},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.name);
        std::unique_ptr<TESSEL_BACKEND_OP> backend(RegisterBackend::New(c.name));
        EXPECT_EQ(c.fs || c.pgsql, nullptr != backend);
        EXPECT_EQ(c.fs, nullptr != dynamic_cast<TESSEL_BACKEND_FS *>(backend.get()));
        EXPECT_EQ(c.pgsql, nullptr != dynamic_cast<TESSEL_BACKEND_PGSQL *>(backend.get()));
    }
}

TEST(BackendRegistry, FilledAtLoadWithTheTwoFactories) {
    std::map<std::string, TESSEL_BACKEND_FACTORY> &list = RegisterBackend::get_list();
    ASSERT_EQ(1u, list.count("fs"));
    ASSERT_EQ(1u, list.count("pgsql"));
    EXPECT_EQ(&CreateFsBackend, list["fs"]);
    EXPECT_EQ(&CreatePgsqlBackend, list["pgsql"]);
    EXPECT_EQ(&RegisterBackend::get_list(), &list) << "one registry";
}

TEST(BackendRegistry, EveryNewIsAFreshInstance) {
    for (const char *name : {"fs", "pgsql"}) {
        std::unique_ptr<TESSEL_BACKEND_OP> first(RegisterBackend::New(name));
        std::unique_ptr<TESSEL_BACKEND_OP> second(RegisterBackend::New(name));
        ASSERT_NE(nullptr, first);
        ASSERT_NE(nullptr, second);
        EXPECT_NE(first.get(), second.get());
    }
    std::unique_ptr<TESSEL_BACKEND_OP> fs(CreateFsBackend());
    std::unique_ptr<TESSEL_BACKEND_OP> pgsql(CreatePgsqlBackend());
    EXPECT_NE(nullptr, dynamic_cast<TESSEL_BACKEND_FS *>(fs.get()));
    EXPECT_NE(nullptr, dynamic_cast<TESSEL_BACKEND_PGSQL *>(pgsql.get()));
}

// A backend that counts its instances, to see which factory New used and
// that deleting through the base pointer runs the derived destructor.
int g_probes = 0;

class PROBE_BACKEND : public TESSEL_BACKEND_FS {
public:
    PROBE_BACKEND() { ++g_probes; }
    ~PROBE_BACKEND() override { --g_probes; }
};

TESSEL_BACKEND_OP *CreateProbe() { return new PROBE_BACKEND(); }

TEST(BackendRegistry, LaterRegistrationReplaces) {
    TESSEL_BACKEND_FACTORY original = RegisterBackend::get_list()["fs"];
    {
        RegisterBackend replace("fs", CreateProbe);
        TESSEL_BACKEND_OP *backend = RegisterBackend::New("fs");
        EXPECT_NE(nullptr, dynamic_cast<PROBE_BACKEND *>(backend));
        EXPECT_EQ(1, g_probes);
        delete backend;
        EXPECT_EQ(0, g_probes);
    }
    RegisterBackend restore("fs", original);
    std::unique_ptr<TESSEL_BACKEND_OP> backend(RegisterBackend::New("fs"));
    EXPECT_EQ(nullptr, dynamic_cast<PROBE_BACKEND *>(backend.get()));

    RegisterBackend added("probe", CreateProbe);
    std::unique_ptr<TESSEL_BACKEND_OP> probe(RegisterBackend::New("probe"));
    EXPECT_NE(nullptr, dynamic_cast<PROBE_BACKEND *>(probe.get()));
    probe.reset();
    EXPECT_EQ(0, g_probes);
    RegisterBackend::get_list().erase("probe");
}

// Each store's answer to an operation of the other store: a fixed result,
// outputs untouched, nothing on the error stack, nothing in the log.
struct Outputs {
    TESSEL_OBJECT *head = reinterpret_cast<TESSEL_OBJECT *>(0x1);
    TESSEL_OBJECT_VERSION *versionHead = reinterpret_cast<TESSEL_OBJECT_VERSION *>(0x2);
    unsigned int total = 77;
    unsigned int listable = 78;
    std::string ver = "ver-kept";
    std::string id = "id-kept";
    Json::Value json = Json::Value("json-kept");
};

struct StubCase {
    const char *backend;
    const char *op;
    std::function<long(TESSEL_BACKEND_OP *, const Json::Value &, Outputs &)> call;
    long expected;
};

TEST(BackendDefaults, OtherStoresOperationsAnswerSilently) {
    // The records are never touched: a null record would crash an operation
    // that tried.
    const std::vector<StubCase> cases = {
        {"fs", "List", [](TESSEL_BACKEND_OP *b, const Json::Value &p, Outputs &o) {
             return static_cast<long>(b->List(p, &o.head, o.total)); }, 0},
        {"fs", "ListChildren", [](TESSEL_BACKEND_OP *b, const Json::Value &p, Outputs &o) {
             return static_cast<long>(b->ListChildren(p, o.json)); }, false},
        {"fs", "HasChildren", [](TESSEL_BACKEND_OP *b, const Json::Value &p, Outputs &) {
             return static_cast<long>(b->HasChildren(p)); }, false},
        {"pgsql", "Get", [](TESSEL_BACKEND_OP *b, const Json::Value &p, Outputs &) {
             return static_cast<long>(b->Get(p, nullptr)); }, true},
        {"pgsql", "Download", [](TESSEL_BACKEND_OP *b, const Json::Value &p, Outputs &) {
             return static_cast<long>(b->Download(p)); }, true},
        {"pgsql", "Set", [](TESSEL_BACKEND_OP *b, const Json::Value &p, Outputs &o) {
             return static_cast<long>(b->Set(p, o.ver)); }, true},
        {"pgsql", "FieldRename", [](TESSEL_BACKEND_OP *b, const Json::Value &p, Outputs &o) {
             return static_cast<long>(b->FieldRename(p, o.ver)); }, true},
        {"pgsql", "Create", [](TESSEL_BACKEND_OP *b, const Json::Value &p, Outputs &o) {
             return static_cast<long>(b->Create(p, o.id, o.ver)); }, true},
        {"pgsql", "VersionGet", [](TESSEL_BACKEND_OP *b, const Json::Value &p, Outputs &) {
             return static_cast<long>(b->VersionGet(p, nullptr)); }, true},
        {"pgsql", "VersionDiff", [](TESSEL_BACKEND_OP *b, const Json::Value &p, Outputs &o) {
             return static_cast<long>(b->VersionDiff(p, o.json)); }, true},
        {"pgsql", "VersionList", [](TESSEL_BACKEND_OP *b, const Json::Value &p, Outputs &o) {
             return static_cast<long>(b->VersionList(p, &o.versionHead, o.total, o.listable)); }, false},
        {"pgsql", "SetOwner", [](TESSEL_BACKEND_OP *b, const Json::Value &p, Outputs &o) {
             return static_cast<long>(b->SetOwner(p, o.ver)); }, true},
    };
    Json::Value jParm(Json::objectValue);
    jParm["ns"] = "notes";
    jParm["id"] = "1001_" + std::string(96, 'a');
    jParm["requester"] = 1001;
    jParm["version"] = std::string(40, 'f');
    jParm["field"]["text"] = true;

    std::unique_ptr<TESSEL_BACKEND_OP> fs(RegisterBackend::New("fs"));
    std::unique_ptr<TESSEL_BACKEND_OP> pgsql(RegisterBackend::New("pgsql"));
    ASSERT_NE(nullptr, fs);
    ASSERT_NE(nullptr, pgsql);
    const Json::Value jParmBefore = jParm;

    // Making the pgsql store opens the index connection, which logs its
    // failure in this sandbox without a server; let those lines arrive first.
    const std::string flushed = "backends made " + std::to_string(getpid());
    syslog(LOG_INFO, "%s", flushed.c_str());
    ASSERT_TRUE(tessel_test::WaitForSyslog(flushed, 0).has_value());
    size_t mark = tessel_test::SyslogMark();
    for (const StubCase &c : cases) {
        SCOPED_TRACE(std::string(c.backend) + "::" + c.op);
        TESSEL_BACKEND_OP *backend = (std::string("fs") == c.backend) ? fs.get() : pgsql.get();
        Outputs out;
        long result = -99;
        Json::Value jStack;
        std::thread t([&] {
            result = c.call(backend, jParm, out);
            jStack = TesselErrMsgGet();
        });
        t.join();
        EXPECT_EQ(c.expected, result);
        EXPECT_TRUE(jStack.empty()) << jStack.toStyledString();
        Outputs fresh;
        EXPECT_EQ(fresh.head, out.head);
        EXPECT_EQ(fresh.versionHead, out.versionHead);
        EXPECT_EQ(fresh.total, out.total);
        EXPECT_EQ(fresh.listable, out.listable);
        EXPECT_EQ(fresh.ver, out.ver);
        EXPECT_EQ(fresh.id, out.id);
        EXPECT_EQ(fresh.json, out.json);
    }
    EXPECT_EQ(jParmBefore, jParm);

    const std::string sentinel = "backend defaults done " + std::to_string(getpid());
    syslog(LOG_INFO, "%s", sentinel.c_str());
    ASSERT_TRUE(tessel_test::WaitForSyslog(sentinel, mark).has_value());
    for (const tessel_test::SyslogLine &line : tessel_test::SyslogSince(mark)) {
        EXPECT_NE(std::string::npos, line.message.find(sentinel)) << "unexpected log line: " << line.raw;
    }
}

}  // namespace
