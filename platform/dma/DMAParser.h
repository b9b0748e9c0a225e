// Sends a ContentDirectory:1 Browse and parses its reply
// (platform/README.md, "Local media server and browse library"). The HTTP client lives in the
// on-demand plugin of HttpPost.h, loaded only here.
#pragma once

#include <string>
#include <vector>

#include "platform/dma/DMABrowse.h"
#include "platform/dma/ItemNode.h"

class DMAParser {
  public:
    using ItemList = std::vector<ItemNode*>;

    DMAParser() = default;
    ~DMAParser();
    DMAParser(const DMAParser&) = delete;
    DMAParser& operator=(const DMAParser&) = delete;

    // Sends the prepared browse (every page of it when requestedCount is 0) and parses the reply;
    // 0 on a BrowseResponse; non-zero on no connection within 2 s, no whole reply within 20 s (all
    // pages together), an HTTP status other than 200, a SOAP fault, malformed XML, a Result that is
    // not DIDL-Lite, a missing HTTP plugin (Error() says which), or a browse too large for a
    // request's memory: a reply over 64 MiB, a page whose parse would take more than
    // kMaxDidlTreeBytes, more than kMaxBrowseObjects objects or kMaxBrowseTextBytes of their
    // values in all (SoapBrowse.h; these four with a log line).
    int Parse(DMABrowse* browse);

    // The parse result: null when the reply had no Result (or an empty one), else the DIDL-Lite
    // objects in document order. The items belong to the parser.
    const ItemList* GetResult() const { return hasResult_ ? &items_ : nullptr; }

    // TotalMatches of the last page (0 when absent).
    unsigned long TotalMatches() const { return totalMatches_; }
    // Why the last Parse failed ("" after a success).
    const std::string& Error() const { return error_; }

  private:
    // One browse's way through its pages: the HTTP client, the time limit, the next index and
    // what the pages so far have brought (DMAParser.cpp).
    struct Paging;

    // The page loop: asks for and parses one page after the other while more are wanted.
    int FetchPages(const DMABrowse& browse, Paging& paging);
    // The request: sends the Browse for the next page and collects its reply body.
    int RequestPage(const DMABrowse& browse, const Paging& paging, std::string& reply);
    // The parse: the page's BrowseResponse and DIDL-Lite, within the bounds; appends the objects
    // and says whether another page is wanted.
    int ParsePage(const DMABrowse& browse, std::string& reply, Paging& paging, bool& morePages);

    void Clear();
    int Fail(std::string why);
    // Fails for a reply too large for the request's memory bound, with a log line.
    int Refuse(const DMABrowse& browse, const std::string& why);

    ItemList items_;
    bool hasResult_ = false;
    unsigned long totalMatches_ = 0;
    std::string error_;
};
