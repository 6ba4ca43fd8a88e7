// A box for tests of the control side: the scripted platform, a scratch package folder that is
// enabled, two volumes of the box, and places of its own for the daemon.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <memory>
#include <string>

#include "fake/fake-keld.h"
#include "platform/global-setting.h"
#include "platform/package-paths.h"
#include "platform/service-status.h"
#include "service/child-daemon.h"
#include "service/service-ctrl.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

class ServiceTest : public testing::Test {
protected:
    ServiceTest() : m_fake(FakeKeld::Reset()) {
        m_dir.MakeDir("p/etc");
        m_dir.Write("p/enabled", "");
        SetPackageFolderForTest(m_dir / "p");
        m_fake.AddVolume({.mount_path = m_v1});
        m_fake.AddVolume({.mount_path = m_v2});
        LetDaemonStart();
    }
    ~ServiceTest() override { SetPackageFolderForTest(""); }

    [[nodiscard]] ServicePlaces Places() const {
        return {
            m_pid_file, m_dir / "socket", {m_dir / "caps", m_dir / "settings"},
                20, 0
        };
    }
    [[nodiscard]] ServiceCtrl Ctrl() const { return ServiceCtrl(Places()); }

    // What the daemon's program does when it is run: by default it leaves a daemon behind.
    void OnDaemonProgram(const std::function<void()>& action) {
        m_fake.OnCall("KLIBCExec", [this, action] {
            if (m_fake.CallsOf("KLIBCExec").back()[0] == m_program) action();
        });
    }
    void LetDaemonStart() {
        OnDaemonProgram([this] {
            m_started = std::make_unique<ChildDaemon>(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM);
        });
    }

    // The file of the state, as other programs read it.
    [[nodiscard]] std::string Status() const { return ReadWholeFile(m_dir / "p/etc/status"); }
    [[nodiscard]] std::string VolumeList() const {
        return ReadWholeFile(m_dir / "p/etc/keldpkg_conf/reg_volume");
    }
    static std::string StateText(int state, const std::string& error = "") {
        return "state=\"" + std::to_string(state) + "\"\nerror=\"" + error + "\"\n";
    }
    // A line that begins with the place in the source.
    [[nodiscard]] bool HasPlaced(const std::string& tag, const std::string& text) const {
        for (const std::string& line : m_log.Lines()) {
            if (line.starts_with("[" + tag + "] ") && line.ends_with(" " + text)) return true;
        }
        return false;
    }
    // The states that were written since ForgetCalls().
    [[nodiscard]] std::vector<std::string> States() const {
        std::vector<std::string> states;
        for (const auto& call : m_fake.CallsOf("KLIBCFileSetKeyValue")) {
            if (call[1] == "state") states.push_back(call[2]);
        }
        return states;
    }

    FakeKeld& m_fake;
    TempDir m_dir;
    std::string m_v1 = m_dir.MakeDir("v1");
    std::string m_v2 = m_dir.MakeDir("v2");
    std::string m_pid_file = m_dir / "daemon.pid";
    std::string m_program = m_dir / "p/target/sbin/ferrixd";
    LogCapture m_log;
    std::unique_ptr<ChildDaemon> m_started;
};
