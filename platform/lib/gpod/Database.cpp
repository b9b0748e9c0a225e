#include "platform/lib/gpod/Database.h"

namespace harmona::gpod {

namespace {

// Moves a GError's message into `error` and frees it.
void TakeError(GError* gerror, const char* fallback, std::string& error) {
    if (gerror != nullptr) {
        error = gerror->message != nullptr ? gerror->message : fallback;
        g_error_free(gerror);
    } else {
        error = fallback;
    }
}

}  // namespace

Database& Database::operator=(Database&& other) noexcept {
    if (this != &other) {
        Reset();
        itdb_ = other.itdb_;
        other.itdb_ = nullptr;
    }
    return *this;
}

void Database::Reset() noexcept {
    if (itdb_ != nullptr) {
        itdb_free(itdb_);
        itdb_ = nullptr;
    }
}

Database Database::Parse(const char* mountpoint, std::string& error) {
    GError* gerror = nullptr;
    Itdb_iTunesDB* itdb = itdb_parse(mountpoint, &gerror);
    if (itdb == nullptr) {
        TakeError(gerror, "cannot read the iPod database", error);
        return Database();
    }
    if (gerror != nullptr)
        g_error_free(gerror);
    return Database(itdb);
}

Database Database::Create(const char* mountpoint) {
    Database database(itdb_new());
    if (database)
        itdb_set_mountpoint(database.itdb_, mountpoint);
    return database;
}

bool Database::Write(std::string& error) {
    if (itdb_ == nullptr) {
        error = "no database";
        return false;
    }
    GError* gerror = nullptr;
    if (!itdb_write(itdb_, &gerror)) {
        TakeError(gerror, "cannot write the iPod database", error);
        return false;
    }
    if (gerror != nullptr)
        g_error_free(gerror);
    return true;
}

}  // namespace harmona::gpod
