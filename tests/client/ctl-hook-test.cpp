// "ferrixctl hook", from the command line to what the daemon is told.
#include "client/ctl-fixture.h"

using testing::HasSubstr;

namespace {

using CtlHookTest = CtlTest;

}  // namespace

TEST_F(CtlHookTest, TheKindFollowsFromTheNameUnlessItIsSaid) {
    TaskDaemon daemon(m_socket, {});
    ASSERT_EQ(EXIT_DONE, Run("hook pre_encrypt share_name=photos")) << m_errors;
    ASSERT_EQ(EXIT_DONE, Run("hook pre_encrypt --type volume_hook")) << m_errors;
    const std::vector<PObject> told = daemon.Requests();
    ASSERT_EQ(2U, told.size());
    EXPECT_EQ("pre_encrypt", told[0]["notify"].AsString());
    EXPECT_EQ("share_hook", told[0]["type"].AsString());
    EXPECT_EQ("photos", told[0]["share_name"].AsString());
    EXPECT_EQ("volume_hook", told[1]["type"].AsString());
}

TEST_F(CtlHookTest, ANameThatTheDaemonDoesNotKnowIsRefusedUnderEachKind) {
    TaskDaemon daemon(m_socket, {});
    for (const char* type : {"", "--type volume_hook", "--type ferrix_hook", "--type share_hook"}) {
        EXPECT_EQ(EXIT_USAGE, Run("hook post_moun " + std::string(type)));
        EXPECT_THAT(m_errors, HasSubstr("there is no hook \"post_moun\"; there are post_mount, "));
    }
    EXPECT_EQ(EXIT_USAGE, Run("hook post_mount --type any_hook"));
    EXPECT_TRUE(daemon.Requests().empty());
}
