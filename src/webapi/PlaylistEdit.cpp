// The playlist actions of library.cgi: a personal playlist is an extended M3U file (.m3u8) in the
// user's playlists folder, changed under a lock of that folder and replaced atomically; a shared
// playlist is rows of library.db, changed in one write transaction that waits for the indexer
// rather than failing while it writes.
#include "src/webapi/PlaylistEdit.h"

#include <dirent.h>
#include <fcntl.h>
#include <stdio.h>
#include <strings.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "common/io/DirectoryReader.h"
#include "common/io/FileDescriptor.h"
#include "common/util/Number.h"
#include "platform/cgi/ApplicationRequest.h"
#include "platform/lib/sqlite/Database.h"
#include "platform/medialib/LibraryDatabase.h"
#include "platform/medialib/MediaFiles.h"
#include "platform/medialib/StreamName.h"
#include "platform/paths/PlatformPaths.h"
#include "platform/playlist/PlaylistFile.h"
#include "platform/playlist/PlaylistWrite.h"
#include "platform/texts/LocalizedStringParser.h"
#include "src/webapi/ApiError.h"
#include "src/webapi/LibraryApi.h"

namespace harmona::webapi {
namespace {

// Fixed line numbers of the errors, which log readers match on.
enum ErrorLine : int {
    kMethodLine = 201,
    kBodyTooLargeLine = 202,
    kNameInvalidLine = 203,
    kNameTakenLine = 204,
    kNoSuchPlaylistLine = 205,
    kNotAllowedLine = 206,
    kPositionInvalidLine = 207,
    kTrackUnknownLine = 208,
    kLibraryUnavailableLine = 209,
    kWriteFailedLine = 210,
    kPlaylistFullLine = 211,
    kCategoryInvalidLine = 212,
    kLibraryBusyLine = 213,
    kNoIdLeftLine = 214,
};

inline constexpr std::string_view kPersonalPrefix = "musiclib_music_personal/playlist/";
inline constexpr std::string_view kSharedPrefix = "musiclib_music_shared/playlist/";
inline constexpr std::int64_t kMaxSharedId = 4294967295LL;
inline constexpr const char* kPlaylistFileEnding = ".m3u8";

bool StartsWith(std::string_view text, std::string_view prefix) {
    return text.compare(0, prefix.size(), prefix) == 0;
}

// The playlist name of a file name, as the personal listing names it.
std::optional<std::string> PlaylistNameOf(std::string_view fileName) {
    for (std::string_view ending : {std::string_view(".m3u"), std::string_view(".m3u8")}) {
        if (fileName.size() > ending.size() &&
            strncasecmp(fileName.data() + fileName.size() - ending.size(), ending.data(),
                        ending.size()) == 0)
            return std::string(fileName.substr(0, fileName.size() - ending.size()));
    }
    return std::nullopt;
}

// The file of the personal playlist `name` in the folder `dirFd` (the first in byte order when
// two give the name); nullopt when there is none.
std::optional<std::string> FindPlaylistFile(int dirFd, std::string_view name) {
    io::DirectoryReader dir(
        io::FileDescriptor(openat(dirFd, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC)));
    if (!dir)
        return std::nullopt;
    std::optional<std::string> found;
    while (const dirent* entry = dir.Next()) {
        const std::optional<std::string> entryName = PlaylistNameOf(entry->d_name);
        if (entryName && *entryName == name && (!found || std::string_view(entry->d_name) < *found))
            found = std::string(entry->d_name);
    }
    return found;
}

// A comma-separated list of 1 to `max` items, none empty.
bool SplitList(std::string_view text, std::size_t max, std::vector<std::string_view>& items) {
    items.clear();
    if (text.empty())
        return false;
    std::size_t start = 0;
    while (start <= text.size()) {
        const std::size_t comma = std::min(text.find(',', start), text.size());
        const std::string_view item = text.substr(start, comma - start);
        if (item.empty() || items.size() == max)
            return false;
        items.push_back(item);
        start = comma + 1;
    }
    return true;
}

bool ParseIndex(std::string_view text, std::size_t& index) {
    std::int64_t value = 0;
    if (!util::ParseDecimalDigits(text, value) || value > 1000000)
        return false;
    index = static_cast<std::size_t>(value);
    return true;
}

// A track of the library as a playlist holds it.
struct LibraryEntry {
    std::string path;
    std::string title;
    std::string artist;
    std::int64_t durationMs = -1;
};

// Lookups of library.db on one connection (read-only for a personal playlist, the writing one for
// a shared playlist).
class EntryLookup {
  public:
    explicit EntryLookup(sqlite::Database& db)
        : byId_(db.Prepare("SELECT path, title, artist, duration_ms FROM track WHERE id = ?")),
          byPath_(db.Prepare("SELECT path, title, artist, duration_ms FROM track WHERE path = ?")) {
    }
    explicit operator bool() const { return byId_ && byPath_; }

