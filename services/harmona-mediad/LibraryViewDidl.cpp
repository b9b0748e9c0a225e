#include <algorithm>
#include <numeric>
#include <unordered_map>

#include "platform/medialib/MediaFiles.h"
#include "platform/medialib/StreamName.h"
#include "services/harmona-mediad/DidlWriter.h"
#include "services/harmona-mediad/LibraryViewBuilder.h"

namespace harmona::mediad {
void LibraryViewBuilder::TypeTracks() {
    // The type fields depend on the extension alone: worked out once per extension, and kept
    // once in the view.
    std::unordered_map<std::string, uint32_t> typeOf;
    for (std::size_t i = 0; i < rows_.size(); ++i) {
        const LibraryRow& row = rows_[i];
        ViewTrack& track = view_.tracks_[i];
        const std::string path(R(row.path));
        if (row.artPath.size != 0)
            track.art = ArtOfImagePath(std::string(R(row.artPath)));
        const std::string extension = medialib::LowerExtension(path);
        auto type = typeOf.find(extension);
        if (type == typeOf.end()) {
            view_.fileTypes_.push_back(ViewFileType{
                ProtocolInfo(medialib::MimeTypeOfPath(path), medialib::DlnaContentFeatures(path)),
                medialib::StreamExtensionOf(path)});
            type =
                typeOf.emplace(extension, static_cast<uint32_t>(view_.fileTypes_.size() - 1)).first;
        }
        track.fileType = type->second;
    }
}

// Ids in byte order, the first of equal ids first (there are none: every id names one object).
void LibraryViewBuilder::IndexContainers() {
    auto& order = view_.containersById_;
    order.resize(view_.containers_.size());
    std::iota(order.begin(), order.end(), 0);
    std::stable_sort(order.begin(), order.end(), [&](uint32_t a, uint32_t b) {
        return view_.Text(view_.containers_[a].id) < view_.Text(view_.containers_[b].id);
    });
}

}  // namespace harmona::mediad
