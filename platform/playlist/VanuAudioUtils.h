// The smart playlist enumerator of the platform.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

// A smart playlist file with more smart playlists than this is not listed (one log line): its
// names and their tree nodes would take more than a request's memory bound (RequestMemory.h).
// Nobody defines that many rule sets by hand.
inline constexpr std::size_t kMaxSmartPlaylists = 10000;

class VanuAudioUtils {
  public:
    // The names of the smart playlists of the smart playlist file at `path` (a conf file whose
    // every section is one smart playlist; null: the shared file
    // /var/packages/Harmona/etc/smart.playlist): every non-empty section name in file order,
    // duplicates included. `total` receives the number of all names; `offset` names are skipped and
    // at most `limit` returned (0: no limit), so 0 and 0 give all names. A missing or unreadable
    // file gives an empty list, and so does a file with more than kMaxSmartPlaylists names.
    static std::vector<std::string> SmartPLSEnum(int offset, int limit, int& total,
                                                 const char* path);
};