    // The track that a stream id names (its id and its file's extension); nullopt for none.
    std::optional<LibraryEntry> ByStream(std::string_view stream) {
        const std::optional<medialib::StreamName> name = medialib::ParseStreamName(stream);
        if (!name)
            return std::nullopt;
        byId_.Bind(1, name->trackId);
        std::optional<LibraryEntry> entry = Step(byId_);
        if (entry && medialib::StreamNameOf(name->trackId, entry->path) != std::string(stream))
            return std::nullopt;
        // A path that no playlist line can hold is not put in one.
        if (entry && entry->path.find_first_of("\r\n") != std::string::npos)
            return std::nullopt;
        return entry;
    }
    std::optional<LibraryEntry> ByPath(const std::string& path) {
        byPath_.Bind(1, std::string_view(path));
        return Step(byPath_);
    }

  private:
    static std::optional<LibraryEntry> Step(sqlite::Statement& statement) {
        std::optional<LibraryEntry> entry;
        if (statement.Step() == SQLITE_ROW) {
            entry.emplace();
            entry->path = statement.ColumnText(0);
            entry->title = statement.ColumnText(1);
            entry->artist = statement.ColumnText(2);
            if (statement.ColumnType(3) == SQLITE_INTEGER && statement.ColumnInt64(3) >= 0)
                entry->durationMs = statement.ColumnInt64(3);
        }
        statement.Reset();
        return entry;
    }
    sqlite::Statement byId_;
    sqlite::Statement byPath_;
};

// Text of an #EXTINF line: control bytes become spaces, cut at 1024 bytes.
std::string InfoText(std::string text) {
    if (text.size() > 1024)
        text.resize(1024);
    for (char& c : text) {
        const auto byte = static_cast<unsigned char>(c);
        if (byte < 0x20 || byte == 0x7f)
            c = ' ';
    }
    return text;
}

// The extended M3U text of a personal playlist: the library's title and artist where it knows the
// track, the path alone where it does not.
std::string PlaylistText(const std::vector<std::string>& paths, EntryLookup* lookup) {
    std::string text = "#EXTM3U\n";
    for (const std::string& path : paths) {
        if (std::optional<LibraryEntry> entry = lookup ? lookup->ByPath(path) : std::nullopt) {
            const long long seconds =
                entry->durationMs < 0 ? -1 : std::llround(entry->durationMs / 1000.0);
            text += "#EXTINF:" + std::to_string(seconds) + "," + InfoText(entry->artist) + " - " +
                    InfoText(entry->title) + "\n";
        }
        text += path + "\n";
    }
    return text;
}

// The change asked of a playlist's entries.
struct EntryChange {
    enum class Kind { add, remove, move } kind = Kind::add;
    std::vector<std::string> addPaths;  // add: the library paths, in order
    std::optional<std::size_t> at;      // add: the place (none: the end)
    std::vector<std::size_t> remove;    // remove: the entries
    std::size_t from = 0, to = 0;       // move
};

enum class ChangeOutcome { ok, badPosition, full };

ChangeOutcome Apply(const EntryChange& change, std::vector<std::string>& paths) {
    switch (change.kind) {
        case EntryChange::Kind::add: {
            const std::size_t at = change.at.value_or(paths.size());
            if (at > paths.size())
                return ChangeOutcome::badPosition;
            if (paths.size() + change.addPaths.size() > playlist::kMaxPlaylistEntries)
                return ChangeOutcome::full;
            paths.insert(paths.begin() + static_cast<std::ptrdiff_t>(at), change.addPaths.begin(),
                         change.addPaths.end());
            return ChangeOutcome::ok;
        }
        case EntryChange::Kind::remove: {
            std::set<std::size_t> gone(change.remove.begin(), change.remove.end());
            if (gone.size() != change.remove.size() || *gone.rbegin() >= paths.size())
                return ChangeOutcome::badPosition;
            std::vector<std::string> kept;
            kept.reserve(paths.size() - gone.size());
            for (std::size_t i = 0; i < paths.size(); ++i) {
                if (gone.count(i) == 0)
                    kept.push_back(std::move(paths[i]));
            }
            paths = std::move(kept);
            return ChangeOutcome::ok;
        }
        case EntryChange::Kind::move: {
            if (change.from >= paths.size() || change.to >= paths.size())
                return ChangeOutcome::badPosition;
            std::string moved = std::move(paths[change.from]);
            paths.erase(paths.begin() + static_cast<std::ptrdiff_t>(change.from));
            paths.insert(paths.begin() + static_cast<std::ptrdiff_t>(change.to), std::move(moved));
            return ChangeOutcome::ok;
        }
    }
    return ChangeOutcome::badPosition;
}

// library.db opened for writing: only a regular file, with the same busy timeout as every reader.
sqlite::Database OpenLibraryForWriting() {
    struct stat st {};
    if (stat(paths::kLibraryDb, &st) != 0 || !S_ISREG(st.st_mode))
        return sqlite::Database();
    return sqlite::Database::Open(paths::kLibraryDb, SQLITE_OPEN_READWRITE,
                                  medialib::kLibraryBusyTimeoutMs);
}

// A write transaction that is rolled back unless committed.
class WriteTransaction {
  public:
    explicit WriteTransaction(sqlite::Database& db) : db_(db) {
        code_ = db_.Execute("BEGIN IMMEDIATE");
    }
    ~WriteTransaction() {
        if (code_ == SQLITE_OK && !committed_)
            db_.Execute("ROLLBACK");
    }
    int Code() const { return code_; }
    bool Commit() {
        committed_ = db_.Execute("COMMIT") == SQLITE_OK;
        return committed_;
    }

