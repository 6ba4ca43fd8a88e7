// The road of a message: from the thread of the socket loop through the queue to a handler.
#include <cerrno>
#include <cstring>

#include "daemon/app.h"
#include "ipc/pobject.h"
#include "processor/barrier.h"
#include "utils/log.h"
#include "utils/mutex-lock.h"

namespace {

constexpr int kNobody = -1;  // the application thread has no processor id

bool IsHookType(const std::string& type) {
    return type == "volume_hook" || type == "ferrix_hook" || type == "share_hook";
}

}  // namespace

int Ferrixd::StartAppThread() {
    const int error = pthread_create(&m_app_thread, nullptr, RunThread, this);
    if (error != 0) {
        SLOG_ERR("pthread_create: %s (%d)\n", std::strerror(error), error);
        return -1;
    }
    m_has_app_thread = true;
    return 0;
}

void Ferrixd::StopAppThread() {
    if (!m_has_app_thread) return;
    PObject request;
    request["action"] = "stop";
    PObject response;
    // After a client's "stop" nobody takes this item any more, and it goes with the queue.
    PushMessage({&request, &response, nullptr});
    pthread_join(m_app_thread, nullptr);
    m_has_app_thread = false;
}

void* Ferrixd::RunThread(void* self) {
    static_cast<Ferrixd*>(self)->AppLoop();
    pthread_exit(nullptr);
}

int Ferrixd::ProcessMessage(const PObject& request, PObject& response) {
    if (!m_has_app_thread) return 0;  // nobody would ever come by the barrier
    Barrier barrier;
    barrier.Register(kNobody);
    PushMessage({&request, &response, &barrier});
    barrier.Wait();
    return 0;
}

void Ferrixd::PushMessage(const MessageItem& item) {
    const MutexLock lock(m_queue_mutex);
    if (m_queue.empty()) pthread_cond_signal(&m_queue_cond);
    m_queue.push_back(item);
}

MessageItem Ferrixd::PopMessage() {
    const MutexLock lock(m_queue_mutex);
    while (m_queue.empty()) {  // again after a wake-up without a message
        SLOG_INFO("wait for message ...\n");
        pthread_cond_wait(&m_queue_cond, &m_queue_mutex);
        SLOG_INFO("wait for message done\n");
    }
    const MessageItem item = m_queue.front();
    m_queue.pop_front();
    SLOG_INFO("Ferrixd: get message\n");
    return item;
}

int Ferrixd::AppLoop() {
    SLOG_INFO("app thread starts receiving messages\n");
    while (m_running != 0) {
        const MessageItem item = PopMessage();
        PObject unwanted;
        PObject& response = item.response != nullptr ? *item.response : unwanted;
        HandleMessage(*item.request, response);
        response["ack"] = "ok";
        if (item.barrier != nullptr) item.barrier->Reach(kNobody);
    }
    SLOG_INFO("app thread down\n");
    return 0;
}

// An unknown name is answered like a known one, without any error: that silence is wanted.
void Ferrixd::HandleMessage(const PObject& request, PObject& response) {
    SLOG_DBG(">>> %s\n", request.ToText().c_str());
    if (request.HasMember("action")) {
        const auto action = m_actions.find(request["action"].AsString());
        if (action == m_actions.end()) return;
        (this->*action->second)(request, response);
    }
    if (request.HasMember("notify") && request.HasMember("type") &&
        IsHookType(request["type"].AsString())) {
        const auto hook = m_hooks.find(request["notify"].AsString());
        if (hook == m_hooks.end()) return;
        (this->*hook->second)(request);
    }
    SLOG_DBG("<<< %s\n", response.ToText().c_str());
}
