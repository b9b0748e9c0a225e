#include "src/webapi/SearchAction.h"

#include <json/value.h>

#include <cmath>
#include <cstring>
#include <utility>

#include "platform/medialib/LibraryDatabase.h"
#include "platform/paths/PlatformPaths.h"
#include "src/webapi/ApiError.h"
#include "src/webapi/Failure.h"
#include "src/webapi/LibrarySearch.h"

namespace harmona::webapi {

namespace {

// The error replies' fixed line numbers, which log readers match on.
constexpr int kSearchTooLongLine = 651;
constexpr int kSearchTooManyWordsLine = 652;
constexpr int kSearchNotTextLine = 653;
constexpr int kSearchNoLibraryLine = 654;
constexpr int kNoSearchIndexLine = 655;
constexpr int kSearchFailedLine = 656;

int Fail(ActionHandler& handler, WebMan& webMan, Failure failure, int line) {
    return AnswerError(
        handler, webMan,
        {FailureStatus(failure), kSystemSection, kSystemText, line, FailureCode(failure)});
}

Json::Value TrackRow(const Track& track) {
    Json::Value row(Json::objectValue);
    row["stream"] = track.stream;
    row["title"] = track.title;
    row["artist"] = track.artist;
    row["album"] = track.album;
    row["duration"] = track.durationMs < 0
                          ? Json::Int64(-1)
                          : static_cast<Json::Int64>(std::llround(track.durationMs / 1000.0));
    return row;
}

Json::Value Reply(const std::string& query, const SearchResult& result) {
    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    reply["query"] = query;
    Json::Value& tracks = reply["tracks"] = Json::Value(Json::arrayValue);
    for (const Track& track : result.tracks)
        tracks.append(TrackRow(track));
    Json::Value& albums = reply["albums"] = Json::Value(Json::arrayValue);
    for (const AlbumHit& hit : result.albums) {
        Json::Value row(Json::objectValue);
        row["node"] = hit.node;
        row["title"] = hit.title;
        row["artist"] = hit.artist;
        row["tracks"] = Json::Int64(hit.tracks);
        albums.append(std::move(row));
    }
    Json::Value& artists = reply["artists"] = Json::Value(Json::arrayValue);
    for (const ArtistHit& hit : result.artists) {
        Json::Value row(Json::objectValue);
        row["node"] = hit.node;
        row["title"] = hit.name;
        row["albums"] = Json::Int64(hit.albums);
        artists.append(std::move(row));
    }
    Json::Value& more = reply["more"] = Json::Value(Json::objectValue);
    more["tracks"] = result.moreTracks;
    more["albums"] = result.moreAlbums;
    more["artists"] = result.moreArtists;
    return reply;
}

}  // namespace

int ServeSearch(ActionHandler& handler, WebMan& webMan) {
    const char* q = webMan.In("q", "");
    const std::string text(q, std::strlen(q));
    const SearchQuery query = ParseSearchQuery(text);
    switch (query.status) {
        case SearchQueryStatus::ok:
            break;
        case SearchQueryStatus::tooLong:
            return Fail(handler, webMan, Failure::requestInvalid, kSearchTooLongLine);
        case SearchQueryStatus::tooManyWords:
            return Fail(handler, webMan, Failure::requestInvalid, kSearchTooManyWordsLine);
        case SearchQueryStatus::notText:
            return Fail(handler, webMan, Failure::requestInvalid, kSearchNotTextLine);
    }
    medialib::LibraryOpenResult library = medialib::OpenLibrary(paths::kLibraryDb);
    if (library.status != medialib::LibraryStatus::ok)
        return Fail(handler, webMan, Failure::libraryUnavailable, kSearchNoLibraryLine);
    library.db.Execute("BEGIN");  // one consistent view while the indexer writes
    SearchResult result;
    switch (SearchLibrary(library.db, query.words, result)) {
        case SearchStatus::ok:
            break;
        case SearchStatus::noIndex:
            return Fail(handler, webMan, Failure::libraryUnavailable, kNoSearchIndexLine);
        case SearchStatus::failed:
            return Fail(handler, webMan, Failure::libraryUnavailable, kSearchFailedLine);
    }
    library.db.Execute("COMMIT");
    handler.PrintResponse(Reply(text, result), kJsonReplyType);
    return 1;
}

}  // namespace harmona::webapi
