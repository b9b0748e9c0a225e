// Fuzzes CGI parameter decoding and WebMan::LoadIn: the input is split at its first NUL byte into a
// query string and a urlencoded POST body (fed on standard input), then parameters are looked up.
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>

#include "platform/cgi/CgiParams.h"
#include "platform/cgi/UILanguage.h"
#include "platform/cgi/WebMan.h"

namespace {

void FeedStdin(const std::string& body) {
    int fds[2];
    if (pipe(fds) != 0)
        std::abort();
    // A pipe holds 64 KiB: the fuzzer's inputs are smaller (-max_len in scripts/fuzz).
    if (!body.empty() &&
        write(fds[1], body.data(), body.size()) != static_cast<ssize_t>(body.size()))
        std::abort();
    close(fds[1]);
    dup2(fds[0], STDIN_FILENO);
    close(fds[0]);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string input(reinterpret_cast<const char*>(data), size);
    const std::size_t split = input.find('\0');
    const std::string query = input.substr(0, split);
    const std::string body = split == std::string::npos ? "" : input.substr(split + 1);

    setenv("QUERY_STRING", query.c_str(), 1);
    setenv("REQUEST_METHOD", "POST", 1);
    setenv("CONTENT_TYPE", "application/x-www-form-urlencoded; charset=UTF-8", 1);
    setenv("CONTENT_LENGTH", std::to_string(body.size()).c_str(), 1);
    FeedStdin(body);

    WebMan webMan;
    webMan.LoadIn();
    for (const char* name : {"action", "node", "target", ""}) {
        const char* value = webMan.In(name, nullptr);
        if (value != nullptr && std::strlen(value) > size)
            std::abort();  // decoding never grows text
    }
    // The Accept-Language chooser over the same bytes: only known codes may come out.
    const std::string code = harmona::cgi::LanguageFromAcceptLanguage(query);
    if (!code.empty() && !harmona::cgi::IsLanguageCode(code))
        std::abort();
    return 0;
}
