// The floor of a listing request: a process that makes COUNT tree nodes the way every builder of
// the tree does (HarmonaHandler::FillTreeNode into a Json::Value, Json::Value::append into the
// children array) and prints them with ActionHandler::PrintResponse,
// and does nothing else: no request parsing, no fetch, no XML. What a CGI request that lists COUNT
// children costs beyond this is the part that the code can still win; this much it cannot, while
// nodes are jsoncpp values.
//   bench_node_floor COUNT [TITLE_PREFIX]    (or COUNT from the environment: NODE_COUNT=COUNT)
#include <cstdio>
#include <cstdlib>
#include <string>

#include "src/handler/HarmonaHandler.h"

int main(int argc, char** argv) {
    const char* fromEnvironment = std::getenv("NODE_COUNT");
    const long count = argc > 1                     ? std::atol(argv[1])
                       : fromEnvironment != nullptr ? std::atol(fromEnvironment)
                                                    : 0;
    const std::string title = argc > 2 ? argv[2] : "Title ";
    HarmonaHandler handler;
    Json::Value children;
    Json::Value node;
    for (long i = 0; i < count; ++i) {
        const std::string number = std::to_string(i);
        handler.FillTreeNode(node, "musiclib_item-" + number, "musiclib_container", title + number,
                             "3rdparty/Harmona/images/files_class/icon_container.png", NODE_LEAF);
        children.append(std::move(node));
    }
    handler.PrintResponse(std::move(children), kReplyContentType);
    return 1;
}
