// Plugged-in devices as the kernel has them: images on loop devices, really mounted.
#include <keld/keyfile.h>
#include <sys/stat.h>
#include <unistd.h>

#include "device-fixture.h"

INSTANTIATE_TEST_SUITE_P(Kinds, DeviceOfKind, ::testing::Values("ext4", "xfs", "btrfs", "exfat"),
                         [](const auto& test) { return std::string(test.param); });

TEST_P(DeviceOfKind, IsAVolumeAndAShareForAsLongAsItIsMounted) {
    LoopDisk disk(GetParam(), 0);
    PlugIn(disk);
    EXPECT_EQ(Volumes{}, Plugged());
    const std::string path = disk.Mount(m_dir / "mnt/STICK");
    EXPECT_EQ((Volumes{
                  {path, disk.Node()}
    }),
              Plugged());
    EXPECT_EQ("STICK " + path, ShareOf(path + "/DCIM/a.jpg"));
    char text[64];
    EXPECT_EQ(0, KELDVolPathToDevPath(path.c_str(), text, sizeof(text)));
    EXPECT_EQ(disk.Node(), text);
    KELDShare* share = nullptr;
    ASSERT_EQ(0, KELDShareGet("STICK", &share));
    EXPECT_EQ(path, share->path);
    int status = -1;
    EXPECT_EQ(0, KLIBShareRecycleStatusGet(share, &status));
    EXPECT_EQ(0, status);
    EXPECT_EQ(0, KLIBShareIsEncryptedGet(share, &status));
    EXPECT_EQ(0, status);
    KELDShareFree(share);

    Unmount(path);
    EXPECT_EQ(Volumes{}, Plugged());
    EXPECT_EQ("(none)", ShareOf(path + "/DCIM/a.jpg"));
    EXPECT_GT(0, KELDShareGet("STICK", &share));
    EXPECT_GT(0, KELDVolPathToDevPath(path.c_str(), text, sizeof(text)));
}

TEST_P(DeviceOfKind, IsPresentUntilItIsUnmounted) {
    LoopDisk disk(GetParam(), 0);
    const std::string path = disk.Mount(m_dir / "mnt");
    ASSERT_EQ(0, mkdir((path + "/below").c_str(), 0700));
    const std::string identity = Identity(path);
    EXPECT_NE(Identity(m_dir.Path()), identity);
    EXPECT_EQ(1, KELDDevIsPresent(path.c_str(), identity.c_str()));
    EXPECT_EQ(1, KELDDevIsPresent((path + "/below").c_str(), identity.c_str()));
    Unmount(path);
    EXPECT_EQ(0, KELDDevIsPresent(path.c_str(), identity.c_str()));
    EXPECT_EQ(0, KELDDevIsPresent((path + "/below").c_str(), identity.c_str()));
}

TEST_P(DeviceOfKind, AnotherDiskOnTheSamePathAndNumberIsNotTheOldOne) {
    LoopDisk disk(GetParam(), 0);
    LoopDisk other(GetParam(), 0);
    const std::string path = disk.Mount(m_dir / "mnt");
    const std::string identity = Identity(path);
    Unmount(path);
    const std::string node = disk.Node();
    disk.Exchange(other);
    ASSERT_EQ(node, disk.Node());
    disk.Mount(path);
    EXPECT_EQ(0, KELDDevIsPresent(path.c_str(), identity.c_str()));
    EXPECT_EQ(1, KELDDevIsPresent(path.c_str(), Identity(path).c_str()));
}

TEST_P(DeviceOfKind, HoldsAKeyFile) {
    LoopDisk disk(GetParam(), 0);
    const std::string folder = disk.Mount(m_dir / "mnt") + "/@eaDir";
    ASSERT_EQ(0, mkdir(folder.c_str(), 0777));
    const std::string file = folder + "/.KeldoranFerrix.config";
    char value[64];
    for (const std::string text : {"first", "second"}) {
        EXPECT_EQ(0, KLIBCFileSetKeyValue(file.c_str(), "uuid", text.c_str(), nullptr));
        EXPECT_EQ(1, KLIBCFileGetKeyValue(file.c_str(), "uuid", value, sizeof(value), 0));
        EXPECT_EQ(text, value);
    }
    EXPECT_EQ(1, KLIBCFileRemoveKey(file.c_str(), "uuid"));
    ASSERT_EQ(0, unlink(file.c_str()));
    EXPECT_EQ(0, rmdir(folder.c_str())) << "something was left beside the key file";
}

