#include "services/harmona-mediad/LibraryView.h"

#include <sys/stat.h>

#include <algorithm>
#include <atomic>
#include <functional>
#include <map>
#include <numeric>
#include <tuple>

#include "common/util/Utf8.h"
#include "platform/lib/sqlite/Database.h"
#include "platform/medialib/LibrarySchema.h"
#include "platform/medialib/MediaFiles.h"
#include "platform/medialib/StreamName.h"
#include "services/harmona-mediad/DidlWriter.h"
#include "services/harmona-mediad/ObjectIds.h"

namespace harmona::mediad {

using sqlite::Database;
using sqlite::Statement;

namespace {

constexpr int kBusyTimeoutMs = 5000;
constexpr std::size_t kRandomCount = 100;
constexpr std::size_t kLatestAlbumCount = 50;
// Values written before tags were cut when indexed are cut here too: no reply carries more.
constexpr std::size_t kMaxValueBytes = 1024;

constexpr const char* kFolderClass = "object.container.storageFolder";
constexpr const char* kAlbumClass = "object.container.album.musicAlbum";
constexpr const char* kArtistClass = "object.container.person.musicArtist";
constexpr const char* kGenreClass = "object.container.genre.musicGenre";

struct Category {
    const char* id;
    const char* title;
};
constexpr Category kCategories[] = {
    {kAllMusicId, "All Music"},         {kFoldersId, "Folders"}, {kAlbumsId, "Albums"},
    {kAlbumArtistsId, "Album Artists"}, {kGenresId, "Genres"},   {kRandomId, "Random 100"},
    {kLatestAlbumsId, "Latest Albums"},
};

std::string Cut(std::string_view text) {
    return std::string(util::CutUtf8(text, kMaxValueBytes));
}

uint64_t HashOf(std::string_view bytes) {
    return std::hash<std::string_view>()(bytes);
}

uint64_t Combine(uint64_t hash, uint64_t part) {
    return (hash ^ part) * 0x100000001b3ULL + 0x9e3779b97f4a7c15ULL;
}

uint64_t SplitMix(uint64_t& state) {
    uint64_t z = (state += 0x9e3779b97f4a7c15ULL);
    z = (z ^ (z >> 30)) * 0xbf58476d1ce4e5b9ULL;
    z = (z ^ (z >> 27)) * 0x94d049bb133111ebULL;
    return z ^ (z >> 31);
}

struct Row {
    int64_t id = 0;
    std::string path, title, artist, album, albumArtist, genre, artPath;
    int64_t year = 0, trackNo = 0, discNo = 0, durationMs = 0, added = 0, size = -1;
};

struct Album {
    std::string name, albumArtist;
    std::vector<uint32_t> tracks;
    int64_t year = 0, latestAdded = 0;
    std::string artPath;  // of its first track that has one
    int64_t artTrack = 0;
};

bool HasColumn(Database& db, const char* column) {
    Statement stmt = db.Prepare("PRAGMA table_info(track)");
    while (stmt && stmt.Step() == SQLITE_ROW) {
        if (stmt.ColumnText(1) == column)
            return true;
    }
    return false;
}

std::string ArtUrlPath(int64_t trackId, const std::string& artPath) {
    return "art/" + std::to_string(trackId) + "." +
           (medialib::LowerExtension(artPath) == "png" ? "png" : "jpg");
}

// The track's stream name; "" (no res) for a track that no name can carry.
std::string ResUrlPath(int64_t trackId, const std::string& path) {
    return medialib::StreamNameOf(trackId, path).value_or("");
}

std::string DateOfYear(int64_t year) {
    if (year <= 0 || year > 9999)
        return {};
    char text[16];
    std::snprintf(text, sizeof(text), "%04d-01-01", static_cast<int>(year));
    return text;
}

}  // namespace

int CompareNoCase(std::string_view a, std::string_view b) {
    const std::size_t common = std::min(a.size(), b.size());
    for (std::size_t i = 0; i < common; ++i) {
        unsigned char x = static_cast<unsigned char>(a[i]);
        unsigned char y = static_cast<unsigned char>(b[i]);
        if (x >= 'A' && x <= 'Z')
            x = static_cast<unsigned char>(x - 'A' + 'a');
        if (y >= 'A' && y <= 'Z')
            y = static_cast<unsigned char>(y - 'A' + 'a');
        if (x != y)
            return x < y ? -1 : 1;
    }
    return a.size() == b.size() ? 0 : a.size() < b.size() ? -1 : 1;
}

class LibraryViewBuilder {
  public:
    LibraryViewBuilder(LibraryView& view, std::string share)
        : view_(view), share_(std::move(share)) {}

