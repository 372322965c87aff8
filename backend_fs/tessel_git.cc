// The Git version store over libgit2: one repository per object, a tree of
// versions whose latest is the local branch tip with the greatest commit time.
//
// Every libgit2 object is held by a small owner below, so each early return
// frees what was acquired so far. A failing libgit2 call is reported where it
// fails, with the call's text; helpers pass the result up without adding
// frames, so the stack names the one call that went wrong.
#include "tessel_git.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <syslog.h>
#include <time.h>
#include <unistd.h>

#include <string>

#include <git2.h>

#include "common/tessel_json.h"
#include "common/tessel_report.h"
#include "tessel_error.h"

static constexpr const char kTesselModule[] = "tessel_git";

namespace {

// ---- reporting ---------------------------------------------------------------

// The Git failure form carries the libgit2 result and message besides the
// call text; the frame is the same as every other module's.
const char *GitMessage() {
    const git_error *pErr = git_error_last();
    return (NULL != pErr && NULL != pErr->message) ? pErr->message : "Unknown error";
}

// The Git failure form carries the libgit2 result and message besides the
// call text; the frame is the same as every other module's.
void ReportGit(int line, const char *szCall, int ret) {
    int savedErrno = errno;
    syslog(LOG_ERR, "%s:%d Failed [%s][%d][%s], err=%m\n", kTesselModule, line, szCall, ret, GitMessage());
    TesselErrSetEx(GIT_ENOTFOUND == ret ? TESSEL_ERR_NOT_EXISTS : TESSEL_ERR_GIT, kTesselModule, line, "%s",
                   szCall);
    errno = savedErrno;
}

// Evaluates the call once; on a negative result reports it under text, the
// fixed wording of that call in the log, and returns the result from the
// enclosing function.
#define GIT_CHECK(call, text)                 \
    do {                                         \
        int gitRet_ = (call);                    \
        if (0 > gitRet_) {                       \
            ReportGit(__LINE__, text, gitRet_);  \
            return gitRet_;                      \
        }                                        \
    } while (0)

int BadParameter(int line) {
    syslog(LOG_ERR, "%s:%d bad parameter", kTesselModule, line);
    TesselErrSetEx(TESSEL_ERR_BAD_PARAMETERS, kTesselModule, line, "bad parameter");
    return GIT_ERROR;
}

#define GIT_CHECK_PARAM(cond)             \
    do {                                  \
        if (!(cond)) {                    \
            return BadParameter(__LINE__); \
        }                                 \
    } while (0)

// ---- owners ------------------------------------------------------------------

template <typename T, void (*Free)(T *)>
class Owned {
public:
    Owned() = default;
    ~Owned() { reset(); }
    Owned(const Owned &) = delete;
    Owned &operator=(const Owned &) = delete;

