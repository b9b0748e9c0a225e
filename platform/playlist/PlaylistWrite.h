// Writing of playlists (platform/README.md, "Writing playlists"): the check of a playlist's name,
// a folder locked for one change at a time, files replaced atomically (a new file written, synced
// and renamed over the old one, so a reader sees the old file or the new one, never half of one),
// and the change of one section of a smart playlist file that keeps every other byte of it.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "common/io/FileDescriptor.h"
#include "platform/playlist/SmartRules.h"

namespace harmona::playlist {

// A playlist name holds at most this many bytes (the record's name field).
inline constexpr std::size_t kMaxPlaylistNameBytes = 254;

// True when `name` may name a playlist or a smart playlist: 1 to kMaxPlaylistNameBytes bytes of
// valid UTF-8, no "/", no control character (below 0x20, 0x7f), no white space at either end,
// neither "." nor "..", and no "[" or "]" (a smart playlist file names its sections with them).
bool IsValidPlaylistName(std::string_view name);

// Opens the folder `path` (never through a symbolic link) and holds an exclusive lock on it until
// the owner is let go of: one change of the folder's playlists at a time. `create`: a missing
// folder is made first (mode 0755). Empty on failure.
io::FileDescriptor LockFolder(const std::string& path, bool create);

enum class WriteOutcome { ok, exists, failed };

// Writes `text` to a new file in the folder `dirFd`, syncs it and renames it to `name`: over an
// existing file, or, when `mustBeNew`, only when no entry of that name exists (`exists`). The
// folder is synced after the rename. The file gets mode 0644 (or the mode of the file it replaces).
WriteOutcome WriteFileAt(int dirFd, const std::string& name, std::string_view text, bool mustBeNew);

enum class SmartChange { ok, missing, exists, tooLarge, failed };

// Changes the smart playlist file `file` (a name in the folder `dirFd`, which the caller has
// locked): the section(s) named `oldName` (none: a new smart playlist) are replaced by one section
// `newName` holding `rules`, at the place of the first of them (a new one goes at the end); with
// `rules` null they are removed. Every other line keeps its bytes. `missing`: no section
// `oldName`; `exists`: another section is named `newName`; `tooLarge`: the file is larger than
// the conf reader reads.
SmartChange ChangeSmartSection(int dirFd, const std::string& file,
                               std::optional<std::string_view> oldName, std::string_view newName,
                               const SmartRules* rules);

}  // namespace harmona::playlist
