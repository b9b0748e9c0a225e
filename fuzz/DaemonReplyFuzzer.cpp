// Fuzzes the media server list's handling of the audio daemon's replies: AppendMediaServers runs
// over pages taken from the input (split at each 0xFF byte), served by test doubles of the two
// daemon wrappers that copy a page into the caller's buffer exactly as AudioDaemonCall would
// (zero-filled, one read of at most the buffer's size).
#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "src/handler/HarmonaHandler.h"

namespace {

std::vector<std::string> pages;
std::size_t nextPage = 0;
int calls = 0;

}  // namespace

int AudioDaemonPrepareMediaServerList() {
    return 0;
}

int AudioDaemonGetMediaServerList(int /*offset*/, int /*count*/, char* buffer, int size) {
    if (buffer == nullptr || size <= 0)
        return -1;
    if (++calls > 64 || nextPage >= pages.size())
        return -1;  // the daemon stops answering
    const std::string& page = pages[nextPage++];
    if (page.empty())
        return -1;  // nothing read
    std::memset(buffer, 0, static_cast<std::size_t>(size));
    std::memcpy(buffer, page.data(), std::min(page.size(), static_cast<std::size_t>(size)));
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    pages.clear();
    nextPage = 0;
    calls = 0;
    std::string current;
    for (std::size_t i = 0; i < size; ++i) {
        if (data[i] == 0xFF) {
            pages.push_back(current);
            current.clear();
        } else {
            current.push_back(static_cast<char>(data[i]));
        }
    }
    pages.push_back(current);

    HarmonaHandler handler;
    Json::Value children;
    handler.AppendMediaServers(children);
    if (!children.isNull() && !children.isArray())
        std::abort();
    for (const Json::Value& node : children) {
        if (node["id"].asString().size() > 1023)
            std::abort();  // the 1024-byte id buffer
    }
    return 0;
}
