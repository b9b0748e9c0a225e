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
    kPlaylistChangedLine = 215,
};

inline constexpr std::string_view kPersonalPrefix = "musiclib_music_personal/playlist/";
inline constexpr std::string_view kSharedPrefix = "musiclib_music_shared/playlist/";
inline constexpr std::int64_t kMaxSharedId = 4294967295LL;
inline constexpr const char* kPlaylistFileEnding = ".m3u8";

// The error replies of a change. Where no UI text fits, the code itself stands in the errinfo
// (section "playlist").
using MaybeRefusal = std::optional<ApiError>;
constexpr const char* kPlaylistSection = "playlist";

constexpr ApiError kWriteFailed{kStatusServerError, kSystemSection, kSystemText, kWriteFailedLine,
                                "write_failed"};
constexpr ApiError kPlaylistGone{kStatusNotFound, kNotFoundSection, kNotFoundText,
                                 kNoSuchPlaylistLine, "node_gone"};
constexpr ApiError kLibraryUnavailable{kStatusUnavailable, kSystemSection, kSystemText,
                                       kLibraryUnavailableLine, "library_unavailable"};
constexpr ApiError kLibraryBusy{kStatusUnavailable, kPlaylistSection, "library_busy",
                                kLibraryBusyLine, "library_busy"};
constexpr ApiError kNameInvalid{kStatusBadRequest, kPlaylistSection, "name_invalid",
                                kNameInvalidLine, "name_invalid"};
constexpr ApiError kNameTaken{kStatusConflict, kPlaylistSection, "name_taken", kNameTakenLine,
                              "name_taken"};
constexpr ApiError kNotAllowed{kStatusForbidden, kPlaylistSection, "request_refused",
                               kNotAllowedLine, "request_refused"};
constexpr ApiError kPositionInvalid{kStatusBadRequest, kPlaylistSection, "position_invalid",
                                    kPositionInvalidLine, "position_invalid"};
constexpr ApiError kTrackUnknown{kStatusBadRequest, kPlaylistSection, "track_unknown",
                                 kTrackUnknownLine, "track_unknown"};
constexpr ApiError kPlaylistFull{kStatusTooLarge, kPlaylistSection, "too_large", kPlaylistFullLine,
                                 "too_large"};
constexpr ApiError kCategoryInvalid{kStatusBadRequest, kPlaylistSection, "category_invalid",
                                    kCategoryInvalidLine, "category_invalid"};
constexpr ApiError kNoIdLeft{kStatusInsufficientStorage, kPlaylistSection, "no_id_left",
                             kNoIdLeftLine, "no_id_left"};
constexpr ApiError kPlaylistChanged{kStatusConflict, kPlaylistSection, "playlist_changed",
                                    kPlaylistChangedLine, "playlist_changed"};

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

// library.db opened for writing (only a regular file, with the same busy timeout as every reader)
// with a write transaction begun, which is rolled back unless committed.
class LibraryWrite {
  public:
    LibraryWrite() {
        struct stat st {};
        if (stat(paths::kLibraryDb, &st) != 0 || !S_ISREG(st.st_mode))
            return;
        db_ = sqlite::Database::Open(paths::kLibraryDb, SQLITE_OPEN_READWRITE,
                                     medialib::kLibraryBusyTimeoutMs);
        if (db_)
            begun_ = db_.Execute("BEGIN IMMEDIATE");
    }
    ~LibraryWrite() {
        if (begun_ == SQLITE_OK && !committed_)
            db_.Execute("ROLLBACK");
    }
    LibraryWrite(const LibraryWrite&) = delete;
    LibraryWrite& operator=(const LibraryWrite&) = delete;

    // Why no change can be made: library.db missing, held by another writer past the timeout, or
    // not writable.
    MaybeRefusal WhyNot() const {
        if (!db_)
            return kLibraryUnavailable;
        if (begun_ == SQLITE_OK)
            return std::nullopt;
        const int primary = begun_ & 0xff;
        return primary == SQLITE_BUSY || primary == SQLITE_LOCKED ? kLibraryBusy : kWriteFailed;
    }
    sqlite::Database& Db() { return db_; }
    bool Commit() {
        committed_ = db_.Execute("COMMIT") == SQLITE_OK;
        return committed_;
    }

  private:
    sqlite::Database db_;
    int begun_ = SQLITE_ERROR;
    bool committed_ = false;
};

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

