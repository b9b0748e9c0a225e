// The media servers found on the network, shared between libupnp's callback threads
// (announcements), the description fetchers and the control socket loop (command 16). Everything is
// guarded by one mutex; readers take an immutable, already sorted snapshot so that answering a page
// never waits for discovery work and never sorts.
#pragma once

#include <chrono>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace vanuaudiod {

using Clock = std::chrono::steady_clock;

// One listed server, as command 16 reports it.
struct MediaServer {
    std::string udn;           // "uuid:..."
    std::string friendlyName;  // may be empty
    std::string controlUrl;    // absolute ContentDirectory control URL
    std::string ip;            // host of the description's location URL
};

using ServerSnapshot = std::shared_ptr<const std::vector<MediaServer>>;

class ServerList {
  public:
    ServerList();

    // An announcement (alive or search answer) of device `udn` with its description at `location`,
    // valid for `maxAgeSeconds`. Returns true when the caller should fetch the description: the
    // device is new, moved to another location, or its last fetch failed long enough ago.
    bool Seen(const std::string& udn, const std::string& location, int maxAgeSeconds,
              Clock::time_point now);

    // The description of `udn` fetched from `location` gave `server` (ok) or could not be had.
    // Ignored when the device left or moved meanwhile.
    void Described(const std::string& udn, const std::string& location, bool ok,
                   const MediaServer& server, Clock::time_point now);

    // The device said byebye.
    void Remove(const std::string& udn);

    // Drops the devices whose announcement expired; returns how many went.
    int Expire(Clock::time_point now);

    // The earliest expiry time (Clock::time_point::max() when there are no devices).
    Clock::time_point NextExpiry() const;

    // The listed servers (described ones only), by friendly name, then UDN.
    ServerSnapshot Snapshot() const;

    // Whether `udn` is known (described or not).
    bool Knows(const std::string& udn) const;

    // Every known device (described or not).
    std::size_t KnownCount() const;

  private:
    struct Entry {
        std::string location;
        Clock::time_point expiresAt;
        bool described = false;
        bool fetchPending = false;
        Clock::time_point lastFailure;
        bool failed = false;
        MediaServer server;
    };
    void RebuildSnapshotLocked();

    mutable std::mutex mutex_;
    std::map<std::string, Entry> entries_;
    ServerSnapshot snapshot_;
};

}  // namespace vanuaudiod