    // The slot a libgit2 constructor fills; whatever was held is freed first.
    T **out() {
        reset();
        return &p_;
    }
    T *get() const { return p_; }
    void reset() {
        if (NULL != p_) {
            Free(p_);
            p_ = NULL;
        }
    }

private:
    T *p_ = NULL;
};

using Repo = Owned<git_repository, git_repository_free>;
using Commit = Owned<git_commit, git_commit_free>;
using Tree = Owned<git_tree, git_tree_free>;
using TreeEntry = Owned<git_tree_entry, git_tree_entry_free>;
using TreeBuilder = Owned<git_treebuilder, git_treebuilder_free>;
using Object = Owned<git_object, git_object_free>;
using Signature = Owned<git_signature, git_signature_free>;
using Diff = Owned<git_diff, git_diff_free>;
using Walker = Owned<git_revwalk, git_revwalk_free>;
using BranchIter = Owned<git_branch_iterator, git_branch_iterator_free>;
using Reference = Owned<git_reference, git_reference_free>;
using SzList = Owned<QLIBSZLIST, QLIBCSzListFree>;

// Forced, untracked files removed: the target ends up holding exactly the
// version's files.
constexpr unsigned kCheckoutStrategy = GIT_CHECKOUT_FORCE | GIT_CHECKOUT_REMOVE_UNTRACKED;
static_assert(34 == kCheckoutStrategy, "checkout strategy");
constexpr size_t kPathMax = 4095;
constexpr int kListCapacity = 1024;

// The commit id szVersion names; one that does not parse is all zeros and
// finds no commit.
git_oid OidOrZero(const char *szVersion) {
    git_oid id;
    memset(&id, 0, sizeof(id));
    (void)git_oid_fromstr(&id, szVersion);
    return id;
}

git_checkout_options CheckoutOptions() {
    git_checkout_options opts = GIT_CHECKOUT_OPTIONS_INIT;
    opts.checkout_strategy = kCheckoutStrategy;
    return opts;
}

std::string OidText(const git_oid *pOid) {
    char szId[GIT_OID_HEXSZ + 1];
    git_oid_tostr(szId, sizeof(szId), pOid);
    return szId;
}

// ---- tree building -----------------------------------------------------------

// Splits at the first '/': szPath = strHead "/" strRest.
void SplitPath(const char *szPath, std::string &strHead, std::string &strRest) {
    const char *pSlash = strchr(szPath, '/');
    strHead.assign(szPath, pSlash - szPath);
    strRest.assign(pSlash + 1);
}

// A builder over the subtree named by an entry of tree_bld, or an empty one
// when there is none (or a file stands where the folder goes).
int OpenSubBuilder(git_repository *repo, git_treebuilder *tree_bld, const char *szEntryName, TreeBuilder &sub) {
    const git_tree_entry *entry = git_treebuilder_get(tree_bld, szEntryName);
    if (NULL == entry || GIT_OBJECT_TREE != git_tree_entry_type(entry)) {
        GIT_CHECK(git_treebuilder_new(sub.out(), repo, NULL), "git_treebuilder_new(&tree_bld, repo, base_tree)");
        return 0;
    }
    Object base_tree;
    GIT_CHECK(git_tree_entry_to_object(base_tree.out(), repo, entry), "git_tree_entry_to_object(&base_tree, repo, entry)");
    GIT_CHECK(git_treebuilder_new(sub.out(), repo, reinterpret_cast<git_tree *>(base_tree.get())),
                 "git_treebuilder_new(&tree_bld, repo, base_tree)");
    return 0;
}

int InsertPath(git_repository *repo, git_treebuilder *tree_bld, const char *szPath, const git_oid *pOid) {
    if (NULL == strchr(szPath, '/')) {
        const char *szEntryName = szPath;
        GIT_CHECK(git_treebuilder_insert(NULL, tree_bld, szEntryName, pOid, GIT_FILEMODE_BLOB),
                     "git_treebuilder_insert(NULL, tree_bld, szEntryName, &oid_blob, GIT_FILEMODE_BLOB )");
        return 0;
    }
    std::string strHead, strRest;
    SplitPath(szPath, strHead, strRest);
    const char *szEntryName = strHead.c_str();
    TreeBuilder sub;
    int ret = OpenSubBuilder(repo, tree_bld, szEntryName, sub);
    if (0 > ret) {
        return ret;
    }
    ret = InsertPath(repo, sub.get(), strRest.c_str(), pOid);
    if (0 > ret) {
        return ret;
    }
    git_oid subtree_id;
    git_oid *new_tree_id = &subtree_id;
    GIT_CHECK(git_treebuilder_write(new_tree_id, sub.get()), "git_treebuilder_write( new_tree_id, tree_bld )");
    GIT_CHECK(git_treebuilder_insert(NULL, tree_bld, szEntryName, &subtree_id, GIT_FILEMODE_TREE),
                 "git_treebuilder_insert(NULL, tree_bld, szEntryName, &subtree_id, GIT_FILEMODE_TREE )");
    return 0;
}

// Removes szPath below tree_bld; a folder left empty goes with it. Anything
// missing on the way is skipped, as there is nothing to remove.
int RemovePath(git_repository *repo, git_treebuilder *tree_bld, const char *szPath) {
    bool blNested = (NULL != strchr(szPath, '/'));
    std::string strHead, strRest;
    if (blNested) {
        SplitPath(szPath, strHead, strRest);
    } else {
        strHead = szPath;
    }
    const char *szEntryName = strHead.c_str();
    const git_tree_entry *entry = git_treebuilder_get(tree_bld, szEntryName);
    if (NULL == entry || (blNested && GIT_OBJECT_TREE != git_tree_entry_type(entry))) {
        syslog(LOG_ERR, "%s:%d entry not exist, skip", kTesselModule, __LINE__);
        return 0;
    }
    if (!blNested) {
        GIT_CHECK(git_treebuilder_remove(tree_bld, szEntryName), "git_treebuilder_remove(tree_bld, szEntryName)");
        return 0;
    }
    TreeBuilder sub;
    int ret = OpenSubBuilder(repo, tree_bld, szEntryName, sub);
    if (0 > ret) {
        return ret;
    }
    ret = RemovePath(repo, sub.get(), strRest.c_str());
    if (0 > ret) {
        return ret;
    }
    git_oid subtree_id;
    git_oid *new_tree_id = &subtree_id;
    GIT_CHECK(git_treebuilder_write(new_tree_id, sub.get()), "git_treebuilder_write( new_tree_id, tree_bld )");
    Tree subtree;
    GIT_CHECK(git_tree_lookup(subtree.out(), repo, &subtree_id), "git_tree_lookup(&subtree, repo, &subtree_id )");
    if (0 == git_tree_entrycount(subtree.get())) {
        GIT_CHECK(git_treebuilder_remove(tree_bld, szEntryName), "git_treebuilder_remove(tree_bld, szEntryName)");
        return 0;
    }
    GIT_CHECK(git_treebuilder_insert(NULL, tree_bld, szEntryName, &subtree_id, GIT_FILEMODE_TREE),
                 "git_treebuilder_insert(NULL, tree_bld, szEntryName, &subtree_id, GIT_FILEMODE_TREE )");
    return 0;
}

int OutOfMemory(int line) {
    syslog(LOG_ERR, "%s:%d Out of memory!!", kTesselModule, line);
    TesselErrSetEx(TESSEL_ERR_OUT_OF_MEMORY, kTesselModule, line, "Out of memory!!");
    return GIT_ERROR;
}

// The keys of a table (none for a null table), in the table's order.
bool EnumKeys(const QLIBSZHASH *pHash, SzList &list) {
    QLIBSZLIST **ppList = list.out();
    *ppList = QLIBCSzListAlloc(kListCapacity);
    if (NULL == *ppList) {
        return false;
    }
    return NULL == pHash || 0 <= QLIBCSzHashEnumKey(pHash, ppList);
}

// Paths longer than a path buffer are refused rather than cut, so a long
// name never lands under another name.
bool PathFits(const char *szPath) { return strlen(szPath) < kPathMax; }

int PathTooLong(int line, const char *szPath) {
    syslog(LOG_ERR, "%s:%d path too long [%.64s...]", kTesselModule, line, szPath);
    TesselErrSetEx(TESSEL_ERR_USER_INPUT, kTesselModule, line, "strlen(szPath) >= %zu", kPathMax);
    return GIT_ERROR;
}

// The tree of base_tree (or of nothing) with the renames, adds and deletes
// applied, in that order.
int BuildTree(git_repository *repo, git_tree *base_tree, QLIBSZHASH *pAddHash, QLIBSZHASH *pDelHash,
              QLIBSZHASH *pRenameHash, Tree &tree) {
    TreeBuilder tree_bld;
    GIT_CHECK(git_treebuilder_new(tree_bld.out(), repo, base_tree), "git_treebuilder_new(&tree_bld, repo, base_tree)");

    SzList addList, delList, renameList;
    if (!EnumKeys(pAddHash, addList) || !EnumKeys(pDelHash, delList) || !EnumKeys(pRenameHash, renameList)) {
        return OutOfMemory(__LINE__);
    }
    for (QLIBSZLIST *pList : {addList.get(), delList.get(), renameList.get()}) {
        for (int i = 0; i < QLIBCSzListCount(pList); ++i) {
            const char *szPath = QLIBCSzListGet(pList, i);
            if (!PathFits(szPath)) {
                return PathTooLong(__LINE__, szPath);
            }
        }
    }

    for (int i = 0; i < QLIBCSzListCount(renameList.get()); ++i) {
        const char *szSrc = QLIBCSzListGet(renameList.get(), i);
        const char *szDst = QLIBCSzHashGetValue(pRenameHash, szSrc);
        if (NULL == base_tree || NULL == szDst || !PathFits(szDst)) {
            return BadParameter(__LINE__);
        }
        TreeEntry entry;
        GIT_CHECK(git_tree_entry_bypath(entry.out(), base_tree, szSrc), "git_tree_entry_bypath(&entry, base_tree, szSrc)");
        int ret = InsertPath(repo, tree_bld.get(), szDst, git_tree_entry_id(entry.get()));
        if (0 > ret) {
            return ret;
        }
        if (NULL != strchr(szSrc, '/')) {
            ret = RemovePath(repo, tree_bld.get(), szSrc);
            if (0 > ret) {
                return ret;
            }
        } else {
            GIT_CHECK(git_treebuilder_remove(tree_bld.get(), szSrc), "git_treebuilder_remove(tree_bld, szSrc)");
        }
    }

    for (int i = 0; i < QLIBCSzListCount(addList.get()); ++i) {
        const char *szEntryName = QLIBCSzListGet(addList.get(), i);
        const char *szFile = QLIBCSzHashGetValue(pAddHash, szEntryName);
        if (NULL == szFile) {
            return BadParameter(__LINE__);
        }
        git_oid oid_blob;
        GIT_CHECK(git_blob_create_from_disk(&oid_blob, repo, szFile),
                     "git_blob_create_fromdisk(&oid_blob, repo, szFile)");
        int ret = InsertPath(repo, tree_bld.get(), szEntryName, &oid_blob);
        if (0 > ret) {
            return ret;
        }
    }

    // A delete of something that is not there is no reason to lose the
    // rest of the change.
    for (int i = 0; i < QLIBCSzListCount(delList.get()); ++i) {
        const char *szPath = QLIBCSzListGet(delList.get(), i);
        if (NULL != strchr(szPath, '/')) {
            (void)RemovePath(repo, tree_bld.get(), szPath);
        } else if (0 > git_treebuilder_remove(tree_bld.get(), szPath)) {
            syslog(LOG_ERR, "%s:%d fail to git_treebuilder_remove [%s] (%s)", kTesselModule, __LINE__, szPath,
                   GitMessage());
        }
    }

    git_oid oid_tree;
    GIT_CHECK(git_treebuilder_write(&oid_tree, tree_bld.get()), "git_treebuilder_write( &oid_tree, tree_bld )");
    GIT_CHECK(git_tree_lookup(tree.out(), repo, &oid_tree ), "git_tree_lookup(tree, repo, &oid_tree )");
    return 0;
}

// ---- branches and the latest commit ------------------------------------------

// The commit a branch points at, as a revision walk from it yields first.
int BranchTip(git_repository *repo, git_reference *ref, git_oid &commit_id) {
    Walker walker;
    GIT_CHECK(git_revwalk_new(walker.out(), repo), "git_revwalk_new(&walker, repo)");
    GIT_CHECK(git_revwalk_push_ref(walker.get(), git_reference_name(ref)),
                 "git_revwalk_push_ref(walker, git_reference_name(ref))");
    GIT_CHECK(git_revwalk_next(&commit_id, walker.get()), "git_revwalk_next(&commit_id, walker)");
    return 0;
}

// Calls fn(ref) for every local branch until fn returns 0 or less; a
// negative result is a failure already reported.
template <typename Fn>
int ForEachBranch(git_repository *repo, bool blLatestWording, Fn fn) {
    BranchIter iter;
    int ret = git_branch_iterator_new(iter.out(), repo, GIT_BRANCH_LOCAL);
    if (0 > ret) {
        if (!blLatestWording) {
            ReportGit(__LINE__, "git_branch_iterator_new(&iter, repo, GIT_BRANCH_LOCAL)", ret);
            return ret;
        }
        // The latest-commit search has always logged this failure so.
        int savedErrno = errno;
        int line = __LINE__;
        syslog(LOG_ERR, "%s:%d fail to git_tree_lookup (%s)", kTesselModule, line, GitMessage());
        TesselErrSetEx(GIT_ENOTFOUND == ret ? TESSEL_ERR_NOT_EXISTS : TESSEL_ERR_GIT, kTesselModule, line,
                       "git_branch_iterator_new(&iter, repo, GIT_BRANCH_LOCAL)");
        errno = savedErrno;
        return ret;
    }
    for (;;) {
        Reference ref;
        git_branch_t type;
        ret = git_branch_next(ref.out(), &type, iter.get());
        if (GIT_ITEROVER == ret) {
            return 0;
        }
        if (0 > ret) {
            ReportGit(__LINE__, "git_branch_next(&ref, &type, iter)", ret);
            return ret;
        }
        ret = fn(ref.get());
        if (0 >= ret) {
            return ret;
        }
    }
}

// The tip with the strictly greatest commit time; ties keep the branch met
// first. Zero when no tip has a positive time.
int FindLatestCommit(git_repository *repo, git_oid &lastest_commit_id) {
    memset(&lastest_commit_id, 0, sizeof(lastest_commit_id));
    git_time_t best = 0;
    return ForEachBranch(repo, true, [&](git_reference *ref) -> int {
        git_oid commit_id;
        int ret = BranchTip(repo, ref, commit_id);
        if (0 > ret) {
            return ret;
        }
        Commit commit;
        GIT_CHECK(git_commit_lookup(commit.out(), repo, &commit_id), "git_commit_lookup(&commit, repo, &commit_id)");
        git_time_t when = git_commit_time(commit.get());
        if (when > best) {
            best = when;
            git_oid_cpy(&lastest_commit_id, &commit_id);
        }
        return 1;
    });
}

// The reference name of the branch whose tip is szBaseVersion, or "" when
// no branch ends there.
int FindBranchAt(git_repository *repo, const char *szBaseVersion, std::string &strRefName) {
    strRefName.clear();
    return ForEachBranch(repo, false, [&](git_reference *ref) -> int {
        git_oid commit_id;
        int ret = BranchTip(repo, ref, commit_id);
        if (0 > ret) {
            return ret;
        }
        char szTip[GIT_OID_HEXSZ + 1];
        git_oid_tostr(szTip, sizeof(szTip), &commit_id);
        if (0 == strcmp(szTip, szBaseVersion)) {
            strRefName = git_reference_name(ref);
            return 0;
        }
        return 1;
    });
}

// Unique per thread by the counter, across threads by the thread id.
std::string MakeBranchName() {
    thread_local unsigned int s_counter = 0;
    char szBranchName[64];
    snprintf(szBranchName, sizeof(szBranchName), "branch_%llu_%u_%u_%u",
             static_cast<unsigned long long>(static_cast<long long>(time(NULL))), static_cast<unsigned>(getpid()),
             static_cast<unsigned>(gettid()), s_counter);
    ++s_counter;
    return szBranchName;
}

// ---- commit information --------------------------------------------------------

void FillCommitInfo(const git_commit *commit, Json::Value &jInfo) {
    jInfo = Json::Value(Json::objectValue);
    jInfo["version"] = OidText(git_commit_id(commit));
    const git_signature *author = git_commit_author(commit);
    jInfo["auther"] = (NULL != author && NULL != author->name) ? author->name : "";
    jInfo["email"] = (NULL != author && NULL != author->email) ? author->email : "";
    jInfo["mtime"] = static_cast<Json::Int64>(NULL != author ? author->when.time : 0);
    Json::Value jMsg;
    const char *szRaw = git_commit_message_raw(commit);
    if (NULL != szRaw) {
        tessel::fromString(jMsg, szRaw);
    }
    jInfo["msg"] = jMsg;
    Json::Value jParents(Json::arrayValue);
    for (unsigned int i = 0; i < git_commit_parentcount(commit); ++i) {
        jParents.append(OidText(git_commit_parent_id(commit, i)));
    }
    jInfo["parent"] = jParents;
}

// Kept when every member of jFilter equals the same member of the message's
// "commit_msg" object.
bool MatchesFilter(const Json::Value &jInfo, const Json::Value &jFilter) {
    const Json::Value &jMsg = jInfo["msg"];
    if (!jMsg.isObject()) {
        return false;
    }
    const Json::Value &jCommitMsg = jMsg["commit_msg"];
    if (!jCommitMsg.isObject()) {
        return false;
    }
    for (const std::string &strName : jFilter.getMemberNames()) {
        if (!jCommitMsg.isMember(strName) || jCommitMsg[strName] != jFilter[strName]) {
            return false;
        }
    }
    return true;
}

// The tree of the commit szVersion names; a text that is no identifier fails.
int VersionTree(git_repository *repo, const char *szVersion, Tree &tree) {
    git_oid commit_id;
    int ret = git_oid_fromstr(&commit_id, szVersion);
    if (0 > ret) {
        int savedErrno = errno;
        int line = __LINE__;
        syslog(LOG_ERR, "%s:%d fail to git_oid_fromstr (%s)", kTesselModule, line, GitMessage());
        TesselErrSetEx(TESSEL_ERR_GIT, kTesselModule, line, "git_oid_fromstr(&commit_id, szVersion)");
        errno = savedErrno;
        return ret;
    }
    Commit commit;
    GIT_CHECK(git_commit_lookup(commit.out(), repo, &commit_id), "git_commit_lookup(&commit, repo, &commit_id)");
    GIT_CHECK(git_commit_tree(tree.out(), commit.get()), "git_commit_tree(tree, commit)");
    return 0;
}

}  // namespace

