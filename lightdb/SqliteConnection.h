// One SQLite connection, closed when the object goes away. Every database
// function opens its own and never shares it.
#pragma once

#include <sqlite3.h>

#include <string>

class SqliteConnection {
public:
    using RowCallback = int (*)(void* context, int columns, char** values, char** names);

    SqliteConnection() = default;
    ~SqliteConnection() { close(); }
    SqliteConnection(const SqliteConnection&) = delete;
    SqliteConnection& operator=(const SqliteConnection&) = delete;

    // Opens `path` with the sqlite3_open_v2 `flags`. On failure the handle that
    // SQLite still hands out is closed at once and the open's code returned.
    int open(const std::string& path, int flags);
    // Runs `sql` with sqlite3_exec; `callback` sees every result row.
    int exec(const char* sql, RowCallback callback = nullptr, void* context = nullptr);
    void close();

    sqlite3* handle() const { return db_; }

private:
    sqlite3* db_ = nullptr;
};
