#include "src/webapi/CoverArt.h"

#include <json/value.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/medialib/LibraryDatabase.h"
#include "platform/medialib/MediaFiles.h"
#include "platform/medialib/ObjectIdPart.h"
#include "platform/medialib/StreamName.h"
#include "platform/paths/PlatformPaths.h"
#include "src/webapi/ApiError.h"
#include "src/webapi/Failure.h"

namespace harmona::webapi {

namespace {

// The tree's node ids of what the albums action answers.
inline constexpr std::string_view kAllAlbumsNode = "musiclib_music_album";
inline constexpr std::string_view kLatestAlbumsNode = "musiclib_music_latestalbum";
inline constexpr std::string_view kArtistNodePrefix = "musiclib_artist:";
inline constexpr std::size_t kMaxNodeBytes = 4096;
inline constexpr std::size_t kMaxStreamsBytes = 8192;

// The errors, with fixed line numbers that log readers match on.
constexpr ApiError kUnknownNode{kStatusNotFound, kNotFoundSection, kNotFoundText, 701, "node_gone"};
constexpr ApiError kNoLibrary{kStatusUnavailable, kSystemSection, kSystemText, 702,
                              "library_unavailable"};
constexpr ApiError kStreamsInvalid{kStatusBadRequest, kSystemSection, kSystemText, 703,
                                   "request_invalid"};
constexpr ApiError kTooManyStreams{kStatusTooLarge, kSystemSection, kSystemText, 704, "too_large"};
constexpr ApiError kLibraryUnreadable{kStatusUnavailable, kSystemSection, kSystemText, 705,
                                      "library_unavailable"};

// The reverse of EscapeIdPart, only for text that it writes (so that one name has one id).
std::optional<std::string> StrictlyUnescapedIdPart(std::string_view text) {
    std::string out;
    if (!medialib::UnescapeIdPart(text, &out) || medialib::EscapeIdPart(out) != text)
        return std::nullopt;
    return out;
}

bool HasColumn(sqlite::Database& db, const char* column) {
    sqlite::Statement info = db.Prepare("PRAGMA table_info(track)");
    while (info && info.Step() == SQLITE_ROW) {
        if (info.ColumnText(1) == column)
            return true;
    }
    return false;
}

// The same-origin path of track `id`'s cover image stored at `artPath`; "" for none.
std::string CoverPath(std::int64_t id, std::string_view artPath) {
    if (artPath.empty() || id < 0)
        return {};
    const bool png = medialib::LowerExtension(std::string(artPath)) == "png";
    return "media/art/" + std::to_string(id) + (png ? ".png" : ".jpg");
}

Json::Value CoverValue(const std::string& path) {
    return path.empty() ? Json::Value(Json::nullValue) : Json::Value(path);
}

struct Album {
    std::string name;
    std::string albumArtist;
    std::int64_t year = 0;
    std::int64_t tracks = 0;
    std::string cover;  // the first track (by id) with a cover image, as the media server picks it
};

// The art_path column, or NULL when the index predates it (then no track has a cover).
std::string ArtColumn(sqlite::Database& db) {
    return HasColumn(db, "art_path") ? "art_path" : "NULL";
}

int ServeAlbums(ActionHandler& handler, WebMan& webMan) {
    const std::string node = webMan.In("node", "");
    if (node.size() > kMaxNodeBytes)
        return AnswerError(handler, webMan, kUnknownNode);
    std::string viewPrefix;  // the albums' node ids: this, then "<album artist>/<name>" escaped
    std::optional<std::string> artist;
    if (node == kAllAlbumsNode) {
        viewPrefix = "musiclib_album:";
    } else if (node == kLatestAlbumsNode) {
        viewPrefix = "musiclib_latest:";
    } else if (node.compare(0, kArtistNodePrefix.size(), kArtistNodePrefix) == 0) {
        const std::string_view escaped = std::string_view(node).substr(kArtistNodePrefix.size());
        artist = StrictlyUnescapedIdPart(escaped);
        if (!artist || artist->empty() || escaped.find('/') != std::string_view::npos)
            return AnswerError(handler, webMan, kUnknownNode);
        viewPrefix = node + "/";
    } else {
        return AnswerError(handler, webMan, kUnknownNode);
    }

    medialib::LibraryOpenResult library = medialib::OpenLibrary(paths::kLibraryDb);
    if (library.status != medialib::LibraryStatus::ok)
        return AnswerError(handler, webMan, kNoLibrary);
    sqlite::Database& db = library.db;
    db.Execute("BEGIN");
    const std::string artColumn = ArtColumn(db);
    // The album artist as the media server takes it: the album artist tag, else the artist.
    const std::string albumArtist = "COALESCE(NULLIF(album_artist, ''), artist, '')";
    sqlite::Statement rows =
        db.Prepare("SELECT id, album, " + albumArtist + ", year, " + artColumn +
                   " FROM track WHERE album IS NOT NULL AND album <> ''" +
                   (artist ? " AND " + albumArtist + " = ?1" : std::string()) + " ORDER BY id");
    if (!rows)
        return AnswerError(handler, webMan, kLibraryUnreadable);
    if (artist)
        rows.Bind(1, std::string_view(*artist));
    std::map<std::pair<std::string, std::string>, Album> albums;
    int step = SQLITE_ROW;
    while ((step = rows.Step()) == SQLITE_ROW) {
        std::string name(rows.ColumnText(1));
        std::string by(rows.ColumnText(2));
        auto [it, added] = albums.try_emplace(std::make_pair(name, by));
        Album& album = it->second;
        if (added) {
            album.name = std::move(name);
            album.albumArtist = std::move(by);
        }
        album.tracks += 1;
        if (rows.ColumnType(3) == SQLITE_INTEGER)
            album.year = std::max(album.year, rows.ColumnInt64(3));
        if (album.cover.empty())
            album.cover = CoverPath(rows.ColumnInt64(0), rows.ColumnText(4));
    }
    if (step != SQLITE_DONE)
        return AnswerError(handler, webMan, kLibraryUnreadable);

    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    reply["node"] = node;
    Json::Value& list = reply["albums"] = Json::Value(Json::arrayValue);
    for (const auto& entry : albums) {
        const Album& album = entry.second;
        Json::Value row(Json::objectValue);
        row["node"] = artist ? viewPrefix + medialib::EscapeIdPart(album.name)
                             : viewPrefix + medialib::EscapeIdPart(album.albumArtist) + "/" +
                                   medialib::EscapeIdPart(album.name);
        row["title"] = album.name;
        row["artist"] = album.albumArtist;
        row["year"] = Json::Int64(album.year);
        row["tracks"] = Json::Int64(album.tracks);
        row["cover"] = CoverValue(album.cover);
        list.append(std::move(row));
    }

    if (artist) {
        // All the artist's tracks, album by album in the order of their names, each album in the
        // order of its discs and track numbers.
        sqlite::Statement tracks =
            db.Prepare("SELECT id, path, title, artist, album, duration_ms, " + artColumn +
                       " FROM track WHERE album IS NOT NULL AND album <> '' AND " + albumArtist +
                       " = ?1 ORDER BY album COLLATE NOCASE, album, COALESCE(disc_no, 0), "
                       "COALESCE(track_no, 0), title COLLATE NOCASE, id LIMIT ?2");
        if (!tracks)
            return AnswerError(handler, webMan, kLibraryUnreadable);
        tracks.Bind(1, std::string_view(*artist));
        tracks.Bind(2, static_cast<std::int64_t>(kMaxArtistTracks));
        Json::Value& out = reply["tracks"] = Json::Value(Json::arrayValue);
        while ((step = tracks.Step()) == SQLITE_ROW) {
            const std::int64_t id = tracks.ColumnInt64(0);
            const std::optional<std::string> stream =
                medialib::StreamNameOf(id, std::string(tracks.ColumnText(1)));
            if (!stream)
                continue;
            Json::Value row(Json::objectValue);
            row["stream"] = *stream;
            row["title"] = std::string(tracks.ColumnText(2));
            row["artist"] = std::string(tracks.ColumnText(3));
            row["album"] = std::string(tracks.ColumnText(4));
            row["duration"] =
                tracks.ColumnType(5) == SQLITE_INTEGER && tracks.ColumnInt64(5) >= 0
                    ? static_cast<Json::Int64>(std::llround(tracks.ColumnInt64(5) / 1000.0))
                    : Json::Int64(-1);
            row["cover"] = CoverValue(CoverPath(id, tracks.ColumnText(6)));
            out.append(std::move(row));
        }
        if (step != SQLITE_DONE)
            return AnswerError(handler, webMan, kLibraryUnreadable);
    }
    handler.PrintResponse(std::move(reply), kJsonReplyType);
    return 1;
}

// "a,b,c" -> the stream ids, each checked; nullopt for an empty list, an empty or malformed id.
std::optional<std::vector<std::string>> SplitStreams(std::string_view text) {
    std::vector<std::string> streams;
    if (text.empty())
        return std::nullopt;
    std::size_t start = 0;
    while (start <= text.size()) {
        std::size_t end = text.find(',', start);
        if (end == std::string_view::npos)
            end = text.size();
        const std::string_view stream = text.substr(start, end - start);
        if (!medialib::ParseStreamName(stream))
            return std::nullopt;
        streams.emplace_back(stream);
        start = end + 1;
    }
    return streams;
}

int ServeCovers(ActionHandler& handler, WebMan& webMan) {
    const std::string_view text = webMan.In("streams", "");
    if (text.size() > kMaxStreamsBytes)
        return AnswerError(handler, webMan, kTooManyStreams);
    const std::optional<std::vector<std::string>> streams = SplitStreams(text);
    if (!streams)
        return AnswerError(handler, webMan, kStreamsInvalid);
    if (streams->size() > kMaxCoverStreams)
        return AnswerError(handler, webMan, kTooManyStreams);
    medialib::LibraryOpenResult library = medialib::OpenLibrary(paths::kLibraryDb);
    if (library.status != medialib::LibraryStatus::ok)
        return AnswerError(handler, webMan, kNoLibrary);
    sqlite::Database& db = library.db;
    db.Execute("BEGIN");
    sqlite::Statement byId =
        db.Prepare("SELECT path, " + ArtColumn(db) + " FROM track WHERE id = ?1");
    if (!byId)
        return AnswerError(handler, webMan, kLibraryUnreadable);
    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    Json::Value& covers = reply["covers"] = Json::Value(Json::objectValue);
    for (const std::string& stream : *streams) {
        const std::int64_t id = medialib::ParseStreamName(stream)->trackId;
        std::string cover;
        byId.Bind(1, id);
        // Only the track that the stream id names (its extension the file's) has its cover.
        if (byId.Step() == SQLITE_ROW &&
            medialib::StreamNameOf(id, std::string(byId.ColumnText(0))) == stream)
            cover = CoverPath(id, byId.ColumnText(1));
        byId.Reset();
        covers[stream] = CoverValue(cover);
    }
    handler.PrintResponse(std::move(reply), kJsonReplyType);
    return 1;
}

}  // namespace

bool IsCoverArtAction(std::string_view action) {
    return action == kAlbumsAction || action == kCoversAction;
}

int ServeCoverArtAction(ActionHandler& handler, WebMan& webMan, std::string_view action) {
    return action == kAlbumsAction ? ServeAlbums(handler, webMan) : ServeCovers(handler, webMan);
}

}  // namespace harmona::webapi
