// The tracks of the music library index as the listening page sees them: stream ids and metadata,
// never a file path. A stream id is the track's stream name (platform/medialib/StreamName.h), the
// name under which the local media server serves the file ("/media/<stream id>").
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "platform/medialib/LibraryDatabase.h"
#include "platform/medialib/StreamName.h"

namespace harmona::webapi {

struct Track {
    std::int64_t id = 0;
    std::string stream;
    std::string title;
    std::string artist;
    std::string album;
    std::int64_t durationMs = -1;  // below 0: unknown
};

class TrackCatalog {
  public:
    // Opens library.db read-only; false when it is missing or cannot be read.
    bool Open(const char* path);

    // The track of that id, or of that stored path; nullopt when the library has none.
    std::optional<Track> ById(std::int64_t id);
    std::optional<Track> ByPath(const std::string& path);
    // The track a stream id names: its id in the library and its extension the file's (as the
    // track's stream name carries it).
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
