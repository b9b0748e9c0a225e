// The category table of the root tree, exposed so that a unit test can make a child
// builder fail that no fixture can make fail (the radio builder always succeeds).
#pragma once

#include <json/value.h>

#include <vector>

class HarmonaHandler;

namespace harmona::tree {

// When a root category is shown: library categories when a music share exists and the local media
// server runs, the iPod when its directory exists and the user may use it, the media servers when
// the user may see them, radio always.
enum class RootCondition { library, ipod, always, mediaServer };

using ChildBuilder = int (*)(HarmonaHandler& handler, Json::Value& children);

struct RootCategory {
    const char* id;
    const char* textSection;
    const char* textKey;
    RootCondition condition;
    ChildBuilder build;
    const char* errorSection;
    const char* errorKey;
    bool expanded;
};

// The six categories in reply order.
const std::vector<RootCategory>& RootCategories();

// BuildRootTree over the given table (BuildRootTree passes RootCategories()).
int BuildRootTreeFrom(HarmonaHandler& handler, const std::vector<RootCategory>& categories);

}  // namespace harmona::tree
