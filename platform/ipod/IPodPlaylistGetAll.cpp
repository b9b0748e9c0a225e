// VANUIPodPlaylistGetAll: the mountpoint file, then the libgpod reader, run in a child process.
//
// libgpod's parser can spin for good on a damaged database (two changed bytes are enough), and
// nothing can stop a function call that never returns. So the reader plugin is loaded and run in a
// child process that sends the playlists back over a pipe; the request waits for it a few seconds
// at most and kills it when it takes longer. A bonus: libgpod and GLib are never loaded into the
// request's own process.
#include <poll.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <string>

#include "common/io/ChildProcess.h"
#include "common/io/WriteAll.h"
#include "platform/ipod/IPodPlaylist.h"
#include "platform/ipod/IPodPluginApi.h"
#include "platform/paths/PlatformPaths.h"
#include "platform/plugin/Plugin.h"

namespace harmona::ipod {
namespace {

using Clock = std::chrono::steady_clock;

// The pipe's format: one header per playlist, followed by its name, and a last header that marks
// the end of a complete listing. Both ends are this program on this machine: host byte order.
struct WireHeader {
    std::uint32_t nameBytes;  // kEndOfList on the last header
    std::uint32_t reserved;
    std::uint64_t id;
};
constexpr std::uint32_t kEndOfList = 0xFFFFFFFFu;
// A name is cut to this many bytes on the way (the record keeps 254 of them anyway).
constexpr std::size_t kMaxWireNameBytes = 1024;

using io::WriteAll;

// --- the child ---------------------------------------------------------------------------------

struct ChildSink {
    int fd;
    std::size_t sent = 0;
};

int SendPlaylist(void* context, const char* name, std::uint64_t id) {
    auto* sink = static_cast<ChildSink*>(context);
    // One more than the list may hold is enough for the parent to refuse the listing.
    if (sink->sent > kMaxIPodPlaylists)
        return -1;
    const std::size_t length = std::min(std::strlen(name), kMaxWireNameBytes);
    const WireHeader header{static_cast<std::uint32_t>(length), 0, id};
    if (!WriteAll(sink->fd, &header, sizeof header) || !WriteAll(sink->fd, name, length))
        return -1;
    ++sink->sent;
    return 0;
}

int ListInChild(const std::string& mountpoint, int fd) {
    const harmona::plugin::Plugin reader =
        harmona::plugin::Plugin::OpenBesideProgram(HARMONA_IPOD_PLUGIN_FILE);
    auto* listPlaylists =
        reader.Get<harmona_ipod_list_playlists_fn>(HARMONA_IPOD_LIST_PLAYLISTS_SYMBOL);
    ChildSink sink{fd};
    // A listing stopped by the sink still ends with the end header: the parent counts the records.
    if (listPlaylists == nullptr || (listPlaylists(mountpoint.c_str(), &SendPlaylist, &sink) != 0 &&
                                     sink.sent <= kMaxIPodPlaylists))
        return 1;
    const WireHeader end{kEndOfList, 0, 0};
    return WriteAll(fd, &end, sizeof end) ? 0 : 1;
}

// --- the parent --------------------------------------------------------------------------------

enum class Received { listed, failed, timedOut, tooMany };

// Takes the child's records from `fd` into `list` until the end header, the end of the pipe or the
// deadline.
class RecordReceiver {
  public:
    RecordReceiver(int fd, Clock::time_point deadline, playlist::PlaylistListBuilder& list)
        : fd_(fd), deadline_(deadline), list_(list) {}

    Received Run() {
        for (;;) {
            const Received parsed = TakeRecords();
            if (parsed != Received::failed || ended_)
                return parsed;
            const long remainingMs = static_cast<long>(
                std::chrono::duration_cast<std::chrono::milliseconds>(deadline_ - Clock::now())
                    .count());
            if (remainingMs <= 0)
                return Received::timedOut;
            pollfd poller{fd_, POLLIN, 0};
            const int ready = poll(&poller, 1, static_cast<int>(remainingMs));
            if (ready < 0 && errno != EINTR)
                return Received::failed;
            if (ready <= 0)
                continue;
            char chunk[16384];
            const ssize_t n = read(fd_, chunk, sizeof chunk);
            if (n < 0 && errno == EINTR)
                continue;
            if (n <= 0)
                return Received::failed;  // the child ended without the end header
            pending_.append(chunk, static_cast<std::size_t>(n));
        }
    }

  private:
    // Turns the whole records in `pending_` into list entries. `failed` with ended_ false means
    // "more bytes needed".
    Received TakeRecords() {
        std::size_t used = 0;
        Received result = Received::failed;
        while (pending_.size() - used >= sizeof(WireHeader)) {
            WireHeader header;
            std::memcpy(&header, pending_.data() + used, sizeof header);
            if (header.nameBytes == kEndOfList) {
                ended_ = true;
                result = Received::listed;
                break;
            }
            if (header.nameBytes > kMaxWireNameBytes) {
                ended_ = true;  // not what the child writes: refuse it
                break;
            }
            if (pending_.size() - used - sizeof header < header.nameBytes)
                break;
            const std::string_view name(pending_.data() + used + sizeof header, header.nameBytes);
            used += sizeof header + header.nameBytes;
            if (!list_.Append(0, name, FormatIPodKey(header.id))) {
                ended_ = true;
                result = list_.Full() ? Received::tooMany : Received::failed;
                break;
            }
        }
        pending_.erase(0, used);
        return result;
    }

    int fd_;
    Clock::time_point deadline_;
    playlist::PlaylistListBuilder& list_;
    std::string pending_;
    bool ended_ = false;
};

}  // namespace
}  // namespace harmona::ipod

int VANUIPodPlaylistGetAll(PLAYLIST_INFO** head) {
    using namespace harmona::ipod;
    using harmona::playlist::LogListTooLong;
    if (head == nullptr)
        return -1;
    *head = nullptr;

    std::string mountpoint;
    if (!ReadMountpoint(harmona::paths::kIPodMountpointFile, mountpoint))
        return -1;

    const Clock::time_point deadline = Clock::now() + std::chrono::milliseconds(kReadTimeoutMs);
    harmona::io::FileDescriptor records;
    harmona::io::ChildProcess child = harmona::io::ChildProcess::Start(
        [&mountpoint](int fd) { return ListInChild(mountpoint, fd); }, records);
    if (!child)
        return -1;

    // The builder frees what it holds when the listing fails half-way.
    harmona::playlist::PlaylistListBuilder builder(kMaxIPodPlaylists);
    const Received received = RecordReceiver(records.Get(), deadline, builder).Run();
    // Done with the child in every case: killed and reaped, whether it is still parsing, about to
    // exit after its last record, or already gone.
    child.Kill();
    switch (received) {
        case Received::listed:
            *head = builder.Release();
            return 0;
        case Received::timedOut:
            syslog(LOG_ERR,
                   "iPod: the database of the iPod mounted at %s was not read within %d seconds; "
                   "its playlists are not listed",
                   mountpoint.c_str(), kReadTimeoutMs / 1000);
            return -1;
        case Received::tooMany:
            LogListTooLong("playlists on the iPod mounted at " + mountpoint, kMaxIPodPlaylists);
            return -1;
        case Received::failed:
            return -1;
    }
    return -1;
}