    bool Read(const std::string& dbPath);
    void Build();

  private:
    uint32_t AddContainer(const std::string& id, const std::string& parentId,
                          const std::string& title, const char* upnpClass);
    uint32_t FolderOf(const std::string& path);
    uint32_t Folder(const std::string& relative);
    void BuildFolders();
    void BuildAlbums();
    void BuildGenres();
    void BuildAllMusicAndRandom();
    void RankTitles();
    void SortTracks(std::vector<uint32_t>& tracks, bool byDisc) const;
    void AddTrackChildren(uint32_t container, const std::vector<uint32_t>& tracks);
    void RenderTracks();
    void RenderContainers();
    std::string AlbumArtPath(const Album& album) const;

    LibraryView& view_;
    std::string share_;
    std::vector<Row> rows_;
    std::vector<uint32_t> byTitle_;    // every track, by title (NOCASE) and id
    std::vector<uint32_t> titleRank_;  // each track's place in byTitle_
    std::vector<uint32_t> category_;   // container index of each kCategories row
    std::unordered_map<std::string, uint32_t> folders_;
    std::vector<std::vector<std::pair<std::string, uint32_t>>> folderChildren_;  // per container
    std::vector<std::vector<uint32_t>> folderTracks_;
    std::vector<std::string> containerClass_;
    std::vector<Album> albums_;
};

bool LibraryViewBuilder::Read(const std::string& dbPath) {
    struct stat st {};
    if (stat(dbPath.c_str(), &st) != 0)
        return true;  // not indexed yet: an empty library
    Database db = Database::OpenReadOnly(dbPath.c_str(), kBusyTimeoutMs);
    if (!db || db.Execute("BEGIN") != SQLITE_OK)
        return false;
    const int64_t count = medialib::LibraryUpdateCount(db);
    // Without the indexer's count (an index written by hand), the file's time stands in.
    view_.updateId_ = count >= 0 ? static_cast<uint32_t>(count & 0x7fffffff)
                                 : static_cast<uint32_t>(st.st_mtime) & 0x7fffffffU;
    const std::string extra = std::string(HasColumn(db, "size") ? "size" : "NULL") + ", " +
                              (HasColumn(db, "art_path") ? "art_path" : "NULL");
    Statement stmt = db.Prepare(
        "SELECT id, path, title, artist, album, album_artist, genre, year, track_no, disc_no, "
        "duration_ms, added, " +
        extra + " FROM track ORDER BY id");
    if (!stmt)
        return false;
    int step;
    while ((step = stmt.Step()) == SQLITE_ROW) {
        Row row;
        row.id = stmt.ColumnInt64(0);
        row.path = std::string(stmt.ColumnText(1));
        row.title = Cut(stmt.ColumnText(2));
        row.artist = Cut(stmt.ColumnText(3));
        row.album = Cut(stmt.ColumnText(4));
        row.albumArtist = Cut(stmt.ColumnText(5));
        row.genre = Cut(stmt.ColumnText(6));
        row.year = stmt.ColumnInt64(7);
        row.trackNo = stmt.ColumnInt64(8);
        row.discNo = stmt.ColumnInt64(9);
        row.durationMs = stmt.ColumnInt64(10);
        row.added = stmt.ColumnInt64(11);
        row.size = stmt.ColumnType(12) == SQLITE_NULL ? -1 : stmt.ColumnInt64(12);
        row.artPath = std::string(stmt.ColumnText(13));
        rows_.push_back(std::move(row));
    }
    return step == SQLITE_DONE && db.Execute("COMMIT") == SQLITE_OK;
}

uint32_t LibraryViewBuilder::AddContainer(const std::string& id, const std::string& parentId,
                                          const std::string& title, const char* upnpClass) {
    const auto index = static_cast<uint32_t>(view_.containers_.size());
    ViewContainer container;
    container.id = id;
    container.parentId = parentId;
    container.title = title;
    view_.containers_.push_back(std::move(container));
    containerClass_.push_back(upnpClass);
    view_.containerIndex_.emplace(id, index);
    return index;
}

void LibraryViewBuilder::Build() {
    AddContainer(kRootId, "-1", "Music", kFolderClass);
    for (const Category& category : kCategories) {
        const uint32_t index = AddContainer(category.id, kRootId, category.title, kFolderClass);
        category_.push_back(index);
        view_.containers_[0].children.push_back({index, false});
    }
    view_.allMusic_ = category_[0];
    view_.random_ = category_[5];
    view_.tracks_.resize(rows_.size());
    for (std::size_t i = 0; i < rows_.size(); ++i) {
        const Row& row = rows_[i];
        ViewTrack& track = view_.tracks_[i];
        track.id = row.id;
        track.title = row.title;
        track.artist = row.artist;
        track.album = row.album;
        track.year = row.year;
        track.trackNo = row.trackNo;
        view_.trackIndex_.emplace(row.id, static_cast<uint32_t>(i));
    }
    RankTitles();
    BuildFolders();
    BuildAlbums();
    BuildGenres();
    BuildAllMusicAndRandom();
    RenderTracks();
    RenderContainers();
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
    const uint32_t index =
        AddContainer(FolderId(relative), view_.containers_[parent].id, name, kFolderClass);
    folders_.emplace(relative, index);
    folderChildren_.resize(view_.containers_.size());
    folderChildren_[parent].emplace_back(name, index);
    return index;
}

// The folder container of a track's path; kNoIndex for a path outside the share or one that is
// not a plain relative path (those show in the other views only).
uint32_t LibraryViewBuilder::FolderOf(const std::string& path) {
    const std::string prefix = share_ + "/";
    if (path.compare(0, prefix.size(), prefix) != 0)
        return kNoIndex;
    const std::string relative = path.substr(prefix.size());
    const std::size_t slash = relative.rfind('/');
    const std::string folder = slash == std::string::npos ? "" : relative.substr(0, slash);
    std::size_t start = 0;
    while (!folder.empty() && start <= folder.size()) {
        std::size_t end = folder.find('/', start);
        if (end == std::string::npos)
            end = folder.size();
        const std::string part = folder.substr(start, end - start);
        if (part.empty() || part == "." || part == "..")
            return kNoIndex;
        start = end + 1;
    }
    return Folder(folder);
}

void LibraryViewBuilder::BuildFolders() {
    folderChildren_.resize(view_.containers_.size());
    std::vector<uint32_t> byPath(rows_.size());
    std::iota(byPath.begin(), byPath.end(), 0);
    std::sort(byPath.begin(), byPath.end(),
              [&](uint32_t a, uint32_t b) { return rows_[a].path < rows_[b].path; });
    std::vector<std::vector<uint32_t>> tracksOf;
    for (const uint32_t i : byPath) {
        const uint32_t folder = FolderOf(rows_[i].path);
        if (folder == kNoIndex)
            continue;
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
            view_.containers_[folder].children.push_back({index, false});
        AddTrackChildren(folder, tracksOf[folder]);
    }
}

// --- Albums (by album and album artist), album artists, latest albums ----------------------

// Titles are compared once, for the whole library; every other listing sorts by the rank.
void LibraryViewBuilder::RankTitles() {
    byTitle_.resize(rows_.size());
    std::iota(byTitle_.begin(), byTitle_.end(), 0);
    std::sort(byTitle_.begin(), byTitle_.end(), [&](uint32_t a, uint32_t b) {
        const int order = CompareNoCase(rows_[a].title, rows_[b].title);
        return order != 0 ? order < 0 : rows_[a].id < rows_[b].id;
    });
    titleRank_.resize(rows_.size());
    for (uint32_t rank = 0; rank < byTitle_.size(); ++rank)
        titleRank_[byTitle_[rank]] = rank;
}

void LibraryViewBuilder::SortTracks(std::vector<uint32_t>& tracks, bool byDisc) const {
    std::sort(tracks.begin(), tracks.end(), [&](uint32_t a, uint32_t b) {
        const Row& x = rows_[a];
        const Row& y = rows_[b];
        if (byDisc && std::tie(x.discNo, x.trackNo) != std::tie(y.discNo, y.trackNo))
            return std::tie(x.discNo, x.trackNo) < std::tie(y.discNo, y.trackNo);
        return titleRank_[a] < titleRank_[b];
    });
}

void LibraryViewBuilder::AddTrackChildren(uint32_t container, const std::vector<uint32_t>& tracks) {
    auto& children = view_.containers_[container].children;
    children.reserve(children.size() + tracks.size());
    for (const uint32_t track : tracks)
        children.push_back({track, true});
}

std::string LibraryViewBuilder::AlbumArtPath(const Album& album) const {
    return album.artPath.empty() ? std::string() : ArtUrlPath(album.artTrack, album.artPath);
}

void LibraryViewBuilder::BuildAlbums() {
    std::map<std::pair<std::string, std::string>, uint32_t> byKey;
    for (uint32_t i = 0; i < rows_.size(); ++i) {
        const Row& row = rows_[i];
        if (row.album.empty())
            continue;
        const std::string& albumArtist = !row.albumArtist.empty() ? row.albumArtist : row.artist;
        const auto [it, added] =
            byKey.emplace(std::make_pair(row.album, albumArtist), albums_.size());
        if (added)
            albums_.push_back(Album{row.album, albumArtist, {}, 0, 0, {}, 0});
        Album& album = albums_[it->second];
        album.tracks.push_back(i);
        album.year = std::max(album.year, row.year);
        album.latestAdded = std::max(album.latestAdded, row.added);
        if (album.artPath.empty() && !row.artPath.empty()) {
            album.artPath = row.artPath;
            album.artTrack = row.id;
        }
    }
    std::vector<uint32_t> order(albums_.size());
    std::iota(order.begin(), order.end(), 0);
    const auto byName = [&](uint32_t a, uint32_t b) {
        const int names = CompareNoCase(albums_[a].name, albums_[b].name);
        return names != 0 ? names < 0 : albums_[a].albumArtist < albums_[b].albumArtist;
    };
    std::sort(order.begin(), order.end(), byName);
    for (Album& album : albums_)
        SortTracks(album.tracks, true);

    const auto addAlbum = [&](const Album& album, const std::string& id, uint32_t parent,
                              uint32_t ViewTrack::*in) {
        const uint32_t index =
            AddContainer(id, view_.containers_[parent].id, album.name, kAlbumClass);
        ViewContainer& container = view_.containers_[index];
        container.album = true;
        container.artist = album.albumArtist;
        container.year = album.year;
        view_.containers_[parent].children.push_back({index, false});
        AddTrackChildren(index, album.tracks);
        for (const uint32_t track : album.tracks)
            view_.tracks_[track].*in = index;
    };
    for (const uint32_t a : order)
        addAlbum(albums_[a], AlbumId(albums_[a].albumArtist, albums_[a].name), category_[2],
                 &ViewTrack::albumIn);

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
        const uint32_t index =
            AddContainer(ArtistId(artist->first), kAlbumArtistsId, artist->first, kArtistClass);
        view_.containers_[category_[3]].children.push_back({index, false});
        for (const uint32_t a : artist->second)
            addAlbum(albums_[a], ArtistAlbumId(albums_[a].albumArtist, albums_[a].name), index,
                     &ViewTrack::artistAlbumIn);
    }

