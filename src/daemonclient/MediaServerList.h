// The media servers that the audio daemon lists: asked for with commands 14 and 16 and read from
// its JSON replies, page by page. The one reader of those replies: the tree's media server list
// and library.cgi (which browses only a server listed here) both take the servers from it.
#pragma once

#include <functional>
#include <string>

namespace harmona::daemonclient {

// A server of the list that can be shown: its control URL and the text it is shown with (its
// friendly name, or its IP address when the name is missing or empty).
struct ListedMediaServer {
    std::string controlUrl;
    std::string text;
};

// Asks the daemon to prepare its list, then reads the list from offset 0 in pages of
// paths::kDaemonListPageSize (at most 100 pages, whatever "total" the daemon claims) and calls
// `visit` for each element, in order, that has a textual control URL and a text; other elements
// are skipped. Returns the "total" of the last page read (0 when absent or not an int), or 0 when
// the daemon could not be asked or a reply does not parse (logged as "audio:1130 Parse error");
// the servers of the pages read before a failure have been visited.
int ReadMediaServerList(const std::function<void(const ListedMediaServer&)>& visit);

}  // namespace harmona::daemonclient
