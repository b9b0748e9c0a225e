// Part 1.2: tree node record.
#include "HarmonaHandler.h"
#include "WebUtils.h"

void HarmonaHandler::FillTreeNode(Json::Value& node, const std::string& id, const std::string& pid,
                                  const std::string& text, const std::string& icon,
                                  unsigned int flags) {
    // Json::Value::clear() empties an object; on a scalar it would throw, and a node must be an
    // object in any case.
    if (node.isObject())
        node.clear();
    else
        node = Json::Value(Json::objectValue);
    node["text"] = WebUtils::EncodeHtml(text, false);
    node["qtip"] = node["text"];
    node["id"] = id;
    if (!pid.empty())
        node["pid"] = pid;
    if (!icon.empty())
        node["icon"] = icon;
    node["allowDrag"] = (flags & NODE_ALLOW_DRAG) != 0;
    node["allowDrop"] = (flags & NODE_ALLOW_DROP) != 0;
    node["draggable"] = (flags & NODE_DRAGGABLE) != 0;
    node["expanded"] = (flags & NODE_EXPANDED) != 0;
    node["leaf"] = (flags & NODE_LEAF) != 0;
}
