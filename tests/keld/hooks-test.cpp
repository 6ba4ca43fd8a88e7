#include <fcntl.h>
#include <keld/error.h>
#include <keld/index.h>
#include <keld/indicator.h>
#include <keld/notify.h>
#include <keld/service.h>
#include <linux/input.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>

#include "host-fixture.h"
#include "support/log-capture.h"
#include "utils/unique-fd.h"

namespace {

class Hooks : public HostFixture {
protected:
    void Hook(const std::string& folder, const std::string& body) const {
        const std::string path =
            m_dir.Write("etc/keld/" + folder + "/hook",
                        "#!/bin/sh\nout='" + (m_dir / "out") + "'\n" + body + "\n");
        ASSERT_EQ(0, chmod(path.c_str(), 0755));
    }
    std::string Out() const { return ReadWholeFile(m_dir / "out"); }
};

class Hash {
public:
    Hash() : m_hash(KLIBCSzHashAlloc(512)) {}
    ~Hash() { KLIBCSzHashFree(m_hash); }
    Hash(const Hash&) = delete;
    Hash& operator=(const Hash&) = delete;
    Hash& Set(const char* key, const char* value) {
        EXPECT_EQ(0, KLIBCSzHashSetValue(&m_hash, key, value));
        return *this;
    }
    [[nodiscard]] KLIBCSzHash* Get() const { return m_hash; }

private:
    KLIBCSzHash* m_hash;
};

}  // namespace

TEST(StringHash, KeepsTheLastValueOfAKey) {
    Hash hash;
    hash.Set("%A%", "1").Set("%B%", "2").Set("%A%", "3");
    EXPECT_STREQ("3", KLIBCSzHashGetValue(hash.Get(), "%A%"));
    EXPECT_STREQ("2", KLIBCSzHashGetValue(hash.Get(), "%B%"));
    EXPECT_EQ(nullptr, KLIBCSzHashGetValue(hash.Get(), "A"));
}

TEST(StringHash, RefusesWhatIsMissing) {
    Hash hash;
    KLIBCSzHash* raw = hash.Get();
    KLIBCSzHash* none = nullptr;
    EXPECT_GT(0, KLIBCSzHashSetValue(&raw, nullptr, "x"));
    EXPECT_GT(0, KLIBCSzHashSetValue(&raw, "x", nullptr));
    EXPECT_GT(0, KLIBCSzHashSetValue(&none, "x", "x"));
    EXPECT_GT(0, KLIBCSzHashSetValue(nullptr, "x", "x"));
    EXPECT_EQ(nullptr, KLIBCSzHashAlloc(-1));
    KLIBCSzHashFree(nullptr);
}

TEST_F(Hooks, ANotificationRunsTheProgramsWithTagTextAndVariables) {
    Hook("notify.d", "env | grep ^KELD_NOTIFY | sort > $out");
    Hash hash;
    hash.Set("%TASKNAME%", "My \"task\" $x")
        .Set("%HOSTNAME%", "box")
        .Set("%COPY%", "Ferrix Copy")
        .Set("%ERR%", "-5");
    const LogCapture log;
    EXPECT_EQ(0, KELDSysNotifySendNotifiction("FERRIXError", hash.Get()));
    const std::string text =
        "Ferrix Copy on box: task \"My \"task\" $x\" has failed with error -5.";
    EXPECT_EQ(
        "KELD_NOTIFY_COPY=Ferrix Copy\nKELD_NOTIFY_ERR=-5\nKELD_NOTIFY_HOSTNAME=box\n"
        "KELD_NOTIFY_TAG=FERRIXError\nKELD_NOTIFY_TASKNAME=My \"task\" $x\nKELD_NOTIFY_TEXT=" +
            text + "\n",
        Out());
    EXPECT_EQ(std::vector<std::string>{"[NOTICE] notification FERRIXError: " + text}, log.Lines());
}

TEST_F(Hooks, EveryTagOfTheDaemonHasAText) {
    Hash hash;
    hash.Set("%TASKNAME%", "T").Set("%HOSTNAME%", "H").Set("%COPY%", "C").Set("%ERR%", "E");
    const LogCapture log;
    for (const char* tag : {"FERRIXFinished", "FERRIXDisconnect", "FERRIXNospace", "FERRIXError"}) {
        EXPECT_EQ(0, KELDSysNotifySendNotifiction(tag, hash.Get()));
        EXPECT_TRUE(log.Contains("notification " + std::string(tag) + ": C on H: ")) << tag;
        EXPECT_FALSE(log.Contains("%")) << tag;
    }
}

