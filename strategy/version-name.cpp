#include "strategy/version-name.h"

#include "platform/utility.h"
#include "utils/file-op.h"

namespace {

constexpr char NAME_FORMAT[] = "Ferrix Copy_%F_%H%M%S";
constexpr char BAD_NAME_FORMAT[] = "Ferrix Copy_%F_%H%M%S.Bad";
constexpr int TRIES = 3600;

bool IsParsed(const std::string& name, const char* format, tm& fields) {
    fields = {};
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
    const char* const end = strptime(name.c_str(), format, &fields);
#pragma GCC diagnostic pop
    return end != nullptr && end == name.c_str() + name.size();
}

bool IsSameTime(const tm& left, const tm& right) {
    return left.tm_year == right.tm_year && left.tm_mon == right.tm_mon &&
           left.tm_mday == right.tm_mday && left.tm_hour == right.tm_hour &&
           left.tm_min == right.tm_min && left.tm_sec == right.tm_sec;
}

}  // namespace

std::optional<VersionName> ParseVersionName(const std::string& name) {
    VersionName parsed;
    if (IsParsed(name, NAME_FORMAT, parsed.fields)) return parsed;
    parsed.is_bad = true;
    if (IsParsed(name, BAD_NAME_FORMAT, parsed.fields)) return parsed;
    return std::nullopt;
}

int NameVersion(time_t start, std::string& name) {
    tm local{};
    return localtime_r(&start, &local) == nullptr ? -1 : GetTimeString(local, NAME_FORMAT, name);
}

int64_t VersionTime(const VersionName& name, int64_t now) {
    bool is_found = false;
    int64_t found = 0;
    for (const int is_summer : {0, 1}) {
        tm fields = name.fields;
        fields.tm_isdst = is_summer;
        const time_t seconds = mktime(&fields);
        tm shown{};
        if (localtime_r(&seconds, &shown) == nullptr || !IsSameTime(shown, name.fields)) continue;
        const bool is_better = seconds <= now ? found > now || seconds > found : seconds < found;
        if (!is_found || is_better) found = seconds;
        is_found = true;
    }
    if (is_found) return found;
    tm fields = name.fields;
    fields.tm_isdst = 0;  // a hint would make the result depend on what was asked before
    return mktime(&fields);
}

std::string BadVersionPath(const std::string& path) {
    std::string bad_path = path + BAD_VERSION_SUFFIX;
    if (!FSExists(bad_path)) return bad_path;
    const std::optional<VersionName> name = ParseVersionName(PathBaseName(path));
    if (!name) return bad_path;
    tm fields = name->fields;
    const time_t start = timegm(&fields);
    for (int second = 1; second <= TRIES; ++second) {
        const time_t time = start + second;
        std::string free_name;
        if (gmtime_r(&time, &fields) == nullptr ||
            GetTimeString(fields, BAD_NAME_FORMAT, free_name) < 0) {
            break;
        }
        std::string free_path = PathDirName(path) + "/" + free_name;
        if (!FSExists(free_path)) return free_path;
    }
    return bad_path;
}
