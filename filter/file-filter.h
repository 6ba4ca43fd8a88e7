// May this path take part in a task? An optional white list and an optional black list, each read
// from a filter file, answer.
//
// Paths are relative to the task's root and start with "/". Upper and lower case of ASCII letters
// count as the same; all else is compared byte by byte.
// Threads: every operation may be called from any thread; one mutex covers loading and Check().
#pragma once

#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

class BlackListRules;
class WhiteListRules;

// Why a path is refused. The numbers stand in logs and are never renumbered.
enum FilterReason : int {
    FILTER_PASS = 0,
    FILTER_NOT_WHITE = -1,  // the white list does not match, or the path cannot be split
    FILTER_BLACK_CHAR = -258,
    FILTER_BLACK_PREFIX = -259,
    FILTER_BLACK_SUFFIX = -260,
    FILTER_BLACK_NAME = -261,
    FILTER_BLACK_DIR_PREFIX = -264,
    FILTER_MAX_LENGTH = -265,
    FILTER_FILE_CHAR = -514,
    FILTER_FILE_PREFIX = -515,
    FILTER_FILE_SUFFIX = -516,
    FILTER_FILE_NAME = -517,
    FILTER_FILE_EXT = -518,
    FILTER_FILE_GLOB = -519,
    FILTER_DIR_CHAR = -770,
    FILTER_DIR_PREFIX = -771,
    FILTER_DIR_SUFFIX = -772,
    FILTER_DIR_NAME = -773,
    FILTER_DIR_GLOB = -775,
};

class FileFilter {
public:
    using Strings = std::vector<std::string>;

    FileFilter();
    ~FileFilter();
    FileFilter(const FileFilter&) = delete;
    FileFilter& operator=(const FileFilter&) = delete;

    // Replace a list by that of a file. 0; -1 on failure, and then there is no such list any more:
    // a filter without a list passes everything.
    [[nodiscard]] int LoadBlackList(const std::string& path);
    [[nodiscard]] int LoadWhiteList(const std::string& path);

    // 0 to pass, a FilterReason to refuse.
    [[nodiscard]] int Check(std::string_view path, bool is_dir);

    // Whether a filter file can hold the list so that it is read back as it is: no empty string,
    // and none whose written form is too long.
    [[nodiscard]] static bool IsWritableList(const Strings& list);

    // Write a filter file with these names and extensions, readable by all and writable by its
    // owner alone. 0; -1 on failure. A list that could not be read back is refused before the file
    // is touched.
    [[nodiscard]] static int WriteBlackList(const std::string& file, const Strings& names,
                                            const Strings& exts);
    [[nodiscard]] static int WriteWhiteList(const std::string& file, const Strings& names,
                                            const Strings& exts);
    // Read the same two lists back, in their order. 0; -1 on failure, the lists are then empty.
    [[nodiscard]] static int ReadBlackList(const std::string& file, Strings& names, Strings& exts);
    [[nodiscard]] static int ReadWhiteList(const std::string& file, Strings& names, Strings& exts);

private:
    std::mutex m_mutex;
    std::unique_ptr<BlackListRules> m_black;  // guarded by m_mutex, as is m_white
    std::unique_ptr<WhiteListRules> m_white;
};
