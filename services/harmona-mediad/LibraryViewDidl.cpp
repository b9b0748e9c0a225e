#include <algorithm>
#include <numeric>
#include <unordered_map>

#include "platform/medialib/MediaFiles.h"
#include "platform/medialib/StreamName.h"
#include "services/harmona-mediad/DidlWriter.h"
#include "services/harmona-mediad/LibraryViewBuilder.h"

namespace harmona::mediad {
void LibraryViewBuilder::TypeTracks() {
    // The type fields depend on the extension alone: worked out once per extension (from the
    // first path of each that the rows had), and kept once in the view.
    for (const std::string& path : typePaths_) {
        view_.fileTypes_.push_back(ViewFileType{
            ProtocolInfo(medialib::MimeTypeOfPath(path), medialib::DlnaContentFeatures(path)),
            medialib::StreamExtensionOf(path)});
    }
    std::vector<std::string>().swap(typePaths_);
    for (std::size_t i = 0; i < rows_.size(); ++i)
        view_.tracks_[i].art = rows_[i].art;
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
