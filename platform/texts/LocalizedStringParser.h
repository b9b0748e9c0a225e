// The UI text tables (platform/README.md, "UI texts").
#pragma once

#include <json/value.h>

#include <string>

namespace VANU::ZET {

class LocalizedStringParser {
  public:
    // `path` is the text directory of one language; the table is the conf file "strings" inside it.
    // One member per section, each an object of key to string; a missing or unreadable file gives
    // an empty object.
    static Json::Value ParseTexts(std::string path);
};

}  // namespace VANU::ZET