// ---- the seven entry points ----------------------------------------------------

int GitCreateRepository(const char *szRepoPath, long long mtime, QLIBSZHASH *pAddHash, QLIBSZHASH *pDelHash,
                        const char *szAuther, const char *szMail, const char *szCommitMsg,
                        std::string &strOutCommit) {
    GIT_CHECK_PARAM(NULL != szRepoPath && NULL != szAuther && NULL != szMail && NULL != szCommitMsg);
    Repo repo;
    GIT_CHECK(git_repository_init(repo.out(), szRepoPath, 0), "git_repository_init(&repo, szRepoPath, 0)");
    Tree tree;
    int ret = BuildTree(repo.get(), NULL, pAddHash, pDelHash, NULL, tree);
    if (0 > ret) {
        return ret;
    }
    Signature me;
    GIT_CHECK(git_signature_new(me.out(), szAuther, szMail, mtime, 0),
                 "git_signature_new(&me, szAuther, szMail, mtime, 0)");
    git_oid commit_id;
    GIT_CHECK(git_commit_create(&commit_id, repo.get(), "HEAD", me.get(), me.get(), "UTF-8", szCommitMsg,
                                   tree.get(), 0, NULL),
                 "git_commit_create(&commit_id, repo, \"HEAD\", me, me, \"UTF-8\", szCommitMsg, tree, 0, NULL)");
    git_checkout_options opts = CheckoutOptions();
    GIT_CHECK(git_checkout_tree(repo.get(), reinterpret_cast<const git_object *>(tree.get()), &opts),
                 "git_checkout_tree(repo, (const git_object*)tree, &opts)");
    strOutCommit = OidText(&commit_id);
    return 0;
}

