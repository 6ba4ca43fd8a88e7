// Makes and measures folders that are too deep for one path.
#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <string>

#include "utils/unique-fd.h"

// Makes `depth` folders called `name` below `path`, one in the other, with a file "f" in the last
// one or, when asked, in each.
inline void MakeDeepTree(const std::string& path, int depth, const std::string& name,
                         bool has_file_in_each = false) {
    UniqueFd fd(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    for (int i = 0; i < depth; ++i) {
        ASSERT_EQ(0, mkdirat(fd.Get(), name.c_str(), 0777)) << i;
        fd = UniqueFd(openat(fd.Get(), name.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
        ASSERT_TRUE(fd.IsValid()) << i;
        if (!has_file_in_each && i + 1 < depth) continue;
        ASSERT_TRUE(
            UniqueFd(openat(fd.Get(), "f", O_WRONLY | O_CREAT | O_CLOEXEC, 0666)).IsValid());
    }
}

// How many folders called `name` stand one in the other below `path`.
inline int DepthOf(const std::string& path, const std::string& name) {
    UniqueFd fd(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    int depth = -1;
    for (; fd.IsValid(); ++depth) {
        fd = UniqueFd(openat(fd.Get(), name.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    }
    return depth;
}

inline std::string DeepPath(const std::string& path, int depth, const std::string& name) {
    std::string deep = path;
    for (int i = 0; i < depth; ++i) deep += "/" + name;
    return deep;
}
