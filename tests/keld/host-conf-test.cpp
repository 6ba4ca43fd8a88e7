#include "host/host-conf.h"

#include <sys/stat.h>
#include <unistd.h>

#include "host-fixture.h"
#include "support/log-capture.h"

using keld_host::CurrentHostConf;
using keld_host::HostConf;
using keld_host::HostConfError;
using keld_host::ParseHostConf;

namespace {

HostConf Parsed(const std::string& text) {
    HostConf conf;
    HostConfError error;
    EXPECT_TRUE(ParseHostConf(text, conf, error)) << error.line << ": " << error.reason;
    return conf;
}

}  // namespace

TEST(HostConfParser, EmptyTextGivesTheDefaults) {
    const HostConf conf = Parsed("");
    EXPECT_TRUE(conf.volumes.empty());
    EXPECT_TRUE(conf.shares.empty());
    EXPECT_TRUE(conf.removableDevices.empty());
    EXPECT_TRUE(conf.frontUsb.empty());
    EXPECT_TRUE(conf.sdSlot.empty());
    EXPECT_EQ("", conf.led);
    EXPECT_EQ("", conf.speaker);
    EXPECT_EQ("/etc/keld/notify.d", conf.notifyFolder);
    EXPECT_EQ("/etc/keld/index.d", conf.indexFolder);
}

TEST(HostConfParser, EveryKeyIsRead) {
    const HostConf conf = Parsed(
        "; a comment\n"
        "# another\n"
        "[volume /volume1]\n"
        "internal = no\n"
        "[share photos]\n"
        "path = /volume1/photos/ ; its last component is the share's name\n"
        "recycle_bin = yes\n"
        "recycle_bin_admin_only = yes\n"
        "mount_point = yes\n"
        "[removable]\n"
        "devices = /dev/loop*, /dev/sdz\n"
        "[location]\n"
        "front_usb = *\n"
        "sd_slot = mmcblk*\n"
        "[indicator]\n"
        "led = /sys/class/leds/green\n"
        "speaker = /dev/input/by-path/beep\n"
        "[hooks]\n"
        "notify = /opt/notify.d\n"
        "index =\n");
    ASSERT_EQ(1u, conf.volumes.count("/volume1"));
    EXPECT_FALSE(conf.volumes.at("/volume1").internal);
    ASSERT_EQ(1u, conf.shares.size());
    EXPECT_EQ("/volume1/photos", conf.shares[0].path);
    EXPECT_TRUE(conf.shares[0].recycleBin);
    EXPECT_TRUE(conf.shares[0].recycleBinAdminOnly);
    EXPECT_TRUE(conf.shares[0].mountPoint);
    EXPECT_EQ((std::vector<std::string>{"/dev/loop*", "/dev/sdz"}), conf.removableDevices);
    EXPECT_EQ((std::vector<std::string>{"*"}), conf.frontUsb);
    EXPECT_EQ((std::vector<std::string>{"mmcblk*"}), conf.sdSlot);
    EXPECT_EQ("/sys/class/leds/green", conf.led);
    EXPECT_EQ("/dev/input/by-path/beep", conf.speaker);
    EXPECT_EQ("/opt/notify.d", conf.notifyFolder);
    EXPECT_EQ("", conf.indexFolder);
}

TEST(HostConfParser, ShareFlagsAreOffByDefault) {
    const HostConf conf = Parsed("[share a]\npath = /volume1/a\n");
    EXPECT_FALSE(conf.shares[0].recycleBin);
    EXPECT_FALSE(conf.shares[0].recycleBinAdminOnly);
    EXPECT_FALSE(conf.shares[0].mountPoint);
}

TEST(HostConfParser, AVolumeWithoutKeysCounts) {
    const HostConf conf = Parsed("[volume /volume1]\n[volume /volume2]");
    ASSERT_EQ(2u, conf.volumes.size());
    EXPECT_TRUE(conf.volumes.at("/volume2").internal);
}

