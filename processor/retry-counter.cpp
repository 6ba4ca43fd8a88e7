#include "processor/retry-counter.h"

#include "utils/error-code.h"

int RetryCounter::Count(int action) {
    if (action != ERROR_ACTION_RETRY) {
        m_count = 0;
        return action;
    }
    if (++m_count <= MAX_RETRIES) return ERROR_ACTION_RETRY;
    m_count = 0;
    return ERROR_ACTION_DONE;
}
