// Keeps library.db in step with the audio share while the media server runs: inotify watches on
// every folder of the share (new folders watched as they appear), a short quiet period after the
// last change, then the indexer's incremental pass (the same code as harmona-index, called in
// process), which reads the tags of new and changed files only and moves the library's update
// count, so that ContentDirectory's SystemUpdateID follows. When the kernel's event queue
// overflows, or the watch limit is reached, nothing is lost: the pass walks the whole share
// anyway, and without complete watches it also runs periodically.
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <mutex>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "common/io/FileDescriptor.h"
#include "services/harmona-index/Indexer.h"

namespace harmona::mediad {

struct LiveLibraryOptions {
    std::string sharePath;  // no trailing "/"
    std::string dbPath;
    // A pass runs once the share was quiet this long after a change...
    std::chrono::milliseconds quietPeriod{1000};
    // ...or this long after the first change it has not indexed yet, however busy the share.
    std::chrono::milliseconds maxDelay{10000};
    // At most this many folders are watched (the kernel's own limit may be lower: both are
    // logged when reached).
    std::size_t maxWatches = 100000;
    // Without a watch on every folder, the share is also indexed this often.
    std::chrono::milliseconds unwatchedRescan{std::chrono::minutes(10)};
    // Called on the live library's thread after every pass (changed or not).
    std::function<void(const index::IndexReport&)> onIndexed;
};

// The folder of each inotify watch, compact: a share of 20,000 folders takes about 30 bytes a
// folder (its path within the share in one block of text, a sorted array of watch descriptors)
// where a hash map of strings took about 120. Watch descriptors grow as watches are added, so an
// addition is an append; a removal marks its entry, and the table is rebuilt once as much is
// unused as used.
class FolderWatches {
  public:
    // Watch `wd` is of `folder` (a watch set again on a folder replaces its folder).
    void Set(int wd, std::string_view folder);
    // False when `wd` is not in the table.
    bool Find(int wd, std::string* folder) const;
    void Erase(int wd);
    void Clear();
    std::size_t size() const { return live_; }
    // Bytes of the text block and the array as allocated: what the table holds.
    std::size_t heldBytes() const { return text_.capacity() + entries_.capacity() * sizeof(Entry); }

  private:
    struct Entry {
        int wd;
        uint32_t offset, size;  // into text_; offset kErased: removed
    };
    static constexpr uint32_t kErased = 0xffffffffU;
    std::vector<Entry>::iterator Lookup(int wd);
    void Compact();
    std::vector<Entry> entries_;  // by wd
    std::string text_;
    std::size_t live_ = 0, liveText_ = 0;
};

class LiveLibrary {
  public:
    explicit LiveLibrary(LiveLibraryOptions options);
    ~LiveLibrary();
    LiveLibrary(const LiveLibrary&) = delete;
    LiveLibrary& operator=(const LiveLibrary&) = delete;

    // Starts the thread, which watches the share and runs a first pass at once (changes made
    // while the server was not running). False, with `error` set, when inotify is unavailable.
    bool Start(std::string& error);
    // Ends the thread: a running pass stops at its next batch, nothing half written.
    void Stop();

    std::size_t passes() const { return passes_.load(); }
    std::size_t watchedFolders() const;

  private:
    void Run();
    bool WaitForEvents(std::chrono::steady_clock::time_point now);
    void ReadEvents();
    void WatchTree(const std::string& path, int depth);
    void WatchAll();
    void IndexNow();

    LiveLibraryOptions options_;
    io::FileDescriptor inotifyFd_;
    io::FileDescriptor wakeFd_;
    std::thread thread_;
    std::atomic<bool> stopping_{false};
    std::atomic<std::size_t> passes_{0};
    mutable std::mutex watchesMutex_;
    FolderWatches watches_;  // the share's folders below sharePath ("" for the share itself)
    bool watchLimitLogged_ = false;
    bool watchesComplete_ = true;
    bool pending_ = false;
    std::chrono::steady_clock::time_point firstChange_, lastChange_, lastPass_;
};

}  // namespace harmona::mediad
