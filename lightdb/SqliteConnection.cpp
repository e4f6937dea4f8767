#include "lightdb/SqliteConnection.h"

int SqliteConnection::open(const std::string& path, int flags)
{
    close();
    int rc = sqlite3_open_v2(path.c_str(), &db_, flags, nullptr);
    if (rc != SQLITE_OK)
        close();
    return rc;
}

int SqliteConnection::exec(const char* sql, RowCallback callback, void* context)
{
    if (!db_)
        return SQLITE_MISUSE;
    return sqlite3_exec(db_, sql, callback, context, nullptr);
}

void SqliteConnection::close()
{
    if (db_)
        sqlite3_close(db_);
    db_ = nullptr;
}
