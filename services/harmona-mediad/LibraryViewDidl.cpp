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

std::string LibraryViewBuilder::AlbumArtPath(const LibraryAlbum& album) const {
    return album.artPath.empty() ? std::string() : ArtUrlPath(album.artTrack, album.artPath);
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
        const LibraryRow& row = rows_[i];
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
