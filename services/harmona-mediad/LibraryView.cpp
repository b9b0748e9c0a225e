#include "services/harmona-mediad/LibraryView.h"

#include <algorithm>
#include <atomic>
#include <utility>

#include "services/harmona-mediad/DidlWriter.h"
#include "services/harmona-mediad/LibraryReader.h"
#include "services/harmona-mediad/LibraryViewBuilder.h"

namespace harmona::mediad {

static_assert(sizeof(ViewTrack) == 52, "a track of the view takes 52 bytes");
static_assert(sizeof(ViewContainer) == 48, "a container of the view takes 48 bytes");

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

std::string_view ArtExtension(TrackArt art) {
    switch (art) {
        case TrackArt::png:
            return "png";
        case TrackArt::jpg:
            return "jpg";
        case TrackArt::none:
            break;
    }
    return "";
}

std::unique_ptr<LibraryView> LibraryView::Load(const std::string& dbPath,
                                               const std::string& share) {
    static std::atomic<uint64_t> loads{0};
    auto view = std::unique_ptr<LibraryView>(new LibraryView());
    view->serial_ = ++loads;
    LibraryRows rows;
    TrackFolders folders(share);
    if (!ReadLibraryRows(dbPath, rows, [&folders](uint32_t row, std::string_view path) {
            folders.Add(row, path);
        }))
        return nullptr;
    LibraryViewBuilder(*view, std::move(rows), std::move(folders)).Build();
    return view;
}

const ViewContainer* LibraryView::FindContainer(std::string_view id) const {
    const uint32_t index = ContainerIndex(id);
    return index == kNoIndex ? nullptr : &containers_[index];
}

uint32_t LibraryView::ContainerIndex(std::string_view id) const {
    const auto found = std::lower_bound(
        containersById_.begin(), containersById_.end(), id,
        [&](uint32_t index, std::string_view x) { return Text(containers_[index].id) < x; });
    return found == containersById_.end() || Text(containers_[*found].id) != id ? kNoIndex : *found;
}

void LibraryView::AppendContainerElement(std::string& out, uint32_t index,
                                         std::string_view mediaBase) const {
    static constexpr const char* kClasses[] = {
        "object.container.storageFolder", "object.container.album.musicAlbum",
        "object.container.person.musicArtist", "object.container.genre.musicGenre"};
    const ViewContainer& container = containers_[index];
    ContainerFields fields;
    fields.id = Text(container.id);
    fields.parentId = container.parent == kNoIndex ? std::string_view("-1")
                                                   : Text(containers_[container.parent].id);
    fields.title = Text(container.title);
    fields.upnpClass = kClasses[static_cast<int>(container.kind)];
    fields.childCount = container.childCount;
    if (container.album()) {
        fields.artist = Text(container.artist);
        fields.year = YearOf(container);
    }
    fields.artTrack = ArtTrackOf(container);
    fields.artExtension = ArtExtension(container.art);
    AppendContainer(out, fields, mediaBase);
}

TrackNumbers LibraryView::Numbers(const ViewTrack& track) const {
    if (track.wide()) {
        const auto index = static_cast<uint32_t>(&track - tracks_.data());
        const auto found = std::lower_bound(wideNumbers_.begin(), wideNumbers_.end(), index,
                                            [](const std::pair<uint32_t, TrackNumbers>& entry,
                                               uint32_t x) { return entry.first < x; });
        if (found != wideNumbers_.end() && found->first == index)
            return found->second;
    }
    TrackNumbers numbers;
    numbers.id = track.id;
    numbers.year = track.year;
    numbers.trackNo = track.trackNo;
    numbers.durationMs = track.durationMs;
    numbers.size = static_cast<int64_t>(track.sizePlusOne) - 1;
    numbers.fileType = track.fileType;
    return numbers;
}

const ViewTrack* LibraryView::FindTrack(int64_t id) const {
    const auto found =
        std::lower_bound(tracks_.begin(), tracks_.end(), id,
                         [this](const ViewTrack& track, int64_t x) { return IdOf(track) < x; });
    return found == tracks_.end() || IdOf(*found) != id ? nullptr : &*found;
}

void LibraryView::AppendTrackBody(std::string& out, const ViewTrack& track,
                                  std::string_view mediaBase) const {
    const TrackNumbers numbers = Numbers(track);
    TrackFields fields;
    fields.id = numbers.id;
    fields.title = Text(track.title);
    fields.artist = Text(track.artist);
    fields.album = AlbumOf(track);
    fields.genre = GenreOf(track);
    fields.year = numbers.year;
    fields.trackNo = numbers.trackNo;
    fields.durationMs = numbers.durationMs;
    fields.size = numbers.size;
    const ViewFileType& type = fileTypes_[numbers.fileType];
    fields.protocolInfo = type.protocolInfo;
    fields.streamExtension = type.streamExtension;
    fields.artExtension = ArtExtension(track.art);
    AppendTrackItemBody(out, fields, mediaBase);
}

// An album's containers in "Albums", "Album Artists" and "Latest Albums" have the same title and
// artist, each text kept once in the view: the same references.
bool LibraryView::Lists(uint32_t container, const ViewTrack& track) const {
    if (container == kNoIndex)
        return false;
    if (container == allMusic_)
        return true;
    if (container == random_)
        return track.inRandom();
    if (container == track.folderIn || container == track.albumIn || container == track.genreIn)
        return true;
    if (track.albumIn == kNoIndex || !containers_[container].album())
        return false;
    const ViewContainer& album = containers_[track.albumIn];
    const ViewContainer& other = containers_[container];
    return other.title.offset == album.title.offset && other.title.size == album.title.size &&
           other.artist.offset == album.artist.offset && other.artist.size == album.artist.size;
}

}  // namespace harmona::mediad
