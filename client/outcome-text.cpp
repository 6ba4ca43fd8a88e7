#include "client/outcome-text.h"

#include <algorithm>
#include <iterator>

#include "utils/error-code.h"

namespace {

struct OutcomeRow {
    int code;
    const char* text;
};

constexpr OutcomeRow OUTCOMES[] = {
    {ERR_SUCCESS,            "no reason was recorded"                                           },
    {ERR_INTERRUPTED,        "it was interrupted"                                               },
    {ERR_IO,                 "a disk could not be read or written"                              },
    {ERR_SYSTEM,             "the system failed; its own log may say more"                      },
    {ERR_INVALID_ARGUMENT,   "something about it is not valid; the system log may say more"     },
    {ERR_CONNECTION_TIMEOUT, "no answer came in time"                                           },
    {ERR_SSL_VERIFY,         "the certificate of the other side could not be verified"          },
    {ERR_PROCESS_STOPPED,    "the service was stopped"                                          },
    {ERR_IGNORE,             "it was passed over"                                               },
    {ERR_NO_PERMISSION,      "there is no permission for it"                                    },
    {ERR_FILE_OPERATION,     "reading or writing failed"                                        },
    {ERR_FILE_TOO_LARGE,     "it is too large for the destination's file system"                },
    {ERR_FILE_NAME,          "the destination's file system does not take such a name"          },
    {ERR_SHARE_NOT_MOUNTED,  "the share is locked or not mounted"                               },
    {ERR_RESUME,             "what had been begun earlier could not be taken up again"          },
    {ERR_SRC_MISS,           "the source is not there any more"                                 },
    {ERR_DST_EXISTS,         "the destination is there already"                                 },
    {ERR_DST_CONFLICT,       "something else is in its place at the destination"                },
    {ERR_DST_TYPE_CONFLICT,  "a file is in the place of a folder, or a folder in that of a file"},
    {ERR_DST_QUOTA_FULL,     "the destination is full"                                          },
    {ERR_DST_ROOT_MISS,      "the destination folder does not exist"                            },
    {ERR_DST_PARENT_MISS,    "the folder that it belongs into is missing at the destination"    },
    {ERR_SRC_ROOT_MISS,      "the source folder does not exist"                                 },
    {ERR_WAIT_NOTIFY,        "it was put off until something changes"                           },
};
static_assert(std::size(OUTCOMES) == -ERR_LAST + 1, "every outcome has a text");

}  // namespace

std::string OutcomeText(int code) {
    const auto* row = std::ranges::find(OUTCOMES, code, &OutcomeRow::code);
    if (row != std::end(OUTCOMES)) return row->text;
    return "error " + std::to_string(code) + ", which is not known here";
}
