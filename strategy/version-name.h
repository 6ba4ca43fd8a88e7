// The names of version folders, which are the local time of the start of the run:
// "Ferrix Copy_2024-03-09_141502", and the same with ".Bad" for a version that is not whole.
// Threads: any. The time zone is that of the process (TZ).
#pragma once

#include <cstdint>
#include <ctime>
#include <optional>
#include <string>

inline constexpr char BAD_VERSION_SUFFIX[] = ".Bad";

struct VersionName {
    tm fields{};  // the local time as the name tells it
    bool is_bad = false;
};

// The name of the folder of a run that starts at that time. 0, or -1 when it cannot be told.
[[nodiscard]] int NameVersion(time_t start, std::string& name);

// Nothing unless strptime(3) takes the whole name. That is generous: "Ferrix Copy_2024-3-9_141502"
// counts too, and a 31st of February is one of the first days of March.
[[nodiscard]] std::optional<VersionName> ParseVersionName(const std::string& name);

// The seconds since the epoch at which the local time of the name was. A time that the clock showed
// twice, when summer time ended, is the later of the two that is not after `now`; one that it never
// showed is what mktime(3) makes of it.
[[nodiscard]] int64_t VersionTime(const VersionName& name, int64_t now);

// Where a version that is not whole goes: the path with ".Bad", or, if something stands there, with
// the time of the next second that is free.
[[nodiscard]] std::string BadVersionPath(const std::string& path);
