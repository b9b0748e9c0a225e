// The tracks of the music library index as the listening page sees them: stream ids and metadata,
// never a file path. A stream id is "<track id>.<extension>" (lower case), the name under which
// the local media server serves the file ("/media/<stream id>").
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "platform/medialib/LibraryDatabase.h"

namespace harmona::webapi {

struct Track {
    std::int64_t id = 0;
    std::string stream;
    std::string title;
    std::string artist;
    std::string album;
    std::int64_t durationMs = -1;  // below 0: unknown
};

// The track id and extension of a stream id; nullopt for anything else than 1 to 18 digits,
// optionally followed by "." and 1 to 8 lower-case letters or digits.
struct StreamName {
    std::int64_t trackId = 0;
    std::string extension;
};
std::optional<StreamName> ParseStreamId(const std::string& stream);

// The stream id of a track stored at `path`.
std::string StreamIdOf(std::int64_t trackId, const std::string& path);

// The track id in a resource URL of the local media server ("http://<its address>/media/<stream
// id>"); nullopt for any other URL.
std::optional<std::int64_t> TrackIdOfLocalResource(const std::string& url);

class TrackCatalog {
  public:
    // Opens library.db read-only; false when it is missing or cannot be read.
    bool Open(const char* path);

    // The track of that id, or of that stored path; nullopt when the library has none.
    std::optional<Track> ById(std::int64_t id);
    std::optional<Track> ByPath(const std::string& path);
    // The track a stream id names: its id in the library and its extension the file's.
    std::optional<Track> ByStreamId(const std::string& stream);

    // The stored paths of shared playlist `playlistId`, by position; nullopt when there is no
    // such playlist. More than `maxEntries` entries give `tooLarge` and no paths.
    struct PlaylistPaths {
        std::vector<std::string> paths;
        bool tooLarge = false;
    };
    std::optional<PlaylistPaths> SharedPlaylistPaths(std::int64_t playlistId,
                                                     std::size_t maxEntries);

  private:
    std::optional<Track> StepOne(sqlite::Statement& statement);

    medialib::LibraryOpenResult library_;
    sqlite::Statement byId_;
    sqlite::Statement byPath_;
};

}  // namespace harmona::webapi
