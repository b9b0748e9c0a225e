// The UI text tables (platform/README.md, "UI texts").
#pragma once

#include <json/value.h>

#include <cstddef>
#include <string>

namespace VANU::ZET {

// A text table holds a few hundred texts; entries past this many are ignored (one log line), so
// that a damaged table (one entry per short line of an 8 MiB file) cannot take a request's memory
// bound (RequestMemory.h): a root request parses the table up to seven times.
inline constexpr std::size_t kMaxTextEntries = 20000;

class LocalizedStringParser {
  public:
    // `path` is the text directory of one language; the table is the conf file "strings" inside it.
    // One member per section, each an object of key to string; a missing or unreadable file gives
    // an empty object. At most kMaxTextEntries entries are kept.
    static Json::Value ParseTexts(std::string path);
};

}  // namespace VANU::ZET
