// One call of the platform's file copy, and which of its steps failed.
//
// Threads: any number of copies may run at once. Unlike the other calls of the platform a copy is
// made without the lock of the layer: it may take hours, and the call is made for it.
#pragma once

#include <string>

enum KeldCopyStep : int {
    KELD_COPY_DONE,         // copied
    KELD_COPY_NO_ARGS,      // no argument object
    KELD_COPY_NO_CALLBACK,  // the callback was refused
    KELD_COPY_FAILED,       // the copy itself; the platform's error tells why
};

struct KeldCopyResult {
    KeldCopyStep step = KELD_COPY_DONE;
    int keld_error = 0;  // with KELD_COPY_FAILED only
};

// Copies the regular file `from` to `to`, whose folder must exist; an existing file is replaced
// when `overwrite` is 1 and refused when it is -1. The new file gets this owner and group.
// `is_cancel` is asked during the copy, with `user_data`; nonzero stops it. What is left at the
// destination after a failure is up to the platform.
[[nodiscard]] KeldCopyResult KeldCopyFile(const std::string& from, const std::string& to,
                                          int overwrite, int owner, int group,
                                          int (*is_cancel)(void*), void* user_data);
