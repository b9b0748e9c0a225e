#include "platform/cgi/WebMan.h"

#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "platform/cgi/RequestOrigin.h"
#include "platform/cgi/UILanguage.h"
#include "platform/paths/PlatformPaths.h"
#include "platform/users/AudioUsers.h"

namespace {

const char* Env(const char* name) {
    return std::getenv(name);
}

}  // namespace

bool WebMan::IsValidUserName(const std::string& name) {
    if (name.empty() || name.size() > 64 || name == "." || name == "..")
        return false;
    for (unsigned char c : name) {
        if (c == '/' || c < 0x20 || c == 0x7f)
            return false;
    }
    return true;
}

int WebMan::IsAuthorized(const char* /*application*/, int /*level*/,
                         tag_cgi_position /*position*/) {
    const char* user = Env("REMOTE_USER");
    // A page of another site acts in the user's name only through his browser: such a request
    // gets the same answer as one without a valid login, before anything runs.
    const bool crossSite = harmona::cgi::IsCrossSiteRequest(Env("HTTP_SEC_FETCH_SITE"),
                                                            Env("HTTP_ORIGIN"), Env("HTTP_HOST"));
    if (user != nullptr && IsValidUserName(user) && !crossSite)
        return 1;
    std::fputs("Status: 401 Unauthorized\r\n\r\n", stdout);
    std::fflush(stdout);
    return 0;
}

void WebMan::LoadIn() {
    params_.clear();
    const char* method = Env("REQUEST_METHOD");
    if (method != nullptr && std::strcmp(method, "POST") == 0 &&
        harmona::cgi::IsFormContentType(Env("CONTENT_TYPE"))) {
        const long length = harmona::cgi::ParseContentLength(Env("CONTENT_LENGTH"));
        if (length > 0) {
            const std::string body = harmona::cgi::ReadBody(
                STDIN_FILENO, static_cast<std::size_t>(length), harmona::cgi::kBodyTimeoutMs);
            harmona::cgi::DecodeForm(body, params_);
        }
    }
    if (const char* query = Env("QUERY_STRING"))
        harmona::cgi::DecodeForm(query, params_);
}

const char* WebMan::In(const char* name, const char* defaultValue) {
    if (name == nullptr)
        return defaultValue;
    for (const auto& [key, value] : params_) {
        if (key == name)
            return value.c_str();
    }
    return defaultValue;
}

std::string WebMan::GetLoginUserName() const {
    const char* user = Env("REMOTE_USER");
    return user != nullptr ? user : "";
}

std::string WebMan::GetUILanguage() {
    const std::string user = GetLoginUserName();
    if (IsValidUserName(user)) {
        const std::string chosen = AudioUsers::GetUserLanguage(user);
        if (harmona::cgi::IsLanguageCode(chosen))
            return chosen;
    }
    if (const char* header = Env("HTTP_ACCEPT_LANGUAGE")) {
        const std::string fromBrowser = harmona::cgi::LanguageFromAcceptLanguage(header);
        if (!fromBrowser.empty())
            return fromBrowser;
    }
    return "enu";
}

std::string WebMan::GetPreferenceDir() {
    return harmona::paths::kPreferencePrefix + GetLoginUserName();
}
