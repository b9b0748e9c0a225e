// UI text lookup: the text tables of the request's language. The error and success envelopes are
// ActionHandler's (platform).
#include "platform/paths/PlatformPaths.h"
#include "platform/texts/LocalizedStringParser.h"
#include "src/handler/HarmonaHandler.h"

Json::Value HarmonaHandler::LoadUITexts() {
    // The language code is appended as it stands: no separator, no file name.
    std::string path = harmona::paths::kTextsPrefix + webMan.GetUILanguage();
    return VANU::ZET::LocalizedStringParser::ParseTexts(path);
}
