#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "client/ctl.h"
#include "client/notifier.h"
#include "demo-program.h"
#include "manual/command-tree.h"
#include "manual/completion.h"
#include "manual/man-page.h"
#include "manual/page-texts.h"
#include "manual/roff.h"
#include "shell.h"
#include "support/temp-dir.h"

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

namespace {

using Texts = std::vector<std::string>;

const OptionInfo* FindOption(const CommandInfo& command, const std::string& label) {
    for (const OptionInfo& option : command.options) {
        if (option.label == label) return &option;
    }
    return nullptr;
}

// In one line: a page breaks lines where it likes.
std::string OneLine(const std::string& text) {
    std::string line;
    for (const char c : text) {
        const bool is_blank = c == ' ' || c == '\n';
        if (!is_blank) line += c;
        if (is_blank && !line.empty() && line.back() != ' ') line += ' ';
    }
    return line;
}

// The page as it is shown, in plain characters.
std::string Shown(const std::string& page) {
    const TempDir folder;
    const std::string file = folder.Write("page", page);
    const ShellResult shown = RunShell("groff -man -Tascii -P-c -P-b -P-u -P-o -rLL=300n " + file);
    EXPECT_EQ(0, shown.status) << shown.output;
    return OneLine(shown.output);
}

// Every word about the command that "--help" would print has to stand on the page.
void ExpectOnPage(const CommandInfo& command, const std::string& shown) {
    EXPECT_THAT(shown, HasSubstr(OneLine(command.path)));
    // Behind the page's name it stands with a small letter and without a full stop.
    const std::string description = OneLine(command.description);
    EXPECT_THAT(shown, HasSubstr(description.substr(1, description.size() - 2)));
    for (const std::string& line : command.examples) {
        EXPECT_THAT(shown, HasSubstr(OneLine(line))) << command.path;
    }
    const auto expect_option = [&](const OptionInfo& option) {
        for (const std::string& name : option.names) {
            EXPECT_THAT(shown, HasSubstr(name)) << command.path;
        }
        EXPECT_THAT(shown, HasSubstr(option.value_name)) << command.path;
        EXPECT_THAT(shown, HasSubstr(OneLine(option.description))) << command.path;
        for (const std::string& value : option.values) {
            EXPECT_THAT(shown, HasSubstr(value)) << command.path;
        }
    };
    for (const OptionInfo& option : command.options) expect_option(option);
    for (const OptionInfo& argument : command.arguments) expect_option(argument);
    for (const CommandInfo& below : command.commands) ExpectOnPage(below, shown);
}

// The formatter finds nothing to complain about.
void ExpectNoWarnings(const std::string& page) {
    const TempDir folder;
    const std::string file = folder.Write("page", page);
    const ShellResult result = RunShell("groff -man -Tutf8 -ww " + file + " >/dev/null");
    EXPECT_EQ(0, result.status);
    EXPECT_EQ("", result.output);
}

class PageTest : public testing::Test {
protected:
    void SetUp() override {
        if (!HasProgram("groff")) GTEST_SKIP() << "groff is not installed";
    }

    const Ctl m_ctl{DaemonClient(), Terminal(STDOUT_FILENO)};
    const CommandInfo m_ctl_tree = ReadCommandTree(*MakeCtlProgram(m_ctl));
    const CommandInfo m_notifier_tree = ReadCommandTree(*MakeNotifierProgram(m_ctl.daemon));
    DemoProgram m_demo;
    const CommandInfo m_demo_tree = ReadCommandTree(m_demo.app);
};

class CommandTreeTest : public testing::Test {
protected:
    [[nodiscard]] const CommandInfo& At(const Texts& words) const {
        const CommandInfo* command = FindCommand(m_tree, words);
        EXPECT_NE(nullptr, command);
        return *command;
    }

    DemoProgram m_demo;
    const CommandInfo m_tree = ReadCommandTree(m_demo.app);
};

}  // namespace

TEST_F(CommandTreeTest, HoldsTheCommandsInTheirOrderWithoutTheHiddenOnes) {
    Texts paths;
    for (const CommandInfo& command : m_tree.commands) paths.push_back(command.path);
    EXPECT_THAT(paths,
                ElementsAre("demo-ctl service", "demo-ctl task", "demo-ctl send", "demo-ctl odd"));
    EXPECT_EQ("demo-ctl service status", At({"service", "status"}).path);
    EXPECT_EQ(nullptr, FindCommand(m_tree, {"service", "nothing"}));
    EXPECT_EQ(nullptr, FindOption(At({"send"}), "--hidden"));
}

TEST_F(CommandTreeTest, TellsExamplesFromOtherLinesOfTheFooter) {
    EXPECT_THAT(m_tree.notes, ElementsAre("Read the manual first."));
    EXPECT_THAT(m_tree.examples, ElementsAre("demo-ctl service start"));
    EXPECT_THAT(At({"service"}).examples,
                ElementsAre("demo-ctl service start", "demo-ctl service stop"));
}

