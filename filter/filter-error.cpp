#include "filter/filter-error.h"

#include <iterator>

namespace {

struct ErrorRow {
    int code;
    const char* name;
};

constexpr ErrorRow kErrors[] = {
    {FILTER_NO_ERROR,                              "NO_ERROR"                             },
    {FILTER_SECTION_MISSING_LEFT_BRACKET,          "SECTION_MISSING_LEFT_BRACKET"         },
    {FILTER_SECTION_MISSING_RIGHT_BRACKET,         "SECTION_MISSING_RIGHT_BRACKET"        },
    {FILTER_SECTION_MISSING_SECTION,               "SECTION_MISSING_SECTION"              },
    {FILTER_SECTION_ILLEGAL_CHARACTER,             "SECTION_ILLEGAL_CHARACTER"            },
    {FILTER_SECTION_TOO_LONG,                      "SECTION_TOO_LONG"                     },
    {FILTER_SECTION_UNDEFINED_SECTION,             "SECTION_UNDEFINED_SECTION"            },
    {FILTER_KEY_MISSING_KEY,                       "KEY_MISSING_KEY"                      },
    {FILTER_KEY_ILLEGAL_CHARACTER,                 "KEY_ILLEGAL_CHARACTER"                },
    {FILTER_KEY_TOO_LONG,                          "KEY_TOO_LONG"                         },
    {FILTER_KEY_UNDEFINED_KEY,                     "KEY_UNDEFINED_KEY"                    },
    {FILTER_VALUE_NUMERIC_MISSING_INTEGER_PART,    "VALUE_NUMERIC_MISSING_INTEGER_PART"   },
    {FILTER_VALUE_NUMERIC_MISSING_FRACTIONAL_PART, "VALUE_NUMERIC_MISSING_FRACTIONAL_PART"},
    {FILTER_VALUE_NUMERIC_MISSING_VALUE,           "VALUE_NUMERIC_MISSING_VALUE"          },
    {FILTER_VALUE_NUMERIC_ILLEGAL_SYNTAX,          "VALUE_NUMERIC_ILLEGAL_SYNTAX"         },
    {FILTER_VALUE_STRING_MISSING_LEFT_QUOTE,       "VALUE_STRING_MISSING_LEFT_QUOTE"      },
    {FILTER_VALUE_STRING_MISSING_RIGHT_QUOTE,      "VALUE_STRING_MISSING_RIGHT_QUOTE"     },
    {FILTER_VALUE_STRING_ESCAPE_ILLEGAL_SEQUENCE,  "VALUE_STRING_ESCAPE_ILLEGAL_SEQUENCE" },
    {FILTER_VALUE_STRING_ESCAPE_ILLEGAL_HEX_VALUE, "VALUE_STRING_ESCAPE_ILLEGAL_HEX_VALUE"},
    {FILTER_VALUE_STRING_ESCAPE_ILLEGAL_OCT_VALUE, "VALUE_STRING_ESCAPE_ILLEGAL_OCT_VALUE"},
    {FILTER_VALUE_STRING_ILLEGAL_CHARACTER,        "VALUE_STRING_ILLEGAL_CHARACTER"       },
    {FILTER_VALUE_STRING_EMPTY,                    "VALUE_STRING_EMPTY"                   },
    {FILTER_VALUE_SET_MISSING_SEPARATER,           "VALUE_SET_MISSING_SEPARATER"          },
    {FILTER_VALUE_TOO_LONG,                        "VALUE_TOO_LONG"                       },
    {FILTER_LINE_NOT_ENDED,                        "LINE_NOT_ENDED"                       },
    {FILTER_LINE_NOT_EXPECTED,                     "LINE_NOT_EXPECTED"                    },
    {FILTER_INTERNAL_ERROR,                        "INTERNAL_ERROR"                       },
};

constexpr bool RowsAreIndexedByCode() {
    for (int i = 0; i < static_cast<int>(std::size(kErrors)); ++i) {
        if (kErrors[i].code != -i) return false;
    }
    return std::size(kErrors) == -FILTER_INTERNAL_ERROR + 1;
}
static_assert(RowsAreIndexedByCode(), "a name is looked up by the negated code");

}  // namespace

const char* FilterErrorName(int code) {
    return code <= 0 && code >= FILTER_INTERNAL_ERROR ? kErrors[-code].name : "Unknown error";
}
