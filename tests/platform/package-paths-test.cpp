#include "platform/package-paths.h"

#include <gtest/gtest.h>

namespace {

TEST(PackagePathsTest, FilesOfThePackageStandAtTheirFixedPaths) {
    EXPECT_EQ("/var/packages/Ferrix/etc/setting.conf", SettingPath());
    EXPECT_EQ("/var/packages/Ferrix/etc/status", StatusPath());
    EXPECT_EQ("/var/packages/Ferrix/etc/status.lock", StatusLockPath());
    EXPECT_EQ("/var/packages/Ferrix/target/etc/ferrix_system.filter", SystemFilterPath());
    EXPECT_EQ("/var/packages/Ferrix/target/bin/ferrix-notifier", NotifierPath());
    EXPECT_EQ("/var/packages/Ferrix/enabled", PackagePath("/enabled"));
}

TEST(PackagePathsTest, TestsPutAnotherFolderInItsPlaceAndTakeItAway) {
    SetPackageFolderForTest("/scratch");
    EXPECT_EQ("/scratch/etc/setting.conf", SettingPath());
    SetPackageFolderForTest("");
    EXPECT_EQ("/var/packages/Ferrix/etc/setting.conf", SettingPath());
}

}  // namespace
