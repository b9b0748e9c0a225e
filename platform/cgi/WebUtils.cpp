#include "platform/cgi/WebUtils.h"

#include "common/util/XmlEscape.h"

std::string WebUtils::EncodeHtml(const std::string& text, bool /*flag*/) {
    return harmona::util::EscapeMarkup(text);
}
