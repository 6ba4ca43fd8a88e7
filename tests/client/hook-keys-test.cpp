#include "client/hook-keys.h"

#include <gtest/gtest.h>

#include "client/exit-status.h"

namespace {

using Keys = std::vector<std::pair<std::string, std::string>>;

ExitStatus StatusOf(const std::function<void()>& command) {
    try {
        command();
    } catch (const CommandError& error) {
        return error.Status();
    }
    return EXIT_DONE;
}

}  // namespace

TEST(HookKeysTest, AreTakenApartAtTheFirstEqualsSign) {
    EXPECT_EQ((Keys{
                  {"mountpoint", "/media/a=b"},
                  {"device",     ""          }
    }),
              HookKeys({"mountpoint=/media/a=b", "device="}));
    EXPECT_EQ(Keys{}, HookKeys({}));
}

TEST(HookKeysTest, WhatIsNoKeyAndValueIsRefused) {
    for (const char* text : {"mountpoint", "=value", "", "action=stop", "notify=x", "type=x",
                             "need_ack=", "_action=stop"}) {
        EXPECT_EQ(EXIT_USAGE, StatusOf([text] { (void)HookKeys({text}); })) << text;
    }
    EXPECT_EQ(EXIT_USAGE, StatusOf([] { (void)HookKeys({"a=1", "a=2"}); })) << "given twice";
}

TEST(HookTypeTest, EachNameHasTheKindThatTheBoxUses) {
    EXPECT_EQ("volume_hook", HookType("post_mount"));
    EXPECT_EQ("volume_hook", HookType("pre_unmount"));
    EXPECT_EQ("ferrix_hook", HookType("post_ferrix"));
    for (const char* name :
         {"pre_path_change", "post_path_change", "pre_delete", "pre_encrypt", "post_decrypt",
          "pre_snapshot_restore", "post_snapshot_restore", "pre_transform", "post_transform"}) {
        EXPECT_EQ("share_hook", HookType(name)) << name;
    }
    EXPECT_EQ(EXIT_USAGE, StatusOf([] { (void)HookType("post_nothing"); }));
}
