#include "services/harmona-index/TagReader.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <taglib/fileref.h>
#include <taglib/tag.h>
#include <taglib/tfilestream.h>
#include <taglib/tiostream.h>
#include <taglib/tpropertymap.h>
#include <unistd.h>

#include <cstdlib>

#include "common/io/FileDescriptor.h"
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

// An open descriptor as TagLib's stream, under the file's own name, so that TagLib picks the file
// type by the name's extension as it does for a path.
class NamedDescriptorStream : public TagLib::IOStream {
  public:
    NamedDescriptorStream(int fd, const std::string& path)
        : stream_(fd, true), name_(path.c_str()) {}
    TagLib::FileName name() const override { return name_.c_str(); }
    TagLib::ByteVector readBlock(unsigned long length) override {
        return stream_.readBlock(length);
    }
    void writeBlock(const TagLib::ByteVector&) override {}
    void insert(const TagLib::ByteVector&, unsigned long, unsigned long) override {}
    void removeBlock(unsigned long, unsigned long) override {}
    bool readOnly() const override { return true; }
    bool isOpen() const override { return stream_.isOpen(); }
    void seek(long offset, Position p) override { stream_.seek(offset, p); }
    void clear() override { stream_.clear(); }
    long tell() const override { return stream_.tell(); }
    long length() override { return stream_.length(); }
    void truncate(long) override {}

  private:
    TagLib::FileStream stream_;  // takes over the descriptor
    std::string name_;
};

TrackTags TagsOf(TagLib::FileRef& file, const std::string& path) {
    TrackTags tags;
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

}  // namespace

std::string TitleFromFileName(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    std::string name = slash == std::string::npos ? path : path.substr(slash + 1);
    const std::size_t dot = name.rfind('.');
    if (dot != std::string::npos && dot > 0)
        name.erase(dot);
    return std::string(util::CutUtf8(name, kMaxTagBytes));
}

TrackTags ReadTrackTagsOf(const std::string& path, const FileIdentity& seen, bool& swapped) {
    swapped = false;
    // O_NONBLOCK: a FIFO put in the file's place must not hold the open up.
    io::FileDescriptor fd(open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
    struct stat st {};
    if (!fd || fstat(fd.Get(), &st) != 0 || !S_ISREG(st.st_mode) || st.st_dev != seen.device ||
        st.st_ino != seen.inode) {
        swapped = bool(fd) || errno == ELOOP;
        TrackTags tags;
        tags.broken = true;
        tags.title = TitleFromFileName(path);
        return tags;
    }
    fcntl(fd.Get(), F_SETFL, fcntl(fd.Get(), F_GETFL) & ~O_NONBLOCK);
    NamedDescriptorStream stream(fd.Release(), path);
    TagLib::FileRef file(&stream, true, TagLib::AudioProperties::Fast);
    return TagsOf(file, path);
}

}  // namespace harmona::index