TEST_F(CommandTreeTest, ReadsWhatAnOptionIs) {
    const CommandInfo& set = At({"task", "set"});
    const OptionInfo* keep = FindOption(set, "--keep");
    ASSERT_NE(nullptr, keep);
    EXPECT_THAT(keep->names, ElementsAre("-k", "--keep"));
    EXPECT_EQ("INT", keep->value_name);
    EXPECT_EQ("7", keep->default_text);
    EXPECT_THAT(keep->rules, ElementsAre("INT in [1 - 99]"));
    EXPECT_THAT(keep->excludes, ElementsAre("--keep-all"));
    EXPECT_THAT(keep->values, IsEmpty());
    EXPECT_FALSE(keep->is_required || keep->is_repeatable || keep->takes_many);

    const OptionInfo* strategy = FindOption(set, "--strategy");
    ASSERT_NE(nullptr, strategy);
    EXPECT_EQ("TEXT", strategy->value_name);
    EXPECT_THAT(strategy->values, ElementsAre("mirror", "version"));
    EXPECT_THAT(strategy->rules, IsEmpty());
    EXPECT_TRUE(strategy->is_required);

    EXPECT_FALSE(FindOption(set, "--keep-all")->HasValue());
    EXPECT_TRUE(FindOption(set, "--skip")->takes_many);
    EXPECT_EQ("HH:MM", FindOption(set, "--at")->value_name);
}

TEST_F(CommandTreeTest, ReadsTheArgumentsInTheirOrder) {
    const CommandInfo& send = At({"send"});
    ASSERT_EQ(2U, send.arguments.size());
    EXPECT_EQ("NAME", send.arguments[0].value_name);
    EXPECT_TRUE(send.arguments[0].is_required);
    EXPECT_THAT(send.arguments[0].names, IsEmpty());
    EXPECT_EQ("KEY=VALUE", send.arguments[1].value_name);
    EXPECT_TRUE(send.arguments[1].takes_many);
    EXPECT_FALSE(send.arguments[1].is_required);
}

TEST_F(CommandTreeTest, ATextInBracesThatTheCheckDoesNotTakeIsNoSet) {
    std::string value;
    CLI::App app("Odd.", "odd");
    app.add_option("--list", value)->check(CLI::IsMember({"a,b", "c"}));
    app.add_option("--none", value)
        ->check(CLI::Validator([](std::string&) { return std::string("never"); }, "{x,y}"));
    const CommandInfo tree = ReadCommandTree(app);
    EXPECT_THAT(FindOption(tree, "--list")->values, IsEmpty()) << "a value with a comma";
    EXPECT_THAT(FindOption(tree, "--none")->values, IsEmpty());
}

TEST_F(CommandTreeTest, OptionsOfAGroupBelongToTheCommand) {
    std::string value;
    CLI::App app("Odd.", "odd");
    app.add_option_group("Those")->add_option("--inner", value, "In a group");
    const CommandInfo tree = ReadCommandTree(app);
    EXPECT_THAT(tree.commands, IsEmpty());
    EXPECT_NE(nullptr, FindOption(tree, "--inner"));
}

TEST(RoffTest, NothingIsTakenAsAnOrder) {
    EXPECT_EQ("\\&.TP", RoffText(".TP"));
    EXPECT_EQ("a.b\n\\&.c", RoffText("a.b\n.c"));
    EXPECT_EQ("\\(aqbr", RoffText("'br"));
    EXPECT_EQ("\\(rsfB\\(rs(rs", RoffText("\\fB\\(rs"));
    EXPECT_EQ("\\(dqx\\(dq", RoffText("\"x\""));
    EXPECT_EQ("\\-\\-json", RoffText("--json"));
    EXPECT_EQ("\\(ga\\(ha\\(ti", RoffText("`^~"));
    EXPECT_EQ("caf\\[u00E9]\\[u1F4F7]", RoffText("café📷"));
    EXPECT_EQ("\\[uFFFD]", RoffText("\xFF"));
    EXPECT_EQ("", RoffBold(""));
    EXPECT_EQ("\\fB\\-x\\fR", RoffBold("-x"));
}

TEST_F(PageTest, EverythingThatFerrixctlUnderstandsStandsOnItsPage) {
    const std::string page = PageText(CtlPage(), m_ctl_tree);
    const std::string shown = Shown(page);
    ExpectOnPage(m_ctl_tree, shown);
    EXPECT_THAT(shown, HasSubstr("NO_COLOR"));
    ExpectNoWarnings(page);
}

