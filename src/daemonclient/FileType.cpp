// The audio file type test: whether a path names an audio file that the player takes, by its
// extension.
#include <strings.h>

#include <cstring>
#include <iterator>

#include "platform/medialib/MediaFiles.h"
#include "src/daemonclient/AudioDaemon.h"

namespace {

// The accepted extensions of the portable and lossless selectors, compared ignoring case.
constexpr const char* kPortableList[] = {"mp3", "m4a", "m4b"};
constexpr const char* kLosslessList[] = {"aac", "aif", "aiff", "ape", "flac", "m4a",
                                         "m4b", "mp3", "ogg",  "wav", "wma"};

template <size_t N>
bool InList(const char* const (&list)[N], const char* extension) {
    for (const char* entry : list) {
        if (strcasecmp(entry, extension) == 0)
            return true;
    }
    return false;
}

}  // namespace

int IsSupportedAudioFile(int selector, const char* path) {
    if (selector == 0)
        return 1;
    if (path == nullptr)
        return 0;
    // Streams are always accepted; the prefix is compared case-sensitively.
    if (std::strncmp(path, "http", 4) == 0)
        return 1;
    // The last "." of the whole path, so a dot in a folder name takes the rest as extension.
    const char* dot = std::strrchr(path, '.');
    if (dot == nullptr)
        return 0;
    const char* extension = dot + 1;
    switch (selector) {
        case 2:
            return InList(kPortableList, extension) ? 1 : 0;
        case 3:
            return InList(kLosslessList, extension) ? 1 : 0;
        default:  // every audio file type, the list the indexer and the media server use too
            return harmona::medialib::IsAudioExtension(extension) ? 1 : 0;
    }
}