int GitCommit(const char *szRepoPath, const char *szBaseVersion, long long mtime, QLIBSZHASH *pAddHash,
              QLIBSZHASH *pDelHash, QLIBSZHASH *pRenameHash, const char *szAuther, const char *szMail,
              const char *szCommitMsg, std::string &strOutCommit) {
    GIT_CHECK_PARAM(NULL != szRepoPath && NULL != szBaseVersion && NULL != szAuther && NULL != szMail &&
                    NULL != szCommitMsg);
    Repo repo;
    GIT_CHECK(git_repository_open(repo.out(), szRepoPath), "git_repository_open(&repo, szRepoPath)");
    const git_oid base_commit_id = OidOrZero(szBaseVersion);
    Commit base_commit;
    GIT_CHECK(git_commit_lookup(base_commit.out(), repo.get(), &base_commit_id),
                 "git_commit_lookup(&base_commit, repo, &base_commit_id)");
    Tree base_tree;
    GIT_CHECK(git_commit_tree(base_tree.out(), base_commit.get()), "git_commit_tree(&base_tree, base_commit)");

    Tree tree;
    int ret = BuildTree(repo.get(), base_tree.get(), pAddHash, pDelHash, pRenameHash, tree);
    if (0 > ret) {
        return ret;
    }
    Diff diff;
    GIT_CHECK(git_diff_tree_to_tree(diff.out(), repo.get(), base_tree.get(), tree.get(), NULL),
                 "git_diff_tree_to_tree(&diff, repo, base_tree, tree, NULL)");
    if (0 == git_diff_num_deltas(diff.get())) {
        strOutCommit = szBaseVersion;
        return 0;
    }

    std::string strBranchRefName;
    ret = FindBranchAt(repo.get(), szBaseVersion, strBranchRefName);
    if (0 > ret) {
        return ret;
    }
    if (strBranchRefName.empty()) {
        std::string strBranchName = MakeBranchName();
        const char *szBranchName = strBranchName.c_str();
        Reference ref;
        GIT_CHECK(git_branch_create(ref.out(), repo.get(), szBranchName, base_commit.get(), 0),
                     "git_branch_create(&ref, repo, szBranchName, base_commit, 0)");
        strBranchRefName = git_reference_name(ref.get());
    }
    const char *szBranchRefName = strBranchRefName.c_str();

    Signature me;
    GIT_CHECK(git_signature_new(me.out(), szAuther, szMail, mtime, 0),
                 "git_signature_new(&me, szAuther, szMail, mtime, 0)");
    const git_commit *cbase_commit = base_commit.get();
    git_oid commit_id;
    GIT_CHECK(git_commit_create(&commit_id, repo.get(), szBranchRefName, me.get(), me.get(), "UTF-8",
                                   szCommitMsg, tree.get(), 1, &cbase_commit),
                 "git_commit_create(&commit_id, repo, szBranchRefName, me, me, \"UTF-8\", szCommitMsg, tree, 1, "
                 "&cbase_commit)");

    // A commit older than another branch's tip is kept but not shown.
    git_oid lastest_commit_id;
    ret = FindLatestCommit(repo.get(), lastest_commit_id);
    if (0 > ret) {
        return ret;
    }
    if (git_oid_equal(&lastest_commit_id, &commit_id)) {
        git_checkout_options opts = CheckoutOptions();
        GIT_CHECK(git_checkout_tree(repo.get(), reinterpret_cast<const git_object *>(tree.get()), &opts),
                     "git_checkout_tree(repo, (const git_object*)tree, &opts)");
        GIT_CHECK(git_repository_set_head(repo.get(), szBranchRefName),
                     "git_repository_set_head(repo, szBranchRefName)");
    }
    strOutCommit = OidText(&commit_id);
    return 0;
}

