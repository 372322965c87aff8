/* The progress bar. */
#include <stdio.h>

#include "progress.h"

namespace tessel_cli {

void DrawProgress(const std::string &label, unsigned long done, unsigned long total) {
    constexpr unsigned long kWidth = 40;
    if (done > total) {
        done = total;  // the index may hold rows the count did not see yet
    }
    const unsigned long filled = (0 == total) ? kWidth : done * kWidth / total;
    std::string bar(filled, '#');
    bar.append(kWidth - filled, '.');
    fprintf(stderr, "\r%s [%s] %lu/%lu", label.c_str(), bar.c_str(), done, total);
    fflush(stderr);
}

void EndProgress() {
    fputc('\n', stderr);
    fflush(stderr);
}

}  // namespace tessel_cli
