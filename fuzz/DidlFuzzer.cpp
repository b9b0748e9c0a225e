// Fuzzes the browse library's reply parsing: a SOAP Browse reply, and the DIDL-Lite document it
// carries, whatever bytes the media server sends.
#include <cstdint>
#include <cstdlib>
#include <string>
#include <vector>

#include "platform/dma/ItemNode.h"
#include "platform/dma/SoapBrowse.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    std::string reply(reinterpret_cast<const char*>(data), size);
    std::string didl = reply;  // the same bytes as a bare DIDL-Lite document too

    harmona::dma::BrowsePage page;
    if (harmona::dma::ParseBrowseResponse(reply, page) == harmona::dma::ReplyStatus::ok &&
        page.hasResult)
        didl = page.ResultText();

    std::vector<ItemNode*> items;
    const long count = harmona::dma::ParseDidl(didl, items);
    if (count >= 0 && static_cast<std::size_t>(count) != items.size())
        std::abort();
    for (ItemNode* item : items) {
        for (const char* key :
             {"id", "parentID", "title", "class", "childCount", "artist", "album", "res", "x"})
            item->getValueByKey(key);
        delete item;
    }
    return 0;
}
