// ContentDirectory:1 over library.db, without the network: Browse, the capabilities, the system
// and container update ids, and what the file-serving side needs to know about a track. The
// server's transport puts it on the network; tests and benchmarks may also call it directly.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <ctime>
#include <memory>
#include <mutex>
#include <string>

namespace harmona::mediad {

class LibraryView;

// UPnP error codes of ContentDirectory:1 (and UPnP Device Architecture 1.0).
inline constexpr int kErrorInvalidArgs = 402;
inline constexpr int kErrorActionFailed = 501;
inline constexpr int kErrorNoSuchObject = 701;
inline constexpr int kErrorUnsupportedSort = 709;
inline constexpr int kErrorNoSuchContainer = 710;

// SortCriteria may name any of these, each with "+" or "-" (no sign: ascending), several joined
// by ","; any other property is refused with 709, as ContentDirectory:1 has it for a property
// outside the sort capabilities.
inline constexpr const char* kSortCapabilities =
    "dc:title,upnp:artist,upnp:album,upnp:originalTrackNumber,dc:date";
inline constexpr const char* kSearchCapabilities = "";

// At most this many containers are named in one ContainerUpdateIDs value (the higher ones in
// the tree first); a control point that misses a deeper one still sees SystemUpdateID move.
inline constexpr std::size_t kMaxContainerUpdates = 100;

// A Browse returns fewer objects than asked for (always at least one) rather than DIDL-Lite of more
// than this many bytes or more than this many objects, as ContentDirectory:1 allows: a client pages
// on from NumberReturned. Control points built on libxml2 refuse a text node of more than
// 10,000,000 bytes ("huge text node") and then see no NumberReturned at all, so a reply stays well
// below that; and a smaller reply is a smaller share of the server's memory while it is sent
// (the DIDL-Lite, its escaped SOAP envelope, the HTTP body).
inline constexpr std::size_t kMaxResultBytes = 4u * 1024u * 1024u;
inline constexpr std::size_t kMaxResultObjects = 10000;

struct BrowseArgs {
    std::string objectId;
    bool metadata = false;  // BrowseMetadata; else BrowseDirectChildren
    uint32_t startingIndex = 0;
    uint32_t requestedCount = 0;  // 0: all
    std::string sortCriteria;     // "" or e.g. "+upnp:album,+upnp:originalTrackNumber"
    // Where the files are served for this request ("http://host:port/media/"); "" for the
    // media base URL the directory was made with.
    std::string mediaBaseUrl;
};

struct BrowseResult {
    int error = 0;  // 0, or one of the codes above
    std::string errorText;
    std::string didl;
    uint32_t numberReturned = 0;
    uint32_t totalMatches = 0;
    uint32_t updateId = 0;
};

// A track's file as the file-serving side needs it.
struct TrackFile {
    std::string path;      // as the index has it
    int64_t size = -1;     // -1 when not indexed
    std::string mimeType;  // the Content-Type to send
    // The value of the contentFeatures.dlna.org header, the same as the protocolInfo's fourth
    // field in the item's res.
    std::string contentFeatures;
};

class ContentDirectory {
  public:
    // `mediaBaseUrl` is where the server serves the files ("http://127.0.0.1:50003/media/"); the
    // share path (no trailing "/") roots the folder view. A track's file is served at
    // mediaBaseUrl + "<id>.<extension>", its album art at mediaBaseUrl + "art/<id>.jpg" (or
    // ".png"; see LookUpArtFile).
    ContentDirectory(std::string dbPath, std::string sharePath, std::string mediaBaseUrl);
    ~ContentDirectory();

    // Thread-safe. The whole tree is loaded from library.db once per change of the file and kept;
    // a Browse then only reads it. While one call loads a changed library, the others answer
    // from the state before.
    BrowseResult Browse(const BrowseArgs& args) const;

    // The index's update count: it moves whenever the indexer changed library.db.
    uint32_t SystemUpdateId() const;

    // The ContainerUpdateIDs value of the last library change ("id,update id,..."): the containers
    // whose content changed; "" before any change was seen.
    std::string ContainerUpdateIds() const;

    // The same two values of the state loaded last, without loading a changed library: for a
    // caller on a thread that must not wait a second for a load (a network main loop). Another
    // thread keeps the state current by calling SystemUpdateId().
    uint32_t LoadedSystemUpdateId() const;
    std::string LoadedContainerUpdateIds() const;

    // The file of track `id` as the index has it; false when there is no such track.
    bool LookUpTrack(int64_t id, TrackFile* file) const;
    // The album art image of track `id` (its folder's cover file); false when it has none.
    bool LookUpArtFile(int64_t id, std::string* path) const;

    const std::string& mediaBaseUrl() const { return mediaBaseUrl_; }

  private:
    struct FileStamp {
        dev_t device = 0;
        ino_t inode = 0;
        off_t size = -1;
        timespec modified{};
        uint32_t changeCounter = 0;
        bool operator==(const FileStamp& other) const;
    };
    FileStamp StampOfDatabase() const;
    // The view of library.db as it is now (reloaded when the file changed; while another thread
    // reloads it, the one before); nullptr when it cannot be read.
    std::shared_ptr<const LibraryView> CurrentView() const;

    struct SortedListings;

    std::string dbPath_;
    std::string sharePath_;
    std::string mediaBaseUrl_;
    mutable std::mutex mutex_;      // guards the fields below
    mutable std::mutex loadMutex_;  // held by the one thread that loads a new view
    mutable std::shared_ptr<const LibraryView> view_;
    mutable FileStamp stamp_;
    mutable bool loaded_ = false;
    mutable std::string containerUpdateIds_;
    // The last few sorted listings: the pages of one sorted listing are sorted once.
    std::unique_ptr<SortedListings> sortedListings_;
};

}  // namespace harmona::mediad
