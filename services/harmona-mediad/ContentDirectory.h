// ContentDirectory:1 over library.db, without the network: Browse, the capabilities and the
// system update id. MediaServer puts it on libupnp; tests may also call it directly.
#pragma once

#include <cstdint>
#include <string>

namespace harmona::mediad {

// UPnP error codes of ContentDirectory:1 (and UPnP Device Architecture 1.0).
inline constexpr int kErrorInvalidArgs = 402;
inline constexpr int kErrorActionFailed = 501;
inline constexpr int kErrorNoSuchObject = 701;
inline constexpr int kErrorUnsupportedSort = 709;
inline constexpr int kErrorNoSuchContainer = 710;

inline constexpr const char* kSortCapabilities = "dc:title";
inline constexpr const char* kSearchCapabilities = "";

struct BrowseArgs {
    std::string objectId;
    bool metadata = false;  // BrowseMetadata; else BrowseDirectChildren
    uint32_t startingIndex = 0;
    uint32_t requestedCount = 0;  // 0: all
    std::string sortCriteria;     // "", "+dc:title" or "-dc:title"
};

struct BrowseResult {
    int error = 0;  // 0, or one of the codes above
    std::string errorText;
    std::string didl;
    uint32_t numberReturned = 0;
    uint32_t totalMatches = 0;
    uint32_t updateId = 0;
};

class ContentDirectory {
  public:
    // `mediaBaseUrl` is where the server serves the files ("http://127.0.0.1:50003/media/"); the
    // share path (no trailing "/") roots the folder view.
    ContentDirectory(std::string dbPath, std::string sharePath, std::string mediaBaseUrl);

    // Thread-safe: each call opens its own read-only connection with a busy timeout.
    BrowseResult Browse(const BrowseArgs& args) const;

    // Changes whenever the indexer wrote library.db (its modification time).
    uint32_t SystemUpdateId() const;

    // The file of track `id` as the index has it; false when there is no such track.
    bool LookUpTrackFile(int64_t id, std::string* path) const;

    const std::string& mediaBaseUrl() const { return mediaBaseUrl_; }

  private:
    std::string dbPath_;
    std::string sharePath_;
    std::string mediaBaseUrl_;
};

}  // namespace harmona::mediad