    std::vector<uint32_t> latest = order;
    std::stable_sort(latest.begin(), latest.end(), [&](uint32_t a, uint32_t b) {
        return albums_[a].latestAdded > albums_[b].latestAdded;
    });
    latest.resize(std::min(latest.size(), kLatestAlbumCount));
    for (const uint32_t a : latest)
        addAlbum(albums_[a], LatestAlbumId(albums_[a].albumArtist, albums_[a].name), category_[6],
                 &ViewTrack::latestAlbumIn);
}

void LibraryViewBuilder::BuildGenres() {
    std::map<std::string, std::vector<uint32_t>> byGenre;
    for (uint32_t i = 0; i < rows_.size(); ++i) {
        if (!rows_[i].genre.empty())
            byGenre[rows_[i].genre].push_back(i);
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
            AddContainer(GenreId(genre->first), kGenresId, genre->first, kGenreClass);
        view_.containers_[category_[4]].children.push_back({index, false});
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
        view_.tracks_[drawn[i]].inRandom = true;
    }
    drawn.resize(count);
    AddTrackChildren(category_[5], drawn);
}

void LibraryViewBuilder::RenderTracks() {
    // The type fields depend on the extension alone: worked out once per extension, and the
    // protocolInfo stored once in the view.
    struct FileType {
        std::string mimeType, dlnaFeatures;
        int protocolInfoIndex = -1;
    };
    std::unordered_map<std::string, FileType> typeOf;
    for (std::size_t i = 0; i < rows_.size(); ++i) {
        const Row& row = rows_[i];
        DidlObject item;
        item.title = row.title;
        item.upnpClass = kMusicTrackClass;
        item.artist = row.artist;
        item.album = row.album;
        item.genre = row.genre;
        item.date = DateOfYear(row.year);
        item.trackNo = row.trackNo;
        item.durationMs = row.durationMs;
        item.size = row.size;
        item.resPath = ResUrlPath(row.id, row.path);
        if (!row.artPath.empty())
            item.artPath = ArtUrlPath(row.id, row.artPath);
        const std::string extension = medialib::LowerExtension(row.path);
        auto type = typeOf.find(extension);
        if (type == typeOf.end()) {
            FileType fileType{medialib::MimeTypeOfPath(row.path),
                              medialib::DlnaContentFeatures(row.path), -1};
            auto& shared = view_.protocolInfos_;
            if (shared.size() < kMaxSharedProtocolInfos) {
                fileType.protocolInfoIndex = static_cast<int>(shared.size());
                shared.push_back(ProtocolInfo(fileType.mimeType, fileType.dlnaFeatures));
            }
            type = typeOf.emplace(extension, std::move(fileType)).first;
        }
        item.mimeType = type->second.mimeType;
        item.dlnaFeatures = type->second.dlnaFeatures;
        item.protocolInfoIndex = type->second.protocolInfoIndex;
        view_.tracks_[i].body = DidlItemBody(item);
        view_.tracks_[i].body.shrink_to_fit();
    }
}

