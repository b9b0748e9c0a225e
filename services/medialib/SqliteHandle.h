// Thin move-only RAII handles of a SQLite connection and a prepared statement, private to the
// services until the platform's SQLite wrapper is on main.
#pragma once

#include <sqlite3.h>

#include <cstdint>
#include <string>

namespace harmona::medialib {

class Statement {
  public:
    Statement() = default;
    explicit Statement(sqlite3_stmt* stmt) : stmt_(stmt) {}
    ~Statement() { sqlite3_finalize(stmt_); }
    Statement(Statement&& other) noexcept : stmt_(other.stmt_) { other.stmt_ = nullptr; }
    Statement& operator=(Statement&& other) noexcept;
    Statement(const Statement&) = delete;
    Statement& operator=(const Statement&) = delete;

    bool ok() const { return stmt_ != nullptr; }
    // Binds by 1-based index; text is copied by SQLite.
    void Bind(int index, const std::string& text);
    void Bind(int index, int64_t value);
    void BindNull(int index);
    // SQLITE_ROW, SQLITE_DONE or an error code.
    int Step() { return sqlite3_step(stmt_); }
    void Reset();

    int64_t Int(int column) const { return sqlite3_column_int64(stmt_, column); }
    bool IsNull(int column) const { return sqlite3_column_type(stmt_, column) == SQLITE_NULL; }
    // The column's text, "" for NULL.
    std::string Text(int column) const;

  private:
    sqlite3_stmt* stmt_ = nullptr;
};

class SqliteHandle {
  public:
    SqliteHandle() = default;
    ~SqliteHandle() { sqlite3_close_v2(db_); }
    SqliteHandle(SqliteHandle&& other) noexcept : db_(other.db_) { other.db_ = nullptr; }
    SqliteHandle& operator=(SqliteHandle&& other) noexcept;
    SqliteHandle(const SqliteHandle&) = delete;
    SqliteHandle& operator=(const SqliteHandle&) = delete;

    // Opens `path` with sqlite3_open_v2 flags and sets the busy timeout. False on failure
    // (error() says why).
    bool Open(const char* path, int flags, int busyTimeoutMs);
    bool ok() const { return db_ != nullptr; }
    // Runs SQL without results; false on failure.
    bool Exec(const char* sql);
    Statement Prepare(const char* sql);
    std::string error() const;
    sqlite3* get() const { return db_; }

  private:
    sqlite3* db_ = nullptr;
    std::string openError_;
};

}  // namespace harmona::medialib