  private:
    sqlite::Database& db_;
    int code_ = SQLITE_ERROR;
    bool committed_ = false;
};

bool IsBusy(int code) {
    return (code & 0xff) == SQLITE_BUSY || (code & 0xff) == SQLITE_LOCKED;
}

std::optional<std::vector<std::string>> SharedPaths(sqlite::Database& db, std::int64_t id) {
    sqlite::Statement exists = db.Prepare("SELECT 1 FROM playlist WHERE id = ?");
    if (!exists || exists.Bind(1, id) != SQLITE_OK || exists.Step() != SQLITE_ROW)
        return std::nullopt;
    sqlite::Statement select =
        db.Prepare("SELECT path FROM playlist_entry WHERE playlist_id = ? ORDER BY position");
    if (!select)
        return std::nullopt;
    select.Bind(1, id);
    std::vector<std::string> paths;
    while (select.Step() == SQLITE_ROW && paths.size() <= playlist::kMaxPlaylistEntries)
        paths.emplace_back(select.ColumnText(0));
    return paths;
}

bool StoreSharedPaths(sqlite::Database& db, std::int64_t id,
                      const std::vector<std::string>& paths) {
    sqlite::Statement clear = db.Prepare("DELETE FROM playlist_entry WHERE playlist_id = ?");
    if (!clear || clear.Bind(1, id) != SQLITE_OK || clear.Step() != SQLITE_DONE)
        return false;
    sqlite::Statement insert =
        db.Prepare("INSERT INTO playlist_entry (playlist_id, position, path) VALUES (?, ?, ?)");
    if (!insert)
        return false;
    for (std::size_t i = 0; i < paths.size(); ++i) {
        insert.Reset();
        insert.Bind(1, id);
        insert.Bind(2, static_cast<std::int64_t>(i));
        insert.Bind(3, std::string_view(paths[i]));
        if (insert.Step() != SQLITE_DONE)
            return false;
    }
    return true;
}

bool SharedNameTaken(sqlite::Database& db, const std::string& name, std::int64_t except) {
    sqlite::Statement taken = db.Prepare("SELECT 1 FROM playlist WHERE name = ? AND id != ?");
    if (!taken)
        return true;
    taken.Bind(1, std::string_view(name));
    taken.Bind(2, except);
    return taken.Step() == SQLITE_ROW;
}

}  // namespace

bool IsPlaylistEditAction(std::string_view action) {
    return action == "plcreate" || action == "pladd" || action == "plremove" ||
           action == "plmove" || action == "plrename" || action == "pldelete";
}

int LibraryApi::FailWith(const char* status, const char* error, int line, const char* section,
                         const char* key, const std::string& detail) {
    // Without a UI text the code itself stands in the errinfo (section "playlist").
    Json::Value reply = ErrorReply(*this, webMan,
                                   {status, section != nullptr ? section : "playlist",
                                    key != nullptr ? key : error, line, error});
    if (!detail.empty())
        reply["rule"] = detail;
    PrintResponse(std::move(reply), kJsonReplyType, status);
    return 0;
}

int LibraryApi::AdmitChange() {
    const char* method = std::getenv("REQUEST_METHOD");
    if (method == nullptr || std::strcmp(method, "POST") != 0)
        return FailWith(kStatusMethodNotAllowed, "method_not_allowed", kMethodLine);
    const char* length = std::getenv("CONTENT_LENGTH");
    std::int64_t bytes = 0;
    if (length != nullptr && *length != '\0' &&
        (!util::ParseDecimalDigits(length, bytes) || bytes > kMaxChangeBodyBytes))
        return FailWith(kStatusTooLarge, "too_large", kBodyTooLargeLine);
    return 1;
}

int LibraryApi::EditPlaylist(const std::string& action) {
    if (AdmitChange() == 0)
        return 0;
    const bool mayChangeShared = (permission_ & cgi::kPermissionNewSharedPlaylist) != 0;
    const std::string folder = webMan.GetPreferenceDir() + paths::kPlaylistsFolder;

    if (action == "plcreate") {
        const std::string category = webMan.In("category", "");
        const std::string name = webMan.In("name", "");
        if (category != "personal" && category != "shared")
            return FailWith(kStatusBadRequest, "category_invalid", kCategoryInvalidLine);
        if (!playlist::IsValidPlaylistName(name))
            return FailWith(kStatusBadRequest, "name_invalid", kNameInvalidLine);
        Json::Value reply(Json::objectValue);
        reply["success"] = true;
        if (category == "personal") {
            mkdir(webMan.GetPreferenceDir().c_str(), 0755);
            const io::FileDescriptor dir = playlist::LockFolder(folder, true);
            if (!dir)
                return FailWith(kStatusServerError, "write_failed", kWriteFailedLine,
                                kSystemSection, kSystemText);
            if (FindPlaylistFile(dir.Get(), name))
                return FailWith(kStatusConflict, "name_taken", kNameTakenLine);
            const playlist::WriteOutcome written =
                playlist::WriteFileAt(dir.Get(), name + kPlaylistFileEnding, "#EXTM3U\n", true);
            if (written == playlist::WriteOutcome::exists)
                return FailWith(kStatusConflict, "name_taken", kNameTakenLine);
            if (written != playlist::WriteOutcome::ok)
                return FailWith(kStatusServerError, "write_failed", kWriteFailedLine,
                                kSystemSection, kSystemText);
            reply["node"] = std::string(kPersonalPrefix) + name;
        } else {
            if (!mayChangeShared)
                return FailWith(kStatusForbidden, "request_refused", kNotAllowedLine);
            sqlite::Database db = OpenLibraryForWriting();
            if (!db)
                return FailWith(kStatusUnavailable, "library_unavailable", kLibraryUnavailableLine,
                                kSystemSection, kSystemText);
            WriteTransaction transaction(db);
            if (transaction.Code() != SQLITE_OK)
                return IsBusy(transaction.Code())
                           ? FailWith(kStatusUnavailable, "library_busy", kLibraryBusyLine)
                           : FailWith(kStatusServerError, "write_failed", kWriteFailedLine,
                                      kSystemSection, kSystemText);
            if (SharedNameTaken(db, name, -1))
                return FailWith(kStatusConflict, "name_taken", kNameTakenLine);
            sqlite::Statement next = db.Prepare("SELECT coalesce(max(id), 0) + 1 FROM playlist");
            if (!next || next.Step() != SQLITE_ROW)
                return FailWith(kStatusServerError, "write_failed", kWriteFailedLine,
                                kSystemSection, kSystemText);
            const std::int64_t id = next.ColumnInt64(0);
            if (id > kMaxSharedId)
                return FailWith(kStatusInsufficientStorage, "no_id_left", kNoIdLeftLine);
            sqlite::Statement insert = db.Prepare("INSERT INTO playlist (id, name) VALUES (?, ?)");
            if (!insert || insert.Bind(1, id) != SQLITE_OK ||
                insert.Bind(2, std::string_view(name)) != SQLITE_OK ||
                insert.Step() != SQLITE_DONE || !transaction.Commit())
                return FailWith(kStatusServerError, "write_failed", kWriteFailedLine,
                                kSystemSection, kSystemText);
            reply["node"] = std::string(kSharedPrefix) + std::to_string(id);
        }
        PrintResponse(std::move(reply), kJsonReplyType);
        return 1;
    }

    // The other actions name an existing playlist by its tree node.
    const std::string node = webMan.In("node", "");
    const bool personal = StartsWith(node, kPersonalPrefix);
    const bool shared = StartsWith(node, kSharedPrefix);
    std::string name;
    std::int64_t id = -1;
    if (personal) {
        // Any name the listing gives (a file's name less its ending) is found among the folder's
        // files, never used as a path; the rules of a new name apply to new names only.
        name = node.substr(kPersonalPrefix.size());
        if (name.empty() || name.find('/') != std::string::npos)
            return FailWith(kStatusNotFound, "node_gone", kNoSuchPlaylistLine, kNotFoundSection,
                            kNotFoundText);
    } else if (shared) {
        const std::string digits = node.substr(kSharedPrefix.size());
        if (!util::ParseDecimalDigits(digits, id) || id > kMaxSharedId)
            return FailWith(kStatusNotFound, "node_gone", kNoSuchPlaylistLine, kNotFoundSection,
                            kNotFoundText);
        if (!mayChangeShared)
            return FailWith(kStatusForbidden, "request_refused", kNotAllowedLine);
    } else {
        return FailWith(kStatusNotFound, "node_gone", kNoSuchPlaylistLine, kNotFoundSection,
                        kNotFoundText);
    }

    // What is asked, checked before anything is opened.
    EntryChange change;
    std::vector<std::string_view> items;
    std::string newName;
    if (action == "pladd") {
        change.kind = EntryChange::Kind::add;
        if (!SplitList(webMan.In("streams", ""), playlist::kMaxPlaylistEntries, items))
            return FailWith(kStatusBadRequest, "track_unknown", kTrackUnknownLine);
        const std::string at = webMan.In("position", "");
        std::size_t position = 0;
        if (!at.empty()) {
            if (!ParseIndex(at, position))
                return FailWith(kStatusBadRequest, "position_invalid", kPositionInvalidLine);
            change.at = position;
        }
    } else if (action == "plremove") {
        change.kind = EntryChange::Kind::remove;
        if (!SplitList(webMan.In("entries", ""), playlist::kMaxPlaylistEntries, items))
            return FailWith(kStatusBadRequest, "position_invalid", kPositionInvalidLine);
        for (std::string_view item : items) {
            std::size_t entry = 0;
            if (!ParseIndex(item, entry))
                return FailWith(kStatusBadRequest, "position_invalid", kPositionInvalidLine);
            change.remove.push_back(entry);
        }
    } else if (action == "plmove") {
        change.kind = EntryChange::Kind::move;
        if (!ParseIndex(webMan.In("from", ""), change.from) ||
            !ParseIndex(webMan.In("to", ""), change.to))
            return FailWith(kStatusBadRequest, "position_invalid", kPositionInvalidLine);
    } else if (action == "plrename") {
        newName = webMan.In("name", "");
        if (!playlist::IsValidPlaylistName(newName))
            return FailWith(kStatusBadRequest, "name_invalid", kNameInvalidLine);
    }

    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    const bool changesEntries = action == "pladd" || action == "plremove" || action == "plmove";

    if (personal) {
        const io::FileDescriptor dir = playlist::LockFolder(folder, false);
        if (!dir)
            return FailWith(kStatusNotFound, "node_gone", kNoSuchPlaylistLine, kNotFoundSection,
                            kNotFoundText);
        const std::optional<std::string> file = FindPlaylistFile(dir.Get(), name);
        if (!file)
            return FailWith(kStatusNotFound, "node_gone", kNoSuchPlaylistLine, kNotFoundSection,
                            kNotFoundText);
        if (action == "pldelete") {
            if (unlinkat(dir.Get(), file->c_str(), 0) != 0)
                return FailWith(kStatusServerError, "write_failed", kWriteFailedLine,
                                kSystemSection, kSystemText);
            fsync(dir.Get());
        } else if (action == "plrename") {
            if (newName != name) {
                if (FindPlaylistFile(dir.Get(), newName))
                    return FailWith(kStatusConflict, "name_taken", kNameTakenLine);
                const std::string renamed = newName + file->substr(name.size());
                if (renameat2(dir.Get(), file->c_str(), dir.Get(), renamed.c_str(),
                              RENAME_NOREPLACE) != 0)
                    return errno == EEXIST
                               ? FailWith(kStatusConflict, "name_taken", kNameTakenLine)
                               : FailWith(kStatusServerError, "write_failed", kWriteFailedLine,
                                          kSystemSection, kSystemText);
                fsync(dir.Get());
            }
            reply["node"] = std::string(kPersonalPrefix) + newName;
        } else if (changesEntries) {
            playlist::PlaylistFileEntries entries =
                playlist::ReadPlaylistFileAt(dir.Get(), file->c_str(), medialib::AudioSharePath());
            if (entries.status == playlist::PlaylistFileStatus::tooLarge)
                return FailWith(kStatusTooLarge, "too_large", kPlaylistFullLine);
            if (entries.status != playlist::PlaylistFileStatus::ok)
                return FailWith(kStatusNotFound, "node_gone", kNoSuchPlaylistLine, kNotFoundSection,
                                kNotFoundText);
            medialib::LibraryOpenResult library = medialib::OpenLibrary(paths::kLibraryDb);
            if (library.status != medialib::LibraryStatus::ok)
                return FailWith(kStatusUnavailable, "library_unavailable", kLibraryUnavailableLine,
                                kSystemSection, kSystemText);
            EntryLookup lookup(library.db);
            if (!lookup)
                return FailWith(kStatusUnavailable, "library_unavailable", kLibraryUnavailableLine,
                                kSystemSection, kSystemText);
            for (std::string_view stream : items) {
                if (change.kind != EntryChange::Kind::add)
                    break;
                std::optional<LibraryEntry> entry = lookup.ByStream(stream);
                if (!entry)
                    return FailWith(kStatusBadRequest, "track_unknown", kTrackUnknownLine);
                change.addPaths.push_back(std::move(entry->path));
            }
            const ChangeOutcome applied = Apply(change, entries.paths);
            if (applied == ChangeOutcome::badPosition)
                return FailWith(kStatusBadRequest, "position_invalid", kPositionInvalidLine);
            if (applied == ChangeOutcome::full)
                return FailWith(kStatusTooLarge, "too_large", kPlaylistFullLine);
            if (playlist::WriteFileAt(dir.Get(), *file, PlaylistText(entries.paths, &lookup),
                                      false) != playlist::WriteOutcome::ok)
                return FailWith(kStatusServerError, "write_failed", kWriteFailedLine,
                                kSystemSection, kSystemText);
            reply["node"] = node;
            reply["entries"] = Json::UInt64(entries.paths.size());
        }
    } else {
        sqlite::Database db = OpenLibraryForWriting();
        if (!db)
            return FailWith(kStatusUnavailable, "library_unavailable", kLibraryUnavailableLine,
                            kSystemSection, kSystemText);
        WriteTransaction transaction(db);
        if (transaction.Code() != SQLITE_OK)
            return IsBusy(transaction.Code())
                       ? FailWith(kStatusUnavailable, "library_busy", kLibraryBusyLine)
                       : FailWith(kStatusServerError, "write_failed", kWriteFailedLine,
                                  kSystemSection, kSystemText);
        std::optional<std::vector<std::string>> paths = SharedPaths(db, id);
        if (!paths)
            return FailWith(kStatusNotFound, "node_gone", kNoSuchPlaylistLine, kNotFoundSection,
                            kNotFoundText);
        bool stored = true;
        if (action == "pldelete") {
            sqlite::Statement entries =
                db.Prepare("DELETE FROM playlist_entry WHERE playlist_id = ?");
            sqlite::Statement row = db.Prepare("DELETE FROM playlist WHERE id = ?");
            stored = entries && row && entries.Bind(1, id) == SQLITE_OK &&
                     entries.Step() == SQLITE_DONE && row.Bind(1, id) == SQLITE_OK &&
                     row.Step() == SQLITE_DONE;
        } else if (action == "plrename") {
            if (SharedNameTaken(db, newName, id))
                return FailWith(kStatusConflict, "name_taken", kNameTakenLine);
            sqlite::Statement update = db.Prepare("UPDATE playlist SET name = ? WHERE id = ?");
            stored = update && update.Bind(1, std::string_view(newName)) == SQLITE_OK &&
                     update.Bind(2, id) == SQLITE_OK && update.Step() == SQLITE_DONE;
            reply["node"] = node;
        } else if (changesEntries) {
            if (paths->size() > playlist::kMaxPlaylistEntries)
                return FailWith(kStatusTooLarge, "too_large", kPlaylistFullLine);
            EntryLookup lookup(db);
            if (!lookup)
                return FailWith(kStatusServerError, "write_failed", kWriteFailedLine,
                                kSystemSection, kSystemText);
            for (std::string_view stream : items) {
                if (change.kind != EntryChange::Kind::add)
                    break;
                std::optional<LibraryEntry> entry = lookup.ByStream(stream);
                if (!entry)
                    return FailWith(kStatusBadRequest, "track_unknown", kTrackUnknownLine);
                change.addPaths.push_back(std::move(entry->path));
            }
            const ChangeOutcome applied = Apply(change, *paths);
            if (applied == ChangeOutcome::badPosition)
                return FailWith(kStatusBadRequest, "position_invalid", kPositionInvalidLine);
            if (applied == ChangeOutcome::full)
                return FailWith(kStatusTooLarge, "too_large", kPlaylistFullLine);
            stored = StoreSharedPaths(db, id, *paths);
            reply["node"] = node;
            reply["entries"] = Json::UInt64(paths->size());
        }
        if (!stored || !transaction.Commit())
            return FailWith(kStatusServerError, "write_failed", kWriteFailedLine, kSystemSection,
                            kSystemText);
    }
    PrintResponse(std::move(reply), kJsonReplyType);
    return 1;
}

}  // namespace harmona::webapi
