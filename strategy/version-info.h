// One version folder as rotation sees it, and one rule of the conditional policy.
#pragma once

#include <cstdint>
#include <string>

struct VersionInfo {
    std::string path;  // full path of the folder
    uint32_t timestamp = 0;
    bool reserve = false;  // stays, whatever the count
    bool is_bad = false;   // the name ends in ".Bad"
};

struct RotationBucket {
    uint32_t range = 0;     // seconds back from the present
    uint32_t interval = 0;  // seconds
    uint64_t count = 0;     // versions kept in each interval
};
