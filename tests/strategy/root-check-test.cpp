#include "strategy/root-check.h"

#include "strategy-fixture.h"
#include "utils/error-code.h"

namespace {

class RootCheckTest : public StrategyFixture {};

struct RootCase {
    bool is_export;
    bool is_device_gone;
    bool is_share_gone;
    int roots;
    int destination;
};

constexpr RootCase CASES[] = {
    {false, false, false, ERR_SUCCESS,           ERR_SUCCESS          },
    {false, true,  false, ERR_SRC_ROOT_MISS,     ERR_SUCCESS          },
    {false, false, true,  ERR_SHARE_NOT_MOUNTED, ERR_SHARE_NOT_MOUNTED},
    {false, true,  true,  ERR_SRC_ROOT_MISS,     ERR_SHARE_NOT_MOUNTED},
    {true,  false, false, ERR_SUCCESS,           ERR_SUCCESS          },
    {true,  true,  false, ERR_DST_ROOT_MISS,     ERR_DST_ROOT_MISS    },
    {true,  false, true,  ERR_SHARE_NOT_MOUNTED, ERR_SUCCESS          },
    {true,  true,  true,  ERR_DST_ROOT_MISS,     ERR_DST_ROOT_MISS    },
};

TEST_F(RootCheckTest, TheDestinationIsAskedForByItself) {
    for (const RootCase& c : CASES) {
        SCOPED_TRACE(testing::Message() << c.is_export << c.is_device_gone << c.is_share_gone);
        m_fake.AddDevice({.mount_path = m_usb, .dev_path = "/dev/sdb1"});
        if (c.is_device_gone) m_fake.Pull(m_usb);
        m_fake.LockShare("photos", c.is_share_gone);
        m_task.is_export = c.is_export;
        EXPECT_EQ(c.roots, CheckTaskRoots(m_task));
        EXPECT_EQ(c.destination, CheckTaskDestination(m_task));
    }
}

TEST_F(RootCheckTest, ASourceFolderThatIsGoneSaysNothingAboutTheDestination) {
    m_task.src_dir_path += "/gone";
    EXPECT_EQ(ERR_SRC_ROOT_MISS, CheckTaskRoots(m_task));
    EXPECT_EQ(ERR_SUCCESS, CheckTaskDestination(m_task));
}

}  // namespace
