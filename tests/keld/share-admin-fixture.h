// A box with volumes in a scratch folder, for the operations on its shares.
#pragma once

#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <string>
#include <vector>

#include "host-fixture.h"
#include "host/share-admin.h"
#include "host/share-table.h"

class ShareAdmin : public HostFixture {
protected:
    using Outcome = keld_host::ShareOutcome;

    ShareAdmin() { m_dir.MakeDir("volume1"); }

    // Two shares with a file each, named in host.conf.
    void MakeTwoSections() {
        m_dir.Write("volume1/photos/img", "picture");
        m_dir.Write("volume1/music/song", "noise");
        Conf(TWO_SECTIONS);
    }
    [[nodiscard]] std::string ConfText() const {
        return ReadWholeFile(m_dir / "etc/keld/host.conf");
    }
    // As Conf() takes it.
    [[nodiscard]] std::string ShortConf() const {
        std::string text = ConfText();
        for (size_t at = 0; (at = text.find(m_dir.Path())) != std::string::npos;) {
            text.replace(at, m_dir.Path().size(), "$");
        }
        return text;
    }
    [[nodiscard]] std::string At(const std::string& name) const { return m_dir / name; }
    [[nodiscard]] bool Exists(const std::string& name) const {
        return std::filesystem::exists(std::filesystem::symlink_status(At(name)));
    }
    // "name=path" of every share of the box, as the daemon sees them.
    [[nodiscard]] std::vector<std::string> Shares() const {
        std::vector<std::string> shares;
        for (const auto& share : keld_host::CurrentShares()->shares) {
            if (!share.isDevice) {
                shares.push_back(share.name + "=" + share.path.substr(m_dir.Path().size()));
            }
        }
        return shares;
    }

    void ExpectDone(const Outcome& outcome, const std::string& path) const {
        EXPECT_EQ(Outcome::DONE, outcome.kind) << outcome.text;
        EXPECT_EQ(At(path), outcome.text);
    }
    static void ExpectWrong(const Outcome& outcome, const std::string& part) {
        EXPECT_EQ(Outcome::WRONG_REQUEST, outcome.kind) << outcome.text;
        EXPECT_THAT(outcome.text, testing::HasSubstr(part));
    }
    static void ExpectRefused(const Outcome& outcome, const std::string& part) {
        EXPECT_EQ(Outcome::REFUSED, outcome.kind) << outcome.text;
        EXPECT_THAT(outcome.text, testing::HasSubstr(part));
    }

    using Texts = std::vector<std::string>;
    static constexpr const char* TWO_SECTIONS =
        "; two of them\n"
        "[share photos]\n"
        "path = $/volume1/photos ; pictures\n"
        "recycle_bin = yes\n"
        "\n"
        "[share music]\n"
        "path = $/volume1/music\n";
};
