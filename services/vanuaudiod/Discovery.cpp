#include "Discovery.h"

#include <syslog.h>
#include <upnp/upnp.h>
#include <upnp/upnptools.h>

#include <cstring>

#include "Description.h"
#include "HttpGet.h"
#include "Protocol.h"
#include "upnp/ControlPoint.h"
#include "upnp/UpnpLibrary.h"

namespace vanuaudiod {
namespace {

constexpr const char kSearchTarget[] = "urn:schemas-upnp-org:device:MediaServer:1";
constexpr const char kMediaServerPrefix[] = "urn:schemas-upnp-org:device:MediaServer:";
// Queued description fetches beyond this are dropped (a flood of fake announcements must not
// grow memory); the device is fetched on a later announcement.
constexpr std::size_t kMaxQueuedFetches = 256;
// Searches are sent at most this often: many browsers pressing the scan button at once (command
// 14 each) must not flood the network; a request within the interval is served at its end.
constexpr auto kSearchInterval = std::chrono::seconds(1);
// The most devices kept at once, for the same reason.
constexpr std::size_t kMaxKnownDevices = 1024;

int Trampoline(Upnp_EventType eventType, const void* event, void* cookie) {
    static_cast<Discovery*>(cookie)->OnEvent(eventType, event);
    return 0;
}

bool Printable(const std::string& text, std::size_t maxBytes) {
    if (text.empty() || text.size() > maxBytes)
        return false;
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        if (byte <= 0x20 || byte >= 0x7F || c == '"' || c == '\\')
            return false;
    }
    return true;
}

std::string Field(const char* value) {
    return value != nullptr ? value : "";
}

}  // namespace

Discovery::Discovery(ServerList& servers, DiscoveryOptions options)
    : servers_(servers), options_(options) {}

Discovery::~Discovery() {
    Stop();
}

bool Discovery::Start(std::string& error) {
    library_ = std::make_unique<harmona::upnp::UpnpLibrary>(options_.interfaceName, 0);
    if (!library_->ok()) {
        error = "UpnpInit2: " + library_->ErrorText();
        library_.reset();
        return false;
    }
    controlPoint_ = std::make_unique<harmona::upnp::ControlPoint>(&Trampoline, this);
    if (!controlPoint_->ok()) {
        error = "UpnpRegisterClient: " + controlPoint_->ErrorText();
        controlPoint_.reset();
        library_.reset();
        return false;
    }
    syslog(LOG_INFO, "control point on %s:%u", library_->ServerAddress().c_str(),
           library_->ServerPort());
    searchWanted_ = true;  // the search at start
    scheduler_ = std::thread(&Discovery::SchedulerLoop, this);
    for (int i = 0; i < options_.fetchThreads; ++i)
        fetchers_.emplace_back(&Discovery::FetchLoop, this);
    return true;
}

void Discovery::RequestSearch() {
    std::lock_guard<std::mutex> lock(mutex_);
    searchWanted_ = true;
    schedulerWake_.notify_one();
}

void Discovery::Stop() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        stopping_ = true;
        schedulerWake_.notify_all();
        fetchWake_.notify_all();
    }
    if (scheduler_.joinable())
        scheduler_.join();
    for (std::thread& fetcher : fetchers_) {
        if (fetcher.joinable())
            fetcher.join();
    }
    fetchers_.clear();
    // Unregistering waits for running callbacks; after it no callback reaches us.
    controlPoint_.reset();
    library_.reset();
}