int GitLoadCommit(const char *szRepoPath, const char *szVersion, const char *szDir, Json::Value &jInfo) {
    GIT_CHECK_PARAM(NULL != szRepoPath && NULL != szVersion && NULL != szDir);
    Repo repo;
    GIT_CHECK(git_repository_open(repo.out(), szRepoPath), "git_repository_open(&repo, szRepoPath)");
    const git_oid commit_id = OidOrZero(szVersion);
    Commit commit;
    GIT_CHECK(git_commit_lookup(commit.out(), repo.get(), &commit_id),
                 "git_commit_lookup(&commit, repo, &commit_id)");
    // The repository's index describes its own work tree; a load elsewhere
    // must not record the other directory's files in it.
    git_checkout_options opts = CheckoutOptions();
    opts.checkout_strategy |= GIT_CHECKOUT_DONT_UPDATE_INDEX;
    opts.target_directory = szDir;
    GIT_CHECK(git_checkout_tree(repo.get(), reinterpret_cast<const git_object *>(commit.get()), &opts),
                 "git_checkout_tree(repo, (const git_object*)commit, &opts)");
    FillCommitInfo(commit.get(), jInfo);
    return 0;
}

int GitRestoreLastestCommit(const char *szRepoPath) {
    GIT_CHECK_PARAM(NULL != szRepoPath);
    Repo repo;
    GIT_CHECK(git_repository_open(repo.out(), szRepoPath), "git_repository_open(&repo, szRepoPath)");
    git_oid lastest_commit_id;
    int ret = FindLatestCommit(repo.get(), lastest_commit_id);
    if (0 > ret) {
        return ret;
    }
    Commit commit;
    GIT_CHECK(git_commit_lookup(commit.out(), repo.get(), &lastest_commit_id),
                 "git_commit_lookup(&commit, repo, &lastest_commit_id)");
    git_checkout_options opts = CheckoutOptions();
    GIT_CHECK(git_checkout_tree(repo.get(), reinterpret_cast<const git_object *>(commit.get()), &opts),
                 "git_checkout_tree(repo, (const git_object*)commit, &opts)");
    return 0;
}

