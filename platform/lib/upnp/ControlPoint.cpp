#include "upnp/ControlPoint.h"

#include <upnp/upnptools.h>

namespace harmona::upnp {

ControlPoint::ControlPoint(Upnp_FunPtr callback, const void* cookie) {
    error_ = UpnpRegisterClient(callback, cookie, &handle_);
    registered_ = error_ == UPNP_E_SUCCESS;
}

ControlPoint::~ControlPoint() {
    Unregister();
}

void ControlPoint::Unregister() {
    if (registered_)
        UpnpUnRegisterClient(handle_);
    registered_ = false;
}

std::string ControlPoint::ErrorText() const {
    return UpnpGetErrorMessage(error_);
}

int ControlPoint::Search(int mxSeconds, const char* target, const void* cookie) {
    if (!registered_)
        return UPNP_E_INVALID_HANDLE;
    return UpnpSearchAsync(handle_, mxSeconds, target, cookie);
}

}  // namespace harmona::upnp
