#include "event/event-generator.h"

#include "event/event-manager.h"
#include "event/event-text.h"
#include "utils/log.h"

namespace {

Event MakeEvent(EventType type, uint64_t task_id, const std::string& path, uint32_t flags) {
    return {type, WAITTING, task_id, path, flags};
}

}  // namespace

void EventGenerator::PushScanEvent(const std::string& path) const {
    const Event event = MakeEvent(EV_CREATE, m_task_id, path, EVENT_FLAG_DIR | EVENT_FLAG_SCAN);
    EventManager::GetInstance().PushEvent(event);
    SLOG_DBG("Event Genetator: PushScanEvent at [%llu], ev=[%s]\n", Llu(m_task_id),
             EventText(event).CStr());
}

void EventGenerator::PushCreateDirEvent(const std::string& path) const {
    const Event event = MakeEvent(EV_CREATE, m_task_id, path, EVENT_FLAG_DIR);
    EventManager::GetInstance().PushEvent(event);
    SLOG_DBG("Event Genetator: PushCreateDirEvent at [%llu], ev=[%s]\n", Llu(m_task_id),
             EventText(event).CStr());
}

void EventGenerator::PushCopyFileEvent(const std::string& path) const {
    const Event event = MakeEvent(EV_COPY, m_task_id, path, 0);
    EventManager::GetInstance().PushEvent(event);
    SLOG_DBG("Event Genetator: PushCopyFileEvent at [%llu], ev=[%s]\n", Llu(m_task_id),
             EventText(event).CStr());
}

void EventGenerator::PushRemoveEvent(const std::string& path, bool is_dir) const {
    const Event event = MakeEvent(EV_REMOVE, m_task_id, path, is_dir ? EVENT_FLAG_DIR : 0U);
    EventManager::GetInstance().PushEvent(event);
    SLOG_DBG("Event Genetator: PushRemoveEvent at [%llu], ev=[%s]\n", Llu(m_task_id),
             EventText(event).CStr());
}
