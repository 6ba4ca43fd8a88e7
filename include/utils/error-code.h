// Outcomes of units of work: 0 or negative, each with a text and what a worker does next.
//
// The numbers are stored in databases and sent to clients: they are never renumbered.
#pragma once

enum ErrorCode : int {
    ERR_SUCCESS = 0,
    ERR_INTERRUPTED = -1,
    ERR_IO = -2,
    ERR_SYSTEM = -3,
    ERR_INVALID_ARGUMENT = -4,
    ERR_CONNECTION_TIMEOUT = -5,
    ERR_SSL_VERIFY = -6,
    ERR_PROCESS_STOPPED = -7,
    ERR_IGNORE = -8,
    ERR_NO_PERMISSION = -9,
    ERR_FILE_OPERATION = -10,
    ERR_FILE_TOO_LARGE = -11,
    ERR_FILE_NAME = -12,
    ERR_SHARE_NOT_MOUNTED = -13,
    ERR_RESUME = -14,
    ERR_SRC_MISS = -15,
    ERR_DST_EXISTS = -16,
    ERR_DST_CONFLICT = -17,
    ERR_DST_TYPE_CONFLICT = -18,
    ERR_DST_QUOTA_FULL = -19,
    ERR_DST_ROOT_MISS = -20,
    ERR_DST_PARENT_MISS = -21,
    ERR_SRC_ROOT_MISS = -22,
    ERR_WAIT_NOTIFY = -23,
    ERR_LAST = ERR_WAIT_NOTIFY,
};

// What a worker does after handling an outcome.
enum ErrorAction : int {
    ERROR_ACTION_DONE = 0,   // the work is finished
    ERROR_ACTION_RETRY = 1,  // the same work again, three times at most
    ERROR_ACTION_REDO = 2,   // give the work back, to be run later
    ERROR_ACTION_NONE = 3,   // nothing further: the process is going down
};

// True for 0 to ERR_LAST.
[[nodiscard]] bool IsErrorCode(int code);
// The text of a code, a literal; "Unknown error" for a code outside the table.
[[nodiscard]] const char* ErrorText(int code);
// The action and the class of a code; the code must be one (IsErrorCode). Nothing consults the
// class; it is kept beside the action.
[[nodiscard]] ErrorAction ErrorActionOf(int code);
[[nodiscard]] int ErrorClassOf(int code);
// True for the outcomes that do not make a run a failed one: 0, "Ignore this error",
// "Destination file exists" and "Destination file type conflict".
[[nodiscard]] bool IsIgnorableError(int code);
// The code for an error of the platform's copy call. Logs a value that it knows; any other gives
// "File operation error".
[[nodiscard]] int ErrorCodeFromKeldError(int keld_error);
