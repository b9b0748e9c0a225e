#include "services/vanuaudiod/ServerList.h"

#include <algorithm>

namespace harmona::vanuaudiod {
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

SeenOutcome ServerList::Seen(const std::string& udn, const std::string& location,
                             const std::string& announcer, int maxAgeSeconds,
                             Clock::time_point now) {
    std::lock_guard<std::mutex> lock(mutex_);
    const auto expiresAt = now + std::chrono::seconds(SaneMaxAge(maxAgeSeconds));
    auto found = entries_.find(udn);
    if (found == entries_.end()) {
        if (CountFromLocked(announcer) >= kMaxDevicesPerAnnouncer)
            return SeenOutcome::announcerFull;
        if (entries_.size() >= kMaxKnownDevices && !EvictUndescribedLocked() &&
            !EvictFromBusiestAnnouncerLocked(announcer))
            return SeenOutcome::tableFull;
        Entry entry;
        entry.location = location;
        entry.announcer = announcer;
        entry.announcedUntil = expiresAt;
        // Until its description is in, a device holds its slot only briefly.
        entry.expiresAt = std::min(expiresAt, now + kUndescribedHold);
        entry.fetchPending = true;
        entries_.emplace(udn, std::move(entry));
        return SeenOutcome::fetch;
    }
    Entry& entry = found->second;
    entry.announcedUntil = std::max(entry.announcedUntil, expiresAt);
    if (entry.location != location || entry.announcer != announcer) {
        // Moved (new address or port): the old description no longer holds. The new address
        // must have room as a newcomer would.
        if (entry.announcer != announcer && CountFromLocked(announcer) >= kMaxDevicesPerAnnouncer)
            return SeenOutcome::announcerFull;
        const bool wasListed = entry.described;
        entry.location = location;
        entry.announcer = announcer;
        entry.described = false;
        entry.failed = false;
        entry.fetchPending = true;
        entry.expiresAt = std::min(expiresAt, now + kUndescribedHold);
        if (wasListed)
            RebuildSnapshotLocked();
        return SeenOutcome::fetch;
    }
    if (entry.described) {
        entry.expiresAt = std::max(entry.expiresAt, expiresAt);
        return SeenOutcome::nothing;
    }
    if (entry.fetchPending)
        return SeenOutcome::nothing;
    if (entry.failed && now - entry.lastFailure < kRetryAfterFailure)
        return SeenOutcome::nothing;
    entry.fetchPending = true;
    entry.expiresAt = std::min(expiresAt, now + kUndescribedHold);
    return SeenOutcome::fetch;
}

bool ServerList::Described(const std::string& udn, const std::string& location, bool ok,
                           const MediaServer& server, Clock::time_point now) {
    std::lock_guard<std::mutex> lock(mutex_);
    auto found = entries_.find(udn);
    if (found == entries_.end() || found->second.location != location)
        return false;
    Entry& entry = found->second;
    entry.fetchPending = false;
    if (!ok) {
        entry.failed = true;
        entry.lastFailure = now;
        entry.expiresAt = std::min(entry.expiresAt, now + kUndescribedHold);
        return false;
    }
    entry.failed = false;
    entry.described = true;
    entry.expiresAt = std::max(entry.expiresAt, entry.announcedUntil);
    entry.server = server;
    entry.server.udn = udn;
    RebuildSnapshotLocked();
    return true;
}

bool ServerList::Remove(const std::string& udn, const std::string& announcer, MediaServer& gone) {
    std::lock_guard<std::mutex> lock(mutex_);
    auto found = entries_.find(udn);
    if (found == entries_.end() || found->second.announcer != announcer)
        return false;
    const bool wasListed = found->second.described;
    gone = found->second.server;
    entries_.erase(found);
    if (wasListed)
        RebuildSnapshotLocked();
    return wasListed;
}

std::vector<MediaServer> ServerList::Expire(Clock::time_point now) {
    std::lock_guard<std::mutex> lock(mutex_);
    std::vector<MediaServer> listedGone;
    for (auto it = entries_.begin(); it != entries_.end();) {
        if (it->second.expiresAt <= now && !it->second.fetchPending) {
            if (it->second.described)
                listedGone.push_back(it->second.server);
            it = entries_.erase(it);
        } else {
            ++it;
        }
    }
    if (!listedGone.empty())
        RebuildSnapshotLocked();
    return listedGone;
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

std::size_t ServerList::CountFromLocked(const std::string& announcer) const {
    std::size_t count = 0;
    for (const auto& [udn, entry] : entries_)
        count += entry.announcer == announcer ? 1 : 0;
    return count;
}

bool ServerList::EvictUndescribedLocked() {
    auto victim = entries_.end();
    for (auto it = entries_.begin(); it != entries_.end(); ++it) {
        const Entry& entry = it->second;
        if (entry.described || entry.fetchPending)
            continue;
        if (victim == entries_.end() || entry.lastFailure < victim->second.lastFailure)
            victim = it;
    }
    if (victim == entries_.end())
        return false;
    entries_.erase(victim);
    return true;
}

bool ServerList::EvictFromBusiestAnnouncerLocked(const std::string& newcomer) {
    std::map<std::string, std::size_t> counts;
    for (const auto& [udn, entry] : entries_)
        ++counts[entry.announcer];
    auto busiest = counts.begin();
    for (auto it = counts.begin(); it != counts.end(); ++it) {
        if (it->second > busiest->second)
            busiest = it;
    }
    // Only when the newcomer's address, with the newcomer, still announces fewer devices than the
    // busiest one did: otherwise equals would push each other out in turn.
    if (busiest == counts.end() || busiest->second <= counts[newcomer] + 1)
        return false;
    // Of the busiest address's devices, the one whose announcement runs out first.
    auto victim = entries_.end();
    for (auto it = entries_.begin(); it != entries_.end(); ++it) {
        if (it->second.announcer != busiest->first || it->second.fetchPending)
            continue;
        if (victim == entries_.end() || it->second.expiresAt < victim->second.expiresAt)
            victim = it;
    }
    if (victim == entries_.end())
        return false;
    const bool wasListed = victim->second.described;
    if (wasListed && evicted_.size() < kMaxEvictedKept) {
        evicted_.push_back(victim->second.server);
        evicted_.back().udn = victim->first;
    }
    entries_.erase(victim);
    if (wasListed)
        RebuildSnapshotLocked();
    return true;
}

std::vector<MediaServer> ServerList::TakeEvicted() {
    std::lock_guard<std::mutex> lock(mutex_);
    std::vector<MediaServer> taken;
    taken.swap(evicted_);
    return taken;
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

}  // namespace harmona::vanuaudiod
