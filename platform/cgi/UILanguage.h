// The UI language codes of the platform and their choice from Accept-Language (platform/README.md,
// "Requests, users and permissions").
#pragma once

#include <string>
#include <string_view>

namespace harmona::cgi {

// True for one of the platform's language codes ("enu", "ger", ...).
bool IsLanguageCode(std::string_view code);

// The code of the first language of an Accept-Language header (by descending q-value, then order)
// that maps to a code; empty when none does.
std::string LanguageFromAcceptLanguage(std::string_view header);

}  // namespace harmona::cgi
