#include "src/webapi/TrackCatalog.h"

#include <cstdlib>
#include <string_view>

#include "platform/medialib/MediaFiles.h"

namespace harmona::webapi {

namespace {

constexpr std::size_t kMaxTrackIdDigits = 18;
constexpr std::size_t kMaxExtensionLength = 8;
constexpr std::string_view kHttpScheme = "http://";
constexpr std::string_view kMediaPath = "/media/";
constexpr const char* kTrackColumns =
    "SELECT id, path, title, artist, album, duration_ms FROM track";

bool AllDigits(std::string_view text) {
    return !text.empty() && text.find_first_not_of("0123456789") == std::string_view::npos;
}

bool IsExtension(std::string_view text) {
    return !text.empty() && text.size() <= kMaxExtensionLength &&
           text.find_first_not_of("abcdefghijklmnopqrstuvwxyz0123456789") == std::string_view::npos;
}

}  // namespace

std::optional<StreamName> ParseStreamId(const std::string& stream) {
    const std::size_t dot = stream.find('.');
    const std::string_view digits = std::string_view(stream).substr(0, dot);
    if (!AllDigits(digits) || digits.size() > kMaxTrackIdDigits)
        return std::nullopt;
    StreamName name;
    if (dot != std::string::npos) {
        name.extension = stream.substr(dot + 1);
        if (!IsExtension(name.extension))
            return std::nullopt;
    }
    name.trackId = std::strtoll(std::string(digits).c_str(), nullptr, 10);
    return name;
}

std::string StreamIdOf(std::int64_t trackId, const std::string& path) {
    const std::string extension = medialib::LowerExtension(path);
    return extension.empty() ? std::to_string(trackId) : std::to_string(trackId) + "." + extension;
}

std::optional<std::int64_t> TrackIdOfLocalResource(const std::string& url) {
    // The server names itself by the address it announces on the network, so only the path counts.
    if (url.compare(0, kHttpScheme.size(), kHttpScheme) != 0)
        return std::nullopt;
    const std::size_t path = url.find('/', kHttpScheme.size());
    if (path == std::string::npos || url.compare(path, kMediaPath.size(), kMediaPath) != 0)
        return std::nullopt;
    const std::optional<StreamName> name = ParseStreamId(url.substr(path + kMediaPath.size()));
    if (!name)
        return std::nullopt;
    return name->trackId;
}

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
        track.emplace();
        track->id = statement.ColumnInt64(0);
        track->stream = StreamIdOf(track->id, std::string(statement.ColumnText(1)));
        track->title = statement.ColumnText(2);
        track->artist = statement.ColumnText(3);
        track->album = statement.ColumnText(4);
        if (statement.ColumnType(5) == SQLITE_INTEGER && statement.ColumnInt64(5) >= 0)
            track->durationMs = statement.ColumnInt64(5);
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
    const std::optional<StreamName> name = ParseStreamId(stream);
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