TEST(HostConfParser, LongNamesAndPathsAreReadWhole) {
    const std::string volume = "/srv/dev-disk-by-uuid-" + std::string(200, 'v');
    const std::string path = volume + "/" + std::string(250, 'p') + "/" + std::string(250, 's');
    const HostConf conf = Parsed("[volume " + volume + "]\n[share " + std::string(100, 'n') +
                                 "]\npath = " + path + " ; comment\nrecycle_bin=yes\n");
    EXPECT_EQ(1u, conf.volumes.count(volume));
    ASSERT_EQ(1u, conf.shares.size());
    EXPECT_EQ(path, conf.shares[0].path);
    EXPECT_TRUE(conf.shares[0].recycleBin);
}

TEST(HostConfParser, AnIndentedLineIsNotTheContinuationOfTheValueBefore) {
    const HostConf conf =
        Parsed("[share a]\n path = /volume1/a\n  recycle_bin = yes\n\t[share b]\n path=/volume1/b");
    ASSERT_EQ(2u, conf.shares.size());
    EXPECT_EQ("/volume1/a", conf.shares[0].path);
    EXPECT_TRUE(conf.shares[0].recycleBin);
    EXPECT_EQ("/volume1/b", conf.shares[1].path);
}

TEST(HostConfParser, WindowsLineEndsAndAByteOrderMarkAreFine) {
    const HostConf conf = Parsed("\xEF\xBB\xBF[share a]\r\npath = /volume1/a\r\n");
    EXPECT_EQ("/volume1/a", conf.shares.at(0).path);
}

TEST(HostConfParser, NamesThatAreNotUtf8AreKept) {
    const HostConf conf = Parsed("[share \xff]\npath = /volume1/\xfe\xff\n");
    EXPECT_EQ("/volume1/\xfe\xff", conf.shares.at(0).path);
}

TEST(HostConfSample, IsGoodAsItIsAndWithEveryExampleInForce) {
    const std::string sample = ReadWholeFile(FERRIX_SOURCE_DIR "/package/host.conf.example");
    EXPECT_TRUE(Parsed(sample).shares.empty());
    std::string inForce = "\n" + sample;
    for (size_t at = 0; (at = inForce.find("\n;", at)) != std::string::npos; ++at) {
        const bool isProse = inForce[at + 2] == ' ' || inForce[at + 2] == '\n';
        if (!isProse) inForce.erase(at + 1, 1);
    }
    const HostConf conf = Parsed(inForce);
    EXPECT_EQ(1u, conf.volumes.size());
    EXPECT_EQ(1u, conf.shares.size());
    EXPECT_EQ(2u, conf.removableDevices.size());
    EXPECT_EQ(1u, conf.frontUsb.size());
    EXPECT_EQ(1u, conf.sdSlot.size());
    EXPECT_NE("", conf.led);
    EXPECT_NE("", conf.speaker);
}

struct BadConf {
    const char* name;
    std::string text;
    int line;
    const char* reason;
};

class BadHostConf : public ::testing::TestWithParam<BadConf> {};

TEST_P(BadHostConf, IsRefusedWithItsLine) {
    HostConf conf;
    HostConfError error;
    EXPECT_FALSE(ParseHostConf(GetParam().text, conf, error));
    EXPECT_EQ(GetParam().line, error.line);
    EXPECT_EQ(GetParam().reason, error.reason);
}

