/* A progress bar on standard error, for a terminal. */
#ifndef TESSEL_TOOLS_PROGRESS_H
#define TESSEL_TOOLS_PROGRESS_H

#include <string>

namespace tessel_cli {

/* "label [#####.....]  12/40" on one line, redrawn in place. */
void DrawProgress(const std::string &label, unsigned long done, unsigned long total);
/* Ends the bar's line. */
void EndProgress();

}  // namespace tessel_cli

#endif /* TESSEL_TOOLS_PROGRESS_H */
