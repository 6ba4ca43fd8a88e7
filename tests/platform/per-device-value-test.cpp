#include "utils/per-device-value.h"

#include <gtest/gtest.h>

#include <filesystem>

#include "fake/fake-keld.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

namespace {

namespace fs = std::filesystem;

class PerDeviceValueTest : public testing::Test {
protected:
    TempDir m_dir;
    LogCapture m_log;
    FakeKeld& m_fake = FakeKeld::Reset();
    std::string m_file = m_dir / "@eaDir/.KeldoranFerrix.config";
    std::string m_value = "old";
};

TEST_F(PerDeviceValueTest, AValueIsWrittenAndReadBack) {
    m_dir.MakeDir("@eaDir");
    EXPECT_TRUE(SetPerDeviceValue(m_dir.Path(), "uuid", "1234-abcd"));
    EXPECT_EQ("uuid=\"1234-abcd\"\n", ReadWholeFile(m_file));
    EXPECT_TRUE(GetPerDeviceValue(m_dir.Path(), "uuid", m_value));
    EXPECT_EQ("1234-abcd", m_value);
}

TEST_F(PerDeviceValueTest, EmptyArgumentsAreRefusedWithoutAMessage) {
    EXPECT_FALSE(SetPerDeviceValue("", "key", "value"));
    EXPECT_FALSE(SetPerDeviceValue(m_dir.Path(), "", "value"));
    EXPECT_FALSE(SetPerDeviceValue(m_dir.Path(), "key", ""));
    EXPECT_FALSE(GetPerDeviceValue("", "key", m_value));
    EXPECT_TRUE(m_log.Lines().empty());
    EXPECT_TRUE(m_fake.Calls().empty());
}

TEST_F(PerDeviceValueTest, AFailedWriteIsTold) {
    m_fake.FailCall("KLIBCFileSetKeyValue");
    EXPECT_FALSE(SetPerDeviceValue(m_dir.Path(), "k", "v"));
    EXPECT_TRUE(m_log.Has("[ERR] KLIBCFileSetKeyValue() failed, path=[" + m_file +
                          "], key = k, value = v"));
}

TEST_F(PerDeviceValueTest, AMissingFileKeyOrAnEmptyValueIsNoValue) {
    EXPECT_FALSE(GetPerDeviceValue(m_dir.Path(), "uuid", m_value));
    EXPECT_EQ("", m_value);
    m_dir.Write("@eaDir/.KeldoranFerrix.config", "other=\"x\"\nempty=\"\"\n");
    EXPECT_FALSE(GetPerDeviceValue(m_dir.Path(), "uuid", m_value));
    EXPECT_FALSE(GetPerDeviceValue(m_dir.Path(), "empty", m_value));
    EXPECT_TRUE(GetPerDeviceValue(m_dir.Path(), "other", m_value));
    m_fake.FailCall("KLIBCFileGetKeyValue");
    EXPECT_FALSE(GetPerDeviceValue(m_dir.Path(), "other", m_value));
}

TEST_F(PerDeviceValueTest, AValueMayHave63Bytes) {
    m_dir.Write("@eaDir/.KeldoranFerrix.config",
                "fits=\"" + std::string(63, 'x') + "\"\nlong=\"" + std::string(64, 'x') + "\"\n");
    EXPECT_TRUE(GetPerDeviceValue(m_dir.Path(), "fits", m_value));
    EXPECT_EQ(63u, m_value.size());
    EXPECT_FALSE(GetPerDeviceValue(m_dir.Path(), "long", m_value));
}

TEST_F(PerDeviceValueTest, ALinkOnTheDeviceTakesNothingElsewhere) {
    const std::string outside = m_dir.Write("outside/.KeldoranFerrix.config", "uuid=\"secret\"\n");
    const std::string device = m_dir.MakeDir("device");
    fs::create_directory_symlink(m_dir / "outside", device + "/@eaDir");
    EXPECT_FALSE(GetPerDeviceValue(device, "uuid", m_value));
    EXPECT_FALSE(SetPerDeviceValue(device, "uuid", "mine"));
    fs::remove(device + "/@eaDir");
    fs::create_directory(device + "/@eaDir");
    fs::create_symlink(outside, device + "/@eaDir/.KeldoranFerrix.config");
    EXPECT_FALSE(GetPerDeviceValue(device, "uuid", m_value));
    EXPECT_FALSE(SetPerDeviceValue(device, "uuid", "mine"));
    EXPECT_EQ("uuid=\"secret\"\n", ReadWholeFile(outside));
}

}  // namespace
