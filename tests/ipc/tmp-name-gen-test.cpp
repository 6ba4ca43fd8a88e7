#include "ipc/tmp-name-gen.h"

#include <gtest/gtest.h>

#include <set>
#include <string>
#include <thread>
#include <vector>

namespace {

constexpr char kAlphabet[] = "0123456789abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ-_";

bool IsName(const std::string& name) {
    return name.size() == 8 && name.find_first_not_of(kAlphabet) == std::string::npos;
}

// Computed with another implementation of RC4: 256 bytes of key, the seed and then zeros, six bytes
// for each name with the counters begun anew.
TEST(TmpNameGen, NamesOfASeedAreThese) {
    TmpNameGen names("1714556400-123456");
    for (const char* expected : {"YWr7S7jA", "ovHu0bxB", "R3KiMIrY"})
        EXPECT_EQ(expected, names.NewName());
    TmpNameGen others("x");
    for (const char* expected : {"KeYEeLp9", "qO2lCJKs", "FSmUoQJr"})
        EXPECT_EQ(expected, others.NewName());
}

TEST(TmpNameGen, OfALongSeedOnlyTheFirst255BytesCount) {
    TmpNameGen first(std::string(255, 's'));
    TmpNameGen second(std::string(255, 's') + "more");
    EXPECT_EQ(first.NewName(), second.NewName());
    TmpNameGen third(std::string(254, 's'));
    EXPECT_NE(first.NewName(), third.NewName());
}

TEST(TmpNameGen, WithoutASeedARandomOneIsMade) {
    TmpNameGen none("");
    TmpNameGen zero(std::string(256, '\0'));
    EXPECT_TRUE(IsName(none.NewName()));
    EXPECT_TRUE(IsName(zero.NewName()));
    // A key of zeros only would give this.
    EXPECT_NE("Txy9gqcT", TmpNameGen("").NewName());
}

TEST(TmpNameGen, NamesAreHardlyEverAlike) {
    TmpNameGen names("seed");
    std::set<std::string> seen;
    for (int i = 0; i < 100000; ++i) {
        const std::string name = names.NewName();
        ASSERT_TRUE(IsName(name)) << name;
        seen.insert(name);
    }
    EXPECT_EQ(100000U, seen.size());
}

TEST(TmpNameGen, APathIsTheFolderASlashAndTheName) {
    TmpNameGen names("x");
    TmpNameGen twin("x");
    EXPECT_EQ("/some/folder/" + twin.NewName(), names.NewPath("/some/folder"));
    EXPECT_EQ("/" + twin.NewName(), names.NewPath(""));
}

TEST(TmpNameGen, TheProcessHasOne) {
    EXPECT_EQ(&TmpNameGen::Instance(), &TmpNameGen::Instance());
    EXPECT_NE(TmpNameGen::Instance().NewName(), TmpNameGen::Instance().NewName());
}

TEST(TmpNameGen, ThreadsGetNamesOfTheirOwn) {
    TmpNameGen names("shared");
    std::vector<std::vector<std::string>> got(4);
    std::vector<std::thread> threads;
    threads.reserve(got.size());
    for (auto& list : got) {
        threads.emplace_back([&names, &list] {
            for (int i = 0; i < 2000; ++i) list.push_back(names.NewName());
        });
    }
    for (std::thread& thread : threads) thread.join();
    // Together they are what one thread would have got.
    std::multiset<std::string> together;
    for (const auto& list : got) together.insert(list.begin(), list.end());
    TmpNameGen twin("shared");
    std::multiset<std::string> expected;
    for (int i = 0; i < 8000; ++i) expected.insert(twin.NewName());
    EXPECT_EQ(expected, together);
}

TEST(FSMakeTempName, GivesANewNameInTheFolder) {
    std::string first;
    std::string second;
    ASSERT_EQ(0, FSMakeTempName("/no/such folder", first));
    ASSERT_EQ(0, FSMakeTempName("/no/such folder", second));
    EXPECT_EQ("/no/such folder/", first.substr(0, 16));
    EXPECT_TRUE(IsName(first.substr(16)));
    EXPECT_NE(first, second);
}

TEST(FSMakeTempName, AnEmptyFolderIsRefused) {
    std::string out = "as before";
    EXPECT_EQ(-1, FSMakeTempName("", out));
    EXPECT_EQ("as before", out);
}

}  // namespace
