// The audio share and the audio file types, as the indexer and the media server see them.
#pragma once

#include <string>

namespace harmona::medialib {

// The audio share: audio_share_path of audio.conf, else /volume1/music;
// without a trailing "/".
std::string AudioSharePath();

// Whether the indexer takes the file: the CGI's IsSupportedAudioFile with selector 1.
bool IsIndexableAudioFile(const std::string& path);

// The MIME type served for a file, by its extension (any letter case);
// "application/octet-stream" for an unknown one.
const char* MimeTypeOfPath(const std::string& path);

// The extension of the path's file name in lower case, without the dot; "" when none.
std::string LowerExtension(const std::string& path);

}  // namespace harmona::medialib