// The playlist a change names by its tree node: a personal one by its name (found among the
// folder's files, never used as a path), a shared one by its number.
struct Target {
    enum class Kind { personal, shared } kind = Kind::personal;
    std::string node;
    std::string name;      // personal
    std::int64_t id = -1;  // shared
};

MaybeRefusal ParseTarget(const std::string& node, bool mayChangeShared, Target& target) {
    target.node = node;
    if (StartsWith(node, kPersonalPrefix)) {
        // Any name the listing gives (a file's name less its ending) is accepted here; the rules
        // of a new name apply to new names only.
        target.kind = Target::Kind::personal;
        target.name = node.substr(kPersonalPrefix.size());
        if (target.name.empty() || target.name.find('/') != std::string::npos)
            return kPlaylistGone;
        return std::nullopt;
    }
    if (StartsWith(node, kSharedPrefix)) {
        target.kind = Target::Kind::shared;
        if (!util::ParseDecimalDigits(node.substr(kSharedPrefix.size()), target.id) ||
            target.id > kMaxSharedId)
            return kPlaylistGone;
        return mayChangeShared ? std::nullopt : MaybeRefusal(kNotAllowed);
    }
    return kPlaylistGone;
}

// What a change asks, checked before anything is opened.
struct ChangeRequest {
    std::string action;
    EntryChange change;
    std::vector<std::string_view> streams;  // pladd: the stream ids, in order
    // plremove, plmove: the stream ids the page saw at the entries named (plremove: one for each,
    // plmove: the one moved); none given, none checked. Another tab or user may have changed the
    // playlist since it was listed, and entry numbers alone would then remove or move another
    // track.
    std::vector<std::string_view> expected;
    std::string newName;  // plrename

    bool ChangesEntries() const {
        return action == "pladd" || action == "plremove" || action == "plmove";
    }
};

// The stream ids of `expect`: none, or exactly `count`.
bool ParseExpected(WebMan& webMan, std::size_t count, std::vector<std::string_view>& expected) {
    const std::string_view given = webMan.In("expect", "");
    if (given.empty())
        return true;
    return SplitList(given, playlist::kMaxPlaylistEntries, expected) && expected.size() == count;
}

MaybeRefusal ParseChange(WebMan& webMan, ChangeRequest& request) {
    EntryChange& change = request.change;
    if (request.action == "pladd") {
        change.kind = EntryChange::Kind::add;
        if (!SplitList(webMan.In("streams", ""), playlist::kMaxPlaylistEntries, request.streams))
            return kTrackUnknown;
        const std::string at = webMan.In("position", "");
        std::size_t position = 0;
        if (!at.empty()) {
            if (!ParseIndex(at, position))
                return kPositionInvalid;
            change.at = position;
        }
    } else if (request.action == "plremove") {
        change.kind = EntryChange::Kind::remove;
        std::vector<std::string_view> entries;
        if (!SplitList(webMan.In("entries", ""), playlist::kMaxPlaylistEntries, entries))
            return kPositionInvalid;
        for (std::string_view item : entries) {
            std::size_t entry = 0;
            if (!ParseIndex(item, entry))
                return kPositionInvalid;
            change.remove.push_back(entry);
        }
        if (!ParseExpected(webMan, change.remove.size(), request.expected))
            return kPositionInvalid;
    } else if (request.action == "plmove") {
        change.kind = EntryChange::Kind::move;
        if (!ParseIndex(webMan.In("from", ""), change.from) ||
            !ParseIndex(webMan.In("to", ""), change.to) ||
            !ParseExpected(webMan, 1, request.expected))
            return kPositionInvalid;
    } else if (request.action == "plrename") {
        request.newName = webMan.In("name", "");
        if (!playlist::IsValidPlaylistName(request.newName))
            return kNameInvalid;
    }
    return std::nullopt;
}

// True when each entry named still holds the track the page saw there.
bool EntriesAsExpected(const ChangeRequest& request, EntryLookup& lookup,
                       const std::vector<std::string>& paths) {
    const EntryChange& change = request.change;
    const std::vector<std::size_t> named = change.kind == EntryChange::Kind::move
                                               ? std::vector<std::size_t>{change.from}
                                               : change.remove;
    for (std::size_t i = 0; i < request.expected.size() && i < named.size(); ++i) {
        if (named[i] >= paths.size())
            return true;  // a position outside the playlist: Apply says so
        const std::optional<LibraryEntry> entry = lookup.ByStream(request.expected[i]);
        if (!entry || entry->path != paths[named[i]])
            return false;
    }
    return true;
}

