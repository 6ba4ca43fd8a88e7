#include <fcntl.h>
#include <keld/copy.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <climits>
#include <filesystem>
#include <thread>

#include "copy-fixture.h"
#include "host/copy-data.h"
#include "host/copy-error.h"
#include "host/copy-temp-name.h"
#include "utils/unique-fd.h"

namespace {

using Names = std::vector<std::string>;
constexpr size_t MIB = size_t{1024} * 1024;

class KeldCopyTest : public ::testing::Test {
protected:
    // A file below the source share, and one of that name below the destination share.
    std::string MakeSource(const std::string& name, const std::string& content) {
        return m_dir.Write("source/" + name, content);
    }
    std::string Target(const std::string& name) { return m_target + "/" + name; }

    TempDir m_dir;
    std::string m_source = m_dir.MakeDir("source");
    std::string m_target = m_dir.MakeDir("target");
    std::string m_outside = m_dir.MakeDir("outside");
    TestShares m_shares{
        {m_source, m_target}
    };
};

TEST_F(KeldCopyTest, CopiesTheContentOfFilesOfAnySize) {
    for (const size_t size :
         {size_t{0}, size_t{1}, 64 * 1024 - size_t{1}, 64 * size_t{1024}, 64 * 1024 + size_t{1},
          256 * 1024 + size_t{1}, 4 * MIB - 1, 4 * MIB, 4 * MIB + 1, 9 * MIB + 12345}) {
        const std::string from = MakeSource("f", TestBytes(size));
        ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target("f"))) << size;
        EXPECT_TRUE(TestBytes(size) == ReadWholeFile(Target("f"))) << size;
        EXPECT_EQ(Names{"f"}, NamesIn(m_target));
    }
}

TEST_F(KeldCopyTest, GivesThePermissionBitsWithoutSetuidSetgidAndSticky) {
    const std::string from = MakeSource("f", "text");
    for (const mode_t mode : {mode_t{07777}, mode_t{0644}, mode_t{0400}, mode_t{0666}}) {
        ASSERT_EQ(0, chmod(from.c_str(), mode));
        const mode_t before = umask(077);
        const int code = CopyOnce(from, Target("f"));
        umask(before);
        ASSERT_EQ(KELDERR_SUCCESS, code);
        EXPECT_EQ(mode & 0777, StatOf(Target("f")).st_mode & 07777);
    }
}

TEST_F(KeldCopyTest, GivesTheOwnerThatIsAskedFor) {
    if (geteuid() != 0) GTEST_SKIP() << "only root gives files away";
    const std::string from = MakeSource("f", "text");
    KELDCopyOptions options = CopyOptions(1);
    options.owner = 1024;
    options.group = 100;
    ASSERT_EQ(0, KELDFileCopy_r(from.c_str(), Target("f").c_str(), &options, nullptr));
    EXPECT_EQ(1024U, StatOf(Target("f")).st_uid);
    EXPECT_EQ(100U, StatOf(Target("f")).st_gid);
}

TEST_F(KeldCopyTest, ReplacesAnExistingFileInOneStep) {
    const std::string from = MakeSource("f", "new");
    m_dir.Write("target/f", "old and longer");
    const UniqueFd reader(open(Target("f").c_str(), O_RDONLY));
    ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target("f")));
    EXPECT_EQ("new", ReadWholeFile(Target("f")));
    std::array<char, 32> old{};
    EXPECT_EQ(14, read(reader.Get(), old.data(), old.size())) << "the old file was written over";
    EXPECT_EQ(Names{"f"}, NamesIn(m_target));
}

TEST_F(KeldCopyTest, RefusesAnExistingFileWhenItMayNotBeReplaced) {
    const std::string from = MakeSource("f", "new");
    m_dir.Write("target/f", "old");
    EXPECT_EQ(KELDERR_DST_EXISTS, CopyOnce(from, Target("f"), -1));
    EXPECT_EQ("old", ReadWholeFile(Target("f")));
    EXPECT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target("g"), -1));
    EXPECT_EQ("new", ReadWholeFile(Target("g")));
}

