// The register of what each task's present run has come to.
//
// Threads: every operation may be called from any thread; one mutex, a leaf.
#pragma once

#include <cstdint>
#include <map>
#include <mutex>

namespace Ferrix {

class ErrorHandler {
public:
    // The object of the daemon, made on first use and never destroyed.
    static ErrorHandler& GetInstance();

    // For tests; everyone else asks GetInstance().
    ErrorHandler() = default;
    ErrorHandler(const ErrorHandler&) = delete;
    ErrorHandler& operator=(const ErrorHandler&) = delete;

    // Forgets the task: called before a run begins.
    void Clear(uint64_t task_id);
    // Adds an outcome (ErrorCode). The last one that is not ignorable stands, but "Destination
    // quota full" and "Interrupted" are final. A first ignorable outcome is kept as 0.
    void Set(uint64_t task_id, int code);
    // The outcome so far; "System error" for a task that has none.
    [[nodiscard]] int Get(uint64_t task_id);

private:
    std::mutex m_mutex;
    std::map<uint64_t, int> m_codes;  // guarded by m_mutex
};

}  // namespace Ferrix
