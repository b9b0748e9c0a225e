// Move-only owner of one libupnp control point handle (UpnpRegisterClient ...
// UpnpUnRegisterClient). Needs a started UpnpLibrary that outlives it. The callback runs on
// libupnp's own threads: it must be thread safe and must not call back into the SDK (libupnp's
// rule), so a user hands work to its own threads from there.
#pragma once

#include <upnp/upnp.h>

#include <string>

namespace harmona::upnp {

class ControlPoint {
  public:
    // Registers `callback` with `cookie` (passed back to every call). Check ok() / Error().
    ControlPoint(Upnp_FunPtr callback, const void* cookie);
    ~ControlPoint();
    ControlPoint(ControlPoint&& other) noexcept
        : handle_(other.handle_), registered_(other.registered_), error_(other.error_) {
        other.registered_ = false;
    }
    ControlPoint& operator=(ControlPoint&&) = delete;
    ControlPoint(const ControlPoint&) = delete;
    ControlPoint& operator=(const ControlPoint&) = delete;

    bool ok() const { return registered_; }
    int Error() const { return error_; }
    std::string ErrorText() const;
    UpnpClient_Handle Handle() const { return handle_; }

    // Sends an SSDP M-SEARCH for `target` (a device or service type, "ssdp:all", ...); answers come
    // to the callback for up to `mxSeconds`. Returns libupnp's code (UPNP_E_SUCCESS when sent).
    // It may block for a few hundred milliseconds (libupnp repeats the datagram with a pause).
    int Search(int mxSeconds, const char* target, const void* cookie);

    // Unregisters now (idempotent); the destructor does it otherwise. libupnp waits for callbacks
    // that are still running.
    void Unregister();

  private:
    UpnpClient_Handle handle_ = -1;
    bool registered_ = false;
    int error_ = 0;
};

}  // namespace harmona::upnp
