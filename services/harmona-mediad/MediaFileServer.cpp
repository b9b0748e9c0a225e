#include "services/harmona-mediad/MediaFileServer.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <utility>

#include "common/util/Number.h"
#include "platform/medialib/MediaFiles.h"
#include "platform/medialib/StreamName.h"
#include "services/harmona-mediad/ShareFile.h"

namespace harmona::mediad {
namespace {

constexpr std::size_t kChunkBytes = 64 * 1024;

// One response in flight: the open file and how much of the range is still to be sent.
struct Transfer {
    io::FileDescriptor fd;
    off_t next = 0;
    off_t end = 0;  // one past the last byte to send
};

void AppendNextChunk(SoupServerMessage* message, Transfer* transfer) {
    SoupMessageBody* body = soup_server_message_get_response_body(message);
    if (transfer->next >= transfer->end) {
        soup_message_body_complete(body);
        return;
    }
    const std::size_t wanted =
        static_cast<std::size_t>(std::min<off_t>(kChunkBytes, transfer->end - transfer->next));
    auto* buffer = static_cast<char*>(g_malloc(wanted));
    ssize_t got = 0;
    do {
        got = pread(transfer->fd.Get(), buffer, wanted, transfer->next);
    } while (got < 0 && errno == EINTR);
    if (got <= 0) {
        // The file shrank or failed under us: end the body early; the client sees a short
        // transfer against the Content-Length and the connection closes.
        g_free(buffer);
        transfer->next = transfer->end;
        soup_message_body_complete(body);
        return;
    }
    transfer->next += got;
    soup_message_body_append_take(body, reinterpret_cast<guchar*>(buffer), static_cast<gsize>(got));
}

void OnWroteChunk(SoupServerMessage* message, gpointer data) {
    AppendNextChunk(message, static_cast<Transfer*>(data));
}

void FreeTransfer(gpointer data, GClosure*) {
    delete static_cast<Transfer*>(data);
}

bool ParseOffset(const std::string& text, off_t* value) {
    int64_t digits = 0;
    if (!util::ParseDecimalDigits(text, digits))
        return false;
    *value = static_cast<off_t>(digits);
    return true;
}

// Audio: the DLNA headers players look for, with the same fourth field as the item's res.
void SetAudioHeaders(SoupMessageHeaders* headers, const ServedFile& file) {
    soup_message_headers_replace(headers, "Content-Type", file.mimeType.c_str());
    soup_message_headers_replace(headers, "Accept-Ranges", "bytes");
    soup_message_headers_replace(headers, "contentFeatures.dlna.org", file.contentFeatures.c_str());
    soup_message_headers_replace(headers, "transferMode.dlna.org", "Streaming");
}

// Cover art: an image fetched whole, as a player shows it.
void SetImageHeaders(SoupMessageHeaders* headers, const ServedFile& file) {
    soup_message_headers_replace(headers, "Content-Type", file.mimeType.c_str());
    soup_message_headers_replace(headers, "Accept-Ranges", "bytes");
    soup_message_headers_replace(headers, "transferMode.dlna.org", "Interactive");
}

// A cover image's validators: an entity tag of the file's identity, size and time, and the time as
// Last-Modified, so that a browser that keeps the image asks again only whether it changed.
std::string ImageEntityTag(const struct stat& st) {
    char tag[96];
    std::snprintf(tag, sizeof tag, "\"%llx-%llx-%llx\"", static_cast<unsigned long long>(st.st_ino),
                  static_cast<unsigned long long>(st.st_size),
                  static_cast<unsigned long long>(st.st_mtime));
    return tag;
}

std::string HttpDate(time_t when) {
    GDateTime* time = g_date_time_new_from_unix_utc(static_cast<gint64>(when));
    if (time == nullptr)
        return {};
    char* text = soup_date_time_to_string(time, SOUP_DATE_HTTP);
    g_date_time_unref(time);
    std::string date = text != nullptr ? text : "";
    g_free(text);
    return date;
}

// Whether the request's validators say that the client holds this version of the image already:
// If-None-Match names its entity tag, or (without If-None-Match) If-Modified-Since is not older
// than the file.
bool ClientHoldsImage(SoupMessageHeaders* request, const std::string& tag, time_t modified) {
    if (const char* match = soup_message_headers_get_one(request, "If-None-Match"))
        return std::strstr(match, tag.c_str()) != nullptr || std::strcmp(match, "*") == 0;
    const char* since = soup_message_headers_get_one(request, "If-Modified-Since");
    if (since == nullptr)
        return false;
    GDateTime* time = soup_date_time_new_from_http_string(since);
    if (time == nullptr)
        return false;
    const bool held = g_date_time_to_unix(time) >= static_cast<gint64>(modified);
    g_date_time_unref(time);
    return held;
}

// A stream name (platform/medialib/StreamName.h) -> the id and the extension; false for anything
// else.
bool ParseIdName(std::string name, int64_t* id, std::string* extension) {
    std::optional<medialib::StreamName> parsed = medialib::ParseStreamName(name);
    if (!parsed)
        return false;
    *id = parsed->trackId;
    *extension = std::move(parsed->extension);
    return true;
}

}  // namespace

ByteRange ParseByteRange(const char* header, off_t size) {
    ByteRange range;
    range.last = size > 0 ? size - 1 : 0;
    if (header == nullptr)
        return range;
    std::string text = header;
    text.erase(0, text.find_first_not_of(" \t"));
    text.erase(text.find_last_not_of(" \t") + 1);
    if (text.compare(0, 6, "bytes=") != 0 || text.find(',') != std::string::npos)
        return range;
    const std::string bounds = text.substr(6);
    const std::size_t dash = bounds.find('-');
    if (dash == std::string::npos)
        return range;
    const std::string from = bounds.substr(0, dash);
    const std::string to = bounds.substr(dash + 1);
    off_t first = 0, last = 0;
    if (from.empty()) {  // the last n bytes
        if (!ParseOffset(to, &last) || last == 0) {
            range.kind = ByteRange::Kind::unsatisfiable;
            return range;
        }
        range.kind = ByteRange::Kind::part;
        range.first = last >= size ? 0 : size - last;
        range.last = size - 1;
    } else {
        if (!ParseOffset(from, &first) || (!to.empty() && !ParseOffset(to, &last)) ||
            (!to.empty() && last < first))
            return range;  // malformed: ignored, the whole file
        range.kind = ByteRange::Kind::part;
        range.first = first;
        range.last = to.empty() || last >= size ? size - 1 : last;
    }
    if (size == 0 || range.first >= size)
        range.kind = ByteRange::Kind::unsatisfiable;
    return range;
}

MediaFileServer::MediaFileServer(GUPnPContext* context, const ContentDirectory& directory,
                                 std::string sharePath)
    : context_(context), directory_(directory), sharePath_(std::move(sharePath)) {
    // No ACL: files are for every player on the network, as the content directory is.
    gupnp_context_add_server_handler(context_, FALSE, kMediaPath, &MediaFileServer::Handle, this,
                                     nullptr);
}

MediaFileServer::~MediaFileServer() {
    gupnp_context_remove_server_handler(context_, kMediaPath);
}

void MediaFileServer::Handle(SoupServer*, SoupServerMessage* message, const char* path, GHashTable*,
                             gpointer self) {
    static_cast<const MediaFileServer*>(self)->Serve(message, path != nullptr ? path : "");
}

// "/media/<track id>.<extension>" (the track's file) or "/media/art/<track id>.<jpg|png>" (its
// cover art) -> an open descriptor of the indexed file, beneath the share, or -1.
io::FileDescriptor MediaFileServer::Open(const std::string& urlPath, ServedFile* served) const {
    const std::string prefix = std::string(kMediaPath) + "/";
    const std::string artPrefix = prefix + kArtFolder + "/";
    int64_t id = 0;
    std::string extension;
    if (urlPath.compare(0, artPrefix.size(), artPrefix) == 0) {
        served->image = true;
        if (!ParseIdName(urlPath.substr(artPrefix.size()), &id, &extension) ||
            !directory_.LookUpArtFile(id, &served->path))
            return {};
        const std::string real = medialib::LowerExtension(served->path);
        // The URL says what the listing said: png for a PNG cover, jpg for every other.
        if (extension != (real == "png" ? "png" : "jpg"))
            return {};
        served->mimeType = real == "png" ? "image/png" : "image/jpeg";
    } else if (urlPath.compare(0, prefix.size(), prefix) == 0) {
        TrackFile track;
        if (!ParseIdName(urlPath.substr(prefix.size()), &id, &extension) ||
            !directory_.LookUpTrack(id, &track) ||
            extension != medialib::StreamExtensionOf(track.path))
            return {};
        served->path = std::move(track.path);
        served->mimeType = std::move(track.mimeType);
        served->contentFeatures = std::move(track.contentFeatures);
    } else {
        return {};
    }
    const std::string relative = PathBelowShare(sharePath_, served->path);
    return relative.empty() ? io::FileDescriptor() : OpenBeneathShare(sharePath_, relative);
}

void MediaFileServer::Serve(SoupServerMessage* message, const std::string& path) const {
    const char* method = soup_server_message_get_method(message);
    const bool head = std::strcmp(method, "HEAD") == 0;
    if (!head && std::strcmp(method, "GET") != 0) {
        soup_server_message_set_status(message, SOUP_STATUS_METHOD_NOT_ALLOWED, nullptr);
        return;
    }
    ServedFile file;
    io::FileDescriptor fd = Open(path, &file);
    struct stat st {};
    if (!fd || fstat(fd.Get(), &st) != 0) {
        soup_server_message_set_status(message, SOUP_STATUS_NOT_FOUND, nullptr);
        return;
    }
    SoupMessageHeaders* request = soup_server_message_get_request_headers(message);
    SoupMessageHeaders* response = soup_server_message_get_response_headers(message);
    const ByteRange range =
        ParseByteRange(soup_message_headers_get_one(request, "Range"), st.st_size);
    if (file.image) {
        SetImageHeaders(response, file);
        const std::string tag = ImageEntityTag(st);
        soup_message_headers_replace(response, "ETag", tag.c_str());
        const std::string modified = HttpDate(st.st_mtime);
        if (!modified.empty())
            soup_message_headers_replace(response, "Last-Modified", modified.c_str());
        if (ClientHoldsImage(request, tag, st.st_mtime)) {
            soup_server_message_set_status(message, SOUP_STATUS_NOT_MODIFIED, nullptr);
            return;
        }
    } else {
        SetAudioHeaders(response, file);
    }
    if (range.kind == ByteRange::Kind::unsatisfiable) {
        const std::string contentRange = "bytes */" + std::to_string(st.st_size);
        soup_message_headers_replace(response, "Content-Range", contentRange.c_str());
        soup_server_message_set_status(message, SOUP_STATUS_REQUESTED_RANGE_NOT_SATISFIABLE,
                                       nullptr);
        return;
    }
    auto* transfer = new Transfer;
    transfer->fd = std::move(fd);
    transfer->next = range.first;
    transfer->end = st.st_size == 0 ? 0 : range.last + 1;
    if (range.kind == ByteRange::Kind::part) {
        soup_message_headers_set_content_range(response, range.first, range.last, st.st_size);
        soup_server_message_set_status(message, SOUP_STATUS_PARTIAL_CONTENT, nullptr);
    } else {
        soup_server_message_set_status(message, SOUP_STATUS_OK, nullptr);
    }
    soup_message_headers_set_encoding(response, SOUP_ENCODING_CONTENT_LENGTH);
    soup_message_headers_set_content_length(response, transfer->end - transfer->next);
    SoupMessageBody* body = soup_server_message_get_response_body(message);
    if (head) {
        FreeTransfer(transfer, nullptr);
        soup_message_body_complete(body);
        return;
    }
    soup_message_body_set_accumulate(body, FALSE);
    g_signal_connect_data(message, "wrote-chunk", G_CALLBACK(&OnWroteChunk), transfer,
                          &FreeTransfer, GConnectFlags(0));
    AppendNextChunk(message, transfer);
}

}  // namespace harmona::mediad