TEST_F(KeldCopyTest, RefusesADestinationThatIsNoRegularFile) {
    const std::string from = MakeSource("f", "new");
    const std::string victim = m_dir.Write("outside/victim", "untouched");
    m_dir.MakeDir("target/folder");
    ASSERT_EQ(0, symlink(victim.c_str(), Target("link").c_str()));
    ASSERT_EQ(0, symlink("/nowhere/at/all", Target("dangling").c_str()));
    ASSERT_EQ(0, mkfifo(Target("fifo").c_str(), 0666));
    for (const char* name : {"folder", "link", "dangling", "fifo"}) {
        const auto type = StatOf(Target(name)).st_mode;
        EXPECT_EQ(KELDERR_DST_TYPE_CONFLICT, CopyOnce(from, Target(name))) << name;
        EXPECT_EQ(KELDERR_DST_TYPE_CONFLICT, CopyOnce(from, Target(name), -1)) << name;
        EXPECT_EQ(type, StatOf(Target(name)).st_mode) << name;
    }
    EXPECT_EQ(KELDERR_DST_TYPE_CONFLICT, CopyOnce(from, m_target)) << "the share itself";
    EXPECT_EQ("untouched", ReadWholeFile(victim));
}

TEST_F(KeldCopyTest, TellsThatTheSourceIsMissing) {
    EXPECT_EQ(KELDERR_SRC_MISS_PATH, CopyOnce(m_source + "/none", Target("f")));
    MakeSource("file", "");
    EXPECT_EQ(KELDERR_SRC_MISS_PATH, CopyOnce(m_source + "/file/f", Target("f")));
    EXPECT_EQ(Names{}, NamesIn(m_target));
}

TEST_F(KeldCopyTest, RefusesASourceThatIsNoRegularFileWithoutBlocking) {
    const std::string file = MakeSource("file", "text");
    m_dir.MakeDir("source/folder");
    ASSERT_EQ(0, symlink(file.c_str(), (m_source + "/link").c_str()));
    ASSERT_EQ(0, mkfifo((m_source + "/fifo").c_str(), 0666));
    const UniqueFd socket_fd(socket(AF_UNIX, SOCK_STREAM, 0));
    sockaddr_un address{AF_UNIX, {}};
    (m_source + "/socket").copy(address.sun_path, sizeof(address.sun_path) - 1);
    ASSERT_EQ(0, bind(socket_fd.Get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)));
    for (const char* name : {"folder", "link", "fifo", "socket"}) {
        EXPECT_EQ(KELDERR_INVALID_ARGUMENT, CopyOnce(m_source + "/" + name, Target("f"))) << name;
    }
    EXPECT_EQ(Names{}, NamesIn(m_target));
}

TEST_F(KeldCopyTest, RefusesMissingArguments) {
    const std::string from = MakeSource("f", "text");
    const KELDCopyOptions options = CopyOptions(1);
    EXPECT_GT(0, KELDFileCopy_r(nullptr, "/x", &options, nullptr));
    EXPECT_GT(0, KELDFileCopy_r("", "/x", &options, nullptr));
    EXPECT_GT(0, KELDFileCopy_r(from.c_str(), nullptr, &options, nullptr));
    EXPECT_GT(0, KELDFileCopy_r(from.c_str(), "", &options, nullptr));
    EXPECT_GT(0, KELDFileCopy_r(from.c_str(), "/x", nullptr, nullptr));
    EXPECT_EQ(KELDERR_INVALID_ARGUMENT, KLIBCErrGet());
    EXPECT_NE(0, KLIBCErrorGetLine());
    EXPECT_GT(0, KELDCopyTHRSetCallbackIsCancel(nullptr, nullptr, nullptr));
    KELDCopyTHRArgsFree(nullptr);
}

TEST_F(KeldCopyTest, TellsThatTheFolderIsMissingOrIsNone) {
    const std::string from = MakeSource("f", "text");
    m_dir.Write("target/file", "");
    EXPECT_EQ(KELDERR_FILE_OPERATION, CopyOnce(from, Target("none/f")));
    EXPECT_EQ(KELDERR_FILE_OPERATION, CopyOnce(from, Target("file/f")));
}

