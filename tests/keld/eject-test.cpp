// Taking devices out of service: images on loop devices, really mounted.
#include <fcntl.h>
#include <sched.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "device-fixture.h"
#include "utils/unique-fd.h"

class EjectOfKind : public DeviceOfKind {};
class Eject : public DeviceMount {};

INSTANTIATE_TEST_SUITE_P(Kinds, EjectOfKind, ::testing::Values("ext4", "xfs", "btrfs", "exfat"),
                         [](const auto& test) { return std::string(test.param); });

TEST_P(EjectOfKind, IsEjectedWithAllThatWasWritten) {
    LoopDisk disk(GetParam(), 0);
    PlugIn(disk);
    const std::string path = disk.Mount(m_dir / "mnt");
    const std::string text(300000, 'x');
    Put(path + "/file", text);
    EXPECT_EQ(0, KELDExtStgPullOut(disk.Name().c_str(), 4));
    EXPECT_FALSE(IsMounted(path));
    EXPECT_NE(0, access((path + "/file").c_str(), F_OK));
    disk.Mount(path, 0, "ro");
    EXPECT_TRUE(ReadWholeFile(path + "/file") == text);
}

TEST_P(EjectOfKind, IsNotEjectedWhileItIsBusy) {
    LoopDisk disk(GetParam(), 0);
    PlugIn(disk);
    const std::string path = disk.Mount(m_dir / "mnt");
    Put(path + "/file", "text");
    UniqueFd fd(open((path + "/file").c_str(), O_RDONLY | O_CLOEXEC));
    ASSERT_TRUE(fd.IsValid());
    EXPECT_GT(0, KELDExtStgPullOut(disk.Name().c_str(), 4));
    EXPECT_TRUE(IsMounted(path));
    EXPECT_EQ("text", ReadWholeFile(path + "/file"));
    fd.Reset();
    EXPECT_EQ(0, KELDExtStgPullOut(disk.Name().c_str(), 4));
    EXPECT_FALSE(IsMounted(path));
}

TEST_F(Eject, EjectUnmountsEveryFileSystemOfTheDisk) {
    LoopDisk disk("ext4", 2);
    PlugIn(disk);
    const std::string first = disk.Mount(m_dir / "one", 1);
    const std::string second = disk.Mount(m_dir / "one/two", 2);
    const std::string again = disk.Mount(m_dir / "again", 1);
    ASSERT_EQ(0, mkdir((first + "/sub").c_str(), 0700));
    const std::string bound = disk.Bind(first + "/sub", m_dir / "bound");
    EXPECT_EQ(0, KELDExtStgPullOut(disk.Name().c_str(), 4));
    for (const std::string& path : {first, second, again, bound})
        EXPECT_FALSE(IsMounted(path)) << path;
}

TEST_F(Eject, EjectOfADiskWithoutMountsSucceeds) {
    const LoopDisk disk("ext4", 1);
    PlugIn(disk);
    EXPECT_EQ(0, KELDExtStgPullOut(disk.Name().c_str(), 4));
}

TEST_F(Eject, ADiskThatAnotherNamespaceHasMountedIsBusy) {
    LoopDisk disk("ext4", 0);
    PlugIn(disk);
    disk.Mount(m_dir / "mnt");
    int ready[2];
    ASSERT_EQ(0, pipe2(ready, O_CLOEXEC));
    const pid_t child = fork();
    if (child == 0) {
        const bool isAway = unshare(CLONE_NEWNS) == 0;
        static_cast<void>(!write(ready[1], isAway ? "y" : "n", 1));
        for (;;) pause();
    }
    char answer = 'n';
    EXPECT_EQ(1, read(ready[0], &answer, 1));
    EXPECT_EQ('y', answer);
    EXPECT_GT(0, KELDExtStgPullOut(disk.Name().c_str(), 4));
    kill(child, SIGKILL);
    waitpid(child, nullptr, 0);
    EXPECT_EQ(0, KELDExtStgPullOut(disk.Name().c_str(), 4));
    close(ready[0]);
    close(ready[1]);
}
