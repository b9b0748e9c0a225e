// The media servers found on the network, shared between the discovery thread (announcements and
// description fetches) and the control socket loop (command 16). Everything is
// guarded by one mutex; readers take an immutable, already sorted snapshot so that answering a page
// never waits for discovery work and never sorts.
#pragma once

#include <chrono>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace harmona::vanuaudiod {

using Clock = std::chrono::steady_clock;

// One listed server, as command 16 reports it.
struct MediaServer {
    std::string udn;           // "uuid:..."
    std::string friendlyName;  // may be empty
    std::string controlUrl;    // absolute ContentDirectory control URL
    std::string ip;            // host of the description's location URL
};

using ServerSnapshot = std::shared_ptr<const std::vector<MediaServer>>;

// What an announcement leads to.
enum class SeenOutcome {
    fetch,          // fetch the description now
    nothing,        // known already (described, or a fetch is pending or failed lately)
    announcerFull,  // its announcer has as many devices as one address may have
    tableFull,      // every slot holds a described server or a pending fetch
};

// The table's bounds: a flood of announcements may not push real servers out, nor hold slots
// with devices that never give a valid description.
inline constexpr std::size_t kMaxDevicesPerAnnouncer = 16;
inline constexpr std::size_t kMaxKnownDevices = 1024;
inline constexpr auto kUndescribedHold = std::chrono::seconds(30);

class ServerList {
  public:
    ServerList();

    // An announcement (alive or search answer) of device `udn`, sent from address `announcer`,
    // with its description at `location`, valid for `maxAgeSeconds`. kFetch when the caller
    // should fetch the description: the device is new, moved to another location, or its last
    // fetch failed long enough ago. A new device needs a free slot: at most
    // kMaxDevicesPerAnnouncer per announcer, kMaxKnownDevices in all, where a device without a
    // description gives its slot up to a newcomer first, then a device of the address that
    // announces the most, when that address would still announce more than the newcomer's
    // (many addresses of one forger cannot keep a server of another host out).
    SeenOutcome Seen(const std::string& udn, const std::string& location,
                     const std::string& announcer, int maxAgeSeconds, Clock::time_point now);

    // The description of `udn` fetched from `location` gave `server` (ok) or could not be had
    // (the device then keeps its slot for kUndescribedHold at most). Ignored when the device left
    // or moved meanwhile. True when this listed the server or changed what is listed for it.
    bool Described(const std::string& udn, const std::string& location, bool ok,
                   const MediaServer& server, Clock::time_point now);

    // The device said byebye from `announcer` (a byebye from another address is somebody
    // else's word and ignored). True with the listed server in `gone` when it was listed.
    bool Remove(const std::string& udn, const std::string& announcer, MediaServer& gone);

    // Drops the devices whose announcement expired; returns the listed servers among them.
    std::vector<MediaServer> Expire(Clock::time_point now);

    // The earliest expiry time (Clock::time_point::max() when there are no devices).
    Clock::time_point NextExpiry() const;

    // The listed servers (described ones only), by friendly name, then UDN.
    ServerSnapshot Snapshot() const;

    // Whether `udn` is known (described or not).
    bool Knows(const std::string& udn) const;

    // Every known device (described or not).
    std::size_t KnownCount() const;

    // The listed servers that gave their slot up to a newcomer since the last call.
    std::vector<MediaServer> TakeEvicted();

  private:
    struct Entry {
        std::string location;
        std::string announcer;
        Clock::time_point expiresAt;
        Clock::time_point announcedUntil;  // what the announcements' max-age promised
        bool described = false;
        bool fetchPending = false;
        Clock::time_point lastFailure;
        bool failed = false;
        MediaServer server;
    };
    void RebuildSnapshotLocked();
    std::size_t CountFromLocked(const std::string& announcer) const;
    bool EvictUndescribedLocked();
    bool EvictFromBusiestAnnouncerLocked(const std::string& newcomer);

    // How many listed servers TakeEvicted keeps for the log between two calls.
    static constexpr std::size_t kMaxEvictedKept = 16;

    mutable std::mutex mutex_;
    std::map<std::string, Entry> entries_;
    ServerSnapshot snapshot_;
    std::vector<MediaServer> evicted_;
};

}  // namespace harmona::vanuaudiod
