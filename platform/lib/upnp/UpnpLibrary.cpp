#include "upnp/UpnpLibrary.h"

#include <upnp/upnp.h>
#include <upnp/upnptools.h>

namespace harmona::upnp {

UpnpLibrary::UpnpLibrary(const char* interfaceName, unsigned short port) {
    error_ = UpnpInit2(interfaceName, port);
    started_ = error_ == UPNP_E_SUCCESS;
}

UpnpLibrary::~UpnpLibrary() {
    if (started_)
        UpnpFinish();
}

std::string UpnpLibrary::ErrorText() const {
    return UpnpGetErrorMessage(error_);
}

std::string UpnpLibrary::ServerAddress() const {
    const char* address = UpnpGetServerIpAddress();
    return address != nullptr ? address : "";
}

unsigned short UpnpLibrary::ServerPort() const {
    return UpnpGetServerPort();
}

}  // namespace harmona::upnp
