// Notifications: one line in the log, and the programs of the notify folder.
#include <keld/notify.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstring>
#include <string>

#include "host/host-conf.h"
#include "host/host-error.h"
#include "host/run-program.h"
#include "host/sz-hash.h"
#include "utils/log.h"

using keld_host::Fail;

namespace {

struct TextRow {
    const char* tag;
    const char* text;
};

// What a person reads. A variable stands between percent signs, as in the keys of the hash.
constexpr TextRow kTexts[] = {
    {"FERRIXFinished",   "%COPY% on %HOSTNAME%: task \"%TASKNAME%\" has finished."               },
    {"FERRIXDisconnect", "%COPY% on %HOSTNAME%: task \"%TASKNAME%\" was interrupted."            },
    {"FERRIXNospace",    "%COPY% on %HOSTNAME%: no space is left for task \"%TASKNAME%\"."       },
    {"FERRIXError",      "%COPY% on %HOSTNAME%: task \"%TASKNAME%\" has failed with error %ERR%."},
};

std::string TextOf(const std::string& tag, const KLIBCSzHash* hash) {
    std::string text = tag;
    for (const TextRow& row : kTexts) {
        if (tag == row.tag) text = row.text;
    }
    if (hash == nullptr) return text;
    // From left to right, once: a task may be called "%ERR%".
    std::string result;
    for (size_t i = 0; i < text.size();) {
        const size_t end = text[i] == '%' ? text.find('%', i + 1) : std::string::npos;
        const auto pair = end == std::string::npos ? hash->pairs.end()
                                                   : hash->pairs.find(text.substr(i, end - i + 1));
        if (pair == hash->pairs.end()) {
            result += text[i++];
        } else {
            result += pair->second;
            i = end + 1;
        }
    }
    return result;
}

// "%TASKNAME%" gives "KELD_NOTIFY_TASKNAME"; empty for what is no name of a variable.
std::string VariableName(const std::string& key) {
    std::string name;
    std::copy_if(key.begin(), key.end(), std::back_inserter(name), [](char c) { return c != '%'; });
    const bool isName = !name.empty() && std::all_of(name.begin(), name.end(), [](unsigned char c) {
        return isalnum(c) != 0 || c == '_';
    });
    if (!isName || name == "TAG" || name == "TEXT") return {};
    return "KELD_NOTIFY_" + name;
}

}  // namespace

int KELDSysNotifySendNotifiction(const char* tag, const KLIBCSzHash* hash) {
    if (tag == nullptr || tag[0] == '\0') return Fail(KELDERR_INVALID_ARGUMENT);
    const std::string text = TextOf(tag, hash);
    SLOG_NOTICE("notification %s: %s\n", tag, text.c_str());
    keld_host::Program program;
    program.environment = {
        {"KELD_NOTIFY_TAG",  tag },
        {"KELD_NOTIFY_TEXT", text}
    };
    if (hash != nullptr) {
        for (const auto& [key, value] : hash->pairs) {
            const std::string name = VariableName(key);
            if (!name.empty()) program.environment.emplace_back(name, value);
        }
    }
    const std::string folder = keld_host::CurrentHostConf()->notifyFolder;
    return keld_host::RunFolder(folder, std::move(program)) == 0 ? 0 : Fail(KELDERR_SYSTEM);
}

int KELDLnxGetHostname(char* buffer) {
    if (buffer == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    if (gethostname(buffer, KELD_HOSTNAME_SIZE) != 0) return keld_host::FailErrno(errno);
    buffer[KELD_HOSTNAME_SIZE - 1] = '\0';
    return 0;
}
