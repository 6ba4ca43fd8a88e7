#include "utils/error-code.h"

#include <gtest/gtest.h>

#include <climits>
#include <map>
#include <set>

#include "support/log-capture.h"

namespace {

struct CodeCase {
    int code;
    ErrorCode name;
    const char* text;
    int action;
    int error_class;
};
constexpr CodeCase kCases[] = {
    {0,   ERR_SUCCESS,            "Successful",                        0, 0},
    {-1,  ERR_INTERRUPTED,        "Interrupted",                       2, 0},
    {-2,  ERR_IO,                 "I/O error",                         1, 1},
    {-3,  ERR_SYSTEM,             "System error",                      1, 0},
    {-4,  ERR_INVALID_ARGUMENT,   "Invalid argument",                  1, 0},
    {-5,  ERR_CONNECTION_TIMEOUT, "Connection timeout",                1, 0},
    {-6,  ERR_SSL_VERIFY,         "SSL certificate verify fail",       1, 0},
    {-7,  ERR_PROCESS_STOPPED,    "Process stopped",                   3, 2},
    {-8,  ERR_IGNORE,             "Ignore this error",                 0, 0},
    {-9,  ERR_NO_PERMISSION,      "No permission",                     0, 2},
    {-10, ERR_FILE_OPERATION,     "File operation error",              1, 2},
    {-11, ERR_FILE_TOO_LARGE,     "File size too large",               0, 2},
    {-12, ERR_FILE_NAME,          "File name not support",             0, 2},
    {-13, ERR_SHARE_NOT_MOUNTED,  "Share not mounted",                 0, 1},
    {-14, ERR_RESUME,             "Resume failed",                     1, 2},
    {-15, ERR_SRC_MISS,           "Source file is miss",               0, 2},
    {-16, ERR_DST_EXISTS,         "Destination file exists",           1, 0},
    {-17, ERR_DST_CONFLICT,       "Destination file conflict",         0, 0},
    {-18, ERR_DST_TYPE_CONFLICT,  "Destination file type conflict",    1, 0},
    {-19, ERR_DST_QUOTA_FULL,     "Destination quota full",            0, 1},
    {-20, ERR_DST_ROOT_MISS,      "Destination root folder is miss",   0, 2},
    {-21, ERR_DST_PARENT_MISS,    "Destination parent folder is miss", 2, 0},
    {-22, ERR_SRC_ROOT_MISS,      "Source root folder is miss",        0, 2},
    {-23, ERR_WAIT_NOTIFY,        "Wait for notify events",            2, 0},
};

TEST(ErrorCodeTest, EveryCodeHasItsNumberItsTextItsActionAndItsClass) {
    int expected = 0;
    for (const CodeCase& row : kCases) {
        EXPECT_EQ(expected--, row.code);
        EXPECT_EQ(row.code, row.name);
        EXPECT_TRUE(IsErrorCode(row.code)) << row.code;
        EXPECT_STREQ(row.text, ErrorText(row.code));
        EXPECT_EQ(row.action, ErrorActionOf(row.code)) << row.text;
        EXPECT_EQ(row.error_class, ErrorClassOf(row.code)) << row.text;
    }
    EXPECT_EQ(ERR_LAST, std::end(kCases)[-1].name);
}

TEST(ErrorCodeTest, NumbersOutsideTheTableAreNoCodesAndReadUnknownError) {
    for (const int code : {1, -24, 100, -100, INT_MAX, INT_MIN}) {
        EXPECT_FALSE(IsErrorCode(code)) << code;
        EXPECT_STREQ("Unknown error", ErrorText(code));
    }
}

TEST(ErrorCodeTest, FourCodesAreIgnorable) {
    const std::set<int> ignorable = {0, -8, -16, -18};
    for (int code = -30; code <= 5; ++code) {
        EXPECT_EQ(ignorable.contains(code), IsIgnorableError(code)) << code;
    }
}

TEST(ErrorCodeTest, EveryPlatformErrorMapsToItsCodeAndOnlyKnownOnesAreLogged) {
    const std::map<int, int> known = {
        {0x0000, 0  },
        {0x0300, -9 },
        {0x0600, -15},
        {0x0700, -15},
        {0x0800, -16},
        {0x0D00, -4 },
        {0x2400, -19},
        {0x2900, -19},
        {0x3B00, -10},
        {0x6C00, -2 },
        {0x8000, -3 },
        {0x8400, -9 },
        {0xA200, -18},
        {0xA300, -16},
        {0xA400, -11},
        {0xA500, -12},
        {0xA600, -1 },
        {0xC300, -12},
    };
    ASSERT_EQ(18u, known.size());
    LogCapture log;
    for (int error = 0; error <= 0xFFFF; ++error) {
        const auto found = known.find(error);
        const int code = found == known.end() ? -10 : found->second;
        ASSERT_EQ(code, ErrorCodeFromKeldError(error)) << error;
        if (found == known.end()) {
            ASSERT_TRUE(log.Lines().empty()) << error;
            continue;
        }
        char line[100];
        snprintf(line, sizeof(line), "[INFO] GetError: KELDERR = 0x%04x, Ferrix ERROR_CODE = %d",
                 static_cast<unsigned>(error), code);
        ASSERT_EQ(std::vector<std::string>{line}, log.Lines());
        log.Clear();
    }
    EXPECT_EQ(-10, ErrorCodeFromKeldError(-1));
    EXPECT_EQ(-10, ErrorCodeFromKeldError(0x10300));
}

}  // namespace