TEST_F(DeviceMount, ADeviceMountedInAVolumeIsADeviceAndNoShareOfTheVolume) {
    LoopDisk disk("ext4", 0);
    PlugIn(disk);
    m_dir.MakeDir("volume1/photos");
    const std::string path = m_dir.MakeDir("volume1/STICK");
    EXPECT_EQ("STICK " + path, ShareOf(path + "/x"));
    EXPECT_EQ(Volumes{}, Plugged());
    disk.Mount(path);
    EXPECT_EQ("STICK " + path, ShareOf(path + "/x"));
    EXPECT_EQ((Volumes{
                  {path, disk.Node()}
    }),
              Plugged());
    EXPECT_EQ("photos " + (m_dir / "volume1/photos"), ShareOf(m_dir / "volume1/photos/x"));
}

TEST_F(DeviceMount, ARemountedDeviceIsPresentAgain) {
    LoopDisk disk("ext4", 0);
    const std::string path = disk.Mount(m_dir / "mnt");
    const std::string identity = Identity(path);
    Unmount(path);
    disk.Mount(path);
    EXPECT_EQ(1, KELDDevIsPresent(path.c_str(), identity.c_str()));
}

TEST_F(DeviceMount, AnotherPartitionOfTheSameDiskIsNotTheOldOne) {
    LoopDisk disk("ext4", 2);
    const std::string path = disk.Mount(m_dir / "mnt", 1);
    const std::string identity = Identity(path);
    EXPECT_EQ(1, KELDDevIsPresent(path.c_str(), identity.c_str()));
    Unmount(path);
    disk.Mount(path, 2);
    EXPECT_EQ(0, KELDDevIsPresent(path.c_str(), identity.c_str()));
}

TEST_F(DeviceMount, ADeviceThatNobodyNamesIsNotPluggedIn) {
    LoopDisk disk("ext4", 0);
    const std::string path = disk.Mount(m_dir / "mnt");
    EXPECT_EQ(Volumes{}, Plugged());
    EXPECT_EQ("(none)", ShareOf(path + "/x"));
    EXPECT_GT(0, KELDExtStgPullOut(disk.Name().c_str(), 4));
    EXPECT_TRUE(IsMounted(path));
    KELDUSBDevInfo info{};
    EXPECT_EQ(0, KELDUSBDevGetInfo(disk.Name().c_str(), &info));
    EXPECT_EQ(0, info.is_removable);
    PlugIn(disk);
    EXPECT_EQ(0, KELDUSBDevGetInfo(disk.Name().c_str(), &info));
    EXPECT_EQ(disk.Name(), info.name);
    EXPECT_EQ(1, info.is_removable);
    EXPECT_EQ(0, info.is_usb);
    EXPECT_EQ(0, info.is_mmc);
    EXPECT_STREQ("", info.port);
    EXPECT_EQ((Volumes{
                  {path, disk.Node()}
    }),
              Plugged());
}

TEST_F(DeviceMount, ADiskWithoutAPartitionTableHasOnePartition) {
    const LoopDisk disk("ext4", 0);
    DiskPartition layout[1];
    ASSERT_EQ(1, DiskPartitionsLayoutGet(disk.Name().c_str(), layout, 1));
    EXPECT_EQ(disk.Name(), layout[0].name);
    EXPECT_EQ(0u, layout[0].start);
    EXPECT_LT(300u << 20, layout[0].size);
}

TEST_F(DeviceMount, PartitionsAreCountedAndBelongToTheirDisk) {
    LoopDisk disk("ext4", 3);
    PlugIn(disk);
    DiskPartition layout[2] = {};
    EXPECT_EQ(3, DiskPartitionsLayoutGet(disk.Name().c_str(), layout, 2));
    EXPECT_EQ(disk.Name() + "p1", layout[0].name);
    EXPECT_EQ(2048u * 512, layout[0].start);
    EXPECT_EQ(320u << 20, layout[0].size);
    EXPECT_EQ(disk.Name() + "p2", layout[1].name);
    EXPECT_EQ(layout[0].start + layout[0].size, layout[1].start);
    EXPECT_GT(0, DiskPartitionsLayoutGet((disk.Name() + "p1").c_str(), layout, 2));
    const std::string path = disk.Mount(m_dir / "mnt", 2);
    EXPECT_EQ((Volumes{
                  {path, disk.Node(2)}
    }),
              Plugged());
    EXPECT_GT(0, KELDExtStgPullOut((disk.Name() + "p2").c_str(), 4));
    EXPECT_TRUE(IsMounted(path));
}

