// Finding the media servers: libupnp's control point (SSDP M-SEARCH for MediaServer devices,
// alive and byebye notifications), the device descriptions fetched by worker threads of our own
// (libupnp forbids SDK calls inside its callbacks, and a slow device must not hold its threads),
// and the expiry of devices that stop announcing.
#pragma once

#include <condition_variable>
#include <deque>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "ServerList.h"

namespace harmona::upnp {
class UpnpLibrary;
class ControlPoint;
}  // namespace harmona::upnp

namespace vanuaudiod {

struct DiscoveryOptions {
    const char* interfaceName = nullptr;  // nullptr: libupnp's first suitable interface
    int searchMxSeconds = 2;              // MX of the M-SEARCH
    int fetchTimeoutMs = 3000;            // whole description exchange
    std::size_t maxDescriptionBytes = 256 * 1024;
    int fetchThreads = 2;
};

class Discovery {
  public:
    Discovery(ServerList& servers, DiscoveryOptions options);
    ~Discovery();
    Discovery(const Discovery&) = delete;
    Discovery& operator=(const Discovery&) = delete;

    // Starts libupnp, registers the control point, starts the threads and sends the first search.
    // False (with `error` set) when libupnp cannot start.
    bool Start(std::string& error);

    // Asks for a new search soon; returns at once (the M-SEARCH is sent by the scheduler thread).
    void RequestSearch();

    // Stops the threads and libupnp (idempotent).
    void Stop();

    // Called by libupnp's callback (public for the C trampoline only).
    void OnEvent(int eventType, const void* event);

  private:
    struct FetchJob {
        std::string udn;
        std::string location;
    };
    void SchedulerLoop();
    void FetchLoop();
    void Fetch(const FetchJob& job);
    void Enqueue(FetchJob job);

    ServerList& servers_;
    DiscoveryOptions options_;
    std::unique_ptr<harmona::upnp::UpnpLibrary> library_;
    std::unique_ptr<harmona::upnp::ControlPoint> controlPoint_;

    std::mutex mutex_;
    std::condition_variable schedulerWake_;
    std::condition_variable fetchWake_;
    bool stopping_ = false;
    bool searchWanted_ = false;
    std::deque<FetchJob> jobs_;
    std::thread scheduler_;
    std::vector<std::thread> fetchers_;
};

}  // namespace vanuaudiod
