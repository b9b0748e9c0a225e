// Part 1.2: tree node record.
#include "HarmonaHandler.h"
#include "WebUtils.h"

void HarmonaHandler::FillTreeNode(Json::Value& node, const std::string& id, const std::string& pid,
                                  const std::string& text, const std::string& icon,
                                  unsigned int flags) {
    // The member names are static texts: jsoncpp then keeps a pointer rather than a copy per node.
    // Json::Value::clear() empties an object; on a scalar it would throw, and a node must be an
    // object in any case.
    if (node.isObject())
        node.clear();
    else
        node = Json::Value(Json::objectValue);
    node[Json::StaticString("text")] = WebUtils::EncodeHtml(text, false);
    node[Json::StaticString("qtip")] = node[Json::StaticString("text")];
    node[Json::StaticString("id")] = id;
    if (!pid.empty())
        node[Json::StaticString("pid")] = pid;
    if (!icon.empty())
        node[Json::StaticString("icon")] = icon;
    node[Json::StaticString("allowDrag")] = (flags & NODE_ALLOW_DRAG) != 0;
    node[Json::StaticString("allowDrop")] = (flags & NODE_ALLOW_DROP) != 0;
    node[Json::StaticString("draggable")] = (flags & NODE_DRAGGABLE) != 0;
    node[Json::StaticString("expanded")] = (flags & NODE_EXPANDED) != 0;
    node[Json::StaticString("leaf")] = (flags & NODE_LEAF) != 0;
}