INSTANTIATE_TEST_SUITE_P(
    EveryError, BadHostConf,
    ::testing::Values(
        BadConf{"NoSection", "a = b\n", 1, "a key before the first section"},
        BadConf{"UnknownSection", "\n\n[shares]\n", 3, "unknown section [shares]"},
        BadConf{"UnknownSectionWithKeys", "[foo bar]\npath = /a\n", 1, "unknown section [foo bar]"},
        BadConf{"EmptySection", "[]\n", 1, "unknown section []"},
        BadConf{"OpenSection", "[share a]\npath = /v/a\n[share b\npath = /v/b\n", 3,
                "a section without ]"},
        BadConf{"NoEquals", "[hooks]\nnotify\n", 2, "neither [section] nor key = value"},
        BadConf{"NoKey", "[hooks]\n= /a\n", 2, "a value without a key"},
        BadConf{"LongKey", "[hooks]\n" + std::string(49, 'k') + " = /a\n", 2,
                "the key is too long"},
        BadConf{"TenMegabytesWithoutAnyStructure", "[hooks]\n" + std::string(10 << 20, 'x'), 2,
                "neither [section] nor key = value"},
        BadConf{"TenMegabytesOfPath",
                "[hooks]\nindex=\n[share a]\npath = /" + std::string(10 << 20, 'x') + "\n", 4,
                "the path is too long"},
        BadConf{"ControlCharacter", "[hooks]\nnotify = /a\x01z\n", 2, "a control character"},
        BadConf{"NulByte", std::string("[hooks]\nnotify = /a\0z\n", 22), 2, "a control character"},
        BadConf{"UnknownVolumeKey", "[volume /v]\nshared = yes\n", 2,
                "unknown key 'shared' in section [volume]"},
        BadConf{"UnknownShareKey", "[share a]\nPath = /v/a\n", 2,
                "unknown key 'Path' in section [share]"},
        BadConf{"UnknownListKey", "[location]\nback = *\n", 2,
                "unknown key 'back' in section [location]"},
        BadConf{"KeyOfAnotherSection", "[removable]\nsd_slot = *\n", 2,
                "unknown key 'sd_slot' in section [removable]"},
        BadConf{"UnknownFileKey", "[hooks]\nled = /a\n", 2, "unknown key 'led' in section [hooks]"},
        BadConf{"KeyTwice", "[share a]\npath = /v/a\npath = /v/b\n", 3,
                "key 'path' is given twice"},
        BadConf{"SectionTwice", "[hooks]\n[location]\n[hooks]\n", 3,
                "section [hooks] is given twice"},
        BadConf{"VolumeTwice", "[volume /v]\n[volume /v/]\n", 2,
                "section [volume /v] is given twice"},
        BadConf{"ShareSectionTwice", "[share a]\npath=/v/a\n[share a]\npath=/v/b\n", 3,
                "section [share a] is given twice"},
        BadConf{"NamedSection", "[hooks all]\n", 1, "section [hooks] takes no name"},
        BadConf{"NamelessShare", "[share]\npath = /v/a\n", 1, "section [share NAME] has no name"},
        BadConf{"NamelessVolume", "[volume]\n", 1, "section [volume PATH]: the path is empty"},
        BadConf{"RelativeVolume", "[volume v]\n", 1,
                "section [volume PATH]: the path is not absolute"},
        BadConf{"InternalNeitherYesNorNo", "[volume /v]\ninternal = true\n", 2,
                "'internal' is neither yes nor no"},
        BadConf{"RecycleNeitherYesNorNo", "[share a]\npath=/v/a\nrecycle_bin = 1\n", 3,
                "'recycle_bin' is neither yes nor no"},
        BadConf{"AdminOnlyNeitherYesNorNo", "[share a]\npath=/v/a\nrecycle_bin_admin_only = YES\n",
                3, "'recycle_bin_admin_only' is neither yes nor no"},
        BadConf{"MountPointEmpty", "[share a]\npath=/v/a\nmount_point =\n", 3,
                "'mount_point' is neither yes nor no"},
        BadConf{"ShareWithoutPath", "[share a]\nrecycle_bin = yes\n[share b]\npath = /v/b\n", 1,
                "a share without a path"},
        BadConf{"EmptyPath", "[share a]\npath =\n", 2, "the path is empty"},
        BadConf{"RelativePath", "[share a]\npath = v/a\n", 2, "the path is not absolute"},
        BadConf{"RootPath", "[share a]\npath = //\n", 2, "the root folder cannot be a share"},
        BadConf{"PathWithDots", "[share a]\npath = /v/../etc\n", 2, "the path holds . or .."},
        BadConf{"PathEndsInADot", "[share a]\npath = /v/.\n", 2, "the path holds . or .."},
        BadConf{"SameShareName", "[share a]\npath=/v/a\n[share b]\npath=/w/a\n", 3,
                "two shares have the name 'a'"},
        BadConf{"RelativeHook", "[hooks]\nnotify = notify.d\n", 2, "the path is not absolute"},
        BadConf{"RelativeLed", "[indicator]\nled = green\n", 2, "the path is not absolute"},
        BadConf{"TheFirstErrorIsTold", "[hooks]\nfoo = 1\nbar\n", 2,
                "unknown key 'foo' in section [hooks]"}),
    [](const auto& test) { return std::string(test.param.name); });

class HostConfFile : public HostFixture {
protected:
    static std::vector<std::string> Globs() { return CurrentHostConf()->removableDevices; }
    const std::vector<std::string> m_loop{"/dev/loop*"};
    const std::vector<std::string> m_sd{"/dev/sd*"};
};

