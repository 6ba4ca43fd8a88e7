// Copies on real file systems, from another file system and inside one. Needs root.
#include <fcntl.h>
#include <keld/copy.h>
#include <sys/statvfs.h>
#include <sys/wait.h>
#include <unistd.h>

#include "copy-fixture.h"
#include "scratch-disk.h"
#include "utils/unique-fd.h"

namespace {

using Names = std::vector<std::string>;
constexpr size_t MIB = size_t{1024} * 1024;

struct DiskKind {
    const char* name;
    uint64_t sizeMib;
    bool hasHoles;
    bool hasModes;
};
// The smallest sizes that the programs make.
const DiskKind DISK_KINDS[] = {
    {"ext4",  64,  true,  true },
    {"xfs",   300, true,  true },
    {"btrfs", 128, true,  true },
    {"exfat", 64,  false, false},
};

class KeldCopyDiskTest : public ::testing::TestWithParam<DiskKind> {
protected:
    void SetUp() override {
        const std::string reason = ScratchDisk::WhyNot(GetParam().name);
        if (!reason.empty()) GTEST_SKIP() << reason;
        m_disk = std::make_unique<ScratchDisk>(GetParam().name, GetParam().sizeMib);
        m_shares = std::make_unique<TestShares>(Names{m_disk->Path(), m_source});
    }
    std::string Target(const std::string& name) { return m_disk->Path() + "/" + name; }

    TempDir m_dir;
    std::string m_source = m_dir.MakeDir("source");
    std::unique_ptr<ScratchDisk> m_disk;
    std::unique_ptr<TestShares> m_shares;
};

TEST_P(KeldCopyDiskTest, CopiesOntoTheDiskInsideItAndBack) {
    for (const size_t size : {size_t{0}, size_t{33000}, 5 * MIB + 77}) {
        const std::string from = m_dir.Write("source/f", TestBytes(size));
        ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target("f"), -1));
        ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target("f")));
        ASSERT_EQ(KELDERR_DST_EXISTS, CopyOnce(from, Target("f"), -1));
        ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(Target("f"), Target("g")));
        ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(Target("g"), m_source + "/back"));
        EXPECT_TRUE(TestBytes(size) == ReadWholeFile(m_source + "/back"));
        EXPECT_TRUE(TestBytes(size) == ReadWholeFile(Target("f")));
        EXPECT_TRUE(TestBytes(size) == ReadWholeFile(Target("g")));
        EXPECT_EQ((Names{"f", "g"}), NamesIn(m_disk->Path()));
        unlink(Target("f").c_str());
        unlink(Target("g").c_str());
    }
}

TEST_P(KeldCopyDiskTest, GivesOwnerAndModeWhereThereAreSuch) {
    const std::string from = m_dir.Write("source/f", "text");
    ASSERT_EQ(0, chmod(from.c_str(), 06751));
    KELDCopyOptions options = CopyOptions(1);
    options.owner = 1024;
    options.group = 100;
    ASSERT_EQ(0, KELDFileCopy_r(from.c_str(), Target("f").c_str(), &options, nullptr));
    EXPECT_EQ("text", ReadWholeFile(Target("f")));
    if (!GetParam().hasModes) return;
    EXPECT_EQ(1024U, StatOf(Target("f")).st_uid);
    EXPECT_EQ(100U, StatOf(Target("f")).st_gid);
    EXPECT_EQ(0751U, StatOf(Target("f")).st_mode & 07777);
}

TEST_P(KeldCopyDiskTest, HolesStayHoles) {
    const std::string from = m_source + "/sparse";
    const UniqueFd file(open(from.c_str(), O_WRONLY | O_CREAT, 0644));
    const std::string data = TestBytes(MIB);
    ASSERT_EQ(0, ftruncate(file.Get(), static_cast<off_t>(30 * MIB)));
    ASSERT_EQ(ssize_t{MIB}, pwrite(file.Get(), data.data(), MIB, static_cast<off_t>(8 * MIB)));
    ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target("f")));
    EXPECT_EQ(off_t{30 * MIB}, StatOf(Target("f")).st_size);
    const std::string copy = ReadWholeFile(Target("f"));
    EXPECT_TRUE(std::string(8 * MIB, '\0') + data + std::string(21 * MIB, '\0') == copy);
    if (!GetParam().hasHoles) return;
    sync();  // some file systems count blocks only then
    EXPECT_LE(StatOf(Target("f")).st_blocks * 512, off_t{2 * MIB});
    ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(Target("f"), Target("g")));
    EXPECT_TRUE(copy == ReadWholeFile(Target("g")));
    sync();
    EXPECT_LE(StatOf(Target("g")).st_blocks * 512, off_t{2 * MIB});
}

