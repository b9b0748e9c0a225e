// Finding the media servers, on its own thread and GLib main loop: GUPnP's context manager follows
// the host's addresses as they come and go; on each, GSSDP's client hears the NOTIFYs and the
// answers to our M-SEARCH with their source address, so that a description is fetched only from
// the host that announced it (libsoup, bounded in time and size). Servers are dropped on their
// byebye or when their announcement expires. Every discovery event has its log line.
#pragma once

#include <glib.h>

#include <atomic>
#include <cstddef>
#include <string>
#include <thread>

#include "services/vanuaudiod/ServerList.h"

namespace harmona::vanuaudiod {

struct DiscoveryOptions {
    const char* interfaceName = nullptr;  // nullptr: every interface with an address
    unsigned searchMxSeconds = 2;         // MX of the M-SEARCH
    unsigned fetchTimeoutMs = 3000;       // whole description exchange
    std::size_t maxDescriptionBytes = 256 * 1024;
    std::size_t parallelFetches = 4;
    unsigned researchSeconds = 180;  // a new search this often, for servers whose NOTIFYs got lost
};

class Discovery {
  public:
    Discovery(ServerList& servers, DiscoveryOptions options);
    ~Discovery();
    Discovery(const Discovery&) = delete;
    Discovery& operator=(const Discovery&) = delete;

    // Starts the discovery thread. Never fails for want of a network: searches go out on each
    // address as it appears.
    void Start();

    // Asks for a new search soon; returns at once. Safe from any thread.
    void RequestSearch();

    // Stops the thread (idempotent).
    void Stop();

  private:
    class Worker;
    void Run();

    ServerList& servers_;
    DiscoveryOptions options_;
    GMainContext* context_;
    GMainLoop* loop_;
    std::atomic<Worker*> worker_{nullptr};
    std::thread thread_;
};

}  // namespace harmona::vanuaudiod
