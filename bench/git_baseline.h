/*
 * The same repository work as the version store's create and commit, written
 * directly on libgit2: the baseline its figures are compared with.
 */
#ifndef TESSEL_BENCH_GIT_BASELINE_H
#define TESSEL_BENCH_GIT_BASELINE_H

#include <string>
#include <utility>
#include <vector>

namespace tessel_bench {

/* A new repository at strRepo whose first commit holds text/<name> for each field. */
bool BaselineCreate(const std::string &strRepo, const std::vector<std::pair<std::string, std::string>> &fields,
                    long long mtime);
/* A commit on HEAD that replaces the given fields, checked out. */
bool BaselineCommit(const std::string &strRepo, const std::vector<std::pair<std::string, std::string>> &fields,
                    long long mtime);

}  // namespace tessel_bench

#endif /* TESSEL_BENCH_GIT_BASELINE_H */
