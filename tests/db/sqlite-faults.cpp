#include "db/sqlite-faults.h"

#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/types.h>

#include <cerrno>

namespace {

ssize_t FullDisk(int /*fd*/, const void* /*data*/, size_t /*size*/, off_t /*at*/) {
    errno = ENOSPC;
    return -1;
}

// Null brings the system's own call back. Which of the two sqlite uses was chosen when it was
// built.
void SetWriteCall(sqlite3_syscall_ptr call) {
    sqlite3_vfs* const vfs = sqlite3_vfs_find(nullptr);
    for (const char* name : {"pwrite", "pwrite64"}) {
        EXPECT_EQ(SQLITE_OK, vfs->xSetSystemCall(vfs, name, call)) << name;
    }
}

}  // namespace

FailSqliteWrites::FailSqliteWrites() {
    SetWriteCall(reinterpret_cast<sqlite3_syscall_ptr>(FullDisk));
}

FailSqliteWrites::~FailSqliteWrites() { SetWriteCall(nullptr); }
