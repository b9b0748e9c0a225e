// Move-only owner of one libupnp root device (UpnpRegisterRootDevice2 ...
// UpnpUnRegisterRootDevice). Registered on top of a live UpnpLibrary; the device's description
// comes from a memory buffer and libupnp serves it (and writes its URLBase) with its own web
// server.
#pragma once

#include <upnp/upnp.h>

#include <string>

namespace harmona::upnp {

class UpnpRootDevice {
  public:
    UpnpRootDevice() = default;
    ~UpnpRootDevice() { Unregister(); }
    UpnpRootDevice(UpnpRootDevice&& other) noexcept
        : handle_(other.handle_), registered_(other.registered_) {
        other.registered_ = false;
    }
    UpnpRootDevice& operator=(UpnpRootDevice&& other) noexcept;
    UpnpRootDevice(const UpnpRootDevice&) = delete;
    UpnpRootDevice& operator=(const UpnpRootDevice&) = delete;

    // Registers the device whose description XML is `description`; `callback` receives the
    // control requests with `cookie`. Returns libupnp's code (UPNP_E_SUCCESS on success).
    int Register(const std::string& description, Upnp_FunPtr callback, const void* cookie);

    // Sends the SSDP alive announcements, valid for `expireSeconds`.
    int Advertise(int expireSeconds);

    // Sends the byebye announcements and releases the handle; nothing when not registered.
    void Unregister();

    bool registered() const { return registered_; }
    UpnpDevice_Handle handle() const { return handle_; }

  private:
    UpnpDevice_Handle handle_ = -1;
    bool registered_ = false;
};

}  // namespace harmona::upnp
