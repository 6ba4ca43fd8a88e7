// Which sections and keys a filter file may hold, and where in a record each value goes.
#pragma once

#include <cstddef>

// Written out: they are part of the format's description.
enum FilterKeyType : int {
    FILTER_KEY_INT32 = 0,
    FILTER_KEY_UINT64 = 1,
    FILTER_KEY_STRING = 2,  // std::string
    FILTER_KEY_LIST = 3,    // StringList
};

struct FilterKey {
    const char* name;
    FilterKeyType type;
    size_t offset;  // in the section's part of the record
};

struct FilterSection {
    static constexpr size_t MAX_KEYS = 64;

    const char* name;
    size_t offset;  // in the record
    size_t key_count;
    FilterKey keys[MAX_KEYS];  // keys with the same offset are aliases
};

struct FilterSchema {
    static constexpr size_t MAX_SECTIONS = 32;

    int major;
    int minor;
    size_t section_count;
    FilterSection sections[MAX_SECTIONS];
};

extern const FilterSchema white_list_schema;         // for a WhiteFilter
extern const FilterSchema black_list_filter_schema;  // for a BlackFilter
