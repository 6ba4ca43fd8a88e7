// Counts how often a worker has tried the same piece of work again. One thread: the worker's.
#pragma once

class RetryCounter {
public:
    static constexpr int MAX_RETRIES = 3;

    // Takes the action that belongs to an outcome (ErrorAction) and returns the one to carry out:
    // a fourth retry in a row becomes "done", so that failing work runs four times at most.
    int Count(int action);
    // Other work has been taken up.
    void Reset() { m_count = 0; }
    // True when the next retry would be one too many.
    [[nodiscard]] bool IsUsedUp() const { return m_count == MAX_RETRIES; }

private:
    int m_count = 0;
};
