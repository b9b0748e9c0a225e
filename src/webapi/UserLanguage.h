// The user's own UI language, chosen from the page:
//   GET  action=language                   {"success": true, "language": "fre", "tree": "ger",
//                                           "saved": "fre"}
//   POST action=language&language=<code>   saves it; the same reply as a GET after the change
// "saved" is the user's own choice, kept in the file `language` of the user's preference folder
// (one conf line, `language=<code>`; "" when there is none). "language" is the language the page
// speaks: the saved one, unless it is "def" or missing, then the one the tree CGI speaks. "tree" is
// the tree CGI's (users.conf, then the browser's Accept-Language, then "enu"; the administrator's
// choice, which a user cannot change). <code> is one of the eight languages the page carries words
// for (enu ger fre spn ita jpn chs cht), or "def" for no choice of one's own. The file is replaced
// whole (a new file renamed over it) under a lock of the folder.
#pragma once

#include <string>
#include <string_view>

#include "platform/cgi/ActionHandler.h"

namespace harmona::webapi {

inline constexpr std::string_view kLanguageAction = "language";
inline constexpr const char* kLanguageFileName = "language";

// Serves the action; the exit status.
int ServeLanguageAction(ActionHandler& handler, WebMan& webMan);

// Whether `code` may be saved: one of the page's eight languages or "def".
bool IsSavableLanguage(std::string_view code);

}  // namespace harmona::webapi
