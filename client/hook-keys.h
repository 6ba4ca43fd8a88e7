// Hooks on a command line: their kinds and their keys.
#pragma once

#include <string>
#include <utility>
#include <vector>

// The kinds that the daemon takes.
inline const std::vector<std::string> HOOK_TYPES = {"volume_hook", "ferrix_hook", "share_hook"};

// The kind that the box itself sends a hook under. EXIT_USAGE (CommandError) for an unknown name,
// which the daemon would acknowledge.
[[nodiscard]] std::string HookType(const std::string& name);

// "KEY=VALUE" texts taken apart at the first "="; a value may be empty. EXIT_USAGE for a text
// without "=" or without a key, for a key given twice and for keys that are not the hook's
// own: "action", "notify", "type", "need_ack", and all that begin with "_".
[[nodiscard]] std::vector<std::pair<std::string, std::string>> HookKeys(
    const std::vector<std::string>& texts);