int GitGetCommitInfo(const char *szRepoPath, const char *szVersion, Json::Value &jInfo) {
    GIT_CHECK_PARAM(NULL != szRepoPath);
    Repo repo;
    GIT_CHECK(git_repository_open(repo.out(), szRepoPath), "git_repository_open(&repo, szRepoPath)");
    Commit commit;
    if (NULL == szVersion) {
        git_oid lastest_commit_id;
        int ret = FindLatestCommit(repo.get(), lastest_commit_id);
        if (0 > ret) {
            return ret;
        }
        GIT_CHECK(git_commit_lookup(commit.out(), repo.get(), &lastest_commit_id),
                     "git_commit_lookup(&commit, repo, &lastest_commit_id)");
    } else {
        const git_oid commit_id = OidOrZero(szVersion);
        GIT_CHECK(git_commit_lookup(commit.out(), repo.get(), &commit_id),
                     "git_commit_lookup(&commit, repo, &commit_id)");
    }
    FillCommitInfo(commit.get(), jInfo);
    return 0;
}

int GitDiff(const char *szRepoPath, const char *szOldVersion, const char *szNewVersion, QLIBSZHASH *pOut) {
    GIT_CHECK_PARAM(NULL != szRepoPath && NULL != szOldVersion && NULL != pOut);
    Repo repo;
    GIT_CHECK(git_repository_open(repo.out(), szRepoPath), "git_repository_open(&repo, szRepoPath)");
    char szNewId[GIT_OID_HEXSZ + 1];
    if (NULL == szNewVersion) {
        git_oid lastest_commit_id;
        int ret = FindLatestCommit(repo.get(), lastest_commit_id);
        if (0 > ret) {
            return ret;
        }
        git_oid_tostr(szNewId, sizeof(szNewId), &lastest_commit_id);
    } else {
        snprintf(szNewId, sizeof(szNewId), "%s", szNewVersion);
    }
    Tree old_tree, new_tree;
    int ret = VersionTree(repo.get(), szOldVersion, old_tree);
    if (0 > ret) {
        return ret;
    }
    ret = VersionTree(repo.get(), szNewId, new_tree);
    if (0 > ret) {
        return ret;
    }
    Diff diff;
    GIT_CHECK(git_diff_tree_to_tree(diff.out(), repo.get(), old_tree.get(), new_tree.get(), NULL),
                 "git_diff_tree_to_tree(&diff, repo, old_tree, new_tree, NULL)");
    for (size_t i = 0; i < git_diff_num_deltas(diff.get()); ++i) {
        const git_diff_delta *delta = git_diff_get_delta(diff.get(), i);
        switch (delta->status) {
        case GIT_DELTA_ADDED:
            QLIBCSzHashSetValue(pOut, delta->new_file.path, "created");
            break;
        case GIT_DELTA_DELETED:
            QLIBCSzHashSetValue(pOut, delta->old_file.path, "deleted");
            break;
        case GIT_DELTA_MODIFIED:
            QLIBCSzHashSetValue(pOut, delta->new_file.path, "modified");
            break;
        case GIT_DELTA_RENAMED:
            QLIBCSzHashSetValue(pOut, delta->old_file.path, "deleted");
            QLIBCSzHashSetValue(pOut, delta->new_file.path, "created");
            break;
        default:
            break;
        }
    }
    return 0;
}

