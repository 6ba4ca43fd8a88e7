// The plain records that filter files are read into and written from.
//
// An empty string stands for one that is not set: a filter file cannot hold an empty value.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

// A growing list of strings, in the order they were added; repeated values are kept.
class StringList {
public:
    explicit StringList(size_t first_capacity = 4) : m_first_capacity(first_capacity) {}

    // A full list doubles.
    void Add(std::string value);
    void Clear();
    [[nodiscard]] size_t Count() const { return m_items.size(); }
    [[nodiscard]] size_t Capacity() const { return m_items.capacity(); }
    [[nodiscard]] const std::vector<std::string>& Items() const { return m_items; }

private:
    std::vector<std::string> m_items;
    size_t m_first_capacity;
};

struct WhiteFilter {
    int32_t major = 0;
    int32_t minor = 0;
    struct {
        StringList white_name;
    } common;
    struct {
        StringList white_ext;
    } file;
};

struct BlackFilter {
    int32_t major = 0;
    int32_t minor = 0;
    struct {
        std::string black_char;
        StringList black_name;
        StringList black_suffix;
        StringList black_prefix;
        StringList black_dir_prefix;
        uint64_t max_length = 0;
        uint64_t max_path = 0;
        uint64_t max_dst_path = 0;
    } common;
    struct {
        std::string black_char;
        StringList black_prefix;
        StringList black_suffix;
        StringList black_glob;
        StringList black_ext;
        StringList black_name;
        uint64_t max_size = 0;
    } file;
    // These lists are short as a rule: they start with room for two.
    struct {
        std::string black_char;
        StringList black_name{2};
        StringList black_prefix{2};
        StringList black_suffix{2};
        StringList black_glob{2};
    } directory;
};
