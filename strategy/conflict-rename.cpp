#include "strategy/conflict-rename.h"

#include <cstdio>
#include <ctime>
#include <string_view>

#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr int LAST_NUMBER = 99;

// "_PRODUCT_TIME_REASON". Two conflicts of one minute get the same, and a number after it.
std::string MakeSuffix(const char* product, const char* reason) {
    const time_t now = time(nullptr);
    struct tm local {};
    localtime_r(&now, &local);
    char when[64] = "";
    strftime(when, sizeof(when), "%b-%d-%H%M-%Y", &local);
    char suffix[1024];
    std::snprintf(suffix, sizeof(suffix), "_%s_%s_%s", product, when, reason);
    return suffix;
}

// Where the suffix goes: before the dot of the extension, or at the end of a path without one. A
// name that starts with its only dot is all extension.
size_t SuffixPosition(const std::string& path) {
    const size_t slash = path.find_last_of("/\\");
    const size_t dot = path.rfind('.');
    if (slash == std::string::npos || dot == std::string::npos || dot < slash ||
        dot + 1 == path.size()) {
        return path.size();
    }
    return dot;
}

// `path` with the suffix put in, with the first number from `first_number` on that gives a free
// name. After the last number the name is given back whether it is free or not.
std::string FindFreeName(const std::string& path, const std::string& suffix, int first_number) {
    const size_t position = SuffixPosition(path);
    std::string name = path;
    name.insert(position, suffix);
    for (int n = first_number; n <= LAST_NUMBER && FSExists(name); ++n) {
        name = path;
        name.insert(position, suffix + "_" + std::to_string(n));
    }
    return name;
}

}  // namespace

int ConflictRename(const std::string& path, const char* product, const char* reason) {
    const std::string to = FindFreeName(path, MakeSuffix(product, reason), 1);
    const int result = FSRename(path, to);
    if (result == 0) {
        SLOG_INFO("ConflictRename from [%s] to [%s], reason = [%s].", path.c_str(), to.c_str(),
                  reason);
    } else {
        SLOG_ERR("ConflictRename failed. From:[%s] To:[%s] err = [%d]", path.c_str(), to.c_str(),
                 result);
    }
    return result;
}

int WhiteSpaceConflictRename(const std::string& path, const std::string& name,
                             const char* product) {
    const size_t length = name.find_last_not_of(" \t") + 1;
    const std::string stripped = length == 0 ? name + "(empty string)" : name.substr(0, length);
    const std::string target = PathDirName(path) + "/" + stripped;
    if (!FSExists(target) && FSRename(path, target) == 0) {
        SLOG_INFO("WhiteSpaceConflictRename from [%s] to [%s].", path.c_str(), target.c_str());
        return 0;
    }
    const std::string to = FindFreeName(target, MakeSuffix(product, "WhiteSpaceConflict"), 0);
    const int result = FSRename(path, to);
    if (result == 0) {
        SLOG_INFO("WhiteSpaceConflictRename from [%s] to [%s].", path.c_str(), to.c_str());
    } else {
        SLOG_ERR("WhiteSpaceConflictRename failed. From:[%s] To:[%s] err=[%d]", path.c_str(),
                 to.c_str(), result);
    }
    return result;
}
