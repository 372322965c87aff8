// The index against a real server: one record upserted (and the same two
// statements built and sent with plain libpq, for the cost of the layers
// above it), a chain of 300 records replaced in one execution, and a
// namespace of 10,000 stored objects, each with a dozen text fields in its
// repository, re-indexed from tmpfs.
//
// Needs the sandbox's private server; build without sanitizers and run
//
//   bench/run --pg BUILD_DIR tessel_index_bench
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>
#include <libpq-fe.h>

#include "bench/bench_support.h"
#include "tessel_backend.h"
#include "tessel_index.h"
#include "tesselobject.h"

namespace {

namespace fs = std::filesystem;
using tessel_bench::Parse;

// The records' text goes to the server with non-ASCII characters unescaped.
std::string Compact(const Json::Value &jVal) { return tessel_bench::Compact(jVal, true); }

const std::string kNs = "bench";
const std::string kRepo = "/volume1/@Tessel";
constexpr int kReindexObjects = 10000;

// A record of a typical size: a dozen text fields, an acl, a person record.
TESSEL_OBJECT *Record(const std::string &id) {
    TESSEL_OBJECT *pObj = TesselObjectAlloc();
    pObj->set_id(id);
    pObj->set_ns(kNs);
    pObj->set_owner(1001);
    pObj->set_category("note");
    pObj->set_parent_id("");
    pObj->set_version(std::string(40, 'a'));
    pObj->set_commit_msg(Parse(R"({"author_uid":1001,"commit_msg":"edit"})"));
    pObj->set_acl(Parse(R"({"enabled":true,"rules":[{"uid":1002,"perm":"ro"}]})"));
    Json::Value jText(Json::objectValue);
    for (int i = 0; i < 12; ++i) {
        jText["field" + std::to_string(i)] = "value of field " + std::to_string(i) + " with some words in it";
    }
    pObj->set_text(jText);
    pObj->set_metatext(Parse(R"({"color":"blue","pinned":true})"));
    pObj->set_ctime(1700000000);
    pObj->set_mtime(1700000100);
    pObj->set_person(Parse(R"({"1001":{"mtime":1700000100}})"));
    return pObj;
}

bool Setup() {
    static bool blDone = [] {
        return tessel_bench::PlaceBenchNamespace() && nullptr != TesselOpenConn();
    }();
    return blDone;
}

void BM_IndexOne(benchmark::State &state) {
    if (!Setup()) {
        state.SkipWithError("no index connection");
        return;
    }
    DBConnect_tag *pConn = TesselOpenConn();
    std::unique_ptr<TESSEL_OBJECT, void (*)(TESSEL_OBJECT *)> obj(Record("1001_one"), TesselObjectFreeList);
    for (auto _ : state) {
        if (!TesselObjectIndexEx(pConn, obj.get())) {
            state.SkipWithError("index failed");
            break;
        }
    }
}
BENCHMARK(BM_IndexOne);

// The same two upserts, escaped with libpq and sent on a connection of its own.
void BM_IndexOnePlainLibpq(benchmark::State &state) {
    if (!Setup()) {
        state.SkipWithError("no index connection");
        return;
    }
    PGconn *pConn = PQconnectdb("user=postgres dbname=tessel");
    std::unique_ptr<TESSEL_OBJECT, void (*)(TESSEL_OBJECT *)> obj(Record("1001_one"), TesselObjectFreeList);
    auto quote = [pConn](const std::string &s) {
        std::string out(2 * s.size() + 1, '\0');
        out.resize(PQescapeStringConn(pConn, &out[0], s.c_str(), s.size(), nullptr));
        return "'" + out + "'";
    };
    for (auto _ : state) {
        const TESSEL_OBJECT *p = obj.get();
        const std::string id = quote(p->get_id()), ns = quote(p->get_ns()), cat = quote(p->get_category()),
                          parent = quote(p->get_parent_id()), ver = quote(p->get_version()),
                          msg = quote(Compact(p->get_commit_msg())), acl = quote(Compact(p->get_acl())),
                          text = quote(Compact(p->get_text())), meta = quote(Compact(p->get_metatext())),
                          bin = quote("{}"), mbin = quote("{}"), extra = quote("{}"),
                          person = quote(Compact(p->get_person())), owner = std::to_string(p->get_owner()),
                          ctime = std::to_string(p->get_ctime()), mtime = std::to_string(p->get_mtime());
        const std::string values = id + ", " + ns + ", " + owner + ", " + cat + ", " + parent + ", " + ver + ", " +
                                   msg + ", " + acl + ", " + text + ", " + meta + ", " + bin + ", " + mbin + ", " +
                                   ctime + ", " + mtime + ", " + extra;
        const std::string upsert =
            "UPDATE object SET ns=" + ns + ", owner=" + owner + ", category=" + cat + ",parent_id=" + parent +
            ",version=" + ver + ",commit_msg=" + msg + ", acl=" + acl + ", text=" + text + ", metatext=" + meta +
            ", binary_info=" + bin + ", metabinary_info=" + mbin + ", ctime=" + ctime + ", mtime=" + mtime +
            ", extra_info=" + extra + " WHERE id=" + id +
            "; INSERT INTO object(id, ns, owner, category, parent_id, version, commit_msg, acl, text, metatext, "
            "binary_info, metabinary_info, ctime, mtime, extra_info)SELECT " +
            values + " WHERE NOT EXISTS (SELECT 1 FROM object where id = " + id + ");";
        const std::string personUpsert = "UPDATE person SET person=" + person + " WHERE id=" + id +
                                         "; INSERT INTO person(id, person) SELECT " + id + ", " + person +
                                         " WHERE NOT EXISTS (SELECT 1 FROM person WHERE id = " + id + ");";
        for (const std::string *pSQL : {&upsert, &personUpsert}) {
            PGresult *pRes = PQexec(pConn, pSQL->c_str());
            if (PGRES_COMMAND_OK != PQresultStatus(pRes)) {
                state.SkipWithError(PQerrorMessage(pConn));
            }
            PQclear(pRes);
        }
    }
    PQfinish(pConn);
}
BENCHMARK(BM_IndexOnePlainLibpq);

void BM_BatchIndex300(benchmark::State &state) {
    if (!Setup()) {
        state.SkipWithError("no index connection");
        return;
    }
    TESSEL_OBJECT *pHead = nullptr;
    for (int i = 0; i < 300; ++i) {
        TESSEL_OBJECT *pObj = Record("1001_batch" + std::to_string(i));
        pObj->next = pHead;
        pHead = pObj;
    }
    DBConnect_tag *pConn = TesselOpenConn();
    for (auto _ : state) {
        if (!TesselObjectBatchIndexEx(pConn, pHead)) {
            state.SkipWithError("batch failed");
            break;
        }
    }
    state.SetItemsProcessed(state.iterations() * 300);
    TesselObjectFreeList(pHead);
}
BENCHMARK(BM_BatchIndex300)->Unit(benchmark::kMillisecond);

// Copies a tree keeping its owners: the store opens repositories that belong
// to the object's owner.
bool CopyOwned(const fs::path &from, const fs::path &to) {
    std::error_code ec;
    fs::copy(from, to, fs::copy_options::recursive, ec);
    if (ec) {
        return false;
    }
    struct stat st;
    for (auto it = fs::recursive_directory_iterator(from, ec); !ec && it != fs::recursive_directory_iterator();
         it.increment(ec)) {
        if (0 != lstat(it->path().c_str(), &st) ||
            0 != lchown((to / fs::relative(it->path(), from)).c_str(), st.st_uid, st.st_gid)) {
            return false;
        }
    }
    return !ec && 0 == lstat(from.c_str(), &st) && 0 == lchown(to.c_str(), st.st_uid, st.st_gid);
}

// One object stored through the file-system store, its first version holding
// the record's text, then its directory copied under 9,999 further ids: the
// re-index reads each one like any other, text and history included.
bool StoreNamespace() {
    std::unique_ptr<TESSEL_BACKEND_OP> pFs(RegisterBackend::New("fs"));
    Json::Value jParm = Parse(R"({"ns": "bench", "owner": 1001, "requester": 1001, "category": "note",
                                  "ctime": 1700000000, "mtime": 1700000100, "acl": {"enabled": false},
                                  "metatext": {"color": "blue", "pinned": true}, "commit_msg": {"note": "edit"},
                                  "person": {"summary": {"count": 1}}})");
    std::unique_ptr<TESSEL_OBJECT, void (*)(TESSEL_OBJECT *)> obj(Record("x"), TesselObjectFreeList);
    jParm["text"] = obj->get_text();
    std::string strId, strVer;
    if (!pFs->Create(jParm, strId, strVer)) {
        return false;
    }
    const fs::path source = kRepo + "/" + kNs + "/" + strId;
    for (int i = 1; i < kReindexObjects; ++i) {
        char szSuffix[16];
        snprintf(szSuffix, sizeof(szSuffix), "%08x", static_cast<unsigned>(i));
        std::string strCopy = strId.substr(0, strId.size() - 8) + szSuffix;
        if (!CopyOwned(source, source.parent_path() / strCopy)) {
            return false;
        }
    }
    return true;
}

