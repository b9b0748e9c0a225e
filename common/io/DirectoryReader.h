// Move-only owner of an open directory stream (DIR*): closed, with its descriptor, when the owner
// leaves scope. Made from a descriptor, so that the caller chooses how the folder is opened
// (O_NOFOLLOW, openat below a parent).
#pragma once

#include <dirent.h>

#include <cerrno>

#include "common/io/FileDescriptor.h"

namespace harmona::io {

class DirectoryReader {
  public:
    DirectoryReader() = default;
    // Takes over the descriptor of an open folder; an empty reader (the descriptor closed) when
    // it is empty or names no folder.
    explicit DirectoryReader(FileDescriptor folder)
        : dir_(folder ? fdopendir(folder.Get()) : nullptr) {
        if (dir_ != nullptr)
            folder.Release();  // the stream owns it now
    }
    ~DirectoryReader() { Reset(); }
    DirectoryReader(DirectoryReader&& other) noexcept : dir_(other.dir_) { other.dir_ = nullptr; }
    DirectoryReader& operator=(DirectoryReader&& other) noexcept {
        if (this != &other) {
            Reset();
            dir_ = other.dir_;
            other.dir_ = nullptr;
        }
        return *this;
    }
    DirectoryReader(const DirectoryReader&) = delete;
    DirectoryReader& operator=(const DirectoryReader&) = delete;

    explicit operator bool() const { return dir_ != nullptr; }

    // The next entry ("." and ".." included), or nullptr at the end and on a read error; errno,
    // set to 0 before each read, tells the two apart.
    const dirent* Next() {
        errno = 0;
        return readdir(dir_);
    }

    // The folder's descriptor, for the *at() calls on its entries; owned by the reader.
    int Fd() const { return dirfd(dir_); }

    void Reset() {
        if (dir_ != nullptr)
            closedir(dir_);
        dir_ = nullptr;
    }

  private:
    DIR* dir_ = nullptr;
};

}  // namespace harmona::io
