#include "platform/playlist/PlaylistWrite.h"

#include <fcntl.h>
#include <stdio.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "common/io/ReplaceFile.h"
#include "common/util/Trim.h"
#include "common/util/Utf8.h"
#include "platform/conf/ConfFile.h"

namespace harmona::playlist {
namespace {

bool IsBlank(char c) {
    return c == ' ' || c == '\t' || c == '\r' || c == '\n' || c == '\v' || c == '\f';
}

// Temporary files begin so: no playlist file can have such a name (it does not end in ".m3u" or
// ".m3u8") and the conf reader never reads it.
constexpr char kTemporaryPrefix[] = ".tmp-playlist-";

// The whole file `name` in `dirFd` (a regular file, not through a link), at most `maxBytes`.
enum class ReadWhole { ok, missing, tooLarge, failed };
ReadWhole ReadFileAt(int dirFd, const std::string& name, std::size_t maxBytes, std::string& text) {
    io::FileDescriptor fd(
        openat(dirFd, name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC | O_NOCTTY));
    if (!fd)
        return errno == ENOENT ? ReadWhole::missing : ReadWhole::failed;
    struct stat st {};
    if (fstat(fd.Get(), &st) != 0 || !S_ISREG(st.st_mode))
        return ReadWhole::failed;
    if (static_cast<std::size_t>(st.st_size) > maxBytes)
        return ReadWhole::tooLarge;
    char buffer[16384];
    for (;;) {
        const ssize_t n = read(fd.Get(), buffer, sizeof buffer);
        if (n < 0 && errno == EINTR)
            continue;
        if (n < 0)
            return ReadWhole::failed;
        if (n == 0)
            return ReadWhole::ok;
        text.append(buffer, static_cast<std::size_t>(n));
        if (text.size() > maxBytes)
            return ReadWhole::tooLarge;
    }
}

// One line of a conf file as its bytes (line end included) and, when it opens a section, the
// section's name as the conf reader takes it.
struct RawLine {
    std::string_view bytes;
    std::optional<std::string_view> section;
};

std::vector<RawLine> SplitLines(std::string_view text) {
    std::vector<RawLine> lines;
    std::size_t start = 0;
    bool first = true;
    while (start < text.size()) {
        const std::size_t nl = text.find('\n', start);
        const std::size_t end = nl == std::string_view::npos ? text.size() : nl + 1;
        RawLine line{text.substr(start, end - start), std::nullopt};
        std::string_view content = line.bytes;
        if (first && content.substr(0, 3) == "\xEF\xBB\xBF")
            content.remove_prefix(3);
        first = false;
        if (content.size() <= conf::kMaxLineBytes) {
            const std::string_view trimmed = util::Trim(content, util::kAsciiWhiteSpace);
            const std::size_t close = trimmed.rfind(']');
            if (!trimmed.empty() && trimmed.front() == '[' && close != std::string_view::npos &&
                close > 0)
                line.section = trimmed.substr(1, close - 1);
        }
        lines.push_back(line);
        start = end;
    }
    return lines;
}

// A value as the conf reader gives it back: one that it would trim or unquote is quoted.
std::string ConfValue(const std::string& value) {
    if (value.size() >= 2 && value.front() == '"' && value.back() == '"')
        return '"' + value + '"';
    return value;
}

std::string SectionText(std::string_view name, const SmartRules& rules) {
    std::string text = "[" + std::string(name) + "]\n";
    for (const auto& [key, value] : SmartRulePairs(rules))
        text += key + "=" + ConfValue(value) + "\n";
    return text;
}

}  // namespace

bool IsValidPlaylistName(std::string_view name) {
    if (name.empty() || name.size() > kMaxPlaylistNameBytes || name == "." || name == "..")
        return false;
    if (IsBlank(name.front()) || IsBlank(name.back()) || !util::IsValidUtf8(name))
        return false;
    return std::none_of(name.begin(), name.end(), [](char c) {
        const auto byte = static_cast<unsigned char>(c);
        return byte < 0x20 || byte == 0x7f || c == '/' || c == '[' || c == ']';
    });
}

io::FileDescriptor LockFolder(const std::string& path, bool create) {
    if (create)
        mkdir(path.c_str(), 0755);  // an existing one is fine; the open below decides
    io::FileDescriptor dir(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!dir)
        return dir;
    while (flock(dir.Get(), LOCK_EX) != 0) {
        if (errno != EINTR)
            return io::FileDescriptor();
    }
    return dir;
}

WriteOutcome WriteFileAt(int dirFd, const std::string& name, std::string_view text,
                         bool mustBeNew) {
    mode_t mode = 0644;
    struct stat old {};
    if (fstatat(dirFd, name.c_str(), &old, AT_SYMLINK_NOFOLLOW) == 0) {
        if (mustBeNew)
            return WriteOutcome::exists;
        if (S_ISREG(old.st_mode))
            mode = old.st_mode & 0777;
    }
    switch (io::ReplaceFileAt(dirFd, name.c_str(), text, kTemporaryPrefix, {mode, mustBeNew})) {
        case io::ReplaceOutcome::ok:
            return WriteOutcome::ok;
        case io::ReplaceOutcome::exists:
            return WriteOutcome::exists;
        case io::ReplaceOutcome::failed:
            break;
    }
    return WriteOutcome::failed;
}

SmartChange ChangeSmartSection(int dirFd, const std::string& file,
                               std::optional<std::string_view> oldName, std::string_view newName,
                               const SmartRules* rules) {
    std::string text;
    const ReadWhole read = ReadFileAt(dirFd, file, conf::kMaxConfBytes, text);
    if (read == ReadWhole::tooLarge)
        return SmartChange::tooLarge;
    if (read == ReadWhole::failed)
        return SmartChange::failed;
    if (read == ReadWhole::missing && oldName)
        return SmartChange::missing;

    const std::vector<RawLine> lines = SplitLines(text);
    std::string result;
    result.reserve(text.size() + 512);
    bool inOld = false;
    bool placed = false;
    bool foundOld = false;
    for (const RawLine& line : lines) {
        if (line.section) {
            inOld = oldName && *line.section == *oldName;
            if (!inOld && rules != nullptr && *line.section == newName)
                return SmartChange::exists;
            if (inOld) {
                foundOld = true;
                if (!placed && rules != nullptr) {
                    result += SectionText(newName, *rules);
                    placed = true;
                }
                continue;
            }
        }
        if (inOld)
            continue;
        result.append(line.bytes);
    }
    if (oldName && !foundOld)
        return SmartChange::missing;
    if (rules != nullptr && !placed) {
        if (!result.empty() && result.back() != '\n')
            result += '\n';
        result += SectionText(newName, *rules);
    }
    if (result.size() > conf::kMaxConfBytes)
        return SmartChange::tooLarge;
    return WriteFileAt(dirFd, file, result, false) == WriteOutcome::ok ? SmartChange::ok
                                                                       : SmartChange::failed;
}

}  // namespace harmona::playlist
