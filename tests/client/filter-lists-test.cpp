#include "client/filter-lists.h"

#include <gtest/gtest.h>

#include "client/exit-status.h"
#include "ipc/pobject.h"

namespace {

using Texts = std::vector<std::string>;

Texts List(const PObject& request, const char* key) {
    EXPECT_TRUE(request[key].IsArray()) << key;
    Texts texts;
    for (const PObject& item : request[key].AsArray()) texts.push_back(item.AsString());
    return texts;
}

}  // namespace

TEST(FilterListsTest, NothingSaidCopiesEverything) {
    PObject request;
    SetFilterLists({}, request);
    EXPECT_EQ(Texts{"*"}, List(request, "white_name"));
    EXPECT_EQ(Texts{"*"}, List(request, "white_ext"));
    for (const char* key : {"black_name", "black_ext", "custom_name", "custom_ext"}) {
        EXPECT_EQ(Texts{}, List(request, key)) << key;
    }
}

TEST(FilterListsTest, OnlyExtensionsLeaveNoNameIn) {
    FilterOptions options;
    options.only_extensions = {"jpg", ".CR2", "*.mov"};
    PObject request;
    SetFilterLists(options, request);
    EXPECT_EQ(Texts{}, List(request, "white_name"));
    EXPECT_EQ((Texts{"jpg", "CR2", "mov"}), List(request, "white_ext"));
    EXPECT_EQ((Texts{"jpg", "CR2", "mov"}), List(request, "custom_ext"));
}

TEST(FilterListsTest, ExcludedNamesAndExtensions) {
    FilterOptions options;
    options.exclude_names = {"private", ".Trash"};
    options.exclude_extensions = {"tmp"};
    options.only_names = {"DCIM"};
    PObject request;
    SetFilterLists(options, request);
    EXPECT_EQ((Texts{"private", ".Trash"}), List(request, "black_name"));
    EXPECT_EQ(Texts{"tmp"}, List(request, "black_ext"));
    EXPECT_EQ(Texts{"DCIM"}, List(request, "white_name"));
    EXPECT_EQ(Texts{}, List(request, "white_ext"));
    EXPECT_EQ((Texts{"private", ".Trash", "DCIM"}), List(request, "custom_name"));
}

TEST(FilterListsTest, APathOrNothingIsRefused) {
    for (const char* name : {"DCIM/100", ""}) {
        FilterOptions options;
        options.exclude_names = {name};
        PObject request;
        EXPECT_THROW(SetFilterLists(options, request), CommandError) << name;
    }
}
