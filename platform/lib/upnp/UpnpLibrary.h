// Move-only owner of libupnp's process-wide state (UpnpInit2 ... UpnpFinish). The media server
// (harmona-mediad) and the audio daemon (vanuaudiod) each hold one for their lifetime; device and
// control point handles are registered on top of it.
#pragma once

#include <string>

namespace harmona::upnp {

class UpnpLibrary {
  public:
    // Starts libupnp on interface `interfaceName` (nullptr: the first suitable one; "lo" for tests
    // on loopback) and `port` (0: libupnp chooses). Check ok() / Error() afterwards.
    UpnpLibrary(const char* interfaceName, unsigned short port);
    ~UpnpLibrary();
    UpnpLibrary(UpnpLibrary&& other) noexcept : started_(other.started_), error_(other.error_) {
        other.started_ = false;
    }
    UpnpLibrary& operator=(UpnpLibrary&&) = delete;
    UpnpLibrary(const UpnpLibrary&) = delete;
    UpnpLibrary& operator=(const UpnpLibrary&) = delete;

    bool ok() const { return started_; }
    // libupnp's error code of UpnpInit2 (UPNP_E_SUCCESS when ok()).
    int Error() const { return error_; }
    std::string ErrorText() const;

    // The address and port libupnp serves on.
    std::string ServerAddress() const;
    unsigned short ServerPort() const;

  private:
    bool started_ = false;
    int error_ = 0;
};

}  // namespace harmona::upnp
