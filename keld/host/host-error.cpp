#include "host/host-error.h"

#include <cerrno>

namespace keld_host {
namespace {

struct ErrorState {
    int code = KELDERR_SUCCESS;
    const char* file = "";
    int line = 0;
};

thread_local ErrorState t_error;

struct ErrnoRow {
    int error;
    int code;
};

constexpr ErrnoRow kErrnoRows[] = {
    {0,            KELDERR_SUCCESS           },
    {EPERM,        KELDERR_NO_PERMISSION     },
    {EACCES,       KELDERR_NO_PERMISSION     },
    {EROFS,        KELDERR_NO_PERMISSION     },
    {ENOENT,       KELDERR_SRC_MISS          },
    {ENOTDIR,      KELDERR_SRC_MISS          },
    {EEXIST,       KELDERR_DST_EXISTS        },
    {EINVAL,       KELDERR_INVALID_ARGUMENT  },
    {ENOSPC,       KELDERR_NO_SPACE          },
    {EDQUOT,       KELDERR_QUOTA_FULL        },
    {EIO,          KELDERR_IO                },
    {ENXIO,        KELDERR_IO                },
    {ENODEV,       KELDERR_IO                },
    {ENOMEM,       KELDERR_SYSTEM            },
    {EMFILE,       KELDERR_SYSTEM            },
    {ENFILE,       KELDERR_SYSTEM            },
    {EFBIG,        KELDERR_FILE_TOO_LARGE    },
    {ENAMETOOLONG, KELDERR_NAME_TOO_LONG     },
    {EILSEQ,       KELDERR_NAME_NOT_SUPPORTED},
    {EISDIR,       KELDERR_DST_TYPE_CONFLICT },
    {ECANCELED,    KELDERR_CANCELLED         },
};

}  // namespace

void SetError(int code, const char* file, int line) { t_error = {code, file, line}; }

int ErrorFromErrno(int error) {
    for (const ErrnoRow& row : kErrnoRows) {
        if (row.error == error) return row.code;
    }
    return KELDERR_FILE_OPERATION;
}

}  // namespace keld_host

int KLIBCErrGet(void) { return keld_host::t_error.code; }
const char* KLIBCErrorGetFile(void) { return keld_host::t_error.file; }
int KLIBCErrorGetLine(void) { return keld_host::t_error.line; }
