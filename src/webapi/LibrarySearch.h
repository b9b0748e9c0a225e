// Search over the music library's full-text index in library.db (platform/README.md, "Search
// index"): tracks, albums and artists whose words begin with every word the user typed.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/lib/sqlite/Database.h"
#include "src/webapi/TrackCatalog.h"

namespace harmona::webapi {

// What a query may hold: longer ones, or ones of more words, are refused (a request_invalid).
inline constexpr std::size_t kMaxSearchQueryBytes = 200;
inline constexpr std::size_t kMaxSearchWords = 8;
// Results per group at most; "more" says whether the group had others.
inline constexpr std::size_t kMaxSearchTracks = 50;
inline constexpr std::size_t kMaxSearchAlbums = 20;
inline constexpr std::size_t kMaxSearchArtists = 20;

enum class SearchQueryStatus { ok, tooLong, tooManyWords, notText };

struct SearchQuery {
    SearchQueryStatus status = SearchQueryStatus::ok;
    // The words: runs of letters, digits and every non-ASCII character; ASCII punctuation and
    // white space separate them and are never passed on, so nothing typed is query syntax.
    std::vector<std::string> words;
};

// Splits what the user typed into words (none when it holds no letter or digit).
SearchQuery ParseSearchQuery(std::string_view text);

// The full-text match expression of `words`: every word a quoted prefix ("word"*), all ANDed.
std::string MatchExpression(const std::vector<std::string>& words);

struct AlbumHit {
    std::string node;  // the tree node id that lists the album
    std::string title;
    std::string artist;  // its album artist (the tracks' artist when they have none)
    std::int64_t tracks = 0;
};

struct ArtistHit {
    std::string node;  // the tree node id that lists the artist's albums
    std::string name;
    std::int64_t albums = 0;
};

struct SearchResult {
    std::vector<Track> tracks;
    std::vector<AlbumHit> albums;
    std::vector<ArtistHit> artists;
    bool moreTracks = false;
    bool moreAlbums = false;
    bool moreArtists = false;
};

enum class SearchStatus { ok, noIndex, failed };

// Searches the library open in `db` for `words`: tracks whose title, artist, album or genre hold
// words beginning with each of them, albums whose name and album artist do, artists (album
// artists, as the tree lists them) whose name does. Each group holds the first matches of the
// index's order (never all matches ranked or sorted: a word of one letter matches most of a large
// library); the albums and artists among them are then put in name order (ASCII letter case
// ignored). No words: an empty result.
SearchStatus SearchLibrary(sqlite::Database& db, const std::vector<std::string>& words,
                           SearchResult& result);

// The tree node ids of an album and of an album artist, as the local media server names them.
std::string AlbumNode(const std::string& albumArtist, const std::string& album);
std::string ArtistNode(const std::string& albumArtist);

}  // namespace harmona::webapi
