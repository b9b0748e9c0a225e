// Fuzzes the conf reader as users.conf, audio.conf, the strings tables and the smart playlist files
// use it: every event is checked against the syntax's promises.
#include <cstdint>
#include <cstdlib>
#include <string>

#include "platform/conf/ConfFile.h"
#include "platform/texts/LocalizedStringParser.h"

namespace {

class CheckingVisitor : public harmona::conf::ConfVisitor {
  public:
    void Section(std::string_view name) override {
        if (name.find('\n') != std::string_view::npos)
            std::abort();
        ++sections;
    }
    void Entry(std::string_view key, std::string_view value) override {
        if (key.empty() || key.find('=') != std::string_view::npos)
            std::abort();
        if (key.find('\n') != std::string_view::npos || value.find('\n') != std::string_view::npos)
            std::abort();
        if (key.front() == ' ' || key.back() == ' ')
            std::abort();
        ++entries;
    }
    std::size_t sections = 0;
    std::size_t entries = 0;
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view text(reinterpret_cast<const char*>(data), size);
    CheckingVisitor visitor;
    harmona::conf::ParseConf(text, visitor);
    if (visitor.sections + visitor.entries > size)
        std::abort();  // at most one event per line
    return 0;
}