// The change applied to the entries: the paths of the tracks added looked up first.
MaybeRefusal ApplyChange(ChangeRequest& request, EntryLookup& lookup,
                         std::vector<std::string>& paths) {
    if (!EntriesAsExpected(request, lookup, paths))
        return kPlaylistChanged;
    if (request.change.kind == EntryChange::Kind::add) {
        for (std::string_view stream : request.streams) {
            std::optional<LibraryEntry> entry = lookup.ByStream(stream);
            if (!entry)
                return kTrackUnknown;
            request.change.addPaths.push_back(std::move(entry->path));
        }
    }
    switch (Apply(request.change, paths)) {
        case ChangeOutcome::ok:
            return std::nullopt;
        case ChangeOutcome::badPosition:
            return kPositionInvalid;
        case ChangeOutcome::full:
            return kPlaylistFull;
    }
    return kPositionInvalid;
}

MaybeRefusal CreatePersonal(const std::string& preferenceDir, const std::string& folder,
                            const std::string& name, Json::Value& reply) {
    mkdir(preferenceDir.c_str(), 0755);
    const io::FileDescriptor dir = playlist::LockFolder(folder, true);
    if (!dir)
        return kWriteFailed;
    if (FindPlaylistFile(dir.Get(), name))
        return kNameTaken;
    switch (playlist::WriteFileAt(dir.Get(), name + kPlaylistFileEnding, "#EXTM3U\n", true)) {
        case playlist::WriteOutcome::ok:
            break;
        case playlist::WriteOutcome::exists:
            return kNameTaken;
        default:
            return kWriteFailed;
    }
    reply["node"] = std::string(kPersonalPrefix) + name;
    return std::nullopt;
}

MaybeRefusal CreateShared(const std::string& name, Json::Value& reply) {
    LibraryWrite write;
    if (MaybeRefusal refused = write.WhyNot())
        return refused;
    sqlite::Database& db = write.Db();
    if (SharedNameTaken(db, name, -1))
        return kNameTaken;
    sqlite::Statement next = db.Prepare("SELECT coalesce(max(id), 0) + 1 FROM playlist");
    if (!next || next.Step() != SQLITE_ROW)
        return kWriteFailed;
    const std::int64_t id = next.ColumnInt64(0);
    if (id > kMaxSharedId)
        return kNoIdLeft;
    sqlite::Statement insert = db.Prepare("INSERT INTO playlist (id, name) VALUES (?, ?)");
    if (!insert || insert.Bind(1, id) != SQLITE_OK ||
        insert.Bind(2, std::string_view(name)) != SQLITE_OK || insert.Step() != SQLITE_DONE ||
        !write.Commit())
        return kWriteFailed;
    reply["node"] = std::string(kSharedPrefix) + std::to_string(id);
    return std::nullopt;
}

MaybeRefusal RenamePersonal(int dirFd, const std::string& file, const Target& target,
                            const std::string& newName) {
    if (newName == target.name)
        return std::nullopt;
    if (FindPlaylistFile(dirFd, newName))
        return kNameTaken;
    const std::string renamed = newName + file.substr(target.name.size());
    if (renameat2(dirFd, file.c_str(), dirFd, renamed.c_str(), RENAME_NOREPLACE) != 0)
        return errno == EEXIST ? kNameTaken : kWriteFailed;
    fsync(dirFd);
    return std::nullopt;
}

MaybeRefusal ChangePersonalEntries(int dirFd, const std::string& file, ChangeRequest& request,
                                   Json::Value& reply) {
    playlist::PlaylistFileEntries entries =
        playlist::ReadPlaylistFileAt(dirFd, file.c_str(), medialib::AudioSharePath());
    if (entries.status == playlist::PlaylistFileStatus::tooLarge)
        return kPlaylistFull;
    if (entries.status != playlist::PlaylistFileStatus::ok)
        return kPlaylistGone;
    medialib::LibraryOpenResult library = medialib::OpenLibrary(paths::kLibraryDb);
    if (library.status != medialib::LibraryStatus::ok)
        return kLibraryUnavailable;
    EntryLookup lookup(library.db);
    if (!lookup)
        return kLibraryUnavailable;
    if (MaybeRefusal refused = ApplyChange(request, lookup, entries.paths))
        return refused;
    if (playlist::WriteFileAt(dirFd, file, PlaylistText(entries.paths, &lookup), false) !=
        playlist::WriteOutcome::ok)
        return kWriteFailed;
    reply["entries"] = Json::UInt64(entries.paths.size());
    return std::nullopt;
}

