// The whole ContentDirectory tree of one state of library.db, built once per library change and
// then only read: every container with its children in their default order and its child count,
// every value already escaped for DIDL-Lite, the random container's 100 tracks drawn once (seeded
// by the update id, so that its order stays the same across the pages of one listing).
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace harmona::mediad {

inline constexpr uint32_t kNoIndex = 0xffffffffU;

// Compares as SQLite's NOCASE collation does (ASCII letters folded, then bytes): the order every
// listing and sort uses, so that the view sorts as the index's own queries would.
int CompareNoCase(std::string_view a, std::string_view b);

struct ViewTrack {
    int64_t id = 0;
    std::string title, artist, album;  // for sorting; as indexed
    int64_t year = 0, trackNo = 0;
    std::string body;  // the item's DIDL-Lite children (DidlItemBody)
    // The containers that list this track (kNoIndex when none).
    uint32_t folderIn = kNoIndex, albumIn = kNoIndex, artistAlbumIn = kNoIndex,
             latestAlbumIn = kNoIndex, genreIn = kNoIndex;
    bool inRandom = false;
};

struct ViewChild {
    uint32_t index = 0;  // into containers or tracks
    bool track = false;
};

struct ViewContainer {
    std::string id, parentId, title;
    bool album = false;               // an album: its title is also its upnp:album
    std::string artist;               // albums: the album artist
    int64_t year = 0;                 // albums: the latest year of their tracks
    std::vector<ViewChild> children;  // in the default order
    std::string element;              // the whole DIDL-Lite element, childCount included
    uint64_t contentHash = 0;         // of the children and their metadata: what GENA reports
};

class LibraryView {
  public:
    // Reads library.db at `dbPath` (a missing file is an empty library); nullptr when it exists
    // but cannot be read. `share` (no trailing "/") roots the folder view.
    static std::unique_ptr<LibraryView> Load(const std::string& dbPath, const std::string& share);

    uint32_t updateId() const { return updateId_; }
    // Different for every view this process loads: what caches made of a view are keyed by.
    uint64_t serial() const { return serial_; }
    const std::vector<ViewContainer>& containers() const { return containers_; }
    const std::vector<ViewTrack>& tracks() const { return tracks_; }
    // The res protocolInfo of each file type, which the track bodies mark (DidlPieces).
    const std::vector<std::string>& protocolInfos() const { return protocolInfos_; }

    const ViewContainer* FindContainer(const std::string& id) const;
    uint32_t ContainerIndex(const std::string& id) const;
    const ViewTrack* FindTrack(int64_t id) const;
    // Whether container `container` lists track `track` (by index).
    bool Lists(uint32_t container, const ViewTrack& track) const;
    uint32_t allMusic() const { return allMusic_; }
    uint32_t random() const { return random_; }

    // "id,updateId,..." of the containers that are new or whose content differs from `previous`
    // (at most `limit` of them, the higher ones in the tree first); "" when none did.
    std::string ChangedContainers(const LibraryView* previous, std::size_t limit) const;

  private:
    friend class LibraryViewBuilder;
    uint32_t updateId_ = 0;
    uint64_t serial_ = 0;
    std::vector<ViewContainer> containers_;
    std::vector<ViewTrack> tracks_;
    std::vector<std::string> protocolInfos_;
    std::unordered_map<std::string, uint32_t> containerIndex_;
    std::unordered_map<int64_t, uint32_t> trackIndex_;
    uint32_t allMusic_ = kNoIndex, random_ = kNoIndex;
};

}  // namespace harmona::mediad