void LibraryViewBuilder::RenderContainers() {
    std::vector<uint64_t> trackHash(rows_.size());
    for (std::size_t i = 0; i < rows_.size(); ++i)
        trackHash[i] = Combine(HashOf(view_.tracks_[i].body), static_cast<uint64_t>(rows_[i].id));
    std::map<std::pair<std::string, std::string>, const Album*> albumByKey;
    for (const Album& album : albums_)
        albumByKey[{album.name, album.albumArtist}] = &album;
    for (uint32_t c = 0; c < view_.containers_.size(); ++c) {
        ViewContainer& container = view_.containers_[c];
        DidlObject object;
        object.container = true;
        object.id = container.id;
        object.parentId = container.parentId;
        object.title = container.title;
        object.upnpClass = containerClass_[c];
        object.childCount = static_cast<int64_t>(container.children.size());
        if (containerClass_[c] == kAlbumClass) {
            object.artist = container.artist;
            object.date = DateOfYear(container.year);
            const auto album = albumByKey.find({container.title, container.artist});
            if (album != albumByKey.end())
                object.artPath = AlbumArtPath(*album->second);
        }
        container.element = DidlElement(object);
    }
    // Children before parents do not exist in every view, so hash in a second pass: a container's
    // hash covers its children's elements (their titles and counts) and its tracks.
    for (ViewContainer& container : view_.containers_) {
        uint64_t hash = HashOf(container.element);
        for (const ViewChild& child : container.children) {
            const uint64_t part = child.track ? trackHash[child.index]
                                              : HashOf(view_.containers_[child.index].element);
            hash = Combine(hash, part);
        }
        container.contentHash = hash;
    }
}

