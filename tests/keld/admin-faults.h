// Makes renames and flushes of this program fail on demand: the functions stand in for the C
// library's. Threads: set while no other thread makes such calls; one object at a time.
#pragma once

class FailNth {
public:
    enum Call { RENAME_WITH_FLAGS, FLUSH };

    // The nth such call (1 is the next) up to the `last`th fails with `error`.
    FailNth(Call call, int nth, int last, int error);
    ~FailNth();
    FailNth(const FailNth&) = delete;
    FailNth& operator=(const FailNth&) = delete;

    // Whether so many calls were made that one failed.
    [[nodiscard]] static bool HasFailed();
};