void Discovery::OnEvent(int eventType, const void* event) {
    if (event == nullptr)
        return;
    switch (eventType) {
        case UPNP_DISCOVERY_ADVERTISEMENT_ALIVE:
        case UPNP_DISCOVERY_SEARCH_RESULT: {
            const auto* discovery = static_cast<const UpnpDiscovery*>(event);
            if (UpnpDiscovery_get_ErrCode(discovery) != UPNP_E_SUCCESS)
                return;
            const std::string type = Field(UpnpDiscovery_get_DeviceType_cstr(discovery));
            if (type.compare(0, sizeof(kMediaServerPrefix) - 1, kMediaServerPrefix) != 0)
                return;
            const std::string udn = Field(UpnpDiscovery_get_DeviceID_cstr(discovery));
            const std::string location = Field(UpnpDiscovery_get_Location_cstr(discovery));
            UrlParts parts;
            if (!Printable(udn, kMaxUdnBytes) || !Printable(location, kMaxControlUrlBytes) ||
                !SplitHttpUrl(location, parts))
                return;
            if (servers_.KnownCount() >= kMaxKnownDevices && !servers_.Knows(udn))
                return;
            const int maxAge = UpnpDiscovery_get_Expires(discovery);
            if (servers_.Seen(udn, location, maxAge, Clock::now()))
                Enqueue({udn, location});
            return;
        }
        case UPNP_DISCOVERY_ADVERTISEMENT_BYEBYE: {
            const auto* discovery = static_cast<const UpnpDiscovery*>(event);
            const std::string udn = Field(UpnpDiscovery_get_DeviceID_cstr(discovery));
            if (!udn.empty())
                servers_.Remove(udn);
            return;
        }
        default:
            return;
    }
}

void Discovery::Enqueue(FetchJob job) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (stopping_)
        return;
    if (jobs_.size() >= kMaxQueuedFetches) {
        // Mark it failed so that a later announcement asks again.
        servers_.Described(job.udn, job.location, false, {}, Clock::now());
        return;
    }
    jobs_.push_back(std::move(job));
    fetchWake_.notify_one();
}

void Discovery::SchedulerLoop() {
    std::unique_lock<std::mutex> lock(mutex_);
    Clock::time_point lastSearch{};
    while (!stopping_) {
        const auto now = Clock::now();
        if (searchWanted_ && now - lastSearch >= kSearchInterval) {
            searchWanted_ = false;
            lastSearch = now;
            lock.unlock();
            // Blocks a few hundred milliseconds (libupnp repeats the datagram); the control
            // socket's loop is not on this thread, so it keeps answering meanwhile.
            const int rc = controlPoint_->Search(options_.searchMxSeconds, kSearchTarget, this);
            if (rc != UPNP_E_SUCCESS)
                syslog(LOG_ERR, "M-SEARCH failed: %s", UpnpGetErrorMessage(rc));
            lock.lock();
            continue;
        }
        // Wake at the next expiry or the next allowed search, at the latest after a second.
        lock.unlock();
        const int gone = servers_.Expire(Clock::now());
        if (gone > 0)
            syslog(LOG_INFO, "%d media server(s) expired", gone);
        auto next = std::min(servers_.NextExpiry(), Clock::now() + std::chrono::seconds(1));
        lock.lock();
        if (searchWanted_)
            next = std::min(next, lastSearch + kSearchInterval);
        if (!stopping_)
            schedulerWake_.wait_until(lock, next);
    }
}

void Discovery::FetchLoop() {
    std::unique_lock<std::mutex> lock(mutex_);
    for (;;) {
        fetchWake_.wait(lock, [this] { return stopping_ || !jobs_.empty(); });
        if (stopping_)
            return;
        FetchJob job = std::move(jobs_.front());
        jobs_.pop_front();
        lock.unlock();
        Fetch(job);
        lock.lock();
    }
}

void Discovery::Fetch(const FetchJob& job) {
    const HttpResult reply =
        HttpGet(job.location, options_.fetchTimeoutMs, options_.maxDescriptionBytes);
    MediaServer server;
    bool ok = reply.ok && ParseDeviceDescription(reply.body, job.location, job.udn, server);
    if (!reply.ok)
        syslog(LOG_ERR, "description of %s at %s: %s", job.udn.c_str(), job.location.c_str(),
               reply.error.c_str());
    else if (!ok)
        syslog(LOG_ERR, "description of %s at %s: no usable MediaServer ContentDirectory",
               job.udn.c_str(), job.location.c_str());
    servers_.Described(job.udn, job.location, ok, server, Clock::now());
}

}  // namespace vanuaudiod