TEST_F(KeldCopyTest, CopiesWhatLiesInNoShare) {
    const std::string from = m_dir.Write("outside/a", "text");
    EXPECT_EQ(KELDERR_SUCCESS, CopyOnce(from, m_outside + "/b"));
    EXPECT_EQ("text", ReadWholeFile(m_outside + "/b"));
    ASSERT_EQ(0, symlink("b", (m_outside + "/link").c_str()));
    EXPECT_EQ(KELDERR_DST_TYPE_CONFLICT, CopyOnce(from, m_outside + "/link"));
    EXPECT_EQ(KELDERR_INVALID_ARGUMENT, CopyOnce(m_outside + "/link", m_outside + "/c"));
    EXPECT_EQ(KELDERR_SRC_MISS_PATH, CopyOnce(m_outside + "/none/x", m_outside + "/c"));
    EXPECT_EQ(KELDERR_DST_TYPE_CONFLICT, CopyOnce(from, "/"));
}

TEST_F(KeldCopyTest, IsAskedAtTheStartAndStopsBeforeAnythingElse) {
    EXPECT_EQ(KELDERR_CANCELLED,
              CopyAsking(m_source + "/none", Target("f"), [](int) { return true; }));
    EXPECT_EQ(Names{}, NamesIn(m_target));
}

TEST_F(KeldCopyTest, IsAskedAtLeastOnceInEachEightMebibytes) {
    const std::string from = MakeSource("f", std::string(65 * MIB, 'x'));
    int asked = 0;
    EXPECT_EQ(KELDERR_SUCCESS, CopyAsking(from, Target("f"), [&](int count) {
                  asked = count;
                  return false;
              }));
    // A clone moves nothing, and need not ask.
    const bool is_cloned = asked == 1;
    EXPECT_TRUE(is_cloned || asked >= 9) << asked;
}

TEST_F(KeldCopyTest, CancelInTheMiddleLeavesTheDestinationAsItWas) {
    const std::string from = MakeSource("f", TestBytes(20 * MIB));
    const auto third_time = [](int count) { return count == 3; };
    EXPECT_EQ(KELDERR_CANCELLED, CopyAsking(from, Target("f"), third_time));
    EXPECT_EQ(Names{}, NamesIn(m_target));
    m_dir.Write("target/f", "old");
    EXPECT_EQ(KELDERR_CANCELLED, CopyAsking(from, Target("f"), third_time));
    EXPECT_EQ("old", ReadWholeFile(Target("f")));
    EXPECT_EQ(Names{"f"}, NamesIn(m_target));
}

TEST_F(KeldCopyTest, NothingIsSeenUnderTheNameWhileTheCopyRuns) {
    const std::string from = MakeSource("f", TestBytes(20 * MIB));
    EXPECT_EQ(KELDERR_SUCCESS, CopyAsking(from, Target("f"), [&](int) {
                  EXPECT_FALSE(Exists(Target("f")));
                  return false;
              }));
    EXPECT_TRUE(Exists(Target("f")));
}

void Grow(const std::string& path) {
    const UniqueFd file(open(path.c_str(), O_WRONLY | O_APPEND));
    EXPECT_EQ(4, write(file.Get(), "more", 4));
}

void ShrinkMuch(const std::string& path) { EXPECT_EQ(0, truncate(path.c_str(), 100)); }

void ShrinkByOneByte(const std::string& path) {
    EXPECT_EQ(0, truncate(path.c_str(), static_cast<off_t>(20 * MIB - 1)));
}

void Rewrite(const std::string& path) {
    const UniqueFd file(open(path.c_str(), O_WRONLY));
    EXPECT_EQ(4, pwrite(file.Get(), "XXXX", 4, 0));
    const timespec times[2] = {
        {1, 0},
        {1, 0}
    };
    EXPECT_EQ(0, futimens(file.Get(), times));
}

struct ChangeCase {
    const char* name;
    void (*change)(const std::string& path);
};
const ChangeCase CHANGE_CASES[] = {
    {"grows",               Grow           },
    {"shrinks much",        ShrinkMuch     },
    {"shrinks by one byte", ShrinkByOneByte},
    {"is rewritten",        Rewrite        },
};

