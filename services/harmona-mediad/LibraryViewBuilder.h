// How a LibraryView is made from the rows of library.db, one job per file: the container builders
// (LibraryViewBuilder.cpp: the root and its categories, folders, albums with album artists and
// latest albums, genres, all music and the random draw), what the DIDL-Lite of every track and
// container is written from (LibraryViewDidl.cpp), and the content hashes that tell which
// containers changed (LibraryViewChanges.cpp). Used by LibraryView::Load only.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "services/harmona-mediad/LibraryReader.h"
#include "services/harmona-mediad/LibraryView.h"

namespace harmona::mediad {

// An album as the rows make it: by album name and album artist.
struct LibraryAlbum {
    std::string name, albumArtist;
    std::vector<uint32_t> tracks;
    int64_t year = 0, latestAdded = 0;
    uint32_t yearTrack = kNoIndex;  // the first track of that year (kNoIndex while it is 0)
    TrackArt art = TrackArt::none;  // of its first track that has one
    uint32_t artTrack = kNoIndex;
};

// The folder of every track in the share, gathered while library.db gives the paths in their
// order (ReadLibraryRows): each folder's relative path once, and for each track, in path order,
// only its row and the folder's number. No path is kept.
class TrackFolders {
  public:
    explicit TrackFolders(std::string share) : prefix_(std::move(share) + "/") {}
    // A track's path, in path order; one outside the share, or not a plain relative path below
    // it, has no folder (it shows in the other views only).
    void Add(uint32_t row, std::string_view path);

    struct Entry {
        uint32_t row, folder;  // into LibraryRows::rows, folders()
    };
    const std::vector<Entry>& inPathOrder() const { return inPathOrder_; }
    // Relative to the share ("" for the share itself), by number.
    const std::string& folder(uint32_t number) const { return *folders_[number]; }

  private:
    std::string prefix_;
    std::vector<Entry> inPathOrder_;
    std::unordered_map<std::string, uint32_t> numbers_;
    std::vector<const std::string*> folders_;  // the keys of numbers_
};

class LibraryViewBuilder {
  public:
    LibraryViewBuilder(LibraryView& view, LibraryRows rows, TrackFolders folders)
        : view_(view),
          rows_(std::move(rows.rows)),
          rowText_(std::move(rows.text)),
          typePaths_(std::move(rows.typePaths)),
          trackFolders_(std::move(folders)) {
        view_.updateId_ = rows.updateId;
    }

    // Every container with its children, then the DIDL-Lite of everything, then the hashes.
    void Build();

  private:
    // Containers (LibraryViewBuilder.cpp).
    uint32_t AddContainer(const std::string& id, uint32_t parent, const std::string& title,
                          ContainerKind kind);
    void AddChild(uint32_t container, ViewChild child);
    // The children gathered per container, moved into the view's one array.
    void FlattenChildren();
    uint32_t Folder(const std::string& relative);
    void BuildFolders();
    void BuildAlbums();
    void BuildGenres();
    void BuildAllMusicAndRandom();
    void RankTitles();
    void SortTracks(std::vector<uint32_t>& tracks, bool byDisc) const;
    void AddTrackChildren(uint32_t container, const std::vector<uint32_t>& tracks);
    // Text kept in the view's block: every title once, each distinct artist, album and genre once
    // for all the tracks that share it.
    TextRef AddText(std::string_view text);
    TextRef SharedText(std::string_view text);
    // DIDL-Lite (LibraryViewDidl.cpp): the file type and art of every track, and the containers
    // in the order of their ids.
    void TypeTracks();
    void IndexContainers();
    // Content hashes (LibraryViewChanges.cpp); after the rendering, which they cover.

    LibraryView& view_;
    std::vector<LibraryRow> rows_;
    std::string rowText_;
    std::vector<std::string> typePaths_;
    TrackFolders trackFolders_;
    std::string_view R(TextRef ref) const {
        return std::string_view(rowText_).substr(ref.offset, ref.size);
    }
    std::vector<uint32_t> byTitle_;    // every track, by title (NOCASE) and id
    std::vector<uint32_t> titleRank_;  // each track's place in byTitle_
    std::vector<uint32_t> category_;   // container index of each category row
    std::unordered_map<std::string, uint32_t> folders_;
    std::vector<std::vector<std::pair<std::string, uint32_t>>> folderChildren_;  // per container
    std::vector<std::vector<ViewChild>> children_;  // per container, while building
    std::vector<LibraryAlbum> albums_;
    std::unordered_map<std::string, TextRef> sharedText_;
};

}  // namespace harmona::mediad
