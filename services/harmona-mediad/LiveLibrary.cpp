#include "services/harmona-mediad/LiveLibrary.h"

#include <dirent.h>
#include <fcntl.h>
#include <malloc.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "common/io/DirectoryReader.h"

namespace harmona::mediad {
namespace {

using Clock = std::chrono::steady_clock;

// The same depth limit and hidden names as the indexer's walk: what it never indexes needs no
// watch.
constexpr int kMaxFolderDepth = 64;
constexpr uint32_t kFolderEvents = IN_CLOSE_WRITE | IN_CREATE | IN_DELETE | IN_MOVED_FROM |
                                   IN_MOVED_TO | IN_ATTRIB | IN_DELETE_SELF | IN_MOVE_SELF |
                                   IN_ONLYDIR | IN_DONT_FOLLOW | IN_EXCL_UNLINK;
// Room for many events per read; each is at most sizeof(inotify_event) + NAME_MAX + 1.
constexpr std::size_t kEventBufferBytes = 64 * 1024;

bool IsSkippedName(const char* name) {
    return name[0] == '.' || name[0] == '@';
}

int MillisecondsUntil(Clock::time_point now, Clock::time_point when) {
    if (when <= now)
        return 0;
    const auto wait = std::chrono::duration_cast<std::chrono::milliseconds>(when - now).count();
    return static_cast<int>(std::min<long long>(wait + 1, 24LL * 3600 * 1000));
}

}  // namespace

std::vector<FolderWatches::Entry>::iterator FolderWatches::Lookup(int wd) {
    const auto found = std::lower_bound(entries_.begin(), entries_.end(), wd,
                                        [](const Entry& entry, int x) { return entry.wd < x; });
    return found != entries_.end() && found->wd == wd ? found : entries_.end();
}

void FolderWatches::Set(int wd, std::string_view folder) {
    auto found = Lookup(wd);
    if (found == entries_.end()) {
        const auto at = std::lower_bound(entries_.begin(), entries_.end(), wd,
                                         [](const Entry& entry, int x) { return entry.wd < x; });
        found = entries_.insert(at, Entry{wd, kErased, 0});
    }
    if (found->offset != kErased) {
        liveText_ -= found->size;
        --live_;
    }
    found->offset = static_cast<uint32_t>(text_.size());
    found->size = static_cast<uint32_t>(folder.size());
    text_ += folder;
    liveText_ += folder.size();
    ++live_;
}

bool FolderWatches::Find(int wd, std::string* folder) const {
    const auto found = const_cast<FolderWatches*>(this)->Lookup(wd);
    if (found == entries_.end() || found->offset == kErased)
        return false;
    folder->assign(text_, found->offset, found->size);
    return true;
}

void FolderWatches::Erase(int wd) {
    const auto found = Lookup(wd);
    if (found == entries_.end() || found->offset == kErased)
        return;
    liveText_ -= found->size;
    --live_;
    found->offset = kErased;
    if (entries_.size() - live_ > live_ || text_.size() - liveText_ > liveText_ + 4096)
        Compact();
}

void FolderWatches::Clear() {
    std::vector<Entry>().swap(entries_);
    std::string().swap(text_);
    live_ = liveText_ = 0;
}

void FolderWatches::Compact() {
    std::vector<Entry> entries;
    entries.reserve(live_);
    std::string text;
    text.reserve(liveText_);
    for (const Entry& entry : entries_) {
        if (entry.offset == kErased)
            continue;
        entries.push_back(Entry{entry.wd, static_cast<uint32_t>(text.size()), entry.size});
        text.append(text_, entry.offset, entry.size);
    }
    entries_.swap(entries);
    text_.swap(text);
}

LiveLibrary::LiveLibrary(LiveLibraryOptions options) : options_(std::move(options)) {}

LiveLibrary::~LiveLibrary() {
    Stop();
}

bool LiveLibrary::Start(std::string& error) {
    if (thread_.joinable())
        return true;
    inotifyFd_ = io::FileDescriptor(inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
    wakeFd_ = io::FileDescriptor(eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC));
    if (!inotifyFd_ || !wakeFd_) {
        error = std::string("cannot watch the share: ") + std::strerror(errno);
        Stop();
        return false;
    }
    stopping_ = false;
    thread_ = std::thread([this] { Run(); });
    return true;
}

void LiveLibrary::Stop() {
    stopping_ = true;
    if (wakeFd_) {
        const uint64_t one = 1;
        if (write(wakeFd_.Get(), &one, sizeof one) < 0) {
            // The counter is full: the thread is being woken already.
        }
    }
    if (thread_.joinable())
        thread_.join();
    inotifyFd_.Reset();
    wakeFd_.Reset();
    std::lock_guard<std::mutex> lock(watchesMutex_);
    watches_.Clear();
}

std::size_t LiveLibrary::watchedFolders() const {
    std::lock_guard<std::mutex> lock(watchesMutex_);
    return watches_.size();
}

void LiveLibrary::Run() {
    WatchAll();
    IndexNow();  // what changed while the server was not running
    while (!stopping_) {
        const Clock::time_point now = Clock::now();
        const bool due = pending_ && (now - lastChange_ >= options_.quietPeriod ||
                                      now - firstChange_ >= options_.maxDelay);
        const bool rescanDue = !watchesComplete_ && now - lastPass_ >= options_.unwatchedRescan;
        if (due || rescanDue) {
            IndexNow();
            continue;
        }
        if (!WaitForEvents(now))
            break;
    }
}

// Sleeps until an event, the stop request or the next deadline; false once stopping.
bool LiveLibrary::WaitForEvents(Clock::time_point now) {
    int timeout = -1;
    if (pending_)
        timeout = std::min(MillisecondsUntil(now, lastChange_ + options_.quietPeriod),
                           MillisecondsUntil(now, firstChange_ + options_.maxDelay));
    if (!watchesComplete_) {
        const int rescan = MillisecondsUntil(now, lastPass_ + options_.unwatchedRescan);
        timeout = timeout < 0 ? rescan : std::min(timeout, rescan);
    }
    pollfd fds[2] = {{inotifyFd_.Get(), POLLIN, 0}, {wakeFd_.Get(), POLLIN, 0}};
    const int ready = poll(fds, 2, timeout);
    if (stopping_)
        return false;
    if (ready < 0 && errno != EINTR) {
        syslog(LOG_ERR, "live library: poll failed: %s", std::strerror(errno));
        return false;
    }
    if (ready > 0 && (fds[0].revents & POLLIN) != 0)
        ReadEvents();
    return true;
}

void LiveLibrary::ReadEvents() {
    alignas(inotify_event) char buffer[kEventBufferBytes];
    bool changed = false;
    for (;;) {
        const ssize_t got = read(inotifyFd_.Get(), buffer, sizeof buffer);
        if (got <= 0)
            break;
        for (ssize_t at = 0; at < got;) {
            const auto* event = reinterpret_cast<const inotify_event*>(buffer + at);
            at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
            if ((event->mask & IN_Q_OVERFLOW) != 0) {
                // Events were lost: watch whatever folders are new; the pass walks everything.
                syslog(LOG_WARNING, "live library: event queue overflowed; rescanning %s",
                       options_.sharePath.c_str());
                WatchAll();
                changed = true;
                continue;
            }
            if ((event->mask & IN_IGNORED) != 0) {
                std::lock_guard<std::mutex> lock(watchesMutex_);
                watches_.Erase(event->wd);
                continue;
            }
            const char* name = event->len > 0 ? event->name : "";
            if (event->len > 0 && IsSkippedName(name))
                continue;
            changed = true;
            if ((event->mask & IN_ISDIR) != 0 && (event->mask & (IN_CREATE | IN_MOVED_TO)) != 0) {
                std::string relative;
                bool watched;
                {
                    std::lock_guard<std::mutex> lock(watchesMutex_);
                    watched = watches_.Find(event->wd, &relative);
                }
                if (watched) {
                    const std::string parent = options_.sharePath + relative;
                    const int depth =
                        static_cast<int>(std::count(relative.begin(), relative.end(), '/') + 1);
                    WatchTree(parent + "/" + name, depth);
                }
            }
        }
    }
    if (!changed)
        return;
    const Clock::time_point now = Clock::now();
    if (!pending_)
        firstChange_ = now;
    lastChange_ = now;
    pending_ = true;
}

void LiveLibrary::WatchAll() {
    WatchTree(options_.sharePath, 0);
}

// Watches `path` and every folder below it that the indexer would walk.
void LiveLibrary::WatchTree(const std::string& path, int depth) {
    if (stopping_ || depth > kMaxFolderDepth)
        return;
    {
        std::lock_guard<std::mutex> lock(watchesMutex_);
        if (watches_.size() >= options_.maxWatches) {
            watchesComplete_ = false;
            if (!watchLimitLogged_)
                syslog(LOG_WARNING,
                       "live library: watching %zu folders, the most allowed; changes in the "
                       "others are found by a rescan every %lld s",
                       watches_.size(),
                       static_cast<long long>(std::chrono::duration_cast<std::chrono::seconds>(
                                                  options_.unwatchedRescan)
                                                  .count()));
            watchLimitLogged_ = true;
            return;
        }
    }
    const int wd = inotify_add_watch(inotifyFd_.Get(), path.c_str(), kFolderEvents);
    if (wd < 0) {
        if (errno == ENOSPC) {
            watchesComplete_ = false;
            if (!watchLimitLogged_)
                syslog(LOG_WARNING,
                       "live library: the kernel's inotify watch limit is reached "
                       "(fs.inotify.max_user_watches) at %zu folders; changes in the others are "
                       "found by a periodic rescan",
                       watchedFolders());
            watchLimitLogged_ = true;
        }
        return;  // gone already, or not a folder: nothing to watch
    }
    {
        std::lock_guard<std::mutex> lock(watchesMutex_);
        watches_.Set(wd, std::string_view(path).substr(options_.sharePath.size()));
    }
    // Not through a link swapped in since the watch was set: only the share's own folders.
    io::FileDescriptor fd(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    io::DirectoryReader dir(std::move(fd));
    if (!dir)
        return;
    while (const dirent* entry = dir.Next()) {
        if (IsSkippedName(entry->d_name))
            continue;
        const std::string child = path + "/" + entry->d_name;
        struct stat st {};
        if (lstat(child.c_str(), &st) == 0 && S_ISDIR(st.st_mode))
            WatchTree(child, depth + 1);
    }
}

void LiveLibrary::IndexNow() {
    pending_ = false;
    if (watchedFolders() == 0) {
        // The share was not there (an unmounted volume) or went away: try again, and rescan
        // periodically until it can be watched.
        WatchAll();
        if (watchedFolders() == 0)
            watchesComplete_ = false;
    }
    const index::IndexReport report =
        index::IndexShare(options_.sharePath, options_.dbPath, &stopping_);
    // A pass holds every file of the share and every row of library.db at once (about 40 MB at
    // 100,000 tracks), all freed when it ends; the allocator would keep those pages for this
    // thread's next pass, minutes or days away. Given back to the system instead.
    malloc_trim(0);
    lastPass_ = Clock::now();
    ++passes_;
    if (!report.ok) {
        if (!stopping_)
            syslog(LOG_ERR, "live library: indexing %s failed: %s", options_.sharePath.c_str(),
                   report.error.c_str());
    } else if (report.added + report.updated + report.removed > 0) {
        syslog(LOG_INFO, "live library: indexed %s: %s", options_.sharePath.c_str(),
               index::FormatReport(report).c_str());
    }
    if (options_.onIndexed)
        options_.onIndexed(report);
}

}  // namespace harmona::mediad
