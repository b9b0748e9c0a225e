#include "src/webapi/LibrarySearch.h"

#include <algorithm>
#include <cctype>
#include <set>
#include <utility>

#include "common/util/Utf8.h"
#include "platform/medialib/ObjectIdPart.h"
#include "platform/medialib/StreamName.h"

namespace harmona::webapi {

namespace {

using sqlite::Statement;

bool IsWordByte(unsigned char byte) {
    return byte >= 0x80 || std::isalnum(byte);
}

std::optional<Track> TrackOf(Statement& stmt) {
    if (stmt.ColumnType(0) != SQLITE_INTEGER)
        return std::nullopt;
    const std::int64_t id = stmt.ColumnInt64(0);
    std::optional<std::string> stream = medialib::StreamNameOf(id, std::string(stmt.ColumnText(1)));
    if (!stream)
        return std::nullopt;  // no stream name can carry it: it cannot be played
    Track track;
    track.id = id;
    track.stream = std::move(*stream);
    track.title = stmt.ColumnText(2);
    track.artist = stmt.ColumnText(3);
    track.album = stmt.ColumnText(4);
    if (stmt.ColumnType(5) == SQLITE_INTEGER && stmt.ColumnInt64(5) >= 0)
        track.durationMs = stmt.ColumnInt64(5);
    return track;
}

// The tracks matching `match`, not already in `seen`, appended up to the limit.
bool AppendTracks(sqlite::Database& db, const std::string& match, std::set<std::int64_t>& seen,
                  SearchResult& result) {
    // In the index's order (the tracks' ids), never ranked: a ranking would score every match,
    // thousands for a word of one letter, where the first few dozen are what is shown.
    Statement stmt = db.Prepare(
        "SELECT t.id, t.path, t.title, t.artist, t.album, t.duration_ms FROM track_search s "
        "CROSS JOIN track t ON t.id = s.rowid WHERE track_search MATCH ?1 LIMIT ?2");
    if (!stmt)
        return false;
    stmt.Bind(1, std::string_view(match));
    stmt.Bind(2, static_cast<std::int64_t>(kMaxSearchTracks + 1 + seen.size()));
    int step;
    while ((step = stmt.Step()) == SQLITE_ROW) {
        if (seen.count(stmt.ColumnInt64(0)) != 0)
            continue;
        if (result.tracks.size() == kMaxSearchTracks) {
            result.moreTracks = true;
            break;
        }
        if (std::optional<Track> track = TrackOf(stmt)) {
            seen.insert(track->id);
            result.tracks.push_back(std::move(*track));
        }
    }
    return step == SQLITE_ROW || step == SQLITE_DONE;
}

bool LessByName(const std::string& a, const std::string& b) {
    const auto lower = [](unsigned char c) { return static_cast<char>(std::tolower(c)); };
    for (std::size_t i = 0; i < a.size() && i < b.size(); ++i) {
        const char x = lower(a[i]), y = lower(b[i]);
        if (x != y)
            return static_cast<unsigned char>(x) < static_cast<unsigned char>(y);
    }
    return a.size() != b.size() ? a.size() < b.size() : a < b;
}

// The first albums of the index's order (never all matches sorted: a word of one letter matches
// most of a large library), then those in name order.
bool FindAlbums(sqlite::Database& db, const std::string& match, SearchResult& result) {
    Statement stmt = db.Prepare(
        "SELECT a.album, a.artist, a.tracks FROM search_album_text s CROSS JOIN search_album a "
        "ON a.id = s.rowid WHERE search_album_text MATCH ?1 LIMIT ?2");
    if (!stmt)
        return false;
    stmt.Bind(1, std::string_view(match));
    stmt.Bind(2, static_cast<std::int64_t>(kMaxSearchAlbums + 1));
    int step;
    while ((step = stmt.Step()) == SQLITE_ROW) {
        if (result.albums.size() == kMaxSearchAlbums) {
            result.moreAlbums = true;
            break;
        }
        AlbumHit album;
        album.title = stmt.ColumnText(0);
        album.artist = stmt.ColumnText(1);
        album.tracks = stmt.ColumnInt64(2);
        album.node = AlbumNode(album.artist, album.title);
        result.albums.push_back(std::move(album));
    }
    std::sort(result.albums.begin(), result.albums.end(), [](const AlbumHit& a, const AlbumHit& b) {
        return a.title != b.title ? LessByName(a.title, b.title) : a.artist < b.artist;
    });
    return step == SQLITE_ROW || step == SQLITE_DONE;
}

bool FindArtists(sqlite::Database& db, const std::string& match, SearchResult& result) {
    // The album artists that the tree lists: those of at least one album.
    Statement stmt = db.Prepare(
        "SELECT DISTINCT a.artist FROM search_album_text s CROSS JOIN search_album a "
        "ON a.id = s.rowid WHERE search_album_text MATCH ?1 AND a.artist <> '' LIMIT ?2");
    Statement albums = db.Prepare("SELECT COUNT(*) FROM search_album WHERE artist = ?1");
    if (!stmt || !albums)
        return false;
    stmt.Bind(1, "{artist} : (" + match + ")");
    stmt.Bind(2, static_cast<std::int64_t>(kMaxSearchArtists + 1));
    int step;
    while ((step = stmt.Step()) == SQLITE_ROW) {
        if (result.artists.size() == kMaxSearchArtists) {
            result.moreArtists = true;
            break;
        }
        ArtistHit artist;
        artist.name = stmt.ColumnText(0);
        albums.Reset();
        albums.Bind(1, std::string_view(artist.name));
        artist.albums = albums.Step() == SQLITE_ROW ? albums.ColumnInt64(0) : 0;
        artist.node = ArtistNode(artist.name);
        result.artists.push_back(std::move(artist));
    }
    std::sort(result.artists.begin(), result.artists.end(),
              [](const ArtistHit& a, const ArtistHit& b) { return LessByName(a.name, b.name); });
    return step == SQLITE_ROW || step == SQLITE_DONE;
}

bool HasSearchIndex(sqlite::Database& db) {
    Statement stmt = db.Prepare(
        "SELECT COUNT(*) FROM sqlite_master WHERE name IN ('track_search', 'search_album', "
        "'search_album_text')");
    return stmt && stmt.Step() == SQLITE_ROW && stmt.ColumnInt64(0) == 3;
}

}  // namespace

SearchQuery ParseSearchQuery(std::string_view text) {
    SearchQuery query;
    if (text.size() > kMaxSearchQueryBytes) {
        query.status = SearchQueryStatus::tooLong;
        return query;
    }
    if (!util::IsValidUtf8(text)) {
        query.status = SearchQueryStatus::notText;
        return query;
    }
    std::size_t i = 0;
    while (i < text.size()) {
        while (i < text.size() && !IsWordByte(static_cast<unsigned char>(text[i])))
            ++i;
        const std::size_t start = i;
        while (i < text.size() && IsWordByte(static_cast<unsigned char>(text[i])))
            ++i;
        if (i > start)
            query.words.emplace_back(text.substr(start, i - start));
    }
    if (query.words.size() > kMaxSearchWords) {
        query.words.clear();
        query.status = SearchQueryStatus::tooManyWords;
    }
    return query;
}

std::string MatchExpression(const std::vector<std::string>& words) {
    // A word holds no quote (ASCII punctuation separates words), so each is one quoted string:
    // "NEAR", "AND", "*" or "-" typed by the user are text to the index, never its syntax.
    std::string match;
    for (const std::string& word : words) {
        if (!match.empty())
            match += ' ';
        match += '"' + word + "\"*";
    }
    return match;
}

SearchStatus SearchLibrary(sqlite::Database& db, const std::vector<std::string>& words,
                           SearchResult& result) {
    result = SearchResult{};
    if (!HasSearchIndex(db))
        return SearchStatus::noIndex;
    if (words.empty())
        return SearchStatus::ok;
    const std::string match = MatchExpression(words);
    std::set<std::int64_t> seen;
    const bool ok = AppendTracks(db, match, seen, result) && FindAlbums(db, match, result) &&
                    FindArtists(db, match, result);
    return ok ? SearchStatus::ok : SearchStatus::failed;
}

std::string AlbumNode(const std::string& albumArtist, const std::string& album) {
    return "musiclib_album:" + medialib::EscapeIdPart(albumArtist) + "/" +
           medialib::EscapeIdPart(album);
}

std::string ArtistNode(const std::string& albumArtist) {
    return "musiclib_artist:" + medialib::EscapeIdPart(albumArtist);
}

}  // namespace harmona::webapi
