// A thin move-only owner of libgpod's Itdb_iTunesDB (itdb_parse / itdb_new ... itdb_free), in the
// manner of MPD's src/lib/ wrappers. No exceptions: failures come back as an empty Database and a
// message.
#pragma once

#include <gpod/itdb.h>

#include <string>

namespace harmona::gpod {

class Database {
  public:
    Database() = default;
    // Takes ownership of `itdb` (may be null).
    explicit Database(Itdb_iTunesDB* itdb) noexcept : itdb_(itdb) {}
    ~Database() { Reset(); }
    Database(Database&& other) noexcept : itdb_(other.itdb_) { other.itdb_ = nullptr; }
    Database& operator=(Database&& other) noexcept;
    Database(const Database&) = delete;
    Database& operator=(const Database&) = delete;

    // Reads the database of the iPod mounted at `mountpoint` (the folder holding iPod_Control).
    // Empty on failure, with the reason in `error`.
    static Database Parse(const char* mountpoint, std::string& error);

    // A new, empty database (no playlist yet) bound to `mountpoint`.
    static Database Create(const char* mountpoint);

    // Writes the database to its mountpoint; false with the reason in `error`.
    bool Write(std::string& error);

    explicit operator bool() const noexcept { return itdb_ != nullptr; }
    Itdb_iTunesDB* Get() const noexcept { return itdb_; }

    void Reset() noexcept;

  private:
    Itdb_iTunesDB* itdb_ = nullptr;
};

}  // namespace harmona::gpod
