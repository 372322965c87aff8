// The version store on tmpfs: creating an object with three text fields
// (repository, first commit, counters), committing a change, reading the
// latest and an older version, listing a hundred versions. The same create
// and commit are timed through the Git layer alone and written directly on
// libgit2 (git_baseline.cc), so that the cost of each layer shows.
//
// Runs inside the test sandbox (bench/run), whose /volume1 is a tmpfs.
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <sys/vfs.h>
#include <unistd.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include <benchmark/benchmark.h>
#include <git2.h>
#include <linux/magic.h>

#include "bench/bench_support.h"
#include "bench/git_baseline.h"
#include "common/tessel_json.h"
#include "common/tessel_priv.h"
#include "tessel_backend.h"
#include "tessel_git.h"
#include "tesselobject.h"
#include "tesselobjectversion.h"

namespace {

const std::string kNs = "bench";
const std::string kNsDir = "/volume1/@Tessel/bench";
const std::string kWorkDir = "/volume1/bench-work";
const long long kT0 = 1700000000;

using Fields = std::vector<std::pair<std::string, std::string>>;
using tessel_bench::WriteWhole;

// The framework runs each benchmark several times; names made from this stay
// unique over all the runs of the program.
long g_serial = 0;
std::string Fresh(const std::string &strPrefix) { return kWorkDir + "/" + strPrefix + std::to_string(++g_serial); }

Json::Value Parse(const std::string &strText) {
    Json::Value jVal;
    tessel::fromString(jVal, strText);
    return jVal;
}

Json::Value TextOf(const Fields &fields) {
    Json::Value jText(Json::objectValue);
    for (const auto &field : fields) {
        jText[field.first] = field.second;
    }
    return jText;
}

Fields ThreeFields(long n) {
    return {{"title", "Quarterly report " + std::to_string(n)},
            {"body", std::string(400, 'x') + std::to_string(n)},
            {"tags", "[\"finance\",\"q" + std::to_string(n % 4) + "\"]"}};
}

Json::Value CreateParm(long n) {
    Json::Value jParm = Parse(R"({"owner": 1001, "requester": 1001, "category": "report", "ctime": 1700000000})");
    jParm["ns"] = kNs;
    jParm["mtime"] = (Json::Int64)(kT0 + n);
    jParm["text"] = TextOf(ThreeFields(n));
    return jParm;
}

// Operations call the store inside one privilege-raising section, so the
// sections the store opens itself are nested and cost nothing; so do these.
struct AsOperation {
    tessel::RootSection section{"bench/version_bench", __LINE__};
};

// A fresh object of the store, and its versions so far (oldest first).
struct StoredObject {
    std::string id;
    std::vector<std::string> versions;
};

bool MakeObject(TESSEL_BACKEND_OP *backend, int nVersions, StoredObject &obj) {
    std::string strVer;
    if (!backend->Create(CreateParm(0), obj.id, strVer)) {
        return false;
    }
    obj.versions = {strVer};
    for (int i = 1; i < nVersions; ++i) {
        Json::Value jParm(Json::objectValue);
        jParm["ns"] = kNs;
        jParm["id"] = obj.id;
        jParm["requester"] = 1001;
        jParm["version"] = obj.versions.back();
        jParm["mtime"] = (Json::Int64)(kT0 + i);
        jParm["text"]["title"] = "revision " + std::to_string(i);
        if (!backend->Set(jParm, strVer)) {
            return false;
        }
        obj.versions.push_back(strVer);
    }
    return true;
}

// ---- the store ----------------------------------------------------------------

void BM_StoreCreate(benchmark::State &state) {
    long n = 0;
    for (auto _ : state) {
        std::string strId, strVer;
        AsOperation op;
        // Each operation makes its own store.
        std::unique_ptr<TESSEL_BACKEND_OP> backend(RegisterBackend::New("fs"));
        if (!backend->Create(CreateParm(++n), strId, strVer)) {
            state.SkipWithError("Create failed");
            break;
        }
    }
}
BENCHMARK(BM_StoreCreate);

void BM_StoreCommit(benchmark::State &state) {
    std::unique_ptr<TESSEL_BACKEND_OP> backend(RegisterBackend::New("fs"));
    StoredObject obj;
    if (!MakeObject(backend.get(), 1, obj)) {
        state.SkipWithError("setup failed");
        return;
    }
    std::string strVer = obj.versions.back();
    long n = 0;
    for (auto _ : state) {
        ++n;
        Json::Value jParm(Json::objectValue);
        jParm["ns"] = kNs;
        jParm["id"] = obj.id;
        jParm["requester"] = 1001;
        jParm["version"] = strVer;
        jParm["mtime"] = (Json::Int64)(kT0 + n);
        jParm["text"]["title"] = "revision " + std::to_string(n);
        AsOperation op;
        std::unique_ptr<TESSEL_BACKEND_OP> opBackend(RegisterBackend::New("fs"));
        if (!opBackend->Set(jParm, strVer)) {
            state.SkipWithError("Set failed");
            break;
        }
    }
}
BENCHMARK(BM_StoreCommit);

void ReadVersion(benchmark::State &state, bool blOlder) {
    std::unique_ptr<TESSEL_BACKEND_OP> backend(RegisterBackend::New("fs"));
    StoredObject obj;
    if (!MakeObject(backend.get(), 3, obj)) {
        state.SkipWithError("setup failed");
        return;
    }
    Json::Value jParm = Parse(R"({"requester": 1001, "field": {"text": true}})");
    jParm["ns"] = kNs;
    jParm["id"] = obj.id;
    if (blOlder) {
        jParm["version"] = obj.versions.front();
    }
    for (auto _ : state) {
        TESSEL_OBJECT record;
        AsOperation op;
        if (!backend->Get(jParm, &record) || record.get_ref_text().size() != 3u) {
            state.SkipWithError("Get failed");
            break;
        }
    }
}

void BM_StoreReadLatest(benchmark::State &state) { ReadVersion(state, false); }
BENCHMARK(BM_StoreReadLatest);

void BM_StoreReadOlder(benchmark::State &state) { ReadVersion(state, true); }
BENCHMARK(BM_StoreReadOlder);

void BM_StoreList100(benchmark::State &state) {
    std::unique_ptr<TESSEL_BACKEND_OP> backend(RegisterBackend::New("fs"));
    StoredObject obj;
    if (!MakeObject(backend.get(), 100, obj)) {
        state.SkipWithError("setup failed");
        return;
    }
    Json::Value jParm(Json::objectValue);
    jParm["ns"] = kNs;
    jParm["id"] = obj.id;
    for (auto _ : state) {
        TESSEL_OBJECT_VERSION *pHead = nullptr;
        unsigned total = 0, listable = 0;
        AsOperation op;
        const int count = backend->VersionList(jParm, &pHead, total, listable);
        TesselObjectVersionFreeList(pHead);
        if (count != 100) {
            state.SkipWithError("VersionList failed");
            break;
        }
    }
}
BENCHMARK(BM_StoreList100);

// ---- the Git layer alone ----------------------------------------------------------

// Writes the fields below strDir/text and names them in a new add table.
QLIBSZHASH *StageFields(const std::string &strDir, const Fields &fields) {
    mkdir(strDir.c_str(), 0700);
    mkdir((strDir + "/text").c_str(), 0700);
    QLIBSZHASH *pAdd = QLIBCSzHashAlloc(1024);
    for (const auto &field : fields) {
        const std::string strFile = strDir + "/text/" + field.first;
        WriteWhole(strFile, field.second);
        QLIBCSzHashSetValue(pAdd, ("text/" + field.first).c_str(), strFile.c_str());
    }
    return pAdd;
}

void BM_GitLayerCreate(benchmark::State &state) {
    QLIBSZHASH *pDel = QLIBCSzHashAlloc(16);
    long n = 0;
    for (auto _ : state) {
        ++n;
        const std::string strRepo = Fresh("layer-");
        QLIBSZHASH *pAdd = StageFields(strRepo, ThreeFields(n));
        std::string strVer;
        const int rc = GitCreateRepository(strRepo.c_str(), kT0 + n, pAdd, pDel, "alice", "alice@example.com",
                                           "{\"author_uid\":1001}", strVer);
        QLIBCSzHashFree(pAdd);
        if (rc != 0 || !WriteWhole(strRepo + "-git_info.json", "{\"commit_cnt\":1,\"listable_commit_cnt\":0}")) {
            state.SkipWithError("GitCreateRepository failed");
            break;
        }
    }
    QLIBCSzHashFree(pDel);
}
BENCHMARK(BM_GitLayerCreate);

void BM_GitLayerCommit(benchmark::State &state) {
    const std::string strRepo = Fresh("layer-commit-");
    const std::string strStage = strRepo + "-stage";
    QLIBSZHASH *pDel = QLIBCSzHashAlloc(16);
    QLIBSZHASH *pAdd = StageFields(strRepo, ThreeFields(0));
    std::string strVer;
    const int rc = GitCreateRepository(strRepo.c_str(), kT0, pAdd, pDel, "alice", "alice@example.com", "{}", strVer);
    QLIBCSzHashFree(pAdd);
    if (rc != 0) {
        state.SkipWithError("setup failed");
        QLIBCSzHashFree(pDel);
        return;
    }
    long n = 0;
    for (auto _ : state) {
        ++n;
        pAdd = StageFields(strStage, {{"title", "revision " + std::to_string(n)}});
        const int rcCommit = GitCommit(strRepo.c_str(), strVer.c_str(), kT0 + n, pAdd, pDel, NULL, "alice",
                                       "alice@example.com", "{\"author_uid\":1001}", strVer);
        QLIBCSzHashFree(pAdd);
        if (rcCommit != 0) {
            state.SkipWithError("GitCommit failed");
            break;
        }
    }
    QLIBCSzHashFree(pDel);
}
BENCHMARK(BM_GitLayerCommit);

// ---- plain libgit2 --------------------------------------------------------------

void BM_BaselineCreate(benchmark::State &state) {
    long n = 0;
    for (auto _ : state) {
        ++n;
        const std::string strObject = Fresh("plain-");
        if (mkdir(strObject.c_str(), 0700) != 0 ||
            !tessel_bench::BaselineCreate(strObject + "/version", ThreeFields(n), kT0 + n)) {
            state.SkipWithError("baseline create failed");
            break;
        }
    }
}
BENCHMARK(BM_BaselineCreate);

void BM_BaselineCommit(benchmark::State &state) {
    const std::string strObject = Fresh("plain-commit-");
    if (mkdir(strObject.c_str(), 0700) != 0 ||
        !tessel_bench::BaselineCreate(strObject + "/version", ThreeFields(0), kT0)) {
        state.SkipWithError("setup failed");
        return;
    }
    long n = 0;
    for (auto _ : state) {
        ++n;
        if (!tessel_bench::BaselineCommit(strObject + "/version", {{"title", "revision " + std::to_string(n)}},
                                          kT0 + n)) {
            state.SkipWithError("baseline commit failed");
            break;
        }
    }
}
BENCHMARK(BM_BaselineCommit);

}  // namespace

int main(int argc, char **argv) {
    // The namespace placed as the library's linked scheme finds it.
    if (system(("mkdir -p " + kNsDir + " " + kWorkDir +
                " /volume1/@tmp/@Tessel/bench /usr/quor/etc/tessel/ns &&"
                " ln -sfn " +
                kNsDir + " /usr/quor/etc/tessel/ns/bench")
                   .c_str()) != 0) {
        fprintf(stderr, "cannot place the namespace (run through bench/run)\n");
        return 1;
    }
    struct statfs fsInfo;
    if (statfs(kNsDir.c_str(), &fsInfo) != 0 || fsInfo.f_type != TMPFS_MAGIC) {
        fprintf(stderr, "%s is not on a tmpfs (run through bench/run)\n", kNsDir.c_str());
        return 1;
    }
    git_libgit2_init();
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    git_libgit2_shutdown();
    return 0;
}
