#include <cstdio>
#include <map>
#include <unordered_map>

#include "platform/medialib/MediaFiles.h"
#include "platform/medialib/StreamName.h"
#include "services/harmona-mediad/DidlWriter.h"
#include "services/harmona-mediad/LibraryViewBuilder.h"

namespace harmona::mediad {
namespace {

std::string ArtUrlPath(int64_t trackId, const std::string& artPath) {
    return "art/" + std::to_string(trackId) + "." +
           (medialib::LowerExtension(artPath) == "png" ? "png" : "jpg");
}

}  // namespace

std::string LibraryViewBuilder::AlbumArtPath(const LibraryAlbum& album) const {
    return album.artPath.empty() ? std::string() : ArtUrlPath(album.artTrack, album.artPath);
}

void LibraryViewBuilder::TypeTracks() {
    // The type fields depend on the extension alone: worked out once per extension, and kept
    // once in the view.
    std::unordered_map<std::string, uint32_t> typeOf;
    for (std::size_t i = 0; i < rows_.size(); ++i) {
        const LibraryRow& row = rows_[i];
        ViewTrack& track = view_.tracks_[i];
        if (!row.artPath.empty())
            track.art =
                medialib::LowerExtension(row.artPath) == "png" ? TrackArt::png : TrackArt::jpg;
        const std::string extension = medialib::LowerExtension(row.path);
        auto type = typeOf.find(extension);
        if (type == typeOf.end()) {
            view_.fileTypes_.push_back(
                ViewFileType{ProtocolInfo(medialib::MimeTypeOfPath(row.path),
                                          medialib::DlnaContentFeatures(row.path)),
                             medialib::StreamExtensionOf(row.path)});
            type =
                typeOf.emplace(extension, static_cast<uint32_t>(view_.fileTypes_.size() - 1)).first;
        }
        track.fileType = type->second;
    }
}

void LibraryViewBuilder::RenderContainers() {
    std::map<std::pair<std::string, std::string>, const LibraryAlbum*> albumByKey;
    for (const LibraryAlbum& album : albums_)
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
}

}  // namespace harmona::mediad
