#include "ServerList.h"

#include <algorithm>

namespace vanuaudiod {
namespace {

// A device that announces no usable max-age is kept for the UPnP default of 30 minutes; a huge
// one is capped so that a device that vanished without byebye goes within a day at most.
constexpr int kDefaultMaxAge = 1800;
constexpr int kLongestMaxAge = 86400;
// A device whose description could not be had is asked again on a later announcement, but not
// more often than this (a broken device must not keep the fetchers busy).
constexpr auto kRetryAfterFailure = std::chrono::seconds(10);

int SaneMaxAge(int seconds) {
    if (seconds <= 0)
        return kDefaultMaxAge;
    return std::min(seconds, kLongestMaxAge);
}

}  // namespace

ServerList::ServerList() : snapshot_(std::make_shared<const std::vector<MediaServer>>()) {}

bool ServerList::Seen(const std::string& udn, const std::string& location, int maxAgeSeconds,
                      Clock::time_point now) {
    std::lock_guard<std::mutex> lock(mutex_);
    const auto expiresAt = now + std::chrono::seconds(SaneMaxAge(maxAgeSeconds));
    auto found = entries_.find(udn);
    if (found == entries_.end()) {
        Entry entry;
        entry.location = location;
        entry.expiresAt = expiresAt;
        entry.fetchPending = true;
        entries_.emplace(udn, std::move(entry));
        return true;
    }
    Entry& entry = found->second;
    entry.expiresAt = std::max(entry.expiresAt, expiresAt);
    if (entry.location != location) {
        // Moved (new address or port): the old description no longer holds.
        const bool wasListed = entry.described;
        entry.location = location;
        entry.described = false;
        entry.failed = false;
        entry.fetchPending = true;
        if (wasListed)
            RebuildSnapshotLocked();
        return true;
    }
    if (entry.described || entry.fetchPending)
        return false;
    if (entry.failed && now - entry.lastFailure < kRetryAfterFailure)
        return false;
    entry.fetchPending = true;
    return true;
}

void ServerList::Described(const std::string& udn, const std::string& location, bool ok,
                           const MediaServer& server, Clock::time_point now) {
    std::lock_guard<std::mutex> lock(mutex_);
    auto found = entries_.find(udn);
    if (found == entries_.end() || found->second.location != location)
        return;
    Entry& entry = found->second;
    entry.fetchPending = false;
    if (!ok) {
        entry.failed = true;
        entry.lastFailure = now;
        return;
    }
    entry.failed = false;
    entry.described = true;
    entry.server = server;
    entry.server.udn = udn;
    RebuildSnapshotLocked();
}

void ServerList::Remove(const std::string& udn) {
    std::lock_guard<std::mutex> lock(mutex_);
    auto found = entries_.find(udn);
    if (found == entries_.end())
        return;
    const bool wasListed = found->second.described;
    entries_.erase(found);
    if (wasListed)
        RebuildSnapshotLocked();
}

int ServerList::Expire(Clock::time_point now) {
    std::lock_guard<std::mutex> lock(mutex_);
    int gone = 0;
    bool listedGone = false;
    for (auto it = entries_.begin(); it != entries_.end();) {
        if (it->second.expiresAt <= now) {
            listedGone = listedGone || it->second.described;
            it = entries_.erase(it);
            ++gone;
        } else {
            ++it;
        }
    }
    if (listedGone)
        RebuildSnapshotLocked();
    return gone;
}

Clock::time_point ServerList::NextExpiry() const {
    std::lock_guard<std::mutex> lock(mutex_);
    Clock::time_point earliest = Clock::time_point::max();
    for (const auto& [udn, entry] : entries_)
        earliest = std::min(earliest, entry.expiresAt);
    return earliest;
}

ServerSnapshot ServerList::Snapshot() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return snapshot_;
}

bool ServerList::Knows(const std::string& udn) const {
    std::lock_guard<std::mutex> lock(mutex_);
    return entries_.count(udn) != 0;
}

std::size_t ServerList::KnownCount() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return entries_.size();
}

void ServerList::RebuildSnapshotLocked() {
    auto servers = std::make_shared<std::vector<MediaServer>>();
    for (const auto& [udn, entry] : entries_) {
        if (entry.described)
            servers->push_back(entry.server);
    }
    std::sort(servers->begin(), servers->end(), [](const MediaServer& a, const MediaServer& b) {
        if (a.friendlyName != b.friendlyName)
            return a.friendlyName < b.friendlyName;
        return a.udn < b.udn;
    });
    snapshot_ = std::move(servers);
}

}  // namespace vanuaudiod
