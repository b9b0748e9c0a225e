#include "src/webapi/TrackCatalog.h"

#include <string_view>
#include <utility>

namespace harmona::webapi {

namespace {

constexpr const char* kTrackColumns =
    "SELECT id, path, title, artist, album, duration_ms FROM track";

}  // namespace

bool TrackCatalog::Open(const char* path) {
    library_ = medialib::OpenLibrary(path);
    if (library_.status != medialib::LibraryStatus::ok)
        return false;
    // One read transaction for all the lookups of the request: a consistent view while the indexer
    // writes, and no lock taken and dropped per track (thousands for a large container).
    library_.db.Execute("BEGIN");
    byId_ = library_.db.Prepare(std::string(kTrackColumns) + " WHERE id = ?");
    byPath_ = library_.db.Prepare(std::string(kTrackColumns) + " WHERE path = ?");
    return byId_ && byPath_;
}

std::optional<Track> TrackCatalog::StepOne(sqlite::Statement& statement) {
    std::optional<Track> track;
    if (statement.Step() == SQLITE_ROW && statement.ColumnType(0) == SQLITE_INTEGER) {
        const std::int64_t id = statement.ColumnInt64(0);
        // A track that no stream name can carry cannot be played: it is not offered.
        if (std::optional<std::string> stream =
                medialib::StreamNameOf(id, std::string(statement.ColumnText(1)))) {
            track.emplace();
            track->id = id;
            track->stream = std::move(*stream);
            track->title = statement.ColumnText(2);
            track->artist = statement.ColumnText(3);
            track->album = statement.ColumnText(4);
            if (statement.ColumnType(5) == SQLITE_INTEGER && statement.ColumnInt64(5) >= 0)
                track->durationMs = statement.ColumnInt64(5);
        }
    }
    statement.Reset();
    return track;
}

std::optional<Track> TrackCatalog::ById(std::int64_t id) {
    if (!byId_)
        return std::nullopt;
    byId_.Bind(1, id);
    return StepOne(byId_);
}

std::optional<Track> TrackCatalog::ByPath(const std::string& path) {
    if (!byPath_)
        return std::nullopt;
    byPath_.Bind(1, std::string_view(path));
    return StepOne(byPath_);
}

std::optional<Track> TrackCatalog::ByStreamId(const std::string& stream) {
    const std::optional<medialib::StreamName> name = medialib::ParseStreamName(stream);
    if (!name)
        return std::nullopt;
    std::optional<Track> track = ById(name->trackId);
    if (track && track->stream != stream)
        return std::nullopt;
    return track;
}

std::optional<TrackCatalog::PlaylistPaths> TrackCatalog::SharedPlaylistPaths(
    std::int64_t playlistId, std::size_t maxEntries) {
    if (!library_.db)
        return std::nullopt;
    sqlite::Statement exists = library_.db.Prepare("SELECT 1 FROM playlist WHERE id = ?");
    if (!exists || exists.Bind(1, playlistId) != SQLITE_OK || exists.Step() != SQLITE_ROW)
        return std::nullopt;
    sqlite::Statement entries = library_.db.Prepare(
        "SELECT path FROM playlist_entry WHERE playlist_id = ? ORDER BY position");
    if (!entries)
        return std::nullopt;
    entries.Bind(1, playlistId);
    PlaylistPaths result;
    while (entries.Step() == SQLITE_ROW) {
        if (result.paths.size() == maxEntries) {
            result.paths.clear();
            result.tooLarge = true;
            break;
        }
        result.paths.emplace_back(entries.ColumnText(0));
    }
    return result;
}

}  // namespace harmona::webapi