TEST_F(HostConfFile, AMissingFileGivesTheDefaults) { EXPECT_TRUE(Globs().empty()); }

TEST_F(HostConfFile, AnEditIsSeenAtTheNextUse) {
    Conf("[removable]\ndevices = /dev/loop*\n");
    EXPECT_EQ(m_loop, Globs());
    Conf("[removable]\ndevices = /dev/sd*\n");
    EXPECT_EQ(m_sd, Globs());
}

TEST_F(HostConfFile, AnEditOfTheSameLengthWithinOneClockTickIsSeen) {
    for (int i = 0; i < 50; ++i) {
        Conf("[removable]\ndevices = /dev/aa*\n");
        ASSERT_EQ("/dev/aa*", Globs().at(0)) << "edit " << i;
        Conf("[removable]\ndevices = /dev/bb*\n");
        ASSERT_EQ("/dev/bb*", Globs().at(0)) << "edit " << i;
    }
}

TEST_F(HostConfFile, WithoutAnEditTheSameStateIsGiven) {
    Conf("[removable]\ndevices = /dev/loop*\n");
    EXPECT_EQ(CurrentHostConf(), CurrentHostConf());
}

TEST_F(HostConfFile, ABrokenFileIsToldWithItsLineAndTheLastGoodStateStays) {
    Conf("[removable]\ndevices = /dev/loop*\n");
    EXPECT_EQ(m_loop, Globs());
    const LogCapture log;
    Conf("[removable]\ndevices = /dev/sd*\nnonsense\n");
    EXPECT_EQ(m_loop, Globs());
    EXPECT_TRUE(
        log.Contains("host.conf(3): neither [section] nor key = value; the last good state "
                     "stays in force"));
}

TEST_F(HostConfFile, ABrokenFileIsToldOnce) {
    const LogCapture log;
    Conf("nonsense\n");
    for (int i = 0; i < 5; ++i) EXPECT_TRUE(Globs().empty());
    EXPECT_EQ(1u, log.Lines().size());
}

TEST_F(HostConfFile, AMendedFileIsInForceAgain) {
    const LogCapture log;
    Conf("[removable]\ndevices = /dev/loop*\n");
    EXPECT_EQ(m_loop, Globs());
    Conf("broken\n");
    EXPECT_EQ(m_loop, Globs());
    Conf("[removable]\ndevices = /dev/sd*\n");
    EXPECT_EQ(m_sd, Globs());
}

TEST_F(HostConfFile, ARemovedFileGivesTheDefaultsAgain) {
    Conf("[removable]\ndevices = /dev/loop*\n");
    EXPECT_EQ(m_loop, Globs());
    ASSERT_EQ(0, unlink((m_dir / "etc/keld/host.conf").c_str()));
    EXPECT_TRUE(Globs().empty());
}

TEST_F(HostConfFile, AFolderOrAFifoInItsPlaceIsToldAndTheLastGoodStateStays) {
    Conf("[removable]\ndevices = /dev/loop*\n");
    EXPECT_EQ(m_loop, Globs());
    const std::string path = m_dir / "etc/keld/host.conf";
    const LogCapture log;
    ASSERT_EQ(0, unlink(path.c_str()));
    ASSERT_EQ(0, mkfifo(path.c_str(), 0600));
    EXPECT_EQ(m_loop, Globs());
    EXPECT_EQ(m_loop, Globs());
    EXPECT_EQ(1u, log.Lines().size());
    EXPECT_TRUE(log.Contains("cannot read '" + path + "'"));
    ASSERT_EQ(0, unlink(path.c_str()));
    ASSERT_EQ(0, mkdir(path.c_str(), 0700));
    EXPECT_EQ(m_loop, Globs());
}

TEST_F(HostConfFile, AFileBeyondAllMeasureIsRefused) {
    Conf("[removable]\ndevices = /dev/loop*\n");
    EXPECT_EQ(m_loop, Globs());
    const LogCapture log;
    ASSERT_EQ(0, truncate((m_dir / "etc/keld/host.conf").c_str(), off_t{1} << 40));
    EXPECT_EQ(m_loop, Globs());
    EXPECT_TRUE(log.Contains("File too large"));
}
