#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "services/harmona-mediad/LibraryViewBuilder.h"

namespace harmona::mediad {
namespace {

uint64_t HashOf(std::string_view bytes) {
    return std::hash<std::string_view>()(bytes);
}

uint64_t Combine(uint64_t hash, uint64_t part) {
    return (hash ^ part) * 0x100000001b3ULL + 0x9e3779b97f4a7c15ULL;
}

}  // namespace

void LibraryViewBuilder::HashContents() {
    // A track's hash covers its DIDL-Lite as a reply writes it.
    std::vector<uint64_t> trackHash(rows_.size());
    std::string body;
    for (std::size_t i = 0; i < rows_.size(); ++i) {
        body.clear();
        view_.AppendTrackBody(body, view_.tracks_[i], std::string_view());
        trackHash[i] = Combine(HashOf(body), static_cast<uint64_t>(rows_[i].id));
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
