#include "client/shell-word.h"

#include <gtest/gtest.h>

#include <fstream>

#include "client/shell.h"
#include "support/temp-dir.h"

namespace {

// What a shell makes of the word, byte for byte.
std::string ReadBy(const std::string& shell, const std::string& word) {
    const TempDir dir;
    const std::string script = dir.Write("script", "printf %s " + word + " > " + (dir / "out"));
    EXPECT_EQ(0, RunShell(shell + " " + script).status) << word;
    return ReadWholeFile(dir / "out");
}

const std::string NAMES[] = {
    "photos",
    "two words",
    "it's",
    "x' && echo pwned '",
    "$HOME `id` $(id) \"quoted\" \\ back\\x41",
    "*?[a]~!#;|&<>(){}",
    "-n",
    "",
    std::string("\xff") + "abc\x80",
    "line\nbreak\tand \033[31mred",
    std::string("it's \xe2\x80\xae turned \xff") + "0",
    std::string("Gr\xc3\xbc\xc3\x9f") + "e",
};

}  // namespace

TEST(ShellWordTest, ABareWordStaysAsItIs) {
    EXPECT_EQ("share_name=photos/2026-11.d", ShellWord("share_name=photos/2026-11.d"));
    EXPECT_EQ("'two words'", ShellWord("two words"));
}

TEST(ShellWordTest, BashReadsTheNameAgain) {
    ASSERT_TRUE(HasProgram("bash"));
    for (const std::string& name : NAMES) EXPECT_EQ(name, ReadBy("bash", ShellWord(name)));
}

TEST(ShellWordTest, ZshReadsTheNameAgain) {
    if (!HasProgram("zsh")) GTEST_SKIP() << "no zsh";
    for (const std::string& name : NAMES) EXPECT_EQ(name, ReadBy("zsh -f", ShellWord(name)));
}

TEST(ShellWordTest, ATerminalCanShowIt) {
    for (const std::string& name : NAMES) {
        EXPECT_EQ(std::string::npos, ShellWord(name).find_first_of("\033\n\t\xff")) << name;
    }
}
