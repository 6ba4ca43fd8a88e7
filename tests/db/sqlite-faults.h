// Makes every write of sqlite to its files fail, for as long as it lives, as on a full disk. What
// is written in a small transaction is kept in memory until it is committed: so the commit fails.
#pragma once

class FailSqliteWrites {
public:
    FailSqliteWrites();
    ~FailSqliteWrites();
    FailSqliteWrites(const FailSqliteWrites&) = delete;
    FailSqliteWrites& operator=(const FailSqliteWrites&) = delete;
};
