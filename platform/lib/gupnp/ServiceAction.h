// One SOAP action that GUPnP handed to a service's "action-invoked" handler: its in arguments as
// text, its out arguments, and exactly one answer (success or a UPnP error). It holds a reference
// of its own, so an answer may come later from the main loop (after work done in a thread). An
// action dropped unanswered would leave the client's HTTP request paused forever, so the
// destructor answers 501 Action Failed for it.
#pragma once

#include <libgupnp/gupnp-service.h>

#include <optional>
#include <string>

namespace harmona::gupnp {

class ServiceAction {
  public:
    explicit ServiceAction(GUPnPServiceAction* action);
    ~ServiceAction();
    ServiceAction(ServiceAction&& other) noexcept;
    ServiceAction& operator=(ServiceAction&&) = delete;
    ServiceAction(const ServiceAction&) = delete;
    ServiceAction& operator=(const ServiceAction&) = delete;

    const char* name() const { return gupnp_service_action_get_name(action_); }

    // The text of in argument `name`; nothing when the request does not carry it.
    std::optional<std::string> Argument(const char* name) const;

    void SetString(const char* name, const std::string& value);
    void SetUnsigned(const char* name, unsigned value);

    void ReturnSuccess();
    void ReturnError(int code, const std::string& description);
    bool answered() const { return answered_; }

  private:
    GUPnPServiceAction* action_;
    bool answered_ = false;
};

}  // namespace harmona::gupnp
