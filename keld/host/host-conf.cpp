#include "host/host-conf.h"

#include <climits>
#include <set>
#include <utility>

#include "host/host-conf-reader.h"
#include "host/host-paths.h"
#include "host/text.h"

namespace keld_host {
namespace {

bool ReadYesNo(const std::string& value, bool& out) {
    if (value != "yes" && value != "no") return false;
    out = value == "yes";
    return true;
}

// An absolute path in its plain form: no doubled slashes, no "." and "..", no slash at the end.
std::string ReadPath(const std::string& value, std::string& out) {
    if (value.empty()) return "the path is empty";
    if (value.front() != '/') return "the path is not absolute";
    if (value.size() >= PATH_MAX) return "the path is too long";
    out = CleanPath(value);
    const std::string framed = out + "/";
    if (framed.find("/./") != std::string::npos || framed.find("/../") != std::string::npos) {
        return "the path holds . or ..";
    }
    return {};
}

class Builder : public IniVisitor {
public:
    explicit Builder(HostConf& conf) : m_conf(conf) {}

    void OnSection(int line, const std::string& section) override {
        const size_t blank = section.find_first_of(" \t");
        m_kind = section.substr(0, blank);
        m_label = blank == std::string::npos ? "" : std::string(Trim(section.substr(blank)));
        m_isKnown = true;
        if (m_kind == "volume") {
            StartVolume(line);
        } else if (m_kind == "share") {
            StartShare(line);
        } else if (m_kind == "removable" || m_kind == "location" || m_kind == "indicator" ||
                   m_kind == "hooks") {
            if (!m_label.empty()) Blame(line, "section [" + m_kind + "] takes no name");
            StartOnce(line);
        } else {
            m_isKnown = false;
            Blame(line, "unknown section [" + section + "]");
        }
    }

    void OnKey(int line, const std::string& section, const std::string& key,
               const std::string& value) override {
        if (section.empty()) return Blame(line, "a key before the first section");
        if (!m_isKnown) return;  // the section has been blamed
        if (!m_seen.insert(m_kind + "\n" + m_label + "\n" + key).second) {
            return Blame(line, "key '" + key + "' is given twice");
        }
        std::string reason = "unknown key '" + key + "' in section [" + m_kind + "]";
        if (m_kind == "volume") ReadVolumeKey(key, value, reason);
        if (m_kind == "share") ReadShareKey(key, value, reason);
        if (m_kind == "removable" || m_kind == "location") ReadListKey(key, value, reason);
        if (m_kind == "indicator" || m_kind == "hooks") ReadFileKey(key, value, reason);
        if (!reason.empty()) Blame(line, reason);
    }

    void OnBadLine(int line, const std::string& reason) override { Blame(line, reason); }

    // The rules over more than one line, for a text whose lines are good each for itself.
    void Finish() {
        if (HasError()) return;
        std::set<std::string> names;
        for (size_t i = 0; i < m_conf.shares.size(); ++i) {
            const ShareConf& share = m_conf.shares[i];
            if (share.path.empty()) {
                Blame(m_shareLines[i], "a share without a path");
            } else if (!names.insert(std::string(BaseNameOf(share.path))).second) {
                Blame(m_shareLines[i],
                      "two shares have the name '" + std::string(BaseNameOf(share.path)) + "'");
            }
        }
    }

    [[nodiscard]] bool HasError() const { return m_error.line != 0; }
    [[nodiscard]] const HostConfError& Error() const { return m_error; }

private:
    void Blame(int line, const std::string& reason) {
        if (m_error.line != 0 && m_error.line <= line) return;
        m_error = {line, reason};
    }

    void StartOnce(int line) {
        if (!m_sections.insert(m_kind + "\n" + m_label).second) {
            Blame(line, "section [" + m_kind + (m_label.empty() ? "" : " ") + m_label +
                            "] is given twice");
        }
    }

    void StartVolume(int line) {
        std::string path;
        const std::string reason = ReadPath(m_label, path);
        if (!reason.empty()) return Blame(line, "section [volume PATH]: " + reason);
        m_label = path;
        StartOnce(line);
        m_conf.volumes[path];
    }

    void StartShare(int line) {
        if (m_label.empty()) Blame(line, "section [share NAME] has no name");
        StartOnce(line);
        m_conf.shares.emplace_back();
        m_shareLines.push_back(line);
    }

    // Each of these clears `reason` when the key is good, or replaces it.
    void ReadVolumeKey(const std::string& key, const std::string& value, std::string& reason) {
        if (key != "internal") return;
        bool internal = true;
        reason = ReadYesNo(value, internal) ? "" : "'internal' is neither yes nor no";
        // The section itself is blamed already when its path is bad.
        const auto volume = m_conf.volumes.find(m_label);
        if (volume != m_conf.volumes.end()) volume->second.internal = internal;
    }

    void ReadShareKey(const std::string& key, const std::string& value, std::string& reason) {
        ShareConf& share = m_conf.shares.back();
        if (key == "path") {
            reason = ReadPath(value, share.path);
            if (reason.empty() && share.path == "/") reason = "the root folder cannot be a share";
            return;
        }
        const std::pair<const char*, bool*> flags[] = {
            {"recycle_bin",            &share.recycleBin         },
            {"recycle_bin_admin_only", &share.recycleBinAdminOnly},
            {"mount_point",            &share.mountPoint         },
        };
        for (const auto& [name, flag] : flags) {
            if (key == name)
                reason = ReadYesNo(value, *flag) ? "" : "'" + key + "' is neither yes nor no";
        }
    }

    void ReadListKey(const std::string& key, const std::string& value, std::string& reason) {
        std::vector<std::string>* list = nullptr;
        if (m_kind == "removable" && key == "devices") list = &m_conf.removableDevices;
        if (m_kind == "location" && key == "front_usb") list = &m_conf.frontUsb;
        if (m_kind == "location" && key == "sd_slot") list = &m_conf.sdSlot;
        if (list == nullptr) return;
        *list = SplitList(value);
        reason.clear();
    }

    void ReadFileKey(const std::string& key, const std::string& value, std::string& reason) {
        std::string* file = nullptr;
        if (m_kind == "indicator" && key == "led") file = &m_conf.led;
        if (m_kind == "indicator" && key == "speaker") file = &m_conf.speaker;
        if (m_kind == "hooks" && key == "notify") file = &m_conf.notifyFolder;
        if (m_kind == "hooks" && key == "index") file = &m_conf.indexFolder;
        if (file == nullptr) return;
        reason.clear();
        file->clear();  // an empty value turns the thing off
        if (!value.empty()) reason = ReadPath(value, *file);
    }

    HostConf& m_conf;
    HostConfError m_error;
    std::string m_kind;
    std::string m_label;
    bool m_isKnown = false;
    std::set<std::string> m_sections;
    std::set<std::string> m_seen;
    std::vector<int> m_shareLines;
};

}  // namespace

bool ParseHostConf(std::string_view text, HostConf& conf, HostConfError& error) {
    conf = HostConf{};
    conf.notifyFolder = Paths().notifyFolder;
    conf.indexFolder = Paths().indexFolder;
    Builder builder(conf);
    ReadIni(text, builder);
    builder.Finish();
    error = builder.Error();
    return !builder.HasError();
}

}  // namespace keld_host
