// Thin move-only owners of an SQLite connection and a prepared statement, in the manner of MPD's
// src/lib/sqlite. Nothing here throws: a failed open or prepare gives an empty object, and the
// reason is kept as text (Error()) and as SQLite's result code (Code()).
#pragma once

#include <sqlite3.h>

#include <cstdint>
#include <string>
#include <string_view>

namespace harmona::sqlite {

class Statement {
  public:
    Statement() = default;
    explicit Statement(sqlite3_stmt* stmt) noexcept : stmt_(stmt) {}
    ~Statement() { sqlite3_finalize(stmt_); }
    Statement(Statement&& other) noexcept : stmt_(other.stmt_) { other.stmt_ = nullptr; }
    Statement& operator=(Statement&& other) noexcept;
    Statement(const Statement&) = delete;
    Statement& operator=(const Statement&) = delete;

    explicit operator bool() const { return stmt_ != nullptr; }
    sqlite3_stmt* Get() const { return stmt_; }

    // Parameters count from 1, as in SQLite. Each returns SQLite's result code.
    int Bind(int index, std::int64_t value);
    int Bind(int index, std::string_view text);  // copied by SQLite (SQLITE_TRANSIENT)
    int BindNull(int index);

    // One step: SQLITE_ROW, SQLITE_DONE or an error code.
    int Step();
    // Makes the statement ready to run again; bindings are cleared too.
    void Reset();

    // Columns count from 0.
    int ColumnType(int column) const { return sqlite3_column_type(stmt_, column); }
    std::int64_t ColumnInt64(int column) const { return sqlite3_column_int64(stmt_, column); }
    // The column's bytes as SQLite stores them (possibly with NUL bytes inside); empty for NULL.
    // Valid until the next Step, Reset or column call on this column.
    std::string_view ColumnText(int column) const;

  private:
    sqlite3_stmt* stmt_ = nullptr;
};

class Database {
  public:
    Database() = default;
    explicit Database(sqlite3* db) noexcept : db_(db) {}
    ~Database() { sqlite3_close_v2(db_); }
    Database(Database&& other) noexcept;
    Database& operator=(Database&& other) noexcept;
    Database(const Database&) = delete;
    Database& operator=(const Database&) = delete;

    // Opens `path` with the given SQLITE_OPEN_* flags (SQLITE_OPEN_NOMUTEX is added: one
    // connection is used by one thread) and sets the busy timeout, so that a writer that holds the
    // database locked delays this connection by up to `busyTimeoutMs` instead of failing it.
    // Empty on failure.
    static Database Open(const char* path, int flags, int busyTimeoutMs);
    static Database OpenReadOnly(const char* path, int busyTimeoutMs) {
        return Open(path, SQLITE_OPEN_READONLY, busyTimeoutMs);
    }

    explicit operator bool() const { return db_ != nullptr; }
    sqlite3* Get() const { return db_; }

    // An empty statement on failure (see Error()).
    Statement Prepare(std::string_view sql);
    // Runs one or more statements that return no rows of interest; SQLite's result code.
    int Execute(const char* sql);

    // The result code and the message of the last failure (of Open, Prepare, Execute, or of the
    // connection's last call).
    int Code() const { return code_; }
    const std::string& Error() const { return error_; }

  private:
    void Remember(int code);

    sqlite3* db_ = nullptr;
    int code_ = SQLITE_OK;
    std::string error_;
};

}  // namespace harmona::sqlite
