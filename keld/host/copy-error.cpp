#include "host/copy-error.h"

#include <keld/error.h>

#include <cerrno>
#include <span>

namespace keld_host {
namespace {

struct ErrnoRow {
    int error;
    int code;
};

// What both sides share.
constexpr ErrnoRow COMMON[] = {
    {EACCES,       KELDERR_NO_PERMISSION     },
    {EPERM,        KELDERR_NO_PERMISSION     },
    {EROFS,        KELDERR_NO_PERMISSION     },
    {EIO,          KELDERR_IO                },
    {ENODEV,       KELDERR_IO                },
    {ENXIO,        KELDERR_IO                },
    {ENOMEDIUM,    KELDERR_IO                },
    {EREMOTEIO,    KELDERR_IO                },
    {ESTALE,       KELDERR_IO                },
    {ENOTCONN,     KELDERR_IO                }, // a file system in user space whose program has died
    {EUCLEAN,      KELDERR_IO                }, // a damaged file system
    {EBADMSG,      KELDERR_IO                },
    {ENOMEM,       KELDERR_SYSTEM            },
    {EMFILE,       KELDERR_SYSTEM            },
    {ENFILE,       KELDERR_SYSTEM            },
    {ENAMETOOLONG, KELDERR_NAME_TOO_LONG     },
    {EILSEQ,       KELDERR_NAME_NOT_SUPPORTED},
};

constexpr ErrnoRow SOURCE[] = {
    {ENOENT,  KELDERR_SRC_MISS_PATH   },
    {ENOTDIR, KELDERR_SRC_MISS_PATH   },
    {ELOOP,   KELDERR_INVALID_ARGUMENT},
};

constexpr ErrnoRow DESTINATION[] = {
    {ENOSPC, KELDERR_NO_SPACE         },
    {EDQUOT, KELDERR_QUOTA_FULL       },
    {EFBIG,  KELDERR_FILE_TOO_LARGE   },
    {EISDIR, KELDERR_DST_TYPE_CONFLICT}, // a folder came in the way of the final rename
};

int Find(std::span<const ErrnoRow> rows, int error) {
    for (const ErrnoRow& row : rows) {
        if (row.error == error) return row.code;
    }
    return 0;
}

int FindIn(std::span<const ErrnoRow> rows, int error) {
    if (const int code = Find(rows, error); code != 0) return code;
    if (const int code = Find(COMMON, error); code != 0) return code;
    return KELDERR_FILE_OPERATION;
}

}  // namespace

int CopySourceError(int error) { return FindIn(SOURCE, error); }

int CopyDestinationError(int error) { return FindIn(DESTINATION, error); }

}  // namespace keld_host
