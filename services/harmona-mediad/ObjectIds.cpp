#include "services/harmona-mediad/ObjectIds.h"

#include <cstdlib>

#include "common/util/Number.h"

namespace harmona::mediad {
namespace {

constexpr const char* kCategories[] = {kAllMusicId, kFoldersId, kAlbumsId,      kAlbumArtistsId,
                                       kGenresId,   kRandomId,  kLatestAlbumsId};

bool StartsWith(const std::string& text, const char* prefix, std::string* rest) {
    const std::string p(prefix);
    if (text.compare(0, p.size(), p) != 0)
        return false;
    *rest = text.substr(p.size());
    return true;
}

// A relative folder path: non-empty parts, none "." or "..".
bool ParseFolder(const std::string& escaped, std::string* folder) {
    folder->clear();
    std::size_t start = 0;
    while (start <= escaped.size()) {
        std::size_t end = escaped.find('/', start);
        if (end == std::string::npos)
            end = escaped.size();
        std::string part;
        if (!UnescapeIdPart(escaped.substr(start, end - start), &part) || part.empty() ||
            part == "." || part == ".." || part.find('/') != std::string::npos)
            return false;
        if (!folder->empty())
            *folder += '/';
        *folder += part;
        start = end + 1;
    }
    return !folder->empty();
}

}  // namespace

std::string FolderId(const std::string& relativePath) {
    std::string id = "folder:";
    std::size_t start = 0;
    while (start <= relativePath.size()) {
        std::size_t end = relativePath.find('/', start);
        if (end == std::string::npos)
            end = relativePath.size();
        if (start > 0)
            id += '/';
        id += EscapeIdPart(relativePath.substr(start, end - start));
        start = end + 1;
    }
    return id;
}

std::string AlbumId(const std::string& albumArtist, const std::string& album) {
    return "album:" + EscapeIdPart(albumArtist) + "/" + EscapeIdPart(album);
}

std::string ArtistId(const std::string& albumArtist) {
    return "artist:" + EscapeIdPart(albumArtist);
}

std::string GenreId(const std::string& genre) {
    return "genre:" + EscapeIdPart(genre);
}

std::string LatestAlbumId(const std::string& albumArtist, const std::string& album) {
    return "latest:" + EscapeIdPart(albumArtist) + "/" + EscapeIdPart(album);
}

std::string ArtistAlbumId(const std::string& albumArtist, const std::string& album) {
    return ArtistId(albumArtist) + "/" + EscapeIdPart(album);
}

std::string TrackId(int64_t id) {
    return "track:" + std::to_string(id);
}

std::string TrackIdIn(const std::string& containerId, int64_t trackId) {
    if (containerId == kAllMusicId)
        return TrackId(trackId);
    return containerId + "/" + TrackId(trackId);
}

namespace {

// "AA/NAME" of an album id: both parts unescaped, the name not empty.
bool ParseAlbumParts(const std::string& rest, ObjectRef* ref) {
    const std::size_t slash = rest.find('/');
    return slash != std::string::npos && UnescapeIdPart(rest.substr(0, slash), &ref->albumArtist) &&
           UnescapeIdPart(rest.substr(slash + 1), &ref->name) && !ref->name.empty();
}

ObjectRef ParseContainerOrTrackId(const std::string& id);

// "<container id>/track:N", the container being one that lists tracks.
bool ParseTrackIn(const std::string& id, ObjectRef* ref) {
    const std::size_t at = id.rfind("/track:");
    if (at == std::string::npos || !util::ParseDecimalDigits(id.substr(at + 7), ref->trackId))
        return false;
    ref->container = id.substr(0, at);
    const ObjectRef listing = ParseContainerOrTrackId(ref->container);
    switch (listing.kind) {
        case ObjectKind::category:
            return ref->container != kAllMusicId;
        case ObjectKind::folder:
        case ObjectKind::album:
        case ObjectKind::genre:
            return true;
        default:
            return false;
    }
}

}  // namespace

ObjectRef ParseObjectId(const std::string& id) {
    ObjectRef ref;
    if (ParseTrackIn(id, &ref)) {
        ref.kind = ObjectKind::trackIn;
        return ref;
    }
    return ParseContainerOrTrackId(id);
}

namespace {

ObjectRef ParseContainerOrTrackId(const std::string& id) {
    ObjectRef ref;
    std::string rest;
    if (id == kRootId) {
        ref.kind = ObjectKind::root;
        return ref;
    }
    for (const char* category : kCategories) {
        if (id == category) {
            ref.kind = ObjectKind::category;
            ref.category = id;
            return ref;
        }
    }
    if (StartsWith(id, "folder:", &rest)) {
        if (ParseFolder(rest, &ref.folder))
            ref.kind = ObjectKind::folder;
    } else if (StartsWith(id, "album:", &rest)) {
        if (ParseAlbumParts(rest, &ref))
            ref.kind = ObjectKind::album;
    } else if (StartsWith(id, "latest:", &rest)) {
        if (ParseAlbumParts(rest, &ref)) {
            ref.kind = ObjectKind::album;
            ref.albumView = AlbumView::latest;
        }
    } else if (StartsWith(id, "artist:", &rest)) {
        if (rest.find('/') != std::string::npos) {
            if (ParseAlbumParts(rest, &ref) && !ref.albumArtist.empty()) {
                ref.kind = ObjectKind::album;
                ref.albumView = AlbumView::artist;
            }
        } else if (UnescapeIdPart(rest, &ref.albumArtist) && !ref.albumArtist.empty())
            ref.kind = ObjectKind::artist;
    } else if (StartsWith(id, "genre:", &rest)) {
        if (UnescapeIdPart(rest, &ref.name) && !ref.name.empty())
            ref.kind = ObjectKind::genre;
    } else if (StartsWith(id, "track:", &rest)) {
        if (util::ParseDecimalDigits(rest, ref.trackId))
            ref.kind = ObjectKind::track;
    }
    return ref;
}

}  // namespace

}  // namespace harmona::mediad
