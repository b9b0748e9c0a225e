// Opening a file of the audio share for serving, whatever library.db says about it: only a
// regular file strictly beneath the share's directory, reached without any symbolic link on the
// way (a user who can write the share must not be able to swap a folder for a link to /etc).
#pragma once

#include <string>

#include "common/io/FileDescriptor.h"

namespace harmona::mediad {

// `relative` is the path below the share ("Jazz/Blue/04 Fourth.wav"). openat2 with
// RESOLVE_BENEATH | RESOLVE_NO_SYMLINKS from the share's directory; where the kernel has no
// openat2, a walk that opens every component with O_NOFOLLOW. Returns a read-only descriptor of
// a regular file, or an empty owner (errno set) for anything else: a link, a FIFO, a device,
// "..", absent.
io::FileDescriptor OpenBeneathShare(const std::string& sharePath, const std::string& relative);

// The same from an open directory descriptor (tests call it with the fallback forced).
io::FileDescriptor OpenBeneath(int directoryFd, const std::string& relative,
                               bool allowOpenat2 = true);

// `path` relative to `sharePath` when it lies beneath it ("" otherwise).
std::string PathBelowShare(const std::string& sharePath, const std::string& path);

}  // namespace harmona::mediad
