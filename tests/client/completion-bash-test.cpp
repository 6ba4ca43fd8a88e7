#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "completion-fixture.h"

using testing::HasSubstr;

namespace {

class BashCompletionTest : public testing::Test, protected CompletionFixture {
protected:
    void SetUp() override {
        if (!HasProgram("bash")) GTEST_SKIP() << "bash is not installed";
    }

    // What is offered for the last of the words, which are those that bash makes of a line; "files"
    // when that is left to bash. Anything else that is printed is in it too.
    [[nodiscard]] std::string Offered(const std::vector<std::string>& words) const {
        std::string script = "export PATH=" + ShellQuoted(m_folder / "bin") +
                             ":$PATH\n"
                             "set -u\n"
                             "compopt() { echo files; }\n"
                             "source " +
                             ShellQuoted(m_folder / "bash-script") +
                             "\n"
                             "COMP_WORDS=(";
        for (const std::string& word : words) script += ShellQuoted(word) + " ";
        script += ")\nCOMP_CWORD=" + std::to_string(words.size() - 1) + "\n" +
                  "_demo_ctl\n"
                  "printf '%s\\n' \"${COMPREPLY[@]}\"\n";
        const std::string file = m_folder.Write("ask", script);
        const ShellResult result = RunShell("bash --noprofile --norc " + ShellQuoted(file));
        EXPECT_EQ(0, result.status) << result.output;
        std::string offered = result.output;
        for (char& c : offered) {
            if (c == '\n') c = ' ';
        }
        while (offered.ends_with(' ')) offered.pop_back();
        return offered;
    }
};

}  // namespace

TEST_F(BashCompletionTest, OffersTheCommandsOfEachLevel) {
    EXPECT_EQ("service task send odd", Offered({"demo-ctl", ""}));
    EXPECT_EQ("service send", Offered({"demo-ctl", "se"}));
    EXPECT_EQ("start stop status move", Offered({"demo-ctl", "service", ""}));
    EXPECT_EQ("start stop status", Offered({"demo-ctl", "service", "st"}));
    EXPECT_EQ("start stop status", Offered({"/opt/bin/demo-ctl", "service", "st"}));
    EXPECT_EQ("", Offered({"demo-ctl", "service", "x"}));
    EXPECT_EQ("", Offered({"demo-ctl", "service", "start", ""}));
}

TEST_F(BashCompletionTest, OffersTheOptionsOfTheCommand) {
    EXPECT_EQ("-h --help", Offered({"demo-ctl", "-"}));
    EXPECT_EQ("-h --help --json", Offered({"demo-ctl", "service", "status", "-"}));
    EXPECT_EQ("--json", Offered({"demo-ctl", "service", "status", "--j"}));
    EXPECT_EQ("--keep --keep-all", Offered({"demo-ctl", "task", "set", "3", "--k"}));
    EXPECT_EQ("--strategy --skip",
              Offered({"demo-ctl", "task", "set", "--keep-all", "--at", "12", ":", "30", "--s"}));
}

TEST_F(BashCompletionTest, OffersTheValuesOfAnOption) {
    EXPECT_EQ("one two", Offered({"demo-ctl", "send", "--type", ""}));
    EXPECT_EQ("two", Offered({"demo-ctl", "send", "a", "b", "=", "c", "--type", "t"}));
    EXPECT_EQ("mirror", Offered({"demo-ctl", "task", "set", "3", "--strategy", "m"}));
    EXPECT_EQ("", Offered({"demo-ctl", "task", "set", "3", "-k", ""})) << "a number";
    EXPECT_EQ("files", Offered({"demo-ctl", "odd", "--back-slash", ""}));
}

TEST_F(BashCompletionTest, AValueMayStandBehindAnEqualsSign) {
    EXPECT_EQ("one two", Offered({"demo-ctl", "send", "--type", "="}));
    EXPECT_EQ("one two", Offered({"demo-ctl", "send", "--type", "=", ""}));
    EXPECT_EQ("two", Offered({"demo-ctl", "send", "--type", "=", "t"}));
    EXPECT_EQ("--type=two", Offered({"demo-ctl", "send", "--type=t"}))
        << "where the sign does not part words";
    EXPECT_EQ("files", Offered({"demo-ctl", "send", "--type", "=", "one", ""}));
    EXPECT_EQ("files", Offered({"demo-ctl", "send", "--type=one", ""}));
}

