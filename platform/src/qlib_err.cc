// The platform error state: one (code, file, line) per thread.
#include <string>

#include "quor/qlib.h"

namespace {

struct ErrState {
    int code = QLIBC_ERR_NONE;
    std::string file;
    int line = 0;
};

ErrState &State() {
    thread_local ErrState state;
    return state;
}

}  // namespace

extern "C" {

void QLIBCErrSetEx(int code, const char *szFile, int line) {
    ErrState &st = State();
    st.code = code;
    st.file = (NULL == szFile) ? "" : szFile;
    st.line = line;
}

int QLIBCErrGet(void) { return State().code; }

const char *QLIBCErrFileGet(void) { return State().file.c_str(); }

int QLIBCErrLineGet(void) { return State().line; }

void QLIBCErrClear(void) { State() = ErrState(); }

}  // extern "C"
