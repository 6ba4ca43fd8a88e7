// The producer side: turns a handler's decision into an event and enters it in EventManager.
// Threads: any.
#pragma once

#include <cstdint>
#include <string>

class EventGenerator {
public:
    explicit EventGenerator(uint64_t task_id) : m_task_id(task_id) {}

    // Paths are relative to the task's roots, with a leading "/". A path that EventManager refuses
    // is dropped with a log line.
    void PushScanEvent(const std::string& path) const;
    void PushCreateDirEvent(const std::string& path) const;
    void PushCopyFileEvent(const std::string& path) const;
    void PushRemoveEvent(const std::string& path, bool is_dir) const;

private:
    uint64_t m_task_id;
};