int GitListCommitHistory(const char *szRepoPath, unsigned int limit, unsigned int offset, bool blReverse,
                         const Json::Value &jFilter, Json::Value &jOut) {
    jOut = Json::Value(Json::arrayValue);
    if (NULL == szRepoPath || !(jFilter.isNull() || jFilter.isObject())) {
        BadParameter(__LINE__);
        return -1;
    }
    auto walk = [&]() -> int {
        Repo repo;
        GIT_CHECK(git_repository_open(repo.out(), szRepoPath), "git_repository_open(&repo, szRepoPath)");
        Walker walker;
        GIT_CHECK(git_revwalk_new(walker.out(), repo.get()), "git_revwalk_new(&walker, repo)");
        GIT_CHECK(git_revwalk_sorting(walker.get(), blReverse ? (GIT_SORT_TIME | GIT_SORT_REVERSE) : GIT_SORT_TIME),
                     "git_revwalk_sorting(walker, sort)");
        int ret = ForEachBranch(repo.get(), false, [&](git_reference *ref) -> int {
            GIT_CHECK(git_revwalk_push_ref(walker.get(), git_reference_name(ref)),
                         "git_revwalk_push_ref(walker, git_reference_name(ref))");
            return 1;
        });
        if (0 > ret) {
            return ret;
        }
        unsigned int skipped = 0;
        git_oid oid;
        while (0 == (ret = git_revwalk_next(&oid, walker.get()))) {
            Commit commit;
            GIT_CHECK(git_commit_lookup(commit.out(), repo.get(), &oid), "git_commit_lookup(&commit, repo, &oid)");
            Json::Value jInfo;
            FillCommitInfo(commit.get(), jInfo);
            if (!jFilter.empty() && !MatchesFilter(jInfo, jFilter)) {
                continue;
            }
            if (skipped < offset) {
                ++skipped;
                continue;
            }
            jOut.append(jInfo);
            if (0 != limit && jOut.size() >= limit) {
                return 0;
            }
        }
        if (GIT_ITEROVER != ret) {
            ReportGit(__LINE__, "git_revwalk_next(&oid, walker)", ret);
            return ret;
        }
        return 0;
    };
    if (0 > walk()) {
        jOut = Json::Value(Json::arrayValue);
        return -1;
    }
    return static_cast<int>(jOut.size());
}
