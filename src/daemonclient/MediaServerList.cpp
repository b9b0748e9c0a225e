#include "src/daemonclient/MediaServerList.h"

#include <json/reader.h>
#include <syslog.h>

#include <climits>
#include <cstring>

#include "platform/paths/DaemonProtocol.h"
#include "src/daemonclient/AudioDaemon.h"

namespace harmona::daemonclient {
namespace {

// The unit name and line number of the "Parse error" log line: the handler's unit "audio" (as in
// the playlist listing) and a number of this project's own. Both are fixed identifiers that log
// readers match on, not the source line, so they must not follow the code when it moves.
constexpr const char* kUnit = "audio";
constexpr int kLineParseError = 1130;

constexpr int kPageSize = paths::kDaemonListPageSize;
constexpr int kReplySize = static_cast<int>(paths::kDaemonListReplyBufferSize);
// Whatever "total" the daemon claims, at most this many pages are asked for (1,000 servers, which
// no real network has): a daemon that lies cannot keep the request going.
constexpr int kMaxPages = 100;

// jsoncpp's old Reader throws (rather than fails) when arrays and objects nest deeper than its
// stack limit of 1000; a daemon's reply must never get there. Text nested deeper than this is
// treated as a parse failure before the Reader sees it.
constexpr int kMaxNesting = 900;

// The deepest nesting of arrays and objects in `text`, skipping strings and the comments that the
// Reader accepts. Unbalanced text may count too deep or too shallow: the Reader then rejects it.
int NestingDepth(const char* text, size_t length) {
    int depth = 0;
    int deepest = 0;
    for (size_t i = 0; i < length; ++i) {
        const char c = text[i];
        if (c == '"') {
            for (++i; i < length && text[i] != '"'; ++i) {
                if (text[i] == '\\')
                    ++i;
            }
        } else if (c == '/' && i + 1 < length && text[i + 1] == '/') {
            while (i < length && text[i] != '\n')
                ++i;
        } else if (c == '/' && i + 1 < length && text[i + 1] == '*') {
            for (i += 2; i + 1 < length && !(text[i] == '*' && text[i + 1] == '/'); ++i) {
            }
            ++i;
        } else if (c == '[' || c == '{') {
            if (++depth > deepest)
                deepest = depth;
        } else if (c == ']' || c == '}') {
            --depth;
        }
    }
    return deepest;
}

// Parses the reply's text up to its first NUL with the Reader, comments collected. A
// reply that filled the whole buffer has no NUL and is not read past the buffer: a failure.
bool ParseReply(Json::Reader& reader, const char* reply, size_t size, Json::Value& root) {
    const void* nul = std::memchr(reply, '\0', size);
    if (nul == nullptr)
        return false;
    const size_t length = static_cast<size_t>(static_cast<const char*>(nul) - reply);
    if (NestingDepth(reply, length) > kMaxNesting)
        return false;
    return reader.parse(reply, reply + length, root, true);
}

// A member of an object, or null for anything else (a non-object would make jsoncpp throw).
const Json::Value& Member(const Json::Value& value, const char* name) {
    static const Json::Value null;
    if (!value.isObject())
        return null;
    const Json::Value* member = value.find(name, name + std::strlen(name));
    return member != nullptr ? *member : null;
}

// "total" as an integer; absent or not an integer of int's range counts as 0.
int TotalOf(const Json::Value& root) {
    const Json::Value& total = Member(root, "total");
    return total.isInt() ? total.asInt() : 0;
}

}  // namespace

int ReadMediaServerList(const std::function<void(const ListedMediaServer&)>& visit) {
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"
    Json::Reader reader;  // the classic Reader; jsoncpp marks it deprecated
#pragma GCC diagnostic pop
    Json::Value root;
    if (AudioDaemonPrepareMediaServerList() != 0)
        return 0;
    int offset = 0;
    int total = 0;
    ListedMediaServer server;
    for (int page = 0; page < kMaxPages; ++page) {
        static char reply[kReplySize];  // 40 KB: kept off the stack
        if (AudioDaemonGetMediaServerList(offset, kPageSize, reply, kReplySize) != 0)
            return 0;
        if (!ParseReply(reader, reply, kReplySize, root)) {
            syslog(LOG_ERR, "%s:%d Parse error", kUnit, kLineParseError);
            return 0;
        }
        const Json::Value& list = Member(root, "list");
        for (Json::ArrayIndex i = 0; list.isArray() && i < list.size(); ++i) {
            const Json::Value& element = list[i];
            const Json::Value& controlUrl = Member(element, "control_url");
            const Json::Value& name = Member(element, "friendly_name");
            const Json::Value& ip = Member(element, "ip");
            // An element without a textual control URL has no id to give; one without a name
            // has no text unless its ip is a string; such elements are skipped.
            const bool named = name.isString() && !name.asString().empty();
            if (!controlUrl.isString() || (!named && !ip.isString()))
                continue;
            server.controlUrl = controlUrl.asString();
            server.text = named ? name.asString() : ip.asString();
            visit(server);
        }
        total = TotalOf(root);
        // The offset would overflow past INT_MAX; no int total can be above it anyway.
        if (offset > INT_MAX - kPageSize)
            return total;
        offset += kPageSize;
        if (!(offset < total))
            return total;
    }
    return total;
}

}  // namespace harmona::daemonclient