TEST_F(BashCompletionTest, AnOptionOfManyValuesGoesOnUntilTheNextOption) {
    EXPECT_EQ("mon tue", Offered({"demo-ctl", "task", "set", "--on", "mon", ""}));
    EXPECT_EQ("tue", Offered({"demo-ctl", "task", "set", "--on", "mon", "t"}));
    EXPECT_EQ("--strategy --skip", Offered({"demo-ctl", "task", "set", "--on", "mon", "--s"}));
    EXPECT_EQ("3 41", Offered({"demo-ctl", "task", "set", "--on", "mon", "--keep-all", ""}));
}

TEST_F(BashCompletionTest, ArgumentsAreFilesOrTasks) {
    EXPECT_EQ("files", Offered({"demo-ctl", "service", "move", ""}));
    EXPECT_EQ("", Offered({"demo-ctl", "service", "move", "/volume2", ""})) << "takes one only";
    EXPECT_EQ("files", Offered({"demo-ctl", "send", ""}));
    EXPECT_EQ("files", Offered({"demo-ctl", "send", "a", "b", "=", "/c"}));
    EXPECT_EQ("files", Offered({"demo-ctl", "send", "a", "b=c", "d=e", "f"})) << "takes any number";
    EXPECT_EQ("3 41", Offered({"demo-ctl", "task", "run", ""}));
    EXPECT_EQ("41", Offered({"demo-ctl", "task", "run", "4"}));
    EXPECT_EQ("", Offered({"demo-ctl", "task", "run", "3", ""}));
    EXPECT_EQ("3 41", Offered({"demo-ctl", "task", "run", "--", ""}));
    EXPECT_EQ("", Offered({"demo-ctl", "task", "run", "--", "-"})) << "no option any more";
}

TEST_F(BashCompletionTest, TasksThatCannotBeListedAreSilent) {
    WriteProgram("demo-ctl", "echo 'does not answer' >&2; echo 3x; exit 3\n");
    EXPECT_EQ("", Offered({"demo-ctl", "task", "run", ""}));
    EXPECT_EQ("", Offered({"/no/such/demo-ctl", "task", "run", ""}));
    EXPECT_EQ("", Offered({"$(touch x)", "task", "run", ""}));
}

TEST_F(BashCompletionTest, AListThatNeverComesIsNotWaitedFor) {
    WriteProgram("demo-ctl", "exec sleep 300\n");
    EXPECT_EQ("", Offered({"demo-ctl", "task", "run", ""}));
}

TEST_F(BashCompletionTest, NothingInTheWordsIsExpanded) {
    EXPECT_EQ("", Offered({"demo-ctl", "$(touch " + (m_folder / "made") + ")"}));
    EXPECT_EQ("", Offered({"demo-ctl", "send", "--type", "*"}));
    EXPECT_NE(0, access((m_folder / "made").c_str(), F_OK));
}

TEST_F(BashCompletionTest, APersonsKeysBecomeACommand) {
    TerminalShell shell({"bash", "--noprofile", "--norc", "-i"}, Environment());
    shell.Type("PS1='READY> '; cd " + (m_folder / "files") +
               "; source ../bash-script; echo O''K\n");
    shell.WaitFor("OK");
    const auto called_after = [&shell](const std::string& keys) {
        shell.Type(keys + "\n");
        shell.WaitFor("CALLED");
        return shell.WaitFor(">.");
    };
    EXPECT_EQ("<service><start>.", called_after("demo-ctl serv\tstar\t"));
    EXPECT_EQ("<send><a><--type=two>.", called_after("demo-ctl send a --type=t\t"));
    EXPECT_EQ("<task><run><41>.", called_after("demo-ctl ta\tr\t4\t"));
    EXPECT_EQ("<service><move><a picture.jpg>.", called_after("demo-ctl service move a\t"));
    EXPECT_EQ("<service><move><volume2/>.", called_after("demo-ctl service move vol\t"));
    EXPECT_EQ("<send><a><file=a picture.jpg>.", called_after("demo-ctl send a file=a\t"));
    EXPECT_EQ("<service><start>.", called_after("../bin/demo-ctl serv\tstar\t"));
    shell.Type("demo-ctl service st\t\t");
    EXPECT_THAT(shell.WaitFor("stop"), HasSubstr("start"));
}