std::unique_ptr<LibraryView> LibraryView::Load(const std::string& dbPath,
                                               const std::string& share) {
    static std::atomic<uint64_t> loads{0};
    auto view = std::unique_ptr<LibraryView>(new LibraryView());
    view->serial_ = ++loads;
    LibraryViewBuilder builder(*view, share);
    if (!builder.Read(dbPath))
        return nullptr;
    builder.Build();
    return view;
}

const ViewContainer* LibraryView::FindContainer(const std::string& id) const {
    const uint32_t index = ContainerIndex(id);
    return index == kNoIndex ? nullptr : &containers_[index];
}

uint32_t LibraryView::ContainerIndex(const std::string& id) const {
    const auto found = containerIndex_.find(id);
    return found == containerIndex_.end() ? kNoIndex : found->second;
}

const ViewTrack* LibraryView::FindTrack(int64_t id) const {
    const auto found = trackIndex_.find(id);
    return found == trackIndex_.end() ? nullptr : &tracks_[found->second];
}

bool LibraryView::Lists(uint32_t container, const ViewTrack& track) const {
    if (container == kNoIndex)
        return false;
    if (container == allMusic_)
        return true;
    if (container == random_)
        return track.inRandom;
    return container == track.folderIn || container == track.albumIn ||
           container == track.artistAlbumIn || container == track.latestAlbumIn ||
           container == track.genreIn;
}

std::string LibraryView::ChangedContainers(const LibraryView* previous, std::size_t limit) const {
    std::string changed;
    std::size_t listed = 0;
    for (const ViewContainer& container : containers_) {
        if (listed == limit)
            break;
        const ViewContainer* before = previous ? previous->FindContainer(container.id) : nullptr;
        if (before != nullptr && before->contentHash == container.contentHash)
            continue;
        if (!changed.empty())
            changed += ',';
        changed += container.id + "," + std::to_string(updateId_);
        ++listed;
    }
    return changed;
}

}  // namespace harmona::mediad
