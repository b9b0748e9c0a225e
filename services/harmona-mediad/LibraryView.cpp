#include "services/harmona-mediad/LibraryView.h"

#include <algorithm>
#include <atomic>
#include <utility>

#include "services/harmona-mediad/DidlWriter.h"
#include "services/harmona-mediad/LibraryReader.h"
#include "services/harmona-mediad/LibraryViewBuilder.h"

namespace harmona::mediad {

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
        fields.year = container.year;
    }
    fields.artTrack = container.artTrack;
    fields.artExtension = ArtExtension(container.art);
    AppendContainer(out, fields, mediaBase);
}

const ViewTrack* LibraryView::FindTrack(int64_t id) const {
    const auto found =
        std::lower_bound(tracks_.begin(), tracks_.end(), id,
                         [](const ViewTrack& track, int64_t x) { return track.id < x; });
    return found == tracks_.end() || found->id != id ? nullptr : &*found;
}

void LibraryView::AppendTrackBody(std::string& out, const ViewTrack& track,
                                  std::string_view mediaBase) const {
    TrackFields fields;
    fields.id = track.id;
    fields.title = Text(track.title);
    fields.artist = Text(track.artist);
    fields.album = Text(track.album);
    fields.genre = Text(track.genre);
    fields.year = track.year;
    fields.trackNo = track.trackNo;
    fields.durationMs = track.durationMs;
    fields.size = track.size;
    const ViewFileType& type = fileTypes_[track.fileType];
    fields.protocolInfo = type.protocolInfo;
    fields.streamExtension = type.streamExtension;
    fields.artExtension = ArtExtension(track.art);
    AppendTrackItemBody(out, fields, mediaBase);
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

}  // namespace harmona::mediad
