// Fuzzes the reply printer: texts of any bytes, as values and as member names, must come out as
// valid UTF-8 JSON that parses back.
#include <json/json.h>

#include <cstdint>
#include <cstdlib>
#include <memory>
#include <string>

#include "common/util/Utf8.h"
#include "platform/cgi/ActionHandler.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string input(reinterpret_cast<const char*>(data), size);
    Json::Value reply;
    // Pieces separated by '|' become alternately member names and values of nested nodes.
    std::size_t start = 0;
    Json::Value node(Json::objectValue);
    for (int i = 0; start <= input.size() && i < 64; ++i) {
        std::size_t bar = input.find('|', start);
        if (bar == std::string::npos)
            bar = input.size();
        const std::string piece = input.substr(start, bar - start);
        if (i % 2 == 0)
            node[piece] = piece;
        else
            node["text"] = piece;
        reply.append(node);
        start = bar + 1;
    }
    const std::string text = harmona::cgi::SerializeReply(reply);
    if (!harmona::util::IsValidUtf8(text))
        std::abort();
    Json::CharReaderBuilder builder;
    Json::CharReaderBuilder::strictMode(&builder.settings_);
    std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    Json::Value parsed;
    std::string errors;
    if (!reader->parse(text.data(), text.data() + text.size(), &parsed, &errors))
        std::abort();
    if (harmona::util::RepairUtf8(harmona::util::RepairUtf8(input)) !=
        harmona::util::RepairUtf8(input))
        std::abort();
    return 0;
}
