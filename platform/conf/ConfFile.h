// The "conf" line syntax shared by users.conf, audio.conf, the UI text tables and the smart
// playlist files (platform/README.md, "Conf files"). The reader streams the file line by line with
// bounded buffers, so a huge or binary file costs bounded memory and time.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace harmona::conf {

// Receives the file's meaningful lines in file order.
class ConfVisitor {
  public:
    virtual ~ConfVisitor() = default;
    // A `[name]` line; the name is what stands between the first `[` and the last `]`.
    virtual void Section(std::string_view name) {}
    // A `key=value` line, key and value trimmed and the value's enclosing double quotes removed.
    virtual void Entry(std::string_view key, std::string_view value) {}
};

enum class ReadResult {
    ok,          // the file was read
    missing,     // no such file (or a path component is missing)
    unreadable,  // it exists but could not be opened or read (a directory, a FIFO, no permission)
};

// Only this much of a file is read; the rest is ignored. Conf files are small; this bound keeps a
// planted 100 MiB file from costing a request more than a few milliseconds.
constexpr std::size_t kMaxConfBytes = 8u << 20;
// A line longer than this is passed over whole (it cannot be a sensible conf line).
constexpr std::size_t kMaxLineBytes = 64u << 10;

// Feeds every line of `text` to the visitor (a leading UTF-8 byte order mark is skipped).
void ParseConf(std::string_view text, ConfVisitor& visitor);

// Reads the file at `path` and feeds it to the visitor. Only regular files are read; the file is
// opened without blocking, so a FIFO planted at `path` cannot hang the caller.
ReadResult ReadConf(const char* path, ConfVisitor& visitor);

// The value of `key` in `section` (nullopt section: keys before the first section), the last
// occurrence counting; nullopt when the file, section or key is missing or the file is unreadable.
std::optional<std::string> LookupConf(const char* path, std::optional<std::string_view> section,
                                      std::string_view key, ReadResult* result = nullptr);

}  // namespace harmona::conf
