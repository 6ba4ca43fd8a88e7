#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "completion-fixture.h"

using testing::HasSubstr;

namespace {

const std::string CLEAR = "\x15";  // the key that empties the line

class ZshCompletionTest : public testing::Test, protected CompletionFixture {
protected:
    void SetUp() override {
        if (!HasProgram("zsh")) GTEST_SKIP() << "zsh is not installed";
    }

    // A shell that has loaded the script, and stands in the folder with files.
    [[nodiscard]] std::unique_ptr<TerminalShell> Start() const {
        auto shell = std::make_unique<TerminalShell>(std::vector<std::string>{"zsh", "-f", "-i"},
                                                     Environment());
        shell->Type("PS1='READY> '; fpath=(" + (m_folder / "zsh") + " $fpath); cd " +
                    (m_folder / "files") + "; autoload -Uz compinit; compinit -u -D; echo O''K\n");
        shell->WaitFor("OK\r");
        return shell;
    }

    [[nodiscard]] static std::string CalledAfter(TerminalShell& shell, const std::string& keys) {
        shell.Type(keys + "\n");
        shell.WaitFor("CALLED");
        return shell.WaitFor(">.");
    }
};

}  // namespace

TEST_F(ZshCompletionTest, TheScriptIsWellFormed) {
    const ShellResult result = RunShell("zsh -n " + (m_folder / "zsh/_demo-ctl"));
    EXPECT_EQ(0, result.status);
    EXPECT_EQ("", result.output);
}

TEST_F(ZshCompletionTest, TheCompletionSystemFindsAndLoadsIt) {
    const ShellResult result =
        RunShell("HOME=" + m_folder.Path() + " zsh -f -c 'fpath=(" + (m_folder / "zsh") +
                 " $fpath); autoload -Uz compinit; compinit -u -D; print $_comps[demo-ctl]; "
                 "autoload +X _demo-ctl && print loaded' ");
    EXPECT_EQ("_demo-ctl\nloaded\n", result.output);
}

TEST_F(ZshCompletionTest, APersonsKeysBecomeACommand) {
    const auto shell = Start();
    EXPECT_EQ("<service><start>.", CalledAfter(*shell, "demo-ctl serv\tstar\t"));
    EXPECT_EQ("<send><a><--type=two>.", CalledAfter(*shell, "demo-ctl send a --type=t\t"));
    EXPECT_EQ("<send><a><--type><two>.", CalledAfter(*shell, "demo-ctl send a --type t\t"));
    EXPECT_EQ("<task><set><3><--strategy=mirror>.",
              CalledAfter(*shell, "demo-ctl task set 3 --strat\tm\t"));
    EXPECT_EQ("<task><run><41>.", CalledAfter(*shell, "demo-ctl ta\tr\t4\t"));
    EXPECT_EQ("<service><move><a picture.jpg>.", CalledAfter(*shell, "demo-ctl service move a\t"));
    EXPECT_EQ("<service><move><volume2>.", CalledAfter(*shell, "demo-ctl service move vol\t"));
    EXPECT_EQ("<send><a><file=a picture.jpg>.", CalledAfter(*shell, "demo-ctl send a file=a\t"));
    EXPECT_EQ("<service><start>.", CalledAfter(*shell, "../bin/demo-ctl serv\tstar\t"));
}

TEST_F(ZshCompletionTest, OffersComeWithTheirDescriptions) {
    const auto shell = Start();
    shell->Type("demo-ctl service st\t");
    EXPECT_THAT(shell->WaitFor("Stops the service."), HasSubstr("Starts the service."));
    shell->Type(CLEAR + "demo-ctl task run \t");
    EXPECT_THAT(shell->WaitFor("Two words"), HasSubstr("Camera"));
    shell->Type(CLEAR + "demo-ctl service status -\t");
    EXPECT_THAT(shell->WaitFor("Write JSON, for scripts"), HasSubstr("--json"));
}

TEST_F(ZshCompletionTest, TasksThatCannotBeListedAreSilent) {
    WriteProgram("demo-ctl",
                 "if [ \"$2\" = list ]; then echo COMPLAINT; echo COMPLAINT >&2; exit 3; "
                 "fi\nprintf 'CALLED'; printf '<%s>' \"$@\"; echo .\n");
    const auto shell = Start();
    shell->Type("demo-ctl task run \t7\n");
    EXPECT_THAT(shell->WaitFor("CALLED"), testing::Not(HasSubstr("COMPLAINT")));
    EXPECT_EQ("<task><run><7>.", shell->WaitFor(">."));
}
