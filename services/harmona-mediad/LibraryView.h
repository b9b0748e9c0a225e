// The whole ContentDirectory tree of one state of library.db, built once per library change and
// then only read: every container with its children in their default order and its child count,
// the random container's 100 tracks drawn once (seeded by the update id, so that its order stays
// the same across the pages of one listing). Tracks are kept compact, as numbers and references
// into one block of text (the artists, albums and genres that many tracks share are kept once),
// and each reply writes the DIDL-Lite of the tracks it carries: a library of 100,000 tracks costs
// about a tenth of what their DIDL-Lite would.
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

// A piece of LibraryView's text block (LibraryView::Text).
struct TextRef {
    uint32_t offset = 0, size = 0;
};

// A file type as the tracks' res elements name it; the same for every file of one extension.
struct ViewFileType {
    std::string protocolInfo;     // escaped, as the res carries it
    std::string streamExtension;  // what the stream name ends in ("" for none)
};

// The art of a track: its cover image, served as "art/<id>.jpg" or ".png".
enum class TrackArt : uint8_t { none, jpg, png };

struct ViewTrack {
    int64_t id = 0;
    TextRef title, artist, album, genre;  // as indexed
    int64_t year = 0, trackNo = 0, durationMs = 0, size = -1;
    // The containers that list this track (kNoIndex when none).
    uint32_t folderIn = kNoIndex, albumIn = kNoIndex, artistAlbumIn = kNoIndex,
             latestAlbumIn = kNoIndex, genreIn = kNoIndex;
    uint32_t fileType = 0;  // into LibraryView::fileTypes
    TrackArt art = TrackArt::none;
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
    const std::vector<ViewFileType>& fileTypes() const { return fileTypes_; }
    std::string_view Text(TextRef ref) const {
        return std::string_view(text_).substr(ref.offset, ref.size);
    }
    // Appends the children of track `track`'s <item> element (<dc:title> to </res>), its media
    // URLs under `mediaBase`.
    void AppendTrackBody(std::string& out, const ViewTrack& track,
                         std::string_view mediaBase) const;

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
    std::vector<ViewTrack> tracks_;  // by id
    std::vector<ViewFileType> fileTypes_;
    std::string text_;
    std::unordered_map<std::string, uint32_t> containerIndex_;
    uint32_t allMusic_ = kNoIndex, random_ = kNoIndex;
};

}  // namespace harmona::mediad
