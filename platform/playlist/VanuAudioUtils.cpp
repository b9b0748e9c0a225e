#include "platform/playlist/VanuAudioUtils.h"

#include <sys/stat.h>

#include <algorithm>
#include <string>

#include "platform/conf/ConfFile.h"
#include "platform/paths/PlatformPaths.h"
#include "platform/playlist/PlaylistRecord.h"

namespace {

class SectionNames : public harmona::conf::ConfVisitor {
  public:
    void Section(std::string_view name) override {
        if (name.empty() || tooMany)
            return;
        // Counted as the file is read: an 8 MiB file of one-letter sections never becomes two
        // million names.
        if (names.size() == kMaxSmartPlaylists) {
            tooMany = true;
            names.clear();
            names.shrink_to_fit();
            return;
        }
        names.emplace_back(name);
    }
    std::vector<std::string> names;
    bool tooMany = false;
};

// A user's smart playlist file lies in his playlists folder; like his playlists, it is read only
// when that folder is a real one, not a symbolic link to someone else's.
bool InRealFolder(const char* path) {
    const std::string file(path);
    const std::size_t slash = file.rfind('/');
    if (slash == std::string::npos || slash == 0)
        return true;
    struct stat st {};
    return lstat(file.substr(0, slash).c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

}  // namespace

std::vector<std::string> VanuAudioUtils::SmartPLSEnum(int offset, int limit, int& total,
                                                      const char* path) {
    SectionNames visitor;
    const char* file = path != nullptr ? path : harmona::paths::kSharedSmartPlaylists;
    if (path == nullptr || InRealFolder(path))
        harmona::conf::ReadConf(file, visitor);
    if (visitor.tooMany)
        harmona::playlist::LogListTooLong(std::string("smart playlists in ") + file,
                                          kMaxSmartPlaylists);
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
