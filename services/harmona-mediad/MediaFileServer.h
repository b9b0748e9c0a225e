// The library's audio files over HTTP on a GUPnP context: GET and HEAD of
// "/media/<track id>.<extension>", one byte range at most ("Range: bytes=a-b"), the DLNA
// headers players look for, and the file streamed in chunks so that a large file never sits in
// memory whole. The request names a track id only; the file is the one the index has for it,
// opened beneath the share (ShareFile.h).
#pragma once

#include <libgupnp/gupnp.h>
#include <libsoup/soup.h>

#include <string>

#include "ContentDirectory.h"

namespace harmona::mediad {

inline constexpr const char* kMediaPath = "/media";

// The DLNA fourth field for a file that allows byte seeking and nothing else.
inline constexpr const char* kDlnaByteSeekFeatures =
    "DLNA.ORG_OP=01;DLNA.ORG_CI=0;DLNA.ORG_FLAGS=01700000000000000000000000000000";

// One byte range of a file of `size` bytes; parsed from a Range header.
struct ByteRange {
    enum class Kind { Whole, Part, Unsatisfiable } kind = Kind::Whole;
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
    int OpenTrack(const std::string& urlPath, std::string* file) const;

    GUPnPContext* context_;
    const ContentDirectory& directory_;
    std::string sharePath_;
};

}  // namespace harmona::mediad
