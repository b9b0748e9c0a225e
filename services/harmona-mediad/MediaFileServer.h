// The library's audio files and cover art over HTTP on a GUPnP context: GET and HEAD of
// "/media/<track id>.<extension>" and "/media/art/<track id>.<jpg|png>", one byte range at most
// ("Range: bytes=a-b"), the DLNA headers players look for, and the file streamed in chunks so that
// a large file never sits in memory whole. The request names a track id only; the file is the one
// the index has for it, opened beneath the share (ShareFile.h).
#pragma once

#include <libgupnp/gupnp.h>
#include <libsoup/soup.h>

#include <string>

#include "common/io/FileDescriptor.h"
#include "services/harmona-mediad/ContentDirectory.h"

namespace harmona::mediad {

inline constexpr const char* kMediaPath = "/media";
// Below kMediaPath: the cover art the listing names in upnp:albumArtURI.
inline constexpr const char* kArtFolder = "art";

// What one request serves: the indexed file and the headers that go with it.
struct ServedFile {
    std::string path;  // as the index has it
    std::string mimeType;
    std::string contentFeatures;  // audio only
    bool image = false;
};

// One byte range of a file of `size` bytes; parsed from a Range header.
struct ByteRange {
    enum class Kind { whole, part, unsatisfiable } kind = Kind::whole;
    off_t first = 0;
    off_t last = 0;  // inclusive
};

// "bytes=a-b", "bytes=a-" or "bytes=-n". No header, another unit or a list of ranges: the whole
// file (a server may ignore a Range it does not support).
ByteRange ParseByteRange(const char* header, off_t size);

class MediaFileServer {
  public:
    // Serves on `context` until destroyed. `directory` and `sharePath` must outlive this object.
    MediaFileServer(GUPnPContext* context, const ContentDirectory& directory,
                    std::string sharePath);
    ~MediaFileServer();
    MediaFileServer(const MediaFileServer&) = delete;
    MediaFileServer& operator=(const MediaFileServer&) = delete;

  private:
    static void Handle(SoupServer* server, SoupServerMessage* message, const char* path,
                       GHashTable* query, gpointer self);
    void Serve(SoupServerMessage* message, const std::string& path) const;
    io::FileDescriptor Open(const std::string& urlPath, ServedFile* served) const;

    GUPnPContext* context_;
    const ContentDirectory& directory_;
    std::string sharePath_;
};

}  // namespace harmona::mediad