TEST_F(DeviceMount, ALoopDeviceWithoutAnImageHasNoPartitions) {
    std::string name;
    {
        const LoopDisk disk("ext4", 0);
        name = disk.Name();
    }
    EXPECT_GT(0, DiskPartitionsLayoutGet(name.c_str(), nullptr, 0));
}

TEST_F(DeviceMount, OfTwoDevicesOfOneNameTheLaterOneGetsANumber) {
    LoopDisk disk("ext4", 2);
    const std::string first = disk.Mount(m_dir / "b/STICK", 2);
    const std::string second = disk.Mount(m_dir / "a/STICK", 1);
    PlugIn(disk);
    EXPECT_EQ("STICK " + first, ShareOf(first));
    EXPECT_EQ("STICK_2 " + second, ShareOf(second));
    Conf("[removable]\ndevices = " + disk.Node() + "\n[share s]\npath = $/v/STICK\n");
    EXPECT_EQ("STICK " + (m_dir / "v/STICK"), ShareOf(m_dir / "v/STICK/x"));
    EXPECT_EQ("STICK_2 " + first, ShareOf(first));
    EXPECT_EQ("STICK_3 " + second, ShareOf(second));
}

TEST_F(DeviceMount, AVolumeOrAConfiguredShareOnAPluggedInDiskIsNoDevice) {
    LoopDisk disk("ext4", 2);
    const std::string volume = disk.Mount(m_dir / "volume1", 1);
    const std::string share = disk.Mount(m_dir / "vault", 2);
    Conf("[removable]\ndevices = /dev/" + disk.Name() +
         "*\n[share v]\npath = $/vault\nmount_point = yes\n");
    EXPECT_EQ(Volumes{}, Plugged());
    EXPECT_EQ("vault " + share, ShareOf(share + "/x"));
    EXPECT_EQ("(none)", ShareOf(volume + "/x"));
    KELDShare* record = nullptr;
    ASSERT_EQ(0, KELDShareGet("vault", &record));
    int status = -1;
    EXPECT_EQ(0, KLIBShareIsEncryptedGet(record, &status));
    EXPECT_EQ(0, status);
    Unmount(share);
    EXPECT_EQ(0, KLIBShareIsEncryptedGet(record, &status));
    EXPECT_EQ(1, status);
    KELDShareFree(record);
}

TEST_F(DeviceMount, AFolderOfADeviceBoundElsewhereIsNoDeviceOfItsOwn) {
    LoopDisk disk("ext4", 0);
    PlugIn(disk);
    const std::string path = disk.Mount(m_dir / "mnt");
    ASSERT_EQ(0, mkdir((path + "/sub").c_str(), 0700));
    const std::string bound = disk.Bind(path + "/sub", m_dir / "bound");
    EXPECT_EQ((Volumes{
                  {path, disk.Node()}
    }),
              Plugged());
    Unmount(bound);
}

TEST_F(DeviceMount, OfTwoDevicesOnOneFolderTheUpperOneCounts) {
    LoopDisk disk("ext4", 2);
    PlugIn(disk);
    const std::string path = disk.Mount(m_dir / "mnt", 1);
    disk.Mount(path, 2);
    EXPECT_EQ((Volumes{
                  {path, disk.Node(2)}
    }),
              Plugged());
    Unmount(path);
    EXPECT_EQ((Volumes{
                  {path, disk.Node(1)}
    }),
              Plugged());
    disk.Mount(path, 2);
    EXPECT_EQ(0, KELDExtStgPullOut(disk.Name().c_str(), 4));
    EXPECT_FALSE(IsMounted(path));
}

TEST_F(DeviceMount, AVolumeMountedReadOnlyIsNotWritable) {
    LoopDisk disk("ext4", 0);
    const std::string path = disk.Mount(m_dir / "volume1", 0, "ro");
    KELDMountVolInfo* info = KELDMountVolInfoGet(path.c_str());
    ASSERT_NE(nullptr, info);
    EXPECT_EQ(1, info->is_mounted);
    EXPECT_EQ(0, info->is_writable);
    EXPECT_EQ(disk.Node(), info->device_path);
    KELDMountVolInfoFree(info);
}

TEST_F(DeviceMount, MountPathsMayHoldBlanksAndNewlines) {
    LoopDisk disk("ext4", 0);
    PlugIn(disk);
    const std::string path = disk.Mount(m_dir / "my stick\n\\040");
    EXPECT_EQ((Volumes{
                  {path, disk.Node()}
    }),
              Plugged());
    EXPECT_EQ("my stick\n\\040 " + path, ShareOf(path + "/x"));
    EXPECT_EQ(0, KELDExtStgPullOut(disk.Name().c_str(), 4));
    EXPECT_FALSE(IsMounted(path));
}
