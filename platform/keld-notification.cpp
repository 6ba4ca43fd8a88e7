#include "platform/keld-notification.h"

#include <keld/error.h>
#include <keld/notify.h>

#include <cstdio>

#include "platform/keld-sdk-wrapper.h"
#include "utils/error-code.h"
#include "utils/log.h"

namespace {

constexpr int kHashSize = 512;
constexpr size_t kErrorTextSize = 512;

struct TagRow {
    int code;
    const char* tag;
};
constexpr TagRow kTags[] = {
    {ERR_INTERRUPTED,    "FERRIXDisconnect"},
    {ERR_SUCCESS,        "FERRIXFinished"  },
    {ERR_DST_QUOTA_FULL, "FERRIXNospace"   },
};
constexpr char kErrorTag[] = "FERRIXError";  // for every other code

// Owns the hash that carries the variables; the platform may replace it at each change.
class Variables {
public:
    Variables() : m_hash(KLIBCSzHashAlloc(kHashSize)) {}
    ~Variables() {
        if (m_hash != nullptr) KLIBCSzHashFree(m_hash);
    }
    Variables(const Variables&) = delete;
    Variables& operator=(const Variables&) = delete;

    [[nodiscard]] bool IsValid() const { return m_hash != nullptr; }
    [[nodiscard]] const KLIBCSzHash* Get() const { return m_hash; }
    // A notification that lacks a variable still tells the user something: a failure is not looked
    // at.
    void Set(const char* key, const char* value) { KLIBCSzHashSetValue(&m_hash, key, value); }

private:
    KLIBCSzHash* m_hash;
};

const char* ChooseTag(int code, Variables& variables) {
    for (const TagRow& row : kTags) {
        if (row.code == code) return row.tag;
    }
    char text[kErrorTextSize];
    snprintf(text, sizeof(text), "%d", code);
    variables.Set("%ERR%", text);
    return kErrorTag;
}

}  // namespace

int SendNotification(uint64_t /*task_id*/, const std::string& task_name, int code) {
    const SDK::ReentrantLock lock;
    char hostname[KELD_HOSTNAME_SIZE] = "";
    if (KELDLnxGetHostname(hostname) < 0) {
        SLOG_ERR("KELDLnxGetHostname failed.(%X)", static_cast<unsigned>(KLIBCErrGet()));
        return -1;
    }
    Variables variables;
    if (!variables.IsValid()) return 0;  // a lost notification is no failure of the run
    variables.Set("%TASKNAME%", task_name.c_str());
    variables.Set("%HOSTNAME%", hostname);
    variables.Set("%COPY%", "Ferrix Copy");
    const char* tag = ChooseTag(code, variables);
    KELDSysNotifySendNotifiction(tag, variables.Get());
    return 0;
}