TEST_F(KeldCopyTest, ASourceThatChangesWhileItIsReadIsNotTaken) {
    for (const ChangeCase& row : CHANGE_CASES) {
        const std::string from = MakeSource("f", TestBytes(20 * MIB));
        const auto change_at_third = [&](int count) {
            if (count == 3) row.change(from);
            return false;
        };
        EXPECT_EQ(KELDERR_FILE_OPERATION, CopyAsking(from, Target("f"), change_at_third))
            << row.name;
        EXPECT_EQ(Names{}, NamesIn(m_target)) << row.name;
    }
}

TEST_F(KeldCopyTest, ASmallSourceThatIsRewrittenInPlaceIsNotTaken) {
    const std::string path = MakeSource("f", TestBytes(40000));
    const UniqueFd from(open(path.c_str(), O_RDONLY));
    struct stat before {};
    ASSERT_EQ(0, fstat(from.Get(), &before));
    for (const bool is_rewritten : {false, true}) {
        const UniqueFd to(open(Target("f").c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644));
        ASSERT_EQ(0, lseek(from.Get(), 0, SEEK_SET));
        if (is_rewritten) Rewrite(path);
        EXPECT_EQ(is_rewritten ? KELDERR_FILE_OPERATION : KELDERR_SUCCESS,
                  keld_host::CopyData(from.Get(), to.Get(), before, {}));
    }
}

TEST_F(KeldCopyTest, ACopyHasTheTimeOfItsSourceWhenItGetsItsName) {
    const timespec time{1'234'567'890, 123'456'789};
    const timespec times[2] = {time, time};
    for (const size_t size : {size_t{0}, size_t{100}, 20 * MIB}) {
        const std::string from = MakeSource("f", TestBytes(size));
        ASSERT_EQ(0, utimensat(AT_FDCWD, from.c_str(), times, 0));
        ASSERT_EQ(KELDERR_SUCCESS, CopyAsking(from, Target("f"), [](int) { return false; }));
        EXPECT_EQ(time.tv_sec, StatOf(Target("f")).st_mtim.tv_sec) << size;
        EXPECT_EQ(time.tv_nsec, StatOf(Target("f")).st_mtim.tv_nsec) << size;
        ASSERT_EQ(0, unlink(Target("f").c_str()));
    }
}

TEST_F(KeldCopyTest, ASourceThatIsRemovedWhileItIsReadIsTakenWhole) {
    const std::string from = MakeSource("f", TestBytes(20 * MIB));
    EXPECT_EQ(KELDERR_SUCCESS, CopyAsking(from, Target("f"), [&](int count) {
                  if (count == 3) unlink(from.c_str());
                  return false;
              }));
    EXPECT_TRUE(TestBytes(20 * MIB) == ReadWholeFile(Target("f")));
}

struct Piece {
    off_t at;
    std::string bytes;
};

std::string MakeSparse(const std::string& path, off_t size, const std::vector<Piece>& pieces) {
    const UniqueFd file(open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644));
    EXPECT_EQ(0, ftruncate(file.Get(), size));
    for (const Piece& piece : pieces) {
        EXPECT_EQ(static_cast<ssize_t>(piece.bytes.size()),
                  pwrite(file.Get(), piece.bytes.data(), piece.bytes.size(), piece.at));
    }
    return path;
}

TEST_F(KeldCopyTest, HolesStayHoles) {
    const auto size = static_cast<off_t>(16 * MIB);
    const auto middle = static_cast<off_t>(8 * MIB);
    const std::string data = TestBytes(MIB);
    const auto end = size - static_cast<off_t>(MIB);
    const Piece at_start{0, data};
    const Piece in_middle{middle, data};
    const Piece at_end{end, data};
    using Pieces = std::vector<Piece>;
    for (const auto& pieces : {
             Pieces{         },
             Pieces{            at_start         },
             Pieces{   in_middle    },
             Pieces{               at_end},
             Pieces{ at_start,           in_middle}
    }) {
        const std::string from = MakeSparse(m_source + "/f", size, pieces);
        ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target("f")));
        EXPECT_TRUE(ReadWholeFile(from) == ReadWholeFile(Target("f")));
        EXPECT_LE(StatOf(Target("f")).st_blocks, StatOf(from).st_blocks + 16);
    }
    const std::string small = MakeSparse(m_source + "/small", 40000,
                                         {
                                             {30000, "x"}
    });
    ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(small, Target("small")));
    EXPECT_TRUE(ReadWholeFile(small) == ReadWholeFile(Target("small")));
}