TEST_F(PageTest, EverythingThatTheNotifierUnderstandsStandsOnItsPage) {
    const std::string page = PageText(NotifierPage(), m_notifier_tree);
    const std::string shown = Shown(page);
    ExpectOnPage(m_notifier_tree, shown);
    ExpectNoWarnings(page);
    EXPECT_THAT(shown, HasSubstr("ferrix-notifier --execute-task ID "
                                 "ferrix-notifier --hook NAME --type TYPE [KEY=VALUE...] "
                                 "ferrix-notifier --help"));
}

TEST_F(PageTest, TheDaemonsPageTellsItsFilesAndSignals) {
    const std::string page = PageText(DaemonPage());
    const std::string shown = Shown(page);
    for (const char* text :
         {"NAME ferrixd - copies", "SYNOPSIS ferrixd ", "SIGTERM, SIGINT", "EXIT STATUS",
          "/tmp/ferrix-socket", "/var/run/ferrixd.pid", "/var/packages/Ferrix/etc/setting.conf",
          "/volumeN/@Ferrix", "/etc/keld/host.conf", "ferrixctl(1), ferrix-notifier(1)"}) {
        EXPECT_THAT(shown, HasSubstr(text));
    }
    ExpectNoWarnings(page);
}

TEST_F(PageTest, ThePartsStandInTheUsualOrder) {
    const std::string page = PageText(CtlPage(), m_ctl_tree);
    size_t last = 0;
    for (const char* part : {"NAME", "SYNOPSIS", "DESCRIPTION", "OPTIONS", "COMMANDS",
                             "EXIT STATUS", "ENVIRONMENT", "FILES", "SEE ALSO"}) {
        const size_t at = page.find(std::string("\n.SH ") + part + "\n");
        ASSERT_NE(std::string::npos, at) << part;
        EXPECT_LT(last, at) << part;
        last = at;
    }
}

TEST_F(PageTest, TextsThatLookLikeOrdersAreShownAsTheyStand) {
    const std::string page = PageText({"demo-ctl", 1, "", {}, {}, {}, {}}, m_demo_tree);
    ExpectNoWarnings(page);
    const std::string shown = Shown(page);
    EXPECT_THAT(shown, HasSubstr(".B is no order, nor is 'this'; C:\\new\\fBfat `x` $HOME "
                                 "\"quoted\" ~ ^ caf"));
    EXPECT_THAT(shown,
                HasSubstr("demo-ctl odd '.*' \\ --back-slash \"C:\\temp\" .TP 'quoted first'"));
    EXPECT_THAT(shown, HasSubstr("--back-slash TEXT A \\ and a '"));
    EXPECT_THAT(shown, HasSubstr("demo-ctl - does what it is told"));
}

TEST_F(PageTest, WhatTheParserChecksIsTold) {
    const std::string shown = Shown(PageText({"demo-ctl", 1, "", {}, {}, {}, {}}, m_demo_tree));
    EXPECT_THAT(shown, HasSubstr("-k, --keep INT How many are kept. Checked: INT in [1 - 99]. "
                                 "Without it: 7. Not together with --keep-all."));
    EXPECT_THAT(shown, HasSubstr("--strategy TEXT How to copy. One of mirror, version."));
    EXPECT_THAT(shown, HasSubstr("--skip NAME,... What is not copied"));
    EXPECT_THAT(shown, HasSubstr("demo-ctl task set [OPTION]... --strategy TEXT TASK "));
    EXPECT_THAT(shown, HasSubstr("demo-ctl send [--type TEXT] NAME [KEY=VALUE...] "));
    EXPECT_THAT(shown, Not(HasSubstr("secret")));
    EXPECT_THAT(shown, Not(HasSubstr("--hidden")));
}

TEST(FerrixctlCompletionTest, TheScriptsOfTheRealCommandsWork) {
    if (!HasProgram("bash") || !HasProgram("zsh")) GTEST_SKIP() << "bash or zsh is not installed";
    const Ctl ctl{DaemonClient(), Terminal(STDOUT_FILENO)};
    const CommandInfo tree = ReadCommandTree(*MakeCtlProgram(ctl));
    EXPECT_TRUE(CanListTasks(tree));
    const TempDir folder;
    const std::string zsh_script = folder.Write("_ferrixctl", ZshCompletion(tree));
    EXPECT_EQ("", RunShell("zsh -n " + zsh_script).output);
    const std::string ask =
        folder.Write("ask", BashCompletion(tree) +
                                "COMP_WORDS=(ferrixctl task add --strategy ''); COMP_CWORD=4\n"
                                "_ferrixctl; echo \"${COMPREPLY[@]}\"\n"
                                "COMP_WORDS=(ferrixctl service st); COMP_CWORD=2\n"
                                "_ferrixctl; echo \"${COMPREPLY[@]}\"\n");
    EXPECT_EQ("incremental mirror version\nstart stop status\n",
              RunShell("bash --noprofile --norc " + ask).output);
}
