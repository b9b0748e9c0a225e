#include "VanuAudioUtils.h"

#include <algorithm>

#include "ConfFile.h"
#include "PlatformPaths.h"

namespace {

class SectionNames : public harmona::conf::ConfVisitor {
  public:
    void Section(std::string_view name) override {
        if (!name.empty())
            names.emplace_back(name);
    }
    std::vector<std::string> names;
};

}  // namespace

std::vector<std::string> VanuAudioUtils::SmartPLSEnum(int offset, int limit, int& total,
                                                      const char* path) {
    SectionNames visitor;
    harmona::conf::ReadConf(path != nullptr ? path : harmona::paths::kSharedSmartPlaylists,
                            visitor);
    std::vector<std::string>& names = visitor.names;
    total = static_cast<int>(std::min<std::size_t>(names.size(), 0x7FFFFFFF));

    const std::size_t first = offset > 0 ? std::min(names.size(), std::size_t(offset)) : 0;
    std::size_t last = names.size();
    if (limit > 0)
        last = std::min(last, first + std::size_t(limit));
    if (first == 0 && last == names.size())
        return std::move(names);
    return std::vector<std::string>(names.begin() + first, names.begin() + last);
}
