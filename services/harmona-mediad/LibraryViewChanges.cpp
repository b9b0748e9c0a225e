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

std::vector<uint64_t> LibraryView::ContentHashes() const {
    // A track's hash covers its DIDL-Lite as a reply writes it.
    std::vector<uint64_t> trackHash(tracks_.size());
    std::string body;
    for (std::size_t i = 0; i < tracks_.size(); ++i) {
        body.clear();
        AppendTrackBody(body, tracks_[i], std::string_view());
        trackHash[i] = Combine(HashOf(body), static_cast<uint64_t>(IdOf(tracks_[i])));
    }
    // Children before parents do not exist in every view, so hash in a second pass: a container's
    // hash covers its children's elements (their titles and counts) and its tracks.
    std::vector<uint64_t> elementHash(containers_.size());
    std::vector<uint64_t> contentHash(containers_.size());
    for (uint32_t c = 0; c < containers_.size(); ++c) {
        body.clear();
        AppendContainerElement(body, c, std::string_view());
        elementHash[c] = HashOf(body);
    }
    for (uint32_t c = 0; c < containers_.size(); ++c) {
        const ViewContainer& container = containers_[c];
        uint64_t hash = elementHash[c];
        const ViewChild* children = ChildrenOf(container);
        for (uint32_t i = 0; i < container.childCount; ++i) {
            const ViewChild& child = children[i];
            hash = Combine(hash, child.track ? trackHash[child.index] : elementHash[child.index]);
        }
        contentHash[c] = hash;
    }
    return contentHash;
}

std::string LibraryView::ChangedContainers(const LibraryView* previous, std::size_t limit) const {
    std::string changed;
    std::size_t listed = 0;
    const std::vector<uint64_t> now = ContentHashes();
    const std::vector<uint64_t> then =
        previous ? previous->ContentHashes() : std::vector<uint64_t>();
    for (uint32_t c = 0; c < containers_.size(); ++c) {
        if (listed == limit)
            break;
        const std::string_view id = Text(containers_[c].id);
        const uint32_t before = previous ? previous->ContainerIndex(id) : kNoIndex;
        if (before != kNoIndex && then[before] == now[c])
            continue;
        if (!changed.empty())
            changed += ',';
        changed += id;
        changed += "," + std::to_string(updateId_);
        ++listed;
    }
    return changed;
}

}  // namespace harmona::mediad
