#include "platform/conf/ConfFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <string>

#include "common/io/FileDescriptor.h"
#include "common/util/Trim.h"

namespace harmona::conf {
namespace {

constexpr std::string_view kUtf8Bom = "\xEF\xBB\xBF";

void ParseLine(std::string_view line, ConfVisitor& visitor) {
    const std::string_view trimmed = util::Trim(line, util::kAsciiWhiteSpace);
    if (trimmed.empty() || trimmed.front() == '#' || trimmed.front() == ';')
        return;

    if (trimmed.front() == '[') {
        const std::size_t close = trimmed.rfind(']');
        if (close != std::string_view::npos && close > 0) {
            visitor.Section(trimmed.substr(1, close - 1));
            return;
        }
    }

    const std::size_t eq = trimmed.find('=');
    if (eq == std::string_view::npos)
        return;  // any other line is ignored
    const std::string_view key = util::Trim(trimmed.substr(0, eq), util::kAsciiWhiteSpace);
    std::string_view value = util::Trim(trimmed.substr(eq + 1), util::kAsciiWhiteSpace);
    if (key.empty())
        return;
    if (value.size() >= 2 && value.front() == '"' && value.back() == '"')
        value = value.substr(1, value.size() - 2);
    visitor.Entry(key, value);
}

// Splits a byte stream into lines; lines over kMaxLineBytes are dropped whole.
class LineSplitter {
  public:
    explicit LineSplitter(ConfVisitor& visitor) : visitor_(visitor) {}

    void Feed(std::string_view chunk) {
        while (!chunk.empty()) {
            const std::size_t nl = chunk.find('\n');
            Append(chunk.substr(0, nl));
            if (nl == std::string_view::npos)
                return;
            EndLine();
            chunk.remove_prefix(nl + 1);
        }
    }

    // A file may end without a newline: the pending bytes are its last line.
    void Finish() { EndLine(); }

  private:
    void Append(std::string_view piece) {
        if (tooLong_)
            return;
        if (line_.size() + piece.size() > kMaxLineBytes) {
            tooLong_ = true;
            line_.clear();
            return;
        }
        line_.append(piece);
    }

    void EndLine() {
        if (!tooLong_)
            ParseLine(line_, visitor_);
        line_.clear();
        tooLong_ = false;
    }

    ConfVisitor& visitor_;
    std::string line_;
    bool tooLong_ = false;
};

std::string_view SkipBom(std::string_view text) {
    if (text.substr(0, kUtf8Bom.size()) == kUtf8Bom)
        text.remove_prefix(kUtf8Bom.size());
    return text;
}

class LookupVisitor : public ConfVisitor {
  public:
    LookupVisitor(std::optional<std::string_view> section, std::string_view key)
        : wantedSection_(section), key_(key), inWanted_(!section.has_value()) {}

    void Section(std::string_view name) override {
        inWanted_ = wantedSection_.has_value() && name == *wantedSection_;
    }
    void Entry(std::string_view key, std::string_view value) override {
        if (inWanted_ && key == key_)
            value_ = std::string(value);
    }
    std::optional<std::string> value_;

  private:
    std::optional<std::string_view> wantedSection_;
    std::string_view key_;
    bool inWanted_;
};

}  // namespace

void ParseConf(std::string_view text, ConfVisitor& visitor) {
    LineSplitter splitter(visitor);
    splitter.Feed(SkipBom(text));
    splitter.Finish();
}

ReadResult ReadConf(const char* path, ConfVisitor& visitor) {
    if (path == nullptr)
        return ReadResult::missing;
    harmona::io::FileDescriptor fd(open(path, O_RDONLY | O_NONBLOCK | O_CLOEXEC | O_NOCTTY));
    if (fd.Get() < 0)
        return (errno == ENOENT || errno == ENOTDIR) ? ReadResult::missing : ReadResult::unreadable;
    struct stat st {};
    if (fstat(fd.Get(), &st) != 0 || !S_ISREG(st.st_mode))
        return ReadResult::unreadable;

    LineSplitter splitter(visitor);
    char buffer[16384];
    std::size_t total = 0;
    while (total < kMaxConfBytes) {
        const std::size_t want = std::min(sizeof(buffer), kMaxConfBytes - total);
        const ssize_t n = read(fd.Get(), buffer, want);
        if (n < 0) {
            if (errno == EINTR)
                continue;
            return ReadResult::unreadable;
        }
        if (n == 0)
            break;
        std::string_view chunk(buffer, static_cast<std::size_t>(n));
        // Reads of a regular file return whole chunks, so a BOM is never split across two.
        if (total == 0)
            chunk = SkipBom(chunk);
        total += static_cast<std::size_t>(n);
        splitter.Feed(chunk);
    }
    splitter.Finish();
    return ReadResult::ok;
}

std::optional<std::string> LookupConf(const char* path, std::optional<std::string_view> section,
                                      std::string_view key, ReadResult* result) {
    LookupVisitor visitor(section, key);
    const ReadResult r = ReadConf(path, visitor);
    if (result != nullptr)
        *result = r;
    if (r != ReadResult::ok)
        return std::nullopt;
    return visitor.value_;
}

}  // namespace harmona::conf