// Rows of the namespace that carry the stored version, commit message, text
// and modification time: all of them, or the figures measure something else.
long IndexedWithHistory() {
    PGconn *pConn = PQconnectdb("user=postgres dbname=tessel");
    PGresult *pRes = PQexec(pConn, "SELECT count(*) FROM object WHERE ns = 'bench' AND length(version) = 40 AND "
                                   "commit_msg->>'note' = 'edit' AND text->>'field11' <> '' AND mtime = 1700000100");
    const long n = (PGRES_TUPLES_OK == PQresultStatus(pRes)) ? atol(PQgetvalue(pRes, 0, 0)) : -1;
    PQclear(pRes);
    PQfinish(pConn);
    return n;
}

void BM_Reindex10000(benchmark::State &state) {
    static const bool blStored = Setup() && StoreNamespace();
    if (!blStored) {
        state.SkipWithError("could not lay out the namespace");
        return;
    }
    const Json::Value jParam = Parse(R"({"ns": "bench"})");
    for (auto _ : state) {
        if (!TesselReindex(jParam)) {
            state.SkipWithError("re-index failed");
            break;
        }
    }
    state.SetItemsProcessed(state.iterations() * kReindexObjects);
    if (kReindexObjects != IndexedWithHistory()) {
        state.SkipWithError("rows without the stored text and history");
    }
}
// Wall time: most of the work is the server's.
BENCHMARK(BM_Reindex10000)->Unit(benchmark::kMillisecond)->Iterations(3)->UseRealTime();

}  // namespace

BENCHMARK_MAIN();