TEST_F(KeldCopyTest, TakesTheLongestNamesAndNamesOfAnyBytes) {
    const std::string names[] = {std::string(255, 'n'),
                                 "new\nline",
                                 "per%s%n cent",
                                 "quote\"'`$(x)",
                                 "no \xff\xfe utf-8",
                                 " leading",
                                 "trailing ",
                                 "-rf",
                                 "#recycle"};
    for (const std::string& name : names) {
        const std::string from = MakeSource(name, name);
        EXPECT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target(name))) << name;
        EXPECT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target(name))) << name << " replaced";
        EXPECT_EQ(name, ReadWholeFile(Target(name)));
    }
    EXPECT_EQ(std::size(names), NamesIn(m_target).size());
    const int code = CopyOnce(MakeSource("f", ""), Target(std::string(256, 'n')));
    EXPECT_EQ(KELDERR_NAME_TOO_LONG, code);
}

TEST_F(KeldCopyTest, WorksBelowAShareWithPathsLongerThanThePathLimit) {
    const std::string component(200, 'd');
    std::string relative;
    // Made step by step: no call takes the whole path.
    UniqueFd from(open(m_source.c_str(), O_PATH | O_DIRECTORY));
    UniqueFd to(open(m_target.c_str(), O_PATH | O_DIRECTORY));
    for (int depth = 0; depth < 40; ++depth) {
        for (UniqueFd* at : {&from, &to}) {
            ASSERT_EQ(0, mkdirat(at->Get(), component.c_str(), 0777));
            at->Reset(openat(at->Get(), component.c_str(), O_PATH | O_DIRECTORY));
        }
        relative += "/" + component;
    }
    ASSERT_LT(size_t{PATH_MAX}, relative.size());
    const UniqueFd file(openat(from.Get(), "f", O_WRONLY | O_CREAT, 0644));
    ASSERT_EQ(4, write(file.Get(), "deep", 4));
    EXPECT_EQ(KELDERR_SUCCESS, CopyOnce(m_source + relative + "/f", m_target + relative + "/f"));
    const UniqueFd copy(openat(to.Get(), "f", O_RDONLY));
    std::array<char, 8> text{};
    EXPECT_EQ(4, read(copy.Get(), text.data(), text.size()));
}

TEST_F(KeldCopyTest, IsNotLedOutOfAShareByALinkOnTheWay) {
    const std::string from = MakeSource("f", "text");
    m_dir.Write("outside/secret", "secret");
    ASSERT_EQ(0, symlink(m_outside.c_str(), Target("link").c_str()));
    ASSERT_EQ(0, symlink(m_outside.c_str(), (m_source + "/link").c_str()));
    EXPECT_EQ(KELDERR_FILE_OPERATION, CopyOnce(from, Target("link/f")));
    EXPECT_EQ(KELDERR_INVALID_ARGUMENT, CopyOnce(m_source + "/link/secret", Target("f")));
    EXPECT_NE(KELDERR_SUCCESS, CopyOnce(from, Target("../outside/f")));
    EXPECT_NE(KELDERR_SUCCESS, CopyOnce(m_source + "/../outside/secret", Target("f")));
    EXPECT_EQ(Names{"secret"}, NamesIn(m_outside));
    EXPECT_EQ(Names{"link"}, NamesIn(m_target));
}

