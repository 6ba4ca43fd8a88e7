// A platform that stands in a scratch folder: host.conf, volumes, key files and hooks of its own.
#pragma once

#include <gtest/gtest.h>

#include <string>

#include "host/host-paths.h"
#include "support/temp-dir.h"

class HostFixture : public ::testing::Test {
protected:
    HostFixture() {
        keld_host::HostPaths paths;
        paths.hostConf = m_dir / "etc/keld/host.conf";
        paths.notifyFolder = m_dir / "etc/keld/notify.d";
        paths.indexFolder = m_dir / "etc/keld/index.d";
        paths.keldInfo = m_dir / "etc.defaults/keldinfo.conf";
        paths.keldSettings = m_dir / "etc/keldinfo.conf";
        paths.nsswitch = m_dir / "etc/nsswitch.conf";
        paths.systemdFolder = m_dir / "etc/systemd/system";
        paths.volumeRoot = m_dir.Path() + "/";
        paths.schedFolder = m_dir / "var/lib/keld/sched";
        paths.cronFile = m_dir / "etc/cron.d/keld-sched";
        keld_host::SetPaths(paths);
    }
    ~HostFixture() override { keld_host::SetPaths(keld_host::HostPaths{}); }

    // Replaces host.conf. "$" stands for the scratch folder.
    void Conf(std::string text) const {
        for (size_t at = text.find('$'); at != std::string::npos; at = text.find('$', at)) {
            text.replace(at, 1, m_dir.Path());
        }
        m_dir.Write("etc/keld/host.conf", text);
    }

    TempDir m_dir;
};
