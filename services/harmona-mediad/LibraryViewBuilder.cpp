#include "services/harmona-mediad/LibraryViewBuilder.h"

#include <algorithm>
#include <cstdint>
#include <map>
#include <numeric>
#include <tuple>

#include "platform/medialib/MediaFiles.h"
#include "services/harmona-mediad/ObjectIds.h"

namespace harmona::mediad {
namespace {

constexpr std::size_t kRandomCount = 100;
constexpr std::size_t kLatestAlbumCount = 50;

struct Category {
    const char* id;
    const char* title;
};
constexpr Category kCategories[] = {
    {kAllMusicId, "All Music"},         {kFoldersId, "Folders"}, {kAlbumsId, "Albums"},
    {kAlbumArtistsId, "Album Artists"}, {kGenresId, "Genres"},   {kRandomId, "Random 100"},
    {kLatestAlbumsId, "Latest Albums"},
};

uint64_t SplitMix(uint64_t& state) {
    uint64_t z = (state += 0x9e3779b97f4a7c15ULL);
    z = (z ^ (z >> 30)) * 0xbf58476d1ce4e5b9ULL;
    z = (z ^ (z >> 27)) * 0x94d049bb133111ebULL;
    return z ^ (z >> 31);
}

}  // namespace

uint32_t LibraryViewBuilder::AddContainer(const std::string& id, uint32_t parent,
                                          const std::string& title, ContainerKind kind) {
    const auto index = static_cast<uint32_t>(view_.containers_.size());
    ViewContainer container;
    container.id = AddText(id);
    container.parent = parent;
    container.title = SharedText(title);
    container.kind = kind;
    view_.containers_.push_back(container);
    children_.emplace_back();
    return index;
}

void LibraryViewBuilder::AddChild(uint32_t container, ViewChild child) {
    children_[container].push_back(child);
}

void LibraryViewBuilder::FlattenChildren() {
    std::size_t total = 0;
    for (const auto& children : children_)
        total += children.size();
    view_.children_.reserve(total);
    for (uint32_t c = 0; c < children_.size(); ++c) {
        ViewContainer& container = view_.containers_[c];
        container.firstChild = static_cast<uint32_t>(view_.children_.size());
        container.childCount = static_cast<uint32_t>(children_[c].size());
        view_.children_.insert(view_.children_.end(), children_[c].begin(), children_[c].end());
        std::vector<ViewChild>().swap(children_[c]);
    }
    children_.clear();
    children_.shrink_to_fit();
    view_.containers_.shrink_to_fit();
}

void LibraryViewBuilder::Build() {
    AddContainer(kRootId, kNoIndex, "Music", ContainerKind::folder);
    for (const Category& category : kCategories) {
        const uint32_t index = AddContainer(category.id, 0, category.title, ContainerKind::folder);
        category_.push_back(index);
        AddChild(0, {index, false});
    }
    view_.allMusic_ = category_[0];
    view_.random_ = category_[5];
    view_.tracks_.resize(rows_.size());
    std::size_t titleBytes = 0;
    for (const LibraryRow& row : rows_)
        titleBytes += row.title.size;
    // Room for the titles and, as far as the rows' text goes, the containers' ids and titles:
    // a block grown by doubling would hold its old and its new copy at once. What stays unused is
    // never touched, and so never resident, and is given back below.
    view_.text_.reserve(titleBytes + rowText_.size());
    for (std::size_t i = 0; i < rows_.size(); ++i) {
        const LibraryRow& row = rows_[i];
        ViewTrack& track = view_.tracks_[i];
        track.title = AddText(R(row.title));
        track.artist = SharedText(R(row.artist));
        const auto fits = [](int64_t n) { return n >= INT32_MIN && n <= INT32_MAX; };
        if (row.id >= 0 && row.id <= UINT32_MAX && fits(row.year) && fits(row.trackNo) &&
            fits(row.durationMs) && row.size >= -1 && row.size < UINT32_MAX &&
            row.fileType <= UINT16_MAX) {
            track.id = static_cast<uint32_t>(row.id);
            track.year = static_cast<int32_t>(row.year);
            track.trackNo = static_cast<int32_t>(row.trackNo);
            track.durationMs = static_cast<int32_t>(row.durationMs);
            track.sizePlusOne = static_cast<uint32_t>(row.size + 1);
            track.fileType = static_cast<uint16_t>(row.fileType);
        } else {
            track.flags |= ViewTrack::kWide;
            view_.wideNumbers_.emplace_back(static_cast<uint32_t>(i),
                                            TrackNumbers{row.id, row.year, row.trackNo,
                                                         row.durationMs, row.size, row.fileType});
        }
    }
    TypeTracks();
    RankTitles();
    BuildFolders();
    BuildAlbums();
    BuildGenres();
    BuildAllMusicAndRandom();
    // The rows are not needed past here: given back before the children are gathered into one
    // array and the hashes made, the most the load holds at once.
    std::vector<LibraryRow>().swap(rows_);
    std::string().swap(rowText_);
    trackFolders_ = TrackFolders("");
    decltype(sharedText_)().swap(sharedText_);
    decltype(folders_)().swap(folders_);
    decltype(folderChildren_)().swap(folderChildren_);
    decltype(albums_)().swap(albums_);
    decltype(byTitle_)().swap(byTitle_);
    decltype(titleRank_)().swap(titleRank_);
    // The text block to its size: the copy is made where the rows no longer take room.
    view_.text_.shrink_to_fit();
    FlattenChildren();
    IndexContainers();
}

TextRef LibraryViewBuilder::AddText(std::string_view text) {
    TextRef ref{static_cast<uint32_t>(view_.text_.size()), static_cast<uint32_t>(text.size())};
    view_.text_ += text;
    return ref;
}

TextRef LibraryViewBuilder::SharedText(std::string_view text) {
    if (text.empty())
        return {};
    const auto found = sharedText_.find(std::string(text));
    if (found != sharedText_.end())
        return found->second;
    const TextRef ref = AddText(text);
    sharedText_.emplace(std::string(text), ref);
    return ref;
}

// --- Folders: the share's tree, each folder's subfolders (by name) before its tracks (by path).

uint32_t LibraryViewBuilder::Folder(const std::string& relative) {
    if (relative.empty())
        return category_[1];
    const auto found = folders_.find(relative);
    if (found != folders_.end())
        return found->second;
    const std::size_t slash = relative.rfind('/');
    const uint32_t parent = Folder(slash == std::string::npos ? "" : relative.substr(0, slash));
    const std::string name = slash == std::string::npos ? relative : relative.substr(slash + 1);
    const uint32_t index = AddContainer(FolderId(relative), parent, name, ContainerKind::folder);
    folders_.emplace(relative, index);
    folderChildren_.resize(view_.containers_.size());
    folderChildren_[parent].emplace_back(name, index);
    return index;
}

void TrackFolders::Add(uint32_t row, std::string_view path) {
    if (path.compare(0, prefix_.size(), prefix_) != 0)
        return;
    const std::string_view relative = path.substr(prefix_.size());
    const std::size_t slash = relative.rfind('/');
    const std::string folder(slash == std::string_view::npos ? "" : relative.substr(0, slash));
    std::size_t start = 0;
    while (!folder.empty() && start <= folder.size()) {
        std::size_t end = folder.find('/', start);
        if (end == std::string::npos)
            end = folder.size();
        const std::string part = folder.substr(start, end - start);
        if (part.empty() || part == "." || part == "..")
            return;
        start = end + 1;
    }
    const auto [found, added] = numbers_.emplace(folder, static_cast<uint32_t>(folders_.size()));
    if (added)
        folders_.push_back(&found->first);
    inPathOrder_.push_back({row, found->second});
}

void LibraryViewBuilder::BuildFolders() {
    folderChildren_.resize(view_.containers_.size());
    std::vector<std::vector<uint32_t>> tracksOf;
    for (const TrackFolders::Entry& entry : trackFolders_.inPathOrder()) {
        const uint32_t i = entry.row;
        const uint32_t folder = Folder(trackFolders_.folder(entry.folder));
        view_.tracks_[i].folderIn = folder;
        if (tracksOf.size() <= folder)
            tracksOf.resize(folder + 1);
        tracksOf[folder].push_back(i);
    }
    folderChildren_.resize(view_.containers_.size());
    tracksOf.resize(view_.containers_.size());
    for (uint32_t folder = 0; folder < folderChildren_.size(); ++folder) {
        auto& subfolders = folderChildren_[folder];
        if (subfolders.empty() && tracksOf[folder].empty())
            continue;
        std::sort(subfolders.begin(), subfolders.end());
        for (const auto& [name, index] : subfolders)
            AddChild(folder, {index, false});
        AddTrackChildren(folder, tracksOf[folder]);
    }
}

// --- Albums (by album and album artist), album artists, latest albums ----------------------

// Titles are compared once, for the whole library; every other listing sorts by the rank.
void LibraryViewBuilder::RankTitles() {
    byTitle_.resize(rows_.size());
    std::iota(byTitle_.begin(), byTitle_.end(), 0);
    std::sort(byTitle_.begin(), byTitle_.end(), [&](uint32_t a, uint32_t b) {
        const int order = CompareNoCase(R(rows_[a].title), R(rows_[b].title));
        return order != 0 ? order < 0 : rows_[a].id < rows_[b].id;
    });
    titleRank_.resize(rows_.size());
    for (uint32_t rank = 0; rank < byTitle_.size(); ++rank)
        titleRank_[byTitle_[rank]] = rank;
}

void LibraryViewBuilder::SortTracks(std::vector<uint32_t>& tracks, bool byDisc) const {
    std::sort(tracks.begin(), tracks.end(), [&](uint32_t a, uint32_t b) {
        const LibraryRow& x = rows_[a];
        const LibraryRow& y = rows_[b];
        if (byDisc && std::tie(x.discNo, x.trackNo) != std::tie(y.discNo, y.trackNo))
            return std::tie(x.discNo, x.trackNo) < std::tie(y.discNo, y.trackNo);
        return titleRank_[a] < titleRank_[b];
    });
}

void LibraryViewBuilder::AddTrackChildren(uint32_t container, const std::vector<uint32_t>& tracks) {
    auto& children = children_[container];
    children.reserve(children.size() + tracks.size());
    for (const uint32_t track : tracks)
        children.push_back({track, true});
}

void LibraryViewBuilder::BuildAlbums() {
    std::map<std::pair<std::string, std::string>, uint32_t> byKey;
    for (uint32_t i = 0; i < rows_.size(); ++i) {
        const LibraryRow& row = rows_[i];
        if (row.album.size == 0)
            continue;
        const std::string name(R(row.album));
        const std::string albumArtist(R(row.albumArtist.size != 0 ? row.albumArtist : row.artist));
        const auto [it, added] = byKey.emplace(std::make_pair(name, albumArtist), albums_.size());
        if (added)
            albums_.push_back(
                LibraryAlbum{name, albumArtist, {}, 0, 0, kNoIndex, TrackArt::none, kNoIndex});
        LibraryAlbum& album = albums_[it->second];
        album.tracks.push_back(i);
        if (row.year > album.year) {
            album.year = row.year;
            album.yearTrack = i;
        }
        album.latestAdded = std::max(album.latestAdded, row.added);
        if (album.art == TrackArt::none && row.art != TrackArt::none) {
            album.art = row.art;
            album.artTrack = i;
        }
    }
    std::vector<uint32_t> order(albums_.size());
    std::iota(order.begin(), order.end(), 0);
    const auto byName = [&](uint32_t a, uint32_t b) {
        const int names = CompareNoCase(albums_[a].name, albums_[b].name);
        return names != 0 ? names < 0 : albums_[a].albumArtist < albums_[b].albumArtist;
    };
    std::sort(order.begin(), order.end(), byName);
    for (LibraryAlbum& album : albums_)
        SortTracks(album.tracks, true);

    const auto addAlbum = [&](const LibraryAlbum& album, const std::string& id, uint32_t parent,
                              bool listsTracks) {
        const uint32_t index = AddContainer(id, parent, album.name, ContainerKind::album);
        ViewContainer& container = view_.containers_[index];
        container.artist = SharedText(album.albumArtist);
        container.yearTrack = album.yearTrack;
        if (album.art != TrackArt::none) {
            container.art = album.art;
            container.artTrack = album.artTrack;
        }
        AddChild(parent, {index, false});
        AddTrackChildren(index, album.tracks);
        if (listsTracks) {
            for (const uint32_t track : album.tracks)
                view_.tracks_[track].albumIn = index;
        }
    };
    for (const uint32_t a : order)
        addAlbum(albums_[a], AlbumId(albums_[a].albumArtist, albums_[a].name), category_[2], true);

    // Album artists, each with its albums; albums without an album artist belong to none.
    std::map<std::string, std::vector<uint32_t>> byArtist;
    for (const uint32_t a : order) {
        if (!albums_[a].albumArtist.empty())
            byArtist[albums_[a].albumArtist].push_back(a);
    }
    std::vector<const std::pair<const std::string, std::vector<uint32_t>>*> artists;
    for (const auto& entry : byArtist)
        artists.push_back(&entry);
    std::stable_sort(artists.begin(), artists.end(), [](const auto* a, const auto* b) {
        const int names = CompareNoCase(a->first, b->first);
        return names != 0 ? names < 0 : a->first < b->first;
    });
    for (const auto* artist : artists) {
        const uint32_t index = AddContainer(ArtistId(artist->first), category_[3], artist->first,
                                            ContainerKind::artist);
        AddChild(category_[3], {index, false});
        for (const uint32_t a : artist->second)
            addAlbum(albums_[a], ArtistAlbumId(albums_[a].albumArtist, albums_[a].name), index,
                     false);
    }

    std::vector<uint32_t> latest = order;
    std::stable_sort(latest.begin(), latest.end(), [&](uint32_t a, uint32_t b) {
        return albums_[a].latestAdded > albums_[b].latestAdded;
    });
    latest.resize(std::min(latest.size(), kLatestAlbumCount));
    for (const uint32_t a : latest)
        addAlbum(albums_[a], LatestAlbumId(albums_[a].albumArtist, albums_[a].name), category_[6],
                 false);
}

void LibraryViewBuilder::BuildGenres() {
    std::map<std::string, std::vector<uint32_t>> byGenre;
    for (uint32_t i = 0; i < rows_.size(); ++i) {
        if (rows_[i].genre.size != 0)
            byGenre[std::string(R(rows_[i].genre))].push_back(i);
    }
    std::vector<std::pair<const std::string, std::vector<uint32_t>>*> genres;
    for (auto& entry : byGenre)
        genres.push_back(&entry);
    std::stable_sort(genres.begin(), genres.end(), [](const auto* a, const auto* b) {
        const int names = CompareNoCase(a->first, b->first);
        return names != 0 ? names < 0 : a->first < b->first;
    });
    for (auto* genre : genres) {
        const uint32_t index =
            AddContainer(GenreId(genre->first), category_[4], genre->first, ContainerKind::genre);
        AddChild(category_[4], {index, false});
        SortTracks(genre->second, false);
        AddTrackChildren(index, genre->second);
        for (const uint32_t track : genre->second)
            view_.tracks_[track].genreIn = index;
    }
}

// All music by title; "random": 100 tracks drawn with a generator seeded by the update id, so
// that every page of one listing, and every client, sees the same draw until the library changes.
void LibraryViewBuilder::BuildAllMusicAndRandom() {
    AddTrackChildren(category_[0], byTitle_);

    std::vector<uint32_t> drawn(rows_.size());
    std::iota(drawn.begin(), drawn.end(), 0);
    uint64_t state = 0x68726d6e00000000ULL ^ view_.updateId_;
    const std::size_t count = std::min(drawn.size(), kRandomCount);
    for (std::size_t i = 0; i < count; ++i) {
        const std::size_t pick = i + SplitMix(state) % (drawn.size() - i);
        std::swap(drawn[i], drawn[pick]);
        view_.tracks_[drawn[i]].flags |= ViewTrack::kInRandom;
    }
    drawn.resize(count);
    AddTrackChildren(category_[5], drawn);
}

}  // namespace harmona::mediad
