// The whole ContentDirectory tree of one state of library.db, built once per library change and
// then only read: every container with its children in their default order and its child count,
// the random container's 100 tracks drawn once (seeded by the update id, so that its order stays
// the same across the pages of one listing). Tracks and containers are kept compact, as numbers
// and references into one block of text (the artists, albums and genres that many share are kept
// once), the children of all containers in one array,
// and each reply writes the DIDL-Lite of the objects it carries: a library of 100,000 tracks costs
// about a tenth of what their DIDL-Lite would.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "services/harmona-mediad/LibraryReader.h"

namespace harmona::mediad {

inline constexpr uint32_t kNoIndex = 0xffffffffU;

// Compares as SQLite's NOCASE collation does (ASCII letters folded, then bytes): the order every
// listing and sort uses, so that the view sorts as the index's own queries would.
int CompareNoCase(std::string_view a, std::string_view b);

// A file type as the tracks' res elements name it; the same for every file of one extension.
struct ViewFileType {
    std::string protocolInfo;     // escaped, as the res carries it
    std::string streamExtension;  // what the stream name ends in ("" for none)
};

// The extension of art's URL ("png", "jpg"; "" for none).
std::string_view ArtExtension(TrackArt art);

// 52 bytes: the numbers as narrow as real tags and files have them. A track whose id, year,
// number, duration, size or file type does not fit is marked wide, and LibraryView keeps its
// numbers as read.
// Its album and genre are the titles of the containers that list it (albumIn, genreIn).
struct ViewTrack {
    uint32_t id = 0;
    TextRef title, artist;  // as indexed
    int32_t year = 0, trackNo = 0, durationMs = 0;
    uint32_t sizePlusOne = 0;  // 0: the size is not known
    // The containers that list this track (kNoIndex when none): its folder, its album in
    // "Albums" (the same album in "Album Artists" and "Latest Albums" has the same title and
    // artist), its genre.
    uint32_t folderIn = kNoIndex, albumIn = kNoIndex, genreIn = kNoIndex;
    uint16_t fileType = 0;  // into LibraryView::fileTypes
    TrackArt art = TrackArt::none;
    uint8_t flags = 0;
    static constexpr uint8_t kInRandom = 1, kWide = 2;
    bool inRandom() const { return (flags & kInRandom) != 0; }
    bool wide() const { return (flags & kWide) != 0; }
};

// A track's numbers as library.db has them, and its file type.
struct TrackNumbers {
    int64_t id = 0, year = 0, trackNo = 0, durationMs = 0, size = -1;
    uint32_t fileType = 0;
};

// Four bytes: every track is a child of several containers.
struct ViewChild {
    uint32_t index : 31;  // into containers or tracks
    uint32_t track : 1;
};

// What a container is, which names its upnp:class.
enum class ContainerKind : uint8_t { folder, album, artist, genre };

// 48 bytes. An album's year and art are those of two of its tracks (by index).
struct ViewContainer {
    TextRef id, title;
    TextRef artist;              // albums: the album artist
    uint32_t parent = kNoIndex;  // kNoIndex: the root, whose parentID is "-1"
    uint32_t firstChild = 0;     // into LibraryView's children, in the default order
    uint32_t childCount = 0;
    uint32_t yearTrack = kNoIndex;  // albums: the track of the latest year (kNoIndex: none past 0)
    uint32_t artTrack = kNoIndex;   // albums: the track whose art is the album's
    ContainerKind kind = ContainerKind::folder;
    TrackArt art = TrackArt::none;  // albums: the art of track artTrack
    bool album() const { return kind == ContainerKind::album; }
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
    TrackNumbers Numbers(const ViewTrack& track) const;
    int64_t IdOf(const ViewTrack& track) const {
        return track.wide() ? Numbers(track).id : static_cast<int64_t>(track.id);
    }
    std::string_view AlbumOf(const ViewTrack& track) const {
        return track.albumIn == kNoIndex ? std::string_view()
                                         : Text(containers_[track.albumIn].title);
    }
    int64_t YearOf(const ViewContainer& container) const {
        return container.yearTrack == kNoIndex ? 0 : Numbers(tracks_[container.yearTrack]).year;
    }
    int64_t ArtTrackOf(const ViewContainer& container) const {
        return container.artTrack == kNoIndex ? 0 : IdOf(tracks_[container.artTrack]);
    }
    std::string_view GenreOf(const ViewTrack& track) const {
        return track.genreIn == kNoIndex ? std::string_view()
                                         : Text(containers_[track.genreIn].title);
    }
    std::string_view Text(TextRef ref) const {
        return std::string_view(text_).substr(ref.offset, ref.size);
    }
    // Appends the whole <container> element of container `index`, its childCount included, its
    // art under `mediaBase`.
    void AppendContainerElement(std::string& out, uint32_t index, std::string_view mediaBase) const;
    // Appends the children of track `track`'s <item> element (<dc:title> to </res>), its media
    // URLs under `mediaBase`.
    void AppendTrackBody(std::string& out, const ViewTrack& track,
                         std::string_view mediaBase) const;

    const ViewContainer* FindContainer(std::string_view id) const;
    uint32_t ContainerIndex(std::string_view id) const;
    // The children of `container` in their default order (childCount of them).
    const ViewChild* ChildrenOf(const ViewContainer& container) const {
        return children_.data() + container.firstChild;
    }
    const ViewTrack* FindTrack(int64_t id) const;
    // Whether container `container` lists track `track` (by index).
    bool Lists(uint32_t container, const ViewTrack& track) const;
    uint32_t allMusic() const { return allMusic_; }
    uint32_t random() const { return random_; }

    // "id,updateId,..." of the containers that are new or whose content differs from `previous`
    // (at most `limit` of them, the higher ones in the tree first); "" when none did.
    std::string ChangedContainers(const LibraryView* previous, std::size_t limit) const;
    // A hash of each container's content (its children and their metadata), by index: made
    // when a library change is compared, not kept.
    std::vector<uint64_t> ContentHashes() const;

  private:
    friend class LibraryViewBuilder;
    uint32_t updateId_ = 0;
    uint64_t serial_ = 0;
    std::vector<ViewContainer> containers_;
    std::vector<ViewTrack> tracks_;  // by id
    // The numbers of the wide tracks, by their index in tracks_.
    std::vector<std::pair<uint32_t, TrackNumbers>> wideNumbers_;
    std::vector<ViewFileType> fileTypes_;
    std::string text_;
    std::vector<ViewChild> children_;       // of every container, one after the other
    std::vector<uint32_t> containersById_;  // container indexes in the order of their ids
    uint32_t allMusic_ = kNoIndex, random_ = kNoIndex;
};

}  // namespace harmona::mediad
