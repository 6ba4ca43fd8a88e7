// Fixtures for tests with really mounted devices; skipped without root.
#pragma once

#include <gtest/gtest.h>
#include <keld/device.h>
#include <keld/error.h>
#include <keld/fs.h>
#include <keld/share.h>
#include <keld/volume.h>
#include <sys/mount.h>

#include <fstream>
#include <map>
#include <string>

#include "host-fixture.h"
#include "loop-disk.h"

using Volumes = std::map<std::string, std::string>;  // mount path, device path

class DeviceMount : public HostFixture {
protected:
    void SetUp() override {
        const std::string reason = WhyNoLoop();
        if (!reason.empty()) GTEST_SKIP() << reason;
        EnterMountNamespace();
        keld_host::SetPaths(keld_host::Paths());  // looks at the new namespace from now on
    }

    static Volumes Plugged() {
        Volumes found;
        KELDMountVolInfo* list = KELDMountVolAllEnum(0, 4);
        EXPECT_EQ(KELDERR_SUCCESS, KLIBCErrGet());
        for (const KELDMountVolInfo* node = list; node != nullptr; node = node->next) {
            EXPECT_EQ(1, node->is_mounted);
            EXPECT_EQ(0, node->is_internal);
            found[node->mount_path] = node->device_path;
        }
        KELDMountVolInfoFree(list);
        return found;
    }
    static std::string ShareOf(const std::string& path) {
        char name[4095];
        char root[4095];
        return KELDShareNamePathGet(path.c_str(), name, sizeof(name), root, sizeof(root)) == 0
                   ? std::string(name) + " " + root
                   : "(none)";
    }
    static std::string Identity(const std::string& path) {
        char identity[KELD_DEV_IDENTITY_SIZE];
        EXPECT_EQ(0, KELDDevIdentityGet(path.c_str(), identity, sizeof(identity)));
        return identity;
    }
    static bool IsMounted(const std::string& path) {
        return KELDFSHasMountPoint(path.c_str()) == 1;
    }
    static void Unmount(const std::string& path) { ASSERT_EQ(0, umount2(path.c_str(), 0)) << path; }
    void PlugIn(const LoopDisk& disk) const {
        Conf("[removable]\ndevices = " + disk.Node() + "\n");
    }
    static void Put(const std::string& path, const std::string& text) {
        std::ofstream(path) << text;
    }
};

// The same for each kind of file system.
class DeviceOfKind : public DeviceMount, public ::testing::WithParamInterface<const char*> {
protected:
    void SetUp() override {
        const std::string reason = WhyNoLoop(GetParam());
        if (!reason.empty()) GTEST_SKIP() << reason;
        DeviceMount::SetUp();
    }
};
