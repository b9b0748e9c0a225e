// harmona-mediad's UPnP side: a MediaServer:1 root device on libupnp with ContentDirectory:1 and
// ConnectionManager:1, the SCPDs and the library's audio files served by libupnp's web server
// (virtual folders "/upnp" and "/media"; HTTP GET with Range is libupnp's).
#pragma once

#include <memory>
#include <string>

#include "ContentDirectory.h"
#include "LoopbackRelay.h"
#include "upnp/UpnpLibrary.h"
#include "upnp/UpnpRootDevice.h"

namespace harmona::mediad {

// The fixed port the CGI connects to on 127.0.0.1 (platform/README.md, "Fixed paths").
inline constexpr unsigned short kMediaServerPort = 50003;
inline constexpr int kAdvertisementSeconds = 1800;

struct MediaServerOptions {
    const char* interfaceName = nullptr;  // nullptr: libupnp's first suitable interface
    unsigned short port = kMediaServerPort;
    std::string dbPath;
    std::string sharePath;
};

class MediaServer {
  public:
    MediaServer() = default;
    ~MediaServer() { Stop(); }
    MediaServer(const MediaServer&) = delete;
    MediaServer& operator=(const MediaServer&) = delete;

    // Starts libupnp on the fixed port, registers the device and announces it. False with `error`
    // set when any step fails (nothing stays registered then).
    bool Start(const MediaServerOptions& options, std::string* error);
    // Says byebye and stops libupnp.
    void Stop();

    // Called by libupnp's threads.
    int OnDeviceEvent(int eventType, const void* event);
    const ContentDirectory* contentDirectory() const { return contentDirectory_.get(); }
    const std::string& udn() const { return udn_; }

  private:
    std::unique_ptr<upnp::UpnpLibrary> library_;
    upnp::UpnpRootDevice device_;
    LoopbackRelay loopbackRelay_;
    std::unique_ptr<ContentDirectory> contentDirectory_;
    std::string udn_;
};

// The device description registered with libupnp (URLBase is added by libupnp).
std::string DeviceDescription(const std::string& udn, const std::string& friendlyName);

}  // namespace harmona::mediad
