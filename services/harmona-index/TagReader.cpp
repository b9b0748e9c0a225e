#include "services/harmona-index/TagReader.h"

#include <taglib/fileref.h>
#include <taglib/tag.h>
#include <taglib/tpropertymap.h>

#include <cstdlib>

#include "common/util/Utf8.h"

namespace harmona::index {
namespace {

std::string Utf8(const TagLib::String& text) {
    return std::string(util::CutUtf8(text.to8Bit(true), kMaxTagBytes));
}

std::string FirstProperty(const TagLib::PropertyMap& properties, const char* key) {
    const auto found = properties.find(key);
    if (found == properties.end() || found->second.isEmpty())
        return {};
    return Utf8(found->second.front());
}

// "2/3" -> 2; anything unreadable -> 0.
int64_t LeadingNumber(const std::string& text) {
    const long value = std::strtol(text.c_str(), nullptr, 10);
    return value > 0 ? value : 0;
}

}  // namespace

std::string TitleFromFileName(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    std::string name = slash == std::string::npos ? path : path.substr(slash + 1);
    const std::size_t dot = name.rfind('.');
    if (dot != std::string::npos && dot > 0)
        name.erase(dot);
    return std::string(util::CutUtf8(name, kMaxTagBytes));
}

TrackTags ReadTrackTags(const std::string& path) {
    TrackTags tags;
    TagLib::FileRef file(path.c_str(), true, TagLib::AudioProperties::Fast);
    if (file.isNull() || file.tag() == nullptr) {
        tags.broken = true;
        tags.title = TitleFromFileName(path);
        return tags;
    }
    const TagLib::Tag* tag = file.tag();
    tags.title = Utf8(tag->title());
    tags.artist = Utf8(tag->artist());
    tags.album = Utf8(tag->album());
    tags.genre = Utf8(tag->genre());
    tags.year = tag->year();
    tags.trackNo = tag->track();
    const TagLib::PropertyMap properties = file.file()->properties();
    tags.albumArtist = FirstProperty(properties, "ALBUMARTIST");
    tags.discNo = LeadingNumber(FirstProperty(properties, "DISCNUMBER"));
    if (file.audioProperties() != nullptr)
        tags.durationMs = file.audioProperties()->lengthInMilliseconds();
    if (tags.title.empty())
        tags.title = TitleFromFileName(path);
    return tags;
}

}  // namespace harmona::index
