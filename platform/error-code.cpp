#include "utils/error-code.h"

#include <algorithm>
#include <iterator>

#include "utils/log.h"

namespace {

struct CodeRow {
    int code;
    const char* text;
    ErrorAction action;
    int error_class;
};

constexpr CodeRow kCodes[] = {
    {ERR_SUCCESS,            "Successful",                        ERROR_ACTION_DONE,  0},
    {ERR_INTERRUPTED,        "Interrupted",                       ERROR_ACTION_REDO,  0},
    {ERR_IO,                 "I/O error",                         ERROR_ACTION_RETRY, 1},
    {ERR_SYSTEM,             "System error",                      ERROR_ACTION_RETRY, 0},
    {ERR_INVALID_ARGUMENT,   "Invalid argument",                  ERROR_ACTION_RETRY, 0},
    {ERR_CONNECTION_TIMEOUT, "Connection timeout",                ERROR_ACTION_RETRY, 0},
    {ERR_SSL_VERIFY,         "SSL certificate verify fail",       ERROR_ACTION_RETRY, 0},
    {ERR_PROCESS_STOPPED,    "Process stopped",                   ERROR_ACTION_NONE,  2},
    {ERR_IGNORE,             "Ignore this error",                 ERROR_ACTION_DONE,  0},
    {ERR_NO_PERMISSION,      "No permission",                     ERROR_ACTION_DONE,  2},
    {ERR_FILE_OPERATION,     "File operation error",              ERROR_ACTION_RETRY, 2},
    {ERR_FILE_TOO_LARGE,     "File size too large",               ERROR_ACTION_DONE,  2},
    {ERR_FILE_NAME,          "File name not support",             ERROR_ACTION_DONE,  2},
    {ERR_SHARE_NOT_MOUNTED,  "Share not mounted",                 ERROR_ACTION_DONE,  1},
    {ERR_RESUME,             "Resume failed",                     ERROR_ACTION_RETRY, 2},
    {ERR_SRC_MISS,           "Source file is miss",               ERROR_ACTION_DONE,  2},
    {ERR_DST_EXISTS,         "Destination file exists",           ERROR_ACTION_RETRY, 0},
    {ERR_DST_CONFLICT,       "Destination file conflict",         ERROR_ACTION_DONE,  0},
    {ERR_DST_TYPE_CONFLICT,  "Destination file type conflict",    ERROR_ACTION_RETRY, 0},
    {ERR_DST_QUOTA_FULL,     "Destination quota full",            ERROR_ACTION_DONE,  1},
    {ERR_DST_ROOT_MISS,      "Destination root folder is miss",   ERROR_ACTION_DONE,  2},
    {ERR_DST_PARENT_MISS,    "Destination parent folder is miss", ERROR_ACTION_REDO,  0},
    {ERR_SRC_ROOT_MISS,      "Source root folder is miss",        ERROR_ACTION_DONE,  2},
    {ERR_WAIT_NOTIFY,        "Wait for notify events",            ERROR_ACTION_REDO,  0},
};

constexpr bool RowsAreIndexedByCode() {
    for (int i = 0; i < static_cast<int>(std::size(kCodes)); ++i) {
        if (kCodes[i].code != -i) return false;
    }
    return std::size(kCodes) == -ERR_LAST + 1;
}
static_assert(RowsAreIndexedByCode(), "a code is looked up by its negated value");

const CodeRow& RowOf(int code) { return kCodes[-code]; }

struct KeldRow {
    int keld_error;
    int code;
};

constexpr KeldRow kKeldErrors[] = {
    {0x0000, ERR_SUCCESS          },
    {0x0300, ERR_NO_PERMISSION    },
    {0x0600, ERR_SRC_MISS         },
    {0x0700, ERR_SRC_MISS         },
    {0x0800, ERR_DST_EXISTS       },
    {0x0D00, ERR_INVALID_ARGUMENT },
    {0x2400, ERR_DST_QUOTA_FULL   },
    {0x2900, ERR_DST_QUOTA_FULL   },
    {0x3B00, ERR_FILE_OPERATION   },
    {0x6C00, ERR_IO               },
    {0x8000, ERR_SYSTEM           },
    {0x8400, ERR_NO_PERMISSION    },
    {0xA200, ERR_DST_TYPE_CONFLICT},
    {0xA300, ERR_DST_EXISTS       },
    {0xA400, ERR_FILE_TOO_LARGE   },
    {0xA500, ERR_FILE_NAME        },
    {0xA600, ERR_INTERRUPTED      },
    {0xC300, ERR_FILE_NAME        },
};
static_assert(std::ranges::is_sorted(kKeldErrors, {}, &KeldRow::keld_error),
              "lookup is a binary search");

}  // namespace

bool IsErrorCode(int code) { return code <= 0 && code >= ERR_LAST; }

const char* ErrorText(int code) { return IsErrorCode(code) ? RowOf(code).text : "Unknown error"; }

ErrorAction ErrorActionOf(int code) { return RowOf(code).action; }

int ErrorClassOf(int code) { return RowOf(code).error_class; }

bool IsIgnorableError(int code) {
    return code == ERR_SUCCESS || code == ERR_IGNORE || code == ERR_DST_EXISTS ||
           code == ERR_DST_TYPE_CONFLICT;
}

int ErrorCodeFromKeldError(int keld_error) {
    const auto* row = std::ranges::lower_bound(kKeldErrors, keld_error, {}, &KeldRow::keld_error);
    if (row == std::end(kKeldErrors) || row->keld_error != keld_error) return ERR_FILE_OPERATION;
    SLOG_INFO("GetError: KELDERR = 0x%04x, Ferrix ERROR_CODE = %d\n",
              static_cast<unsigned>(keld_error), row->code);
    return row->code;
}