TEST_F(Hooks, AVariableInAValueIsNotExpandedAgain) {
    Hash hash;
    hash.Set("%TASKNAME%", "%COPY% %").Set("%HOSTNAME%", "H").Set("%COPY%", "C");
    const LogCapture log;
    EXPECT_EQ(0, KELDSysNotifySendNotifiction("FERRIXFinished", hash.Get()));
    EXPECT_TRUE(log.Contains("C on H: task \"%COPY% %\" has finished."));
}

TEST_F(Hooks, AnUnknownTagIsItsOwnText) {
    const LogCapture log;
    EXPECT_EQ(0, KELDSysNotifySendNotifiction("Other", nullptr));
    EXPECT_EQ(std::vector<std::string>{"[NOTICE] notification Other: Other"}, log.Lines());
    EXPECT_GT(0, KELDSysNotifySendNotifiction("", nullptr));
    EXPECT_GT(0, KELDSysNotifySendNotifiction(nullptr, nullptr));
}

TEST_F(Hooks, AVariableCannotTakeThePlaceOfTagTextOrAnother) {
    Hook("notify.d", "env | grep ^KELD_NOTIFY | sort > $out");
    Hash hash;
    hash.Set("%TAG%", "evil").Set("%TEXT%", "evil").Set("%A=B%", "evil").Set("%%", "evil");
    EXPECT_EQ(0, KELDSysNotifySendNotifiction("Other", hash.Get()));
    EXPECT_EQ("KELD_NOTIFY_TAG=Other\nKELD_NOTIFY_TEXT=Other\n", Out());
}

TEST_F(Hooks, AFailingProgramMakesTheDeliveryAFailure) {
    Hook("notify.d", "exit 1");
    EXPECT_GT(0, KELDSysNotifySendNotifiction("Other", nullptr));
}

TEST_F(Hooks, TheFoldersAreThoseOfTheConfiguration) {
    Hook("elsewhere", "echo \"$0 $1\" > $out");
    Conf("[hooks]\nnotify = $/etc/keld/elsewhere\nindex =\n");
    EXPECT_EQ(0, KELDSysNotifySendNotifiction("Other", nullptr));
    EXPECT_EQ((m_dir / "etc/keld/elsewhere/hook") + " \n", Out());
}

TEST_F(Hooks, AnIndexedPathIsTheArgumentOfThePrograms) {
    Hook("index.d", "printf '%s|' \"$@\" > $out");
    EXPECT_EQ(0, KLIBKeldIndexAddEx("/volume1/a b\n$x", 0, 3, 0, 0));
    EXPECT_EQ("/volume1/a b\n$x|", Out());
    EXPECT_GT(0, KLIBKeldIndexAddEx("relative", 0, 3, 0, 0));
    EXPECT_GT(0, KLIBKeldIndexAddEx(nullptr, 0, 3, 0, 0));
}

TEST_F(Hooks, TheHostNameIsTheSystems) {
    char expected[256] = "";
    ASSERT_EQ(0, gethostname(expected, sizeof(expected)));
    char name[KELD_HOSTNAME_SIZE];
    EXPECT_EQ(0, KELDLnxGetHostname(name));
    EXPECT_STREQ(expected, name);
    EXPECT_GT(0, KELDLnxGetHostname(nullptr));
}

struct LedCase {
    int code;
    const char* trigger;
    const char* brightness;
};

constexpr LedCase kLedCases[] = {
    {64, "timer", "old"},
    {66, "timer", "old"},
    {10, "none",  "1"  },
    {12, "none",  "0"  },
    {65, "none",  "0"  },
};