TEST_F(KeldCopyTest, NothingLandsOutsideWhileAFolderIsSwappedForALink) {
    const std::string from = MakeSource("f", TestBytes(1000));
    const std::string folder = m_dir.MakeDir("target/folder");
    std::atomic<bool> is_over{false};
    std::thread swapper([&] {
        const std::string aside = m_target + "/aside";
        while (!is_over) {
            if (rename(folder.c_str(), aside.c_str()) != 0) continue;
            EXPECT_EQ(0, symlink(m_outside.c_str(), folder.c_str()));
            EXPECT_EQ(0, unlink(folder.c_str()));
            EXPECT_EQ(0, rename(aside.c_str(), folder.c_str()));
        }
    });
    int copied = 0;
    int refused = 0;
    for (int i = 0; i < 1000000 && (i < 3000 || copied == 0 || refused == 0); ++i) {
        const int code = CopyOnce(from, folder + "/f" + std::to_string(i % 10));
        code == KELDERR_SUCCESS ? ++copied : ++refused;
    }
    is_over = true;
    swapper.join();
    EXPECT_EQ(Names{}, NamesIn(m_outside));
    EXPECT_LT(0, copied);
    EXPECT_LT(0, refused) << "the swap was never met: the test has shown nothing";
}

TEST_F(KeldCopyTest, SourcesOfAnyDateAreCopiedAndKeepTheirDate) {
    for (const time_t date : {time_t{-86400 * 365}, time_t{5000000000}}) {
        const std::string from = MakeSource("f", "text");
        const timespec times[2] = {
            {date, 0},
            {date, 0}
        };
        ASSERT_EQ(0, utimensat(AT_FDCWD, from.c_str(), times, 0));
        EXPECT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target("f")));
        EXPECT_EQ(date, StatOf(from).st_mtim.tv_sec);
        // What the caller sets afterwards stays.
        ASSERT_EQ(0, utimensat(AT_FDCWD, Target("f").c_str(), times, 0));
        EXPECT_EQ(date, StatOf(Target("f")).st_mtim.tv_sec);
    }
}