// A personal playlist changed under the lock of its folder.
MaybeRefusal ChangePersonal(const std::string& folder, const Target& target, ChangeRequest& request,
                            Json::Value& reply) {
    const io::FileDescriptor dir = playlist::LockFolder(folder, false);
    if (!dir)
        return kPlaylistGone;
    const std::optional<std::string> file = FindPlaylistFile(dir.Get(), target.name);
    if (!file)
        return kPlaylistGone;
    if (request.action == "pldelete") {
        if (unlinkat(dir.Get(), file->c_str(), 0) != 0)
            return kWriteFailed;
        fsync(dir.Get());
        return std::nullopt;
    }
    if (request.action == "plrename") {
        reply["node"] = std::string(kPersonalPrefix) + request.newName;
        return RenamePersonal(dir.Get(), *file, target, request.newName);
    }
    reply["node"] = target.node;
    return ChangePersonalEntries(dir.Get(), *file, request, reply);
}

bool DeleteShared(sqlite::Database& db, std::int64_t id) {
    sqlite::Statement entries = db.Prepare("DELETE FROM playlist_entry WHERE playlist_id = ?");
    sqlite::Statement row = db.Prepare("DELETE FROM playlist WHERE id = ?");
    return entries && row && entries.Bind(1, id) == SQLITE_OK && entries.Step() == SQLITE_DONE &&
           row.Bind(1, id) == SQLITE_OK && row.Step() == SQLITE_DONE;
}

bool RenameShared(sqlite::Database& db, std::int64_t id, const std::string& newName) {
    sqlite::Statement update = db.Prepare("UPDATE playlist SET name = ? WHERE id = ?");
    return update && update.Bind(1, std::string_view(newName)) == SQLITE_OK &&
           update.Bind(2, id) == SQLITE_OK && update.Step() == SQLITE_DONE;
}

// A shared playlist changed in one write transaction of library.db.
MaybeRefusal ChangeShared(const Target& target, ChangeRequest& request, Json::Value& reply) {
    LibraryWrite write;
    if (MaybeRefusal refused = write.WhyNot())
        return refused;
    sqlite::Database& db = write.Db();
    std::optional<std::vector<std::string>> paths = SharedPaths(db, target.id);
    if (!paths)
        return kPlaylistGone;
    bool stored = true;
    if (request.action == "pldelete") {
        stored = DeleteShared(db, target.id);
    } else if (request.action == "plrename") {
        if (SharedNameTaken(db, request.newName, target.id))
            return kNameTaken;
        stored = RenameShared(db, target.id, request.newName);
        reply["node"] = target.node;
    } else if (request.ChangesEntries()) {
        if (paths->size() > playlist::kMaxPlaylistEntries)
            return kPlaylistFull;
        EntryLookup lookup(db);
        if (!lookup)
            return kWriteFailed;
        if (MaybeRefusal refused = ApplyChange(request, lookup, *paths))
            return refused;
        stored = StoreSharedPaths(db, target.id, *paths);
        reply["node"] = target.node;
        reply["entries"] = Json::UInt64(paths->size());
    }
    if (!stored || !write.Commit())
        return kWriteFailed;
    return std::nullopt;
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
                                   {status, section != nullptr ? section : kPlaylistSection,
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
    Json::Value reply(Json::objectValue);
    reply["success"] = true;

    MaybeRefusal refused;
    if (action == "plcreate") {
        const std::string category = webMan.In("category", "");
        const std::string name = webMan.In("name", "");
        if (category != "personal" && category != "shared")
            refused = kCategoryInvalid;
        else if (!playlist::IsValidPlaylistName(name))
            refused = kNameInvalid;
        else if (category == "personal")
            refused = CreatePersonal(webMan.GetPreferenceDir(), folder, name, reply);
        else
            refused = mayChangeShared ? CreateShared(name, reply) : MaybeRefusal(kNotAllowed);
    } else {
        Target target;
        ChangeRequest request;
        request.action = action;
        refused = ParseTarget(webMan.In("node", ""), mayChangeShared, target);
        if (!refused)
            refused = ParseChange(webMan, request);
        if (!refused)
            refused = target.kind == Target::Kind::personal
                          ? ChangePersonal(folder, target, request, reply)
                          : ChangeShared(target, request, reply);
    }
    if (refused)
        return AnswerError(*this, webMan, *refused);
    PrintResponse(std::move(reply), kJsonReplyType);
    return 1;
}

}  // namespace harmona::webapi
