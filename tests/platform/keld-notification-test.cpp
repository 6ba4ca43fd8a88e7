#include "platform/keld-notification.h"

#include <gtest/gtest.h>

#include "fake/fake-keld.h"
#include "support/log-capture.h"

namespace {

using Variables = std::map<std::string, std::string>;

class KeldNotificationTest : public testing::Test {
protected:
    KeldNotificationTest() { m_fake.SetHostname("box"); }

    FakeNotification Sent(int code, const std::string& name = "my task") {
        EXPECT_EQ(0, SendNotification(7, name, code));
        const auto all = m_fake.Notifications();
        EXPECT_FALSE(all.empty());
        return all.empty() ? FakeNotification() : all.back();
    }

    FakeKeld& m_fake = FakeKeld::Reset();
};

TEST_F(KeldNotificationTest, EveryCodeHasItsTagAndOnlyErrorsTellTheirNumber) {
    const std::map<int, std::string> tags = {
        {-1,  "FERRIXDisconnect"},
        {0,   "FERRIXFinished"  },
        {-19, "FERRIXNospace"   }
    };
    for (int code = -24; code <= 1; ++code) {
        Variables expected = {
            {"%TASKNAME%", "my task"    },
            {"%HOSTNAME%", "box"        },
            {"%COPY%",     "Ferrix Copy"}
        };
        const auto tag = tags.find(code);
        if (tag == tags.end()) expected["%ERR%"] = std::to_string(code);
        const FakeNotification sent = Sent(code);
        EXPECT_EQ(tag == tags.end() ? "FERRIXError" : tag->second, sent.tag) << code;
        EXPECT_EQ(expected, sent.variables) << code;
    }
}

TEST_F(KeldNotificationTest, NamesOfTasksPassUnharmed) {
    for (const std::string name : {"", "it's 50% \"odd\" %s", "two\nlines", "\xff\xfe"}) {
        EXPECT_EQ(name, Sent(0, name).variables["%TASKNAME%"]);
    }
}

TEST_F(KeldNotificationTest, HostNameOf64BytesIsTaken) {
    const std::string name(64, 'h');
    m_fake.SetHostname(name);
    EXPECT_EQ(name, Sent(0).variables["%HOSTNAME%"]);
}

TEST_F(KeldNotificationTest, UnknownHostNameIsAFailureAndNothingIsSent) {
    m_fake.FailCall("KELDLnxGetHostname", 0xA500);
    const LogCapture log;
    EXPECT_EQ(-1, SendNotification(7, "task", 0));
    EXPECT_EQ(std::vector<std::string>{"[ERR] KELDLnxGetHostname failed.(A500)"}, log.Lines());
    EXPECT_TRUE(m_fake.Notifications().empty());
}

TEST_F(KeldNotificationTest, WithoutAHashNothingIsSentAndThatIsNoFailure) {
    m_fake.FailCall("KLIBCSzHashAlloc");
    EXPECT_EQ(0, SendNotification(7, "task", 0));
    EXPECT_TRUE(m_fake.Notifications().empty());
    EXPECT_EQ(0, m_fake.CallCount("KELDSysNotifySendNotifiction"));
}

TEST_F(KeldNotificationTest, UndeliveredNotificationIsNoFailure) {
    m_fake.FailCall("KELDSysNotifySendNotifiction");
    EXPECT_EQ(0, SendNotification(7, "task", -5));
}

TEST_F(KeldNotificationTest, NoHashLeaksWhicheverCallFails) {
    int nth = 1;
    for (;; ++nth) {
        FakeKeld& fake = FakeKeld::Reset();
        fake.FailNthCall(nth);
        const int result = SendNotification(7, "task", -5);
        if (!fake.Failed()) break;
        EXPECT_EQ(nth == 1 ? -1 : 0, result) << nth;
        EXPECT_EQ(nth <= 2 ? 0 : 1, fake.CallCount("KELDSysNotifySendNotifiction")) << nth;
    }
    EXPECT_LT(3, nth) << "the leak checker watches the hashes of this loop";
}

}  // namespace