TEST_P(KeldCopyDiskTest, TakesTheLongestNames) {
    const std::string name(255, 'n');
    const std::string from = m_dir.Write("source/" + name, "text");
    EXPECT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target(name)));
    EXPECT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target(name)));
    EXPECT_EQ(Names{name}, NamesIn(m_disk->Path()));
}

TEST_P(KeldCopyDiskTest, AFullDiskIsToldAndNoPartOfTheFileIsLeft) {
    struct statvfs info {};
    ASSERT_EQ(0, statvfs(m_disk->Path().c_str(), &info));
    const auto size = static_cast<off_t>(info.f_bavail * info.f_frsize + 16 * MIB);
    const std::string from = m_source + "/big";
    {
        const UniqueFd file(open(from.c_str(), O_WRONLY | O_CREAT, 0644));
        ASSERT_EQ(0, posix_fallocate(file.Get(), 0, size));
    }
    ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(m_dir.Write("source/small", "old"), Target("old")));
    EXPECT_EQ(KELDERR_NO_SPACE, CopyOnce(from, Target("big")));
    EXPECT_EQ(KELDERR_NO_SPACE, CopyOnce(from, Target("old")));
    EXPECT_EQ("old", ReadWholeFile(Target("old")));
    EXPECT_EQ(Names{"old"}, NamesIn(m_disk->Path()));
}

TEST_P(KeldCopyDiskTest, AReadOnlyDiskIsNoPermission) {
    ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(m_dir.Write("source/f", "old"), Target("f")));
    m_disk->Remount(true);
    const std::string from = m_dir.Write("source/f", "new");
    EXPECT_EQ(KELDERR_NO_PERMISSION, CopyOnce(from, Target("f")));
    EXPECT_EQ(KELDERR_NO_PERMISSION, CopyOnce(from, Target("g")));
    EXPECT_EQ(KELDERR_DST_EXISTS, CopyOnce(from, Target("f"), -1));
    EXPECT_EQ("old", ReadWholeFile(Target("f")));
}

TEST_P(KeldCopyDiskTest, CancelInTheMiddleLeavesTheDestinationAsItWas) {
    const std::string from = m_dir.Write("source/f", TestBytes(12 * MIB));
    ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(m_dir.Write("source/g", "old"), Target("g")));
    const auto third_time = [](int count) { return count == 3; };
    EXPECT_EQ(KELDERR_CANCELLED, CopyAsking(from, Target("f"), third_time));
    EXPECT_EQ(KELDERR_CANCELLED, CopyAsking(from, Target("g"), third_time));
    EXPECT_EQ("old", ReadWholeFile(Target("g")));
    EXPECT_EQ(Names{"g"}, NamesIn(m_disk->Path()));
}

TEST_P(KeldCopyDiskTest, WhatADeadProcessLeftIsGoneAfterTheNextRun) {
    const std::string from = m_dir.Write("source/f", TestBytes(12 * MIB));
    const pid_t pid = fork();
    if (pid == 0) {
        CopyAsking(from, Target("f"), [](int count) {
            if (count == 3) _exit(7);
            return false;
        });
        _exit(0);
    }
    int status = 0;
    ASSERT_EQ(pid, waitpid(pid, &status, 0));
    ASSERT_EQ(7, WEXITSTATUS(status));
    EXPECT_FALSE(Exists(Target("f")));
    EXPECT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target("f")));
    EXPECT_EQ(Names{"f"}, NamesIn(m_disk->Path()));
}

TEST_P(KeldCopyDiskTest, ANameThatTheFileSystemHasNotIsTold) {
    const std::string from = m_dir.Write("source/f", "text");
    if (std::string(GetParam().name) == "exfat") {
        EXPECT_EQ(KELDERR_NAME_NOT_SUPPORTED, CopyOnce(from, Target("a:b")));
        EXPECT_EQ(KELDERR_NAME_NOT_SUPPORTED, CopyOnce(from, Target("what?")));
    }
    EXPECT_EQ(KELDERR_NAME_TOO_LONG, CopyOnce(from, Target(std::string(256, 'n'))));
    EXPECT_EQ(Names{}, NamesIn(m_disk->Path()));
}

TEST_P(KeldCopyDiskTest, DatesThatTheCallerSetsStay) {
    const std::string from = m_dir.Write("source/f", TestBytes(5 * MIB));
    ASSERT_EQ(KELDERR_SUCCESS, CopyOnce(from, Target("f")));
    const timespec times[2] = {
        {1000000000, 0},
        {1000000000, 0}
    };
    ASSERT_EQ(0, utimensat(AT_FDCWD, Target("f").c_str(), times, 0));
    m_disk->Remount(false);
    EXPECT_EQ(1000000000, StatOf(Target("f")).st_mtim.tv_sec) << "written back later";
}

INSTANTIATE_TEST_SUITE_P(Disks, KeldCopyDiskTest, ::testing::ValuesIn(DISK_KINDS),
                         [](const auto& row) { return std::string(row.param.name); });

}  // namespace
