#include "platform/error-handler.h"

#include "utils/error-code.h"

namespace Ferrix {

ErrorHandler& ErrorHandler::GetInstance() {
    static ErrorHandler& instance = *new ErrorHandler;
    return instance;
}

void ErrorHandler::Clear(uint64_t task_id) {
    const std::lock_guard lock(m_mutex);
    m_codes.erase(task_id);
}

void ErrorHandler::Set(uint64_t task_id, int code) {
    const bool is_ignorable = IsIgnorableError(code);
    const std::lock_guard lock(m_mutex);
    const auto [entry, is_new] = m_codes.try_emplace(task_id, is_ignorable ? ERR_SUCCESS : code);
    if (is_new || is_ignorable) return;
    const bool is_final = entry->second == ERR_DST_QUOTA_FULL || entry->second == ERR_INTERRUPTED;
    if (!is_final) entry->second = code;
}

int ErrorHandler::Get(uint64_t task_id) {
    const std::lock_guard lock(m_mutex);
    const auto entry = m_codes.find(task_id);
    return entry == m_codes.end() ? ERR_SYSTEM : entry->second;
}

}  // namespace Ferrix
