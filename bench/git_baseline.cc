// The yardstick for the version store: the same repository work written
// directly on libgit2 with nothing around it (no request parsing, no name
// encoding, no error stack, no privilege switches, no counters beyond one
// small file). What the store adds on top shows as the difference.
#include "bench/git_baseline.h"

#include "bench/bench_support.h"

#include <sys/stat.h>

#include <string>

#include <git2.h>

namespace tessel_bench {

namespace {

// Writes the fields into <repo>/text and returns the tree of "text/<name>" entries
// on top of base (null: an empty tree).
bool BuildTree(git_repository *repo, const std::string &strRepo, const git_tree *base,
               const std::vector<std::pair<std::string, std::string>> &fields, git_oid *pTreeId) {
    const std::string strTextDir = strRepo + "/text";
    mkdir(strTextDir.c_str(), 0700);
    git_treebuilder *sub = nullptr;
    const git_tree_entry *baseText = base ? git_tree_entry_byname(base, "text") : nullptr;
    git_tree *baseSub = nullptr;
    if (baseText != nullptr && git_tree_lookup(&baseSub, repo, git_tree_entry_id(baseText)) != 0) {
        return false;
    }
    bool ok = git_treebuilder_new(&sub, repo, baseSub) == 0;
    for (const auto &field : fields) {
        git_oid blob;
        const std::string strFile = strTextDir + "/" + field.first;
        ok = ok && WriteWhole(strFile, field.second) &&
             git_blob_create_from_workdir(&blob, repo, ("text/" + field.first).c_str()) == 0 &&
             git_treebuilder_insert(nullptr, sub, field.first.c_str(), &blob, GIT_FILEMODE_BLOB) == 0;
    }
    git_oid subId;
    ok = ok && git_treebuilder_write(&subId, sub) == 0;
    git_treebuilder *top = nullptr;
    ok = ok && git_treebuilder_new(&top, repo, base) == 0 &&
         git_treebuilder_insert(nullptr, top, "text", &subId, GIT_FILEMODE_TREE) == 0 &&
         git_treebuilder_write(pTreeId, top) == 0;
    git_treebuilder_free(top);
    git_treebuilder_free(sub);
    git_tree_free(baseSub);
    return ok;
}

bool CommitAndCheckOut(git_repository *repo, const git_oid &treeId, long long mtime, git_commit *parent) {
    git_tree *tree = nullptr;
    git_signature *me = nullptr;
    git_oid commitId;
    const git_commit *parents[1] = {parent};
    git_checkout_options opts = GIT_CHECKOUT_OPTIONS_INIT;
    opts.checkout_strategy = GIT_CHECKOUT_FORCE | GIT_CHECKOUT_REMOVE_UNTRACKED;
    const bool ok = git_tree_lookup(&tree, repo, &treeId) == 0 &&
                    git_signature_new(&me, "alice", "alice@example.com", mtime, 0) == 0 &&
                    git_commit_create(&commitId, repo, "HEAD", me, me, "UTF-8", "{\"author_uid\":1001}", tree,
                                      parent ? 1 : 0, parents) == 0 &&
                    git_checkout_tree(repo, reinterpret_cast<const git_object *>(tree), &opts) == 0;
    git_signature_free(me);
    git_tree_free(tree);
    return ok;
}

}  // namespace

bool BaselineCreate(const std::string &strRepo, const std::vector<std::pair<std::string, std::string>> &fields,
                    long long mtime) {
    git_repository *repo = nullptr;
    git_oid treeId;
    const bool ok = mkdir(strRepo.c_str(), 0700) == 0 && git_repository_init(&repo, strRepo.c_str(), 0) == 0 &&
                    BuildTree(repo, strRepo, nullptr, fields, &treeId) &&
                    CommitAndCheckOut(repo, treeId, mtime, nullptr) &&
                    WriteWhole(strRepo + "/../git_info.json", "{\"commit_cnt\":1,\"listable_commit_cnt\":0}");
    git_repository_free(repo);
    return ok;
}

bool BaselineCommit(const std::string &strRepo, const std::vector<std::pair<std::string, std::string>> &fields,
                    long long mtime) {
    git_repository *repo = nullptr;
    git_reference *head = nullptr;
    git_commit *parent = nullptr;
    git_tree *base = nullptr;
    git_oid treeId;
    const bool ok = git_repository_open(&repo, strRepo.c_str()) == 0 && git_repository_head(&head, repo) == 0 &&
                    git_commit_lookup(&parent, repo, git_reference_target(head)) == 0 &&
                    git_commit_tree(&base, parent) == 0 && BuildTree(repo, strRepo, base, fields, &treeId) &&
                    CommitAndCheckOut(repo, treeId, mtime, parent);
    git_tree_free(base);
    git_commit_free(parent);
    git_reference_free(head);
    git_repository_free(repo);
    return ok;
}

}  // namespace tessel_bench
