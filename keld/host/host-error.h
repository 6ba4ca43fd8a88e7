// How an operation of this platform reports a failure: return Fail(KELDERR_...), which stores the
// value with the caller's place in the thread's error state and gives -1.
#pragma once

#include <keld/error.h>

namespace keld_host {

// Stores the error of this thread; `file` is a literal.
void SetError(int code, const char* file, int line);
// The KELDERR value that tells an errno best.
[[nodiscard]] int ErrorFromErrno(int error);

// __builtin_FILE and __builtin_LINE as default arguments are those of the call.
inline int Fail(int code, const char* file = __builtin_FILE(), int line = __builtin_LINE()) {
    SetError(code, file, line);
    return -1;
}
inline int FailErrno(int error, const char* file = __builtin_FILE(), int line = __builtin_LINE()) {
    SetError(ErrorFromErrno(error), file, line);
    return -1;
}

}  // namespace keld_host
