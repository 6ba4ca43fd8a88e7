#include "client/hook-keys.h"

#include <algorithm>

#include "client/exit-status.h"
#include "client/text.h"

namespace {

// What makes a request something else than this hook, and what would switch off the answer that
// tells whether it was heard. A key loses a leading "_" on its way.
bool IsReserved(const std::string& key) {
    return key == "action" || key == "notify" || key == "type" || key == "need_ack" ||
           key.front() == '_';
}

}  // namespace

std::string HookType(const std::string& name) {
    static const std::pair<const char*, const char*> NAMES[] = {
        {"post_mount",            "volume_hook"},
        {"pre_unmount",           "volume_hook"},
        {"post_ferrix",           "ferrix_hook"},
        {"pre_path_change",       "share_hook" },
        {"post_path_change",      "share_hook" },
        {"pre_delete",            "share_hook" },
        {"pre_encrypt",           "share_hook" },
        {"post_decrypt",          "share_hook" },
        {"pre_snapshot_restore",  "share_hook" },
        {"post_snapshot_restore", "share_hook" },
        {"pre_transform",         "share_hook" },
        {"post_transform",        "share_hook" },
    };
    std::string known;
    for (const auto& [hook, type] : NAMES) {
        if (name == hook) return type;
        known += std::string(known.empty() ? "" : ", ") + hook;
    }
    throw CommandError(EXIT_USAGE,
                       "there is no hook \"" + Printable(name) + "\"; there are " + known);
}

std::vector<std::pair<std::string, std::string>> HookKeys(const std::vector<std::string>& texts) {
    std::vector<std::pair<std::string, std::string>> keys;
    for (const std::string& text : texts) {
        const size_t at = text.find('=');
        if (at == std::string::npos || at == 0) {
            throw CommandError(EXIT_USAGE, "\"" + Printable(text) + "\" is no KEY=VALUE");
        }
        const std::string key = text.substr(0, at);
        if (IsReserved(key)) {
            throw CommandError(EXIT_USAGE, "\"" + Printable(key) + "\" is no key of a hook");
        }
        if (std::any_of(keys.begin(), keys.end(),
                        [&key](const auto& pair) { return pair.first == key; })) {
            throw CommandError(EXIT_USAGE, "the key \"" + Printable(key) + "\" is given twice");
        }
        keys.emplace_back(key, text.substr(at + 1));
    }
    return keys;
}
