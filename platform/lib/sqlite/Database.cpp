#include "platform/lib/sqlite/Database.h"

#include <utility>

namespace harmona::sqlite {

Statement& Statement::operator=(Statement&& other) noexcept {
    std::swap(stmt_, other.stmt_);
    return *this;
}

int Statement::Bind(int index, std::int64_t value) {
    return sqlite3_bind_int64(stmt_, index, value);
}

int Statement::Bind(int index, std::string_view text) {
    return sqlite3_bind_text64(stmt_, index, text.data(), text.size(), SQLITE_TRANSIENT,
                               SQLITE_UTF8);
}

int Statement::BindNull(int index) {
    return sqlite3_bind_null(stmt_, index);
}

int Statement::Step() {
    return sqlite3_step(stmt_);
}

void Statement::Reset() {
    sqlite3_reset(stmt_);
    sqlite3_clear_bindings(stmt_);
}

std::string_view Statement::ColumnText(int column) const {
    const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(stmt_, column));
    if (text == nullptr)
        return {};
    const int bytes = sqlite3_column_bytes(stmt_, column);
    return std::string_view(text, bytes > 0 ? static_cast<std::size_t>(bytes) : 0);
}

Database::Database(Database&& other) noexcept
    : db_(other.db_), code_(other.code_), error_(std::move(other.error_)) {
    other.db_ = nullptr;
}

Database& Database::operator=(Database&& other) noexcept {
    std::swap(db_, other.db_);
    std::swap(code_, other.code_);
    std::swap(error_, other.error_);
    return *this;
}

Database Database::Open(const char* path, int flags, int busyTimeoutMs) {
    sqlite3* handle = nullptr;
    const int code = sqlite3_open_v2(path, &handle, flags | SQLITE_OPEN_NOMUTEX, nullptr);
    if (code != SQLITE_OK) {
        // SQLite allocates a handle even for a failed open; it carries the message.
        Database failed;
        failed.code_ = code;
        failed.error_ = handle != nullptr ? sqlite3_errmsg(handle) : sqlite3_errstr(code);
        sqlite3_close_v2(handle);
        return failed;
    }
    sqlite3_busy_timeout(handle, busyTimeoutMs);
    return Database(handle);
}

Statement Database::Prepare(std::string_view sql) {
    sqlite3_stmt* stmt = nullptr;
    const int code =
        sqlite3_prepare_v2(db_, sql.data(), static_cast<int>(sql.size()), &stmt, nullptr);
    if (code != SQLITE_OK) {
        Remember(code);
        sqlite3_finalize(stmt);
        return Statement();
    }
    return Statement(stmt);
}

int Database::Execute(const char* sql) {
    const int code = sqlite3_exec(db_, sql, nullptr, nullptr, nullptr);
    if (code != SQLITE_OK)
        Remember(code);
    return code;
}

void Database::Remember(int code) {
    code_ = code;
    error_ = db_ != nullptr ? sqlite3_errmsg(db_) : sqlite3_errstr(code);
}

}  // namespace harmona::sqlite
