#include "host/run-program.h"

#include <fcntl.h>
#include <keld/error.h>
#include <keld/exec.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <thread>

#include "host-fixture.h"
#include "support/log-capture.h"
#include "utils/unique-fd.h"

using keld_host::Program;
using keld_host::RunFolder;
using keld_host::RunProgram;
using keld_host::StartProgram;

namespace {

class RunProgramTest : public HostFixture {
protected:
    // A shell script of the scratch folder; "DIR/" stands for that folder.
    std::string Script(const std::string& name, std::string body, mode_t mode = 0755) const {
        const std::string mark = "DIR/";
        for (size_t at = body.find(mark); at != std::string::npos; at = body.find(mark, at)) {
            body.replace(at, mark.size(), m_dir.Path() + "/");
            at += m_dir.Path().size();
        }
        const std::string path = m_dir.Write(name, "#!/bin/sh\n" + body + "\n");
        EXPECT_EQ(0, chmod(path.c_str(), mode));
        return path;
    }
    std::string Out() const { return ReadWholeFile(m_dir / "out"); }
    // Waits for a file that a program in the background writes.
    bool Appears(const std::string& name) const {
        for (int i = 0; i < 1000; ++i) {
            if (access((m_dir / name).c_str(), F_OK) == 0) return true;
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        return false;
    }
    // Waits for the end of a process that is init's, which takes it in some time.
    static bool Ends(pid_t pid) {
        const std::string stat = "/proc/" + std::to_string(pid) + "/stat";
        for (int i = 0; i < 500; ++i) {
            const UniqueFd fd(open(stat.c_str(), O_RDONLY | O_CLOEXEC));
            char buffer[256] = "";
            if (!fd.IsValid() || read(fd.Get(), buffer, sizeof(buffer) - 1) <= 0 ||
                std::string(buffer).find(") Z ") != std::string::npos) {
                return true;
            }
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        return false;
    }
};

}  // namespace

TEST_F(RunProgramTest, GivesTheExitStatus) {
    EXPECT_EQ(0, RunProgram({"/bin/true", {}, {}}));
    EXPECT_EQ(1, RunProgram({"/bin/false", {}, {}}));
    EXPECT_EQ(42, RunProgram({
                      "/bin/sh", {"-c",                     "exit 42"},
                       {                        }
    }));
}

TEST_F(RunProgramTest, ArgumentsArePassedAsTheyAreAndNoShellReadsThem) {
    const std::string script = Script("s", "printf '%s|' \"$@\" > DIR/out");
    EXPECT_EQ(0, RunProgram({
                     script, {"a b",     "$(id)", "\"'\n;", "", "\xff%s"},
                      {}
    }));
    EXPECT_EQ("a b|$(id)|\"'\n;||\xff%s|", Out());
}

TEST_F(RunProgramTest, AProgramThatCannotBeStartedTellsWhy) {
    EXPECT_GT(0, RunProgram({m_dir / "none", {}, {}}));
    EXPECT_EQ(ENOENT, errno);
    EXPECT_GT(0, RunProgram({Script("s", "true", 0644), {}, {}}));
    EXPECT_EQ(EACCES, errno);
    EXPECT_GT(0, RunProgram({"/bin/true", {std::string(size_t{1} << 20, 'x')}, {}}));
    EXPECT_EQ(E2BIG, errno);
}

TEST_F(RunProgramTest, AProgramThatASignalEndsIsAFailure) {
    EXPECT_GT(0, RunProgram({
                     "/bin/sh", {"-c",                    "kill -9 $$"},
                      {                       }
    }));
    EXPECT_EQ(ECANCELED, errno);
}

TEST_F(RunProgramTest, AProgramThatTakesTooLongIsKilledWithItsChildren) {
    const std::string script =
        Script("s", "sleep 1000 &\necho $! > DIR/child\ntrap '' TERM INT HUP\nwait\nsleep 1000");
    EXPECT_GT(0, RunProgram({script, {}, {}}, 1000));
    EXPECT_EQ(ETIMEDOUT, errno);
    ASSERT_TRUE(Appears("child"));
    const pid_t child = atoi(ReadWholeFile(m_dir / "child").c_str());
    ASSERT_LT(1, child);
    EXPECT_TRUE(Ends(child));
}

TEST_F(RunProgramTest, AProgramThatIsWaitedForEndsWithItsCaller) {
    const std::string script =
        Script("s", "echo $$ > DIR/tmp; mv DIR/tmp DIR/pid; trap '' TERM INT HUP; exec sleep 1000");
    const pid_t caller = fork();
    if (caller == 0) _exit(RunProgram({script, {}, {}}, 1000000) == 0 ? 0 : 1);
    ASSERT_TRUE(Appears("pid"));
    const pid_t program = atoi(ReadWholeFile(m_dir / "pid").c_str());
    ASSERT_LT(1, program);
    ASSERT_EQ(0, kill(program, 0));
    kill(caller, SIGKILL);
    ASSERT_EQ(caller, waitpid(caller, nullptr, 0));
    EXPECT_TRUE(Ends(program));
    kill(program, SIGKILL);
}

TEST_F(RunProgramTest, AProgramInTheBackgroundOutlivesItsCaller) {
    const std::string script =
        Script("s", "while ! [ -e DIR/go ]; do sleep 0.01; done; echo > DIR/done");
    const pid_t caller = fork();
    if (caller == 0) _exit(StartProgram({script, {}, {}}) == 0 ? 0 : 1);
    int status = -1;
    ASSERT_EQ(caller, waitpid(caller, &status, 0));
    EXPECT_EQ(0, status);
    m_dir.Write("go", "");
    EXPECT_TRUE(Appears("done"));
}

TEST_F(RunProgramTest, AProgramThatLeavesOneInTheBackgroundIsNotWaitedFor) {
    EXPECT_EQ(0,
              RunProgram({Script("s", "sleep 1000 & echo $! > DIR/child; exit 0"), {}, {}}, 20000));
    kill(atoi(ReadWholeFile(m_dir / "child").c_str()), SIGKILL);
}

TEST_F(RunProgramTest, NoDescriptorIsInheritedAndTheStandardOnesAreNull) {
    const int leaked = open("/dev/zero", O_RDONLY);  // on purpose without O_CLOEXEC
    ASSERT_LE(0, leaked);
    const int high = fcntl(leaked, F_DUPFD, 700);
    const std::string script = Script("s", "ls -l /proc/$$/fd > DIR/out");
    EXPECT_EQ(0, RunProgram({script, {}, {}}));
    close(leaked);
    close(high);
    const std::string out = Out();
    EXPECT_EQ(std::string::npos, out.find("/dev/zero")) << out;
    EXPECT_NE(std::string::npos, out.find("/dev/null")) << out;
    EXPECT_EQ(std::string::npos, out.find("pipe:")) << out;
    EXPECT_EQ(std::string::npos, out.find("socket:")) << out;
}

TEST_F(RunProgramTest, SignalsAndUmaskAreThoseOfAFreshProgram) {
    sigset_t all;
    sigset_t old;
    sigfillset(&all);
    pthread_sigmask(SIG_BLOCK, &all, &old);
    const mode_t mask = umask(0);
    const auto handler = signal(SIGPIPE, SIG_IGN);
    const std::string script = Script(
        "s",
        "grep -E '^Sig(Blk|Ign):' /proc/self/status > DIR/out; umask >> DIR/out; pwd >> DIR/out");
    EXPECT_EQ(0, RunProgram({script, {}, {}}));
    signal(SIGPIPE, handler);
    umask(mask);
    pthread_sigmask(SIG_SETMASK, &old, nullptr);
    EXPECT_EQ("SigBlk:\t0000000000000000\nSigIgn:\t0000000000000000\n0022\n/\n", Out());
}

TEST_F(RunProgramTest, TheEnvironmentIsAddedToAndReplaced) {
    ASSERT_EQ(0, setenv("KELD_TEST_OLD", "old", 1));
    ASSERT_EQ(0, setenv("KELD_TEST_KEPT", "kept", 1));
    const std::string script = Script("s", "env | grep ^KELD_TEST | sort > DIR/out");
    EXPECT_EQ(0, RunProgram({
                     script, {                        },
                      { {"KELD_TEST_OLD", "new"}, {"KELD_TEST_X", "a=b c"}}
    }));
    unsetenv("KELD_TEST_OLD");
    unsetenv("KELD_TEST_KEPT");
    EXPECT_EQ("KELD_TEST_KEPT=kept\nKELD_TEST_OLD=new\nKELD_TEST_X=a=b c\n", Out());
}

TEST_F(RunProgramTest, StartDoesNotWait) {
    const std::string script = Script(
        "s", "while ! [ -e DIR/go ]; do sleep 0.01; done; echo x > DIR/tmp; mv DIR/tmp DIR/done");
    EXPECT_EQ(0, StartProgram({script, {}, {}}));
    EXPECT_NE(0, access((m_dir / "done").c_str(), F_OK));
    m_dir.Write("go", "");
    EXPECT_TRUE(Appears("done"));
    EXPECT_GT(0, StartProgram({m_dir / "none", {}, {}}));
    EXPECT_EQ(ENOENT, errno);
}

TEST_F(RunProgramTest, AFolderIsRunInTheOrderOfNamesWithoutWhatIsNoProgram) {
    Script("d/20-b", "echo b \"$1\" >> DIR/out");
    Script("d/10-a", "echo a \"$1\" >> DIR/out");
    Script("d/15-no", "echo no >> DIR/out", 0644);
    m_dir.MakeDir("d/12-folder");
    ASSERT_EQ(0, symlink("nowhere", (m_dir / "d/13-dangling").c_str()));
    EXPECT_EQ(0, RunFolder(m_dir / "d", Program{"", {"/x y"}, {}}));
    EXPECT_EQ("a /x y\nb /x y\n", Out());
}

TEST_F(RunProgramTest, AFailureOfOneProgramDoesNotKeepTheOthersFromRunning) {
    Script("d/1", "exit 3");
    Script("d/2", "sleep 1000");
    Script("d/3", "echo ran > DIR/out");
    const LogCapture log;
    EXPECT_EQ(2, RunFolder(m_dir / "d", Program{}, 1000));
    EXPECT_EQ("ran\n", Out());
    EXPECT_TRUE(log.Has("[WARN] '" + (m_dir / "d/1") + "' ended with 3"));
    EXPECT_TRUE(log.Contains("'" + (m_dir / "d/2") + "' failed: Connection timed out"));
}

TEST_F(RunProgramTest, AMissingFolderIsAnEmptyOne) {
    EXPECT_EQ(0, RunFolder(m_dir / "none", Program{}));
    EXPECT_EQ(0, RunFolder("", Program{}));
    EXPECT_EQ(1, RunFolder(m_dir.Write("file", ""), Program{}));
}

TEST_F(RunProgramTest, ProgramsThatOthersCouldHaveChangedAreNotRun) {
    const LogCapture log;
    Script("d/open", "echo open >> DIR/out", 0777);
    Script("d/own", "echo own >> DIR/out", 0755);
    EXPECT_EQ(0, RunFolder(m_dir / "d", Program{}));
    EXPECT_EQ("own\n", Out());
    EXPECT_TRUE(log.Contains("'open' is not run"));
    ASSERT_EQ(0, chmod((m_dir / "d").c_str(), 0777));
    EXPECT_EQ(1, RunFolder(m_dir / "d", Program{}));
    EXPECT_EQ("own\n", Out());
}

TEST_F(RunProgramTest, ProgramsThatAGroupCouldHaveChangedAreNotRun) {
    if (geteuid() != 0) GTEST_SKIP() << "only root gives files to other groups";
    const LogCapture log;
    Script("d/shared", "echo shared >> DIR/out", 0775);
    Script("d/own", "echo own >> DIR/out", 0775);
    ASSERT_EQ(0, chown((m_dir / "d/shared").c_str(), 0, 100));
    EXPECT_EQ(0, RunFolder(m_dir / "d", Program{}));
    EXPECT_EQ("own\n", Out());
    EXPECT_TRUE(log.Contains("'shared' is not run"));
    ASSERT_EQ(0, chown((m_dir / "d").c_str(), 0, 100));
    ASSERT_EQ(0, chmod((m_dir / "d").c_str(), 0775));
    EXPECT_EQ(1, RunFolder(m_dir / "d", Program{}));
    EXPECT_EQ("own\n", Out());
}

TEST_F(RunProgramTest, ExecPassesItsArgumentsAndItsResult) {
    const std::string script = Script("s", "printf '%s|' \"$@\" > DIR/out; exit 5");
    EXPECT_EQ(5, KLIBCExec(script.c_str(), "eject", "sd b", nullptr));
    EXPECT_EQ("eject|sd b|", Out());
    EXPECT_EQ(0, KLIBCExec("/bin/true", nullptr));
    EXPECT_GT(0, KLIBCExec((m_dir / "none").c_str(), nullptr));
    EXPECT_EQ(KELDERR_SRC_MISS, KLIBCErrGet());
    EXPECT_GT(0, KLIBCExec("true", nullptr));
    EXPECT_EQ(0, KLIBCBackgroundExec("/bin/true", nullptr));
    EXPECT_GT(0, KLIBCBackgroundExec((m_dir / "none").c_str(), nullptr));
}

TEST_F(RunProgramTest, WithoutADockScriptThereIsNoDockToBeTold) {
    if (access("/lib/udev/script/rdx_util.sh", F_OK) == 0) GTEST_SKIP() << "there is a dock script";
    EXPECT_EQ(0, KLIBCExec("/lib/udev/script/rdx_util.sh", "eject", "sdb", nullptr));
}

TEST_F(RunProgramTest, APidFileHoldsOneNumber) {
    const auto read = [&](const std::string& text) {
        return KLIBCReadPidFile(m_dir.Write("pid", text).c_str());
    };
    EXPECT_EQ(1234, read("1234\n"));
    EXPECT_EQ(2, read(" 2"));
    for (const char* text :
         {"", "\n", "x", "12x", "-5", "0", "1", "99999999999999999999", "12 13", "4294967298"}) {
        EXPECT_GT(0, read(text)) << text;
    }
    EXPECT_GT(0, read(std::string(100, '1')));
    EXPECT_GT(0, KLIBCReadPidFile((m_dir / "none").c_str()));
    EXPECT_GT(0, KLIBCReadPidFile(nullptr));
}