TEST_F(Hooks, EachLedCodeSetsItsPattern) {
    Conf("[indicator]\nled = $/led\n");
    for (const LedCase& row : kLedCases) {
        m_dir.Write("led/trigger", "old");
        m_dir.Write("led/brightness", "old");
        EXPECT_EQ(0, KLIBScemdNotify(row.code)) << row.code;
        EXPECT_EQ(row.trigger, ReadWholeFile(m_dir / "led/trigger")) << row.code;
        EXPECT_EQ(row.brightness, ReadWholeFile(m_dir / "led/brightness")) << row.code;
    }
    EXPECT_GT(0, KLIBScemdNotify(63));
}

TEST_F(Hooks, WithoutALedNothingIsDoneAndAMissingOneFails) {
    for (const LedCase& row : kLedCases) EXPECT_EQ(0, KLIBScemdNotify(row.code));
    Conf("[indicator]\nled = $/none\n");
    EXPECT_GT(0, KLIBScemdNotify(64));
    EXPECT_EQ(KELDERR_SRC_MISS, KLIBCErrGet());
}

TEST_F(Hooks, ABeepIsOneToneOnAndOff) {
    m_dir.Write("speaker", "");
    Conf("[indicator]\nspeaker = $/speaker\n");
    EXPECT_EQ(0, KELDHWExternalControl(0x5302, 0, 0));
    EXPECT_EQ(0, KELDHWExternalControl(0x5301, 0, 0));
    const std::string bytes = ReadWholeFile(m_dir / "speaker");
    input_event events[4];
    ASSERT_EQ(sizeof(events), bytes.size());
    memcpy(events, bytes.data(), sizeof(events));
    EXPECT_EQ(EV_SND, events[0].type);
    EXPECT_EQ(SND_TONE, events[0].code);
    EXPECT_LT(0, events[0].value);
    EXPECT_EQ(EV_SYN, events[1].type);
    EXPECT_EQ(EV_SND, events[2].type);
    EXPECT_EQ(SND_TONE, events[2].code);
    EXPECT_EQ(0, events[2].value);
    EXPECT_EQ(EV_SYN, events[3].type);
}

TEST_F(Hooks, WithoutASpeakerNothingIsDoneAndAMissingOneFails) {
    EXPECT_EQ(0, KELDHWExternalControl(0x5302, 0, 0));
    EXPECT_GT(0, KELDHWExternalControl(0x5303, 0, 0));
    Conf("[indicator]\nspeaker = $/none\n");
    EXPECT_GT(0, KELDHWExternalControl(0x5302, 0, 0));
}

TEST_F(Hooks, TheBoxesLogTellsStartAndStop) {
    const LogCapture log;
    EXPECT_EQ(0, KELDLogSet1(1, 1, 0x11b01050, "Ferrix Copy", "", "", ""));
    EXPECT_EQ(0, KELDLogSet1(1, 1, 0x11b01051, "Ferrix Copy", "", "", ""));
    EXPECT_TRUE(log.Contains("Ferrix Copy: started (0x11b01050)"));
    EXPECT_TRUE(log.Contains("Ferrix Copy: stopped (0x11b01051)"));
    EXPECT_GT(0, KELDLogSet1(1, 1, 1, nullptr, "", "", ""));
}

TEST_F(Hooks, AServiceIsEnabledWhenATargetWantsItsUnit) {
    m_dir.Write("etc/systemd/system/multi-user.target.wants/smbd.service", "");
    EXPECT_EQ(1, KLIBServiceIsEnabled("smbd"));
    EXPECT_EQ(0, KLIBServiceIsEnabled("nfsd"));
    EXPECT_GT(0, KLIBServiceIsEnabled("*"));
    EXPECT_GT(0, KLIBServiceIsEnabled(""));
}

TEST_F(Hooks, TheSourcesOfUsersAreThoseOfTheNameServiceSwitch) {
    EXPECT_EQ(0, KELDLDAPIsBinded());
    m_dir.Write("etc/nsswitch.conf",
                "# passwd: winbind\npasswd: files ldap # winbind\ngroup: winbind\n");
    EXPECT_EQ(1, KELDLDAPIsBinded());
    EXPECT_EQ(0, KELDWinsIsJoined());
}

TEST_F(Hooks, HomesAreThereWhenTheirShareIs) {
    EXPECT_EQ(0, KELDServiceUserHomeIsEnabled());
    m_dir.MakeDir("volume1/homes");
    EXPECT_EQ(1, KELDServiceUserHomeIsEnabled());
}
