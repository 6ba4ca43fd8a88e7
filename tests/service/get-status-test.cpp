#include "service/service-fixture.h"

namespace {

class GetStatusTest : public ServiceTest {};

TEST_F(GetStatusTest, WhatWasWrittenIsRead) {
    ASSERT_EQ(0, SetServiceStatus({5, "err_sys"}));
    ServiceStatus status;
    EXPECT_EQ(0, GetServiceStatus(status));
    EXPECT_EQ(5, status.state);
    EXPECT_EQ("err_sys", status.error);
    ASSERT_EQ(0, SetServiceStatus({6, ""}));
    EXPECT_EQ(0, GetServiceStatus(status));
    EXPECT_EQ(6, status.state);
    EXPECT_EQ("", status.error);
}

TEST_F(GetStatusTest, AStatusThatCannotBeReadIsTold) {
    ServiceStatus status{9, "untouched"};
    EXPECT_EQ(-1, GetServiceStatus(status));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get ferrix copy service state."));
    ASSERT_EQ(0, SetServiceStatus({4, ""}));
    m_fake.FailCall("KLIBCFileGetKeyValue", KELDERR_SYSTEM, 1, 1);
    EXPECT_EQ(-1, GetServiceStatus(status));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get ferrix copy service error state."));
    SetPackageFolderForTest(m_dir / "none");
    EXPECT_EQ(-1, GetServiceStatus(status));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to open ferrix copy status lock file."));
    EXPECT_EQ(9, status.state);
    EXPECT_EQ("untouched", status.error);
}

}  // namespace