TEST_F(KeldCopyTest, ManyCopiesRunAtOnce) {
    const std::string from = MakeSource("f", TestBytes(300000));
    std::vector<std::thread> threads;
    std::atomic<int> failures{0};
    for (int thread = 0; thread < 4; ++thread) {
        threads.emplace_back([&, thread] {
            for (int i = 0; i < 25; ++i) {
                const std::string own = Target(std::to_string(thread) + "-" + std::to_string(i));
                if (CopyOnce(from, own) != KELDERR_SUCCESS) ++failures;
                if (CopyOnce(from, Target("same")) != KELDERR_SUCCESS) ++failures;
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(0, failures);
    EXPECT_EQ(101U, NamesIn(m_target).size());
    EXPECT_TRUE(TestBytes(300000) == ReadWholeFile(Target("same")));
}

TEST_F(KeldCopyTest, OfManyThatMayNotReplaceOneWins) {
    std::vector<std::thread> threads;
    std::atomic<int> won{0};
    std::atomic<int> refused{0};
    for (int thread = 0; thread < 4; ++thread) {
        const std::string from = MakeSource(std::to_string(thread), std::to_string(thread));
        threads.emplace_back([&, from] {
            for (int i = 0; i < 50; ++i) {
                const int code = CopyOnce(from, Target(std::to_string(i)), -1);
                if (code == KELDERR_SUCCESS) ++won;
                if (code == KELDERR_DST_EXISTS) ++refused;
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(50, won);
    EXPECT_EQ(150, refused);
}

// A process number that is free: a child that has ended and was waited for.
pid_t DeadProcess() {
    const pid_t pid = fork();
    if (pid == 0) _exit(0);
    EXPECT_EQ(pid, waitpid(pid, nullptr, 0));
    return pid;
}

std::string TempNameOf(pid_t pid) {
    const std::string own = keld_host::TakeCopyTempName();
    keld_host::GiveBackCopyTempName(own, false);
    const std::string prefix = ".ferrix-tmp-";
    const size_t dash = own.find('-', prefix.size());
    return prefix + std::to_string(pid) + own.substr(dash);
}

TEST(KeldCopyTempNameTest, KnowsWhatACrashLeftFromWhatIsInUse) {
    const std::string own = keld_host::TakeCopyTempName();
    EXPECT_EQ(0U, own.find(".ferrix-tmp-" + std::to_string(getpid()) + "-"));
    EXPECT_FALSE(keld_host::IsCopyLeftover(own));
    keld_host::GiveBackCopyTempName(own, true);
    EXPECT_TRUE(keld_host::IsCopyLeftover(own)) << "its device was pulled out, say";
    const std::string other = keld_host::TakeCopyTempName();
    EXPECT_NE(own, other);
    keld_host::GiveBackCopyTempName(other, false);
    EXPECT_FALSE(keld_host::IsCopyLeftover(TempNameOf(1))) << "that process runs";
    const std::string dead = TempNameOf(DeadProcess());
    EXPECT_TRUE(keld_host::IsCopyLeftover(dead));
    std::string other_boot = own;
    char& digit = other_boot[other_boot.size() - 18];
    digit = digit == '0' ? '1' : '0';
    EXPECT_TRUE(keld_host::IsCopyLeftover(other_boot)) << "the same number in another boot";
    for (const std::string& name :
         {std::string(), std::string(".ferrix-tmp-"), std::string(".ferrix-tmp-1"),
          std::string(".ferrix-tmp-x-00000000-0000000000000000"), dead + "0", dead + ".jpg",
          dead.substr(1), dead.substr(0, dead.size() - 1), "a" + dead,
          std::string(".ferrix-tmp--5-00000000-0000000000000000"),
          std::string(".ferrix-tmp-5-0000000G-0000000000000000"),
          std::string(".ferrix-tmp-99999999999-00000000-0000000000000000")}) {
        EXPECT_FALSE(keld_host::IsCopyLeftover(name)) << name;
    }
}

TEST_F(KeldCopyTest, ACopyThatReplacesRemovesWhatCrashedCopiesLeftInTheFolder) {
    const std::string from = MakeSource("f", "new");
    const std::string dead = TempNameOf(DeadProcess());
    const std::string alive = TempNameOf(1);
    m_dir.Write("target/folder/f", "old");
    m_dir.Write("target/folder/" + dead, "half");
    m_dir.Write("target/folder/" + alive, "in use");
    m_dir.Write("target/folder/.ferrix-tmp-notes", "a file of the user");
    ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target("folder/f")));
    Names expected = {".ferrix-tmp-notes", alive, "f"};
    std::sort(expected.begin(), expected.end());
    EXPECT_EQ(expected, NamesIn(Target("folder")));
}

TEST_F(KeldCopyTest, AProcessThatDiesInTheMiddleLeavesTheDestinationAsItWas) {
    const std::string from = MakeSource("f", TestBytes(20 * MIB));
    m_dir.Write("target/g", "old");
    for (const char* name : {"f", "g"}) {
        const pid_t pid = fork();
        if (pid == 0) {
            CopyAsking(from, Target(name), [](int count) {
                if (count == 3) _exit(7);
                return false;
            });
            _exit(0);
        }
        int status = 0;
        ASSERT_EQ(pid, waitpid(pid, &status, 0));
        ASSERT_EQ(7, WEXITSTATUS(status));
    }
    EXPECT_FALSE(Exists(Target("f")));
    EXPECT_EQ("old", ReadWholeFile(Target("g")));
}

// A file that is open for appending: the kernel refuses to move anything into it by itself.
class KeldCopyDataTest : public ::testing::Test {
protected:
    int Copy(const keld_host::CopyCancel& cancel = {}) {
        return keld_host::CopyData(m_from.Get(), m_to.Get(), m_info, cancel);
    }
    void Open(size_t size) {
        const std::string path = m_dir.Write("from", TestBytes(size));
        m_from.Reset(open(path.c_str(), O_RDONLY));
        m_to.Reset(open((m_dir / "to").c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_APPEND, 0644));
        m_info = StatOf(path);
    }

    TempDir m_dir;
    UniqueFd m_from;
    UniqueFd m_to;
    struct stat m_info {};
};

TEST_F(KeldCopyDataTest, ReadsAndWritesWhereTheKernelCannotMove) {
    for (const size_t size :
         {size_t{0}, size_t{1}, size_t{33000}, 256 * 1024 + size_t{1}, 9 * MIB}) {
        Open(size);
        EXPECT_EQ(KELDERR_SUCCESS, Copy()) << size;
        EXPECT_TRUE(TestBytes(size) == ReadWholeFile(m_dir / "to")) << size;
    }
}

TEST_F(KeldCopyDataTest, ASourceOfAnotherSizeThanWasSeenIsNotTaken) {
    for (const size_t size : {size_t{33000}, 9 * MIB}) {
        for (const off_t difference : {-1, 1}) {
            Open(size);
            m_info.st_size += difference;
            EXPECT_EQ(KELDERR_FILE_OPERATION, Copy()) << size << " " << difference;
            // The same where the kernel moves.
            m_to.Reset(open((m_dir / "to").c_str(), O_WRONLY | O_TRUNC));
            EXPECT_EQ(KELDERR_FILE_OPERATION, Copy()) << size << " " << difference;
        }
    }
}

TEST_F(KeldCopyDataTest, AsksWhetherToStopAlsoWhenItReadsAndWrites) {
    Open(20 * MIB);
    int asked = 0;
    const auto third_time = [](void* count) { return ++*static_cast<int*>(count) == 3 ? 1 : 0; };
    EXPECT_EQ(KELDERR_CANCELLED, Copy({third_time, &asked}));
    EXPECT_EQ(3, asked);
}

TEST_F(KeldCopyDataTest, AFailingWriteIsToldByItsSide) {
    for (const size_t size : {size_t{33000}, 9 * MIB}) {
        Open(size);
        m_to.Reset(open("/dev/full", O_WRONLY));
        EXPECT_EQ(KELDERR_NO_SPACE, Copy()) << size;
    }
}

TEST_F(KeldCopyDataTest, AFailingReadIsToldByItsSide) {
    Open(33000);
    m_from.Reset(open((m_dir / "from").c_str(), O_WRONLY));
    EXPECT_EQ(keld_host::CopySourceError(EBADF), Copy());
    EXPECT_EQ(0, StatOf(m_dir / "to").st_size);
}

TEST(KeldCopyErrorTest, MapsEachErrnoForItsSide) {
    struct Case {
        int error;
        int source;
        int destination;
    };
    const Case cases[] = {
        {ENOENT,       KELDERR_SRC_MISS_PATH,      KELDERR_FILE_OPERATION    },
        {ENOTDIR,      KELDERR_SRC_MISS_PATH,      KELDERR_FILE_OPERATION    },
        {ELOOP,        KELDERR_INVALID_ARGUMENT,   KELDERR_FILE_OPERATION    },
        {ENOSPC,       KELDERR_FILE_OPERATION,     KELDERR_NO_SPACE          },
        {EDQUOT,       KELDERR_FILE_OPERATION,     KELDERR_QUOTA_FULL        },
        {EFBIG,        KELDERR_FILE_OPERATION,     KELDERR_FILE_TOO_LARGE    },
        {EACCES,       KELDERR_NO_PERMISSION,      KELDERR_NO_PERMISSION     },
        {EPERM,        KELDERR_NO_PERMISSION,      KELDERR_NO_PERMISSION     },
        {EROFS,        KELDERR_NO_PERMISSION,      KELDERR_NO_PERMISSION     },
        {ENAMETOOLONG, KELDERR_NAME_TOO_LONG,      KELDERR_NAME_TOO_LONG     },
        {EIO,          KELDERR_IO,                 KELDERR_IO                },
        {ENOTCONN,     KELDERR_IO,                 KELDERR_IO                },
        {ENOMEM,       KELDERR_SYSTEM,             KELDERR_SYSTEM            },
        {EMFILE,       KELDERR_SYSTEM,             KELDERR_SYSTEM            },
        {EXDEV,        KELDERR_FILE_OPERATION,     KELDERR_FILE_OPERATION    },
        {EILSEQ,       KELDERR_NAME_NOT_SUPPORTED, KELDERR_NAME_NOT_SUPPORTED},
    };
    for (const Case& row : cases) {
        EXPECT_EQ(row.source, keld_host::CopySourceError(row.error)) << row.error;
        EXPECT_EQ(row.destination, keld_host::CopyDestinationError(row.error)) << row.error;
    }
}

}  // namespace
