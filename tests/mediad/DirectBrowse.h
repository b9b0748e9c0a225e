// A Browse of the media server's ContentDirectory called directly, without the network, from the
// arguments a control point would send; for the tests and the content benchmark.
#pragma once

#include <cstdint>
#include <string>

#include "services/harmona-mediad/ContentDirectory.h"

namespace harmona::test::mediad {

// BrowseDirectChildren, or BrowseMetadata when `metadata`; `count` 0 asks for all.
inline harmona::mediad::BrowseResult Browse(const harmona::mediad::ContentDirectory& directory,
                                            const std::string& id, bool metadata = false,
                                            uint32_t start = 0, uint32_t count = 0,
                                            const std::string& sort = "") {
    harmona::mediad::BrowseArgs args;
    args.objectId = id;
    args.metadata = metadata;
    args.startingIndex = start;
    args.requestedCount = count;
    args.sortCriteria = sort;
    return directory.Browse(args);
}

}  // namespace harmona::test::mediad
