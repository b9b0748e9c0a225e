// The listings that the refresh action calls, exposed so that a unit test can make the smart
// playlist listing fail (the real one always succeeds).
#pragma once

#include <json/value.h>

class HarmonaHandler;

namespace harmona::tree {

using CategoryLister = int (*)(HarmonaHandler& handler, Json::Value& items, const char* category);
using IPodLister = int (*)(HarmonaHandler& handler, Json::Value& items);

struct RefreshListers {
    IPodLister iPodPlaylists;
    CategoryLister playlists;
    CategoryLister smartPlaylists;
};

// The real listings: ListIPodPlaylists, ListPlaylists, ListSmartPlaylists.
const RefreshListers& DefaultRefreshListers();

// RefreshNode over the given listings (RefreshNode passes DefaultRefreshListers()).
void RefreshNodeWith(HarmonaHandler& handler, const char* target, const RefreshListers& listers);

}  // namespace harmona::tree
