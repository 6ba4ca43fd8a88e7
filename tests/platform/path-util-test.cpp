#include "utils/path-util.h"

#include <gtest/gtest.h>

namespace {

TEST(PathUtil, ATrailingSlashIsAddedUnlessItIsThere) {
    EXPECT_EQ("/", PathAddTrailingSlash(""));
    EXPECT_EQ("/", PathAddTrailingSlash("/"));
    EXPECT_EQ("/a/", PathAddTrailingSlash("/a"));
    EXPECT_EQ("/a/", PathAddTrailingSlash("/a/"));
}

TEST(PathUtil, TrailingSlashesAreTakenAway) {
    EXPECT_EQ("", PathWithoutTrailingSlashes(""));
    EXPECT_EQ("", PathWithoutTrailingSlashes("//"));
    EXPECT_EQ("/a", PathWithoutTrailingSlashes("/a"));
    EXPECT_EQ("/a/b", PathWithoutTrailingSlashes("/a/b//"));
}

struct Case {
    const char* path;
    const char* dir_name;
    const char* base_name;
    const char* extension;
    const char* stem;
};

const Case kCases[] = {
    {"/a/b.txt",       "/a",   "b.txt",       "txt",  "/a/b"       },
    {"/a",             "/",    "a",           "",     "/a"         },
    {"/",              "/",    "",            "",     "/"          },
    {"",               ".",    "",            "",     ""           },
    {"a",              ".",    "a",           "",     "a"          },
    {"a/b",            "a",    "b",           "",     "a/b"        },
    {"a/",             "a",    "",            "",     "a/"         },
    {"//a",            "/",    "a",           "",     "//a"        },
    {"/a/.profile",    "/a",   ".profile",    "",     "/a/.profile"},
    {"/a/.profile.gz", "/a",   ".profile.gz", "gz",   "/a/.profile"},
    {"/a/x.tar.gz",    "/a",   "x.tar.gz",    "gz",   "/a/x.tar"   },
    {"/a.d/b",         "/a.d", "b",           "",     "/a.d/b"     },
    {"/a/b.",          "/a",   "b.",          "",     "/a/b."      },
    {"/a/..",          "/a",   "..",          "",     "/a/.."      },
    {"/a/b\n.\xff",    "/a",   "b\n.\xff",    "\xff", "/a/b\n"     },
};

TEST(PathUtil, PathsAreTakenApart) {
    for (const Case& c : kCases) {
        EXPECT_EQ(c.dir_name, PathDirName(c.path)) << c.path;
        EXPECT_EQ(c.base_name, PathBaseName(c.path)) << c.path;
        EXPECT_EQ(c.extension, PathExtension(c.path)) << c.path;
        EXPECT_EQ(c.stem, PathStem(c.path)) << c.path;
    }
}

}  // namespace
