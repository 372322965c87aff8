// Reading objects: one by id with every field the store holds, against the
// raw read of the same files (and the latest commit when there is one); and
// 300 objects by the list get's 30 workers, against the same records read one
// by one on one thread.
//
// It writes the store's fixed paths, so it runs only inside the sandbox:
//   tests/sandbox/tessel-sandbox --state build/sandbox
//       --syslogd build/tests/sandbox/tessel-syslogd -- build/bench/tessel_get_bench
// (one command line)
#include <stdlib.h>

#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>
#include <git2.h>
#include <json/reader.h>
#include <json/value.h>

#include "support/sandbox.h"
#include "support/scratch.h"
#include "tessel_backend.h"
#include "tesselobject.h"

namespace {

const std::string kNsDir = "/volume1/@Tessel/ledger";
constexpr int kObjects = 300;
constexpr unsigned kAlice = 1001;
constexpr unsigned kBob = 1002;

std::vector<std::string> g_ids;

Json::Value Text(const std::string &strText) {
    Json::CharReaderBuilder builder;
    std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    Json::Value jVal;
    reader->parse(strText.data(), strText.data() + strText.size(), &jVal, nullptr);
    return jVal;
}

// 300 objects of alice, shared with bob, with meta-text, a person summary and
// three text fields in a first commit.
bool LayOut() {
    if (!g_ids.empty()) {
        return true;
    }
    if (!tessel_test::InSandbox() ||
        0 != system(("mkdir -p " + kNsDir + " /usr/quor/etc/tessel/ns && ln -sfn " + kNsDir +
                     " /usr/quor/etc/tessel/ns/ledger")
                        .c_str()) ||
        !tessel_test::WriteFile("/usr/quor/etc/tessel.conf",
                                R"({"Access": {"enable": true, "enable_ns_ledger": true}})")) {
        return false;
    }
    std::unique_ptr<TESSEL_BACKEND_OP> pFs(RegisterBackend::New("fs"));
    Json::Value jParm = Text(R"({"ns": "ledger", "owner": 1001, "requester": 1001, "category": "note",
                                 "parent_id": "", "ctime": 100, "mtime": 200,
                                 "acl": {"enabled": true, "zem_user": {"1002": {"perm": "ro"}}},
                                 "metatext": {"title": "a title", "tags": ["x", "y", "z"], "size": 12345},
                                 "person": {"summary": {"count": 1}},
                                 "text": {"title": "Quarterly report", "tags": ["finance", "q3"]}})");
    jParm["text"]["body"] = std::string(400, 'x');
    for (int i = 0; i < kObjects; ++i) {
        std::string strId, strVer;
        if (!pFs->Create(jParm, strId, strVer)) {
            return false;
        }
        g_ids.push_back(strId);
    }
    return true;
}

Json::Value Request(unsigned requester, const Json::Value &jId) {
    Json::Value jParm(Json::objectValue);
    jParm["ns"] = "ledger";
    jParm["id"] = jId;
    jParm["requester"] = requester;
    jParm["field"] = TesselObjectFieldAll();
    return jParm;
}

bool ReadJsonFile(const std::string &strPath, Json::Value &jOut) {
    Json::CharReaderBuilder builder;
    std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    const std::string strText = tessel_test::ReadFile(strPath);
    return reader->parse(strText.data(), strText.data() + strText.size(), &jOut, nullptr);
}

void BM_GetById(benchmark::State &state) {
    if (!LayOut()) {
        state.SkipWithError("cannot lay out objects (run inside the sandbox)");
        return;
    }
    const Json::Value jParm = Request(kBob, g_ids[0]);
    TESSEL_OBJECT obj;
    for (auto _ : state) {
        if (!obj.Get(jParm) || obj.get_ref_version().empty() || obj.get_ref_text().size() != 3) {
            state.SkipWithError("get failed or read no version");
            return;
        }
        benchmark::DoNotOptimize(obj.get_ref_metatext());
    }
}
BENCHMARK(BM_GetById);

// The same files read directly: the object's basic and meta-text files, its
// person summary, its text fields in the repository's work tree and the head
// commit (with its message, author and time, which a get reports).
void BM_RawReadBaseline(benchmark::State &state) {
    if (!LayOut()) {
        state.SkipWithError("cannot lay out objects (run inside the sandbox)");
        return;
    }
    git_libgit2_init();
    const std::string strBase = kNsDir + "/" + g_ids[0];
    for (auto _ : state) {
        Json::Value jBasic, jMeta, jSummary;
        ReadJsonFile(strBase + "/basic.json", jBasic);
        ReadJsonFile(strBase + "/metatext.json", jMeta);
        ReadJsonFile(strBase + "/person/summary.json", jSummary);
        // Every field file of the work tree (their names are encoded).
        std::vector<std::string> vText;
        for (const auto &entry : std::filesystem::directory_iterator(strBase + "/version/text")) {
            vText.push_back(tessel_test::ReadFile(entry.path().string()));
        }
        git_repository *pRepo = nullptr;
        if (0 != git_repository_open_ext(&pRepo, (strBase + "/version").c_str(), GIT_REPOSITORY_OPEN_NO_SEARCH,
                                         nullptr)) {
            state.SkipWithError("no repository");
            return;
        }
        git_oid oid;
        git_commit *pCommit = nullptr;
        if (0 != git_reference_name_to_id(&oid, pRepo, "HEAD") || 0 != git_commit_lookup(&pCommit, pRepo, &oid) ||
            vText.size() != 3) {
            git_repository_free(pRepo);
            state.SkipWithError("no head commit or no text");
            return;
        }
        std::string strMsg = git_commit_message(pCommit);
        benchmark::DoNotOptimize(strMsg);
        benchmark::DoNotOptimize(git_commit_time(pCommit));
        git_commit_free(pCommit);
        git_repository_free(pRepo);
        benchmark::DoNotOptimize(jMeta);
    }
    git_libgit2_shutdown();
}
BENCHMARK(BM_RawReadBaseline);

void BM_ListGet300(benchmark::State &state) {
    if (!LayOut()) {
        state.SkipWithError("cannot lay out objects (run inside the sandbox)");
        return;
    }
    Json::Value jIds(Json::arrayValue);
    for (const std::string &strId : g_ids) {
        jIds.append(strId);
    }
    const Json::Value jParm = Request(kBob, jIds);
    for (auto _ : state) {
        TESSEL_OBJECT_LIST list;
        Json::Value jsResult;
        if (!list.Get(jParm, jsResult)) {
            state.SkipWithError("list get failed");
            return;
        }
        benchmark::DoNotOptimize(jsResult);
    }
    state.SetItemsProcessed(state.iterations() * kObjects);
}
BENCHMARK(BM_ListGet300)->UseRealTime();

void BM_Get300OneByOne(benchmark::State &state) {
    if (!LayOut()) {
        state.SkipWithError("cannot lay out objects (run inside the sandbox)");
        return;
    }
    std::vector<Json::Value> vParms;
    for (const std::string &strId : g_ids) {
        vParms.push_back(Request(kBob, strId));
    }
    for (auto _ : state) {
        for (const Json::Value &jParm : vParms) {
            TESSEL_OBJECT obj;
            if (!obj.Get(jParm)) {
                state.SkipWithError("get failed");
                return;
            }
        }
    }
    state.SetItemsProcessed(state.iterations() * kObjects);
}
BENCHMARK(BM_Get300OneByOne)->UseRealTime();

}  // namespace

BENCHMARK_MAIN();
