#include "UpnpRootDevice.h"

namespace harmona::upnp {

UpnpRootDevice& UpnpRootDevice::operator=(UpnpRootDevice&& other) noexcept {
    if (this != &other) {
        Unregister();
        handle_ = other.handle_;
        registered_ = other.registered_;
        other.registered_ = false;
    }
    return *this;
}

int UpnpRootDevice::Register(const std::string& description, Upnp_FunPtr callback,
                             const void* cookie) {
    Unregister();
    UpnpDevice_Handle handle = -1;
    // config_baseURL 1: libupnp writes URLBase (its own address and port) into the description
    // and serves the result with its web server.
    const int rc = UpnpRegisterRootDevice2(UPNPREG_BUF_DESC, description.c_str(),
                                           description.size(), 1, callback, cookie, &handle);
    if (rc == UPNP_E_SUCCESS) {
        handle_ = handle;
        registered_ = true;
    }
    return rc;
}

int UpnpRootDevice::Advertise(int expireSeconds) {
    if (!registered_)
        return UPNP_E_INVALID_HANDLE;
    return UpnpSendAdvertisement(handle_, expireSeconds);
}

void UpnpRootDevice::Unregister() {
    if (!registered_)
        return;
    UpnpUnRegisterRootDevice(handle_);
    registered_ = false;
    handle_ = -1;
}

}  // namespace harmona::upnp
