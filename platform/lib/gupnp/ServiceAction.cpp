#include "platform/lib/gupnp/ServiceAction.h"

#include <libsoup/soup.h>

#include <cstring>
#include <utility>

#include "platform/lib/gupnp/Object.h"

namespace harmona::gupnp {
namespace {

// GUPnP warns on the log for an argument the request lacks; looking in the request body first
// keeps a client's malformed request out of the log and lets the caller answer 402 instead.
// gupnp_service_action_get_message returns a reference of its own ("transfer full"): kept, it
// would hold the whole message (request, and the reply once written) for the life of the process.
bool RequestCarries(GUPnPServiceAction* action, const char* name) {
    const ObjectRef<SoupServerMessage> message =
        ObjectRef<SoupServerMessage>::Adopt(gupnp_service_action_get_message(action));
    if (!message)
        return false;
    SoupMessageBody* body = soup_server_message_get_request_body(message.get());
    if (body == nullptr || body->data == nullptr)
        return false;
    const std::string open = std::string("<") + name;
    const char* at = body->data;
    const char* end = body->data + body->length;
    while (at < end) {
        const void* hit = memmem(at, static_cast<std::size_t>(end - at), open.data(), open.size());
        if (hit == nullptr)
            return false;
        const char* after = static_cast<const char*>(hit) + open.size();
        if (after < end && (*after == '>' || *after == '/' || *after == ' ' || *after == '\t' ||
                            *after == '\r' || *after == '\n'))
            return true;
        at = after;
    }
    return false;
}

}  // namespace

ServiceAction::ServiceAction(GUPnPServiceAction* action)
    : action_(static_cast<GUPnPServiceAction*>(g_boxed_copy(GUPNP_TYPE_SERVICE_ACTION, action))) {}

ServiceAction::ServiceAction(ServiceAction&& other) noexcept
    : action_(std::exchange(other.action_, nullptr)), answered_(other.answered_) {}

ServiceAction::~ServiceAction() {
    if (action_ == nullptr)
        return;
    if (!answered_)
        ReturnError(501, "Action Failed");
    g_boxed_free(GUPNP_TYPE_SERVICE_ACTION, action_);
}

std::optional<std::string> ServiceAction::Argument(const char* name) const {
    if (!RequestCarries(action_, name))
        return std::nullopt;
    GValue value = G_VALUE_INIT;
    g_value_init(&value, G_TYPE_STRING);
    gupnp_service_action_get_value(action_, name, &value);
    const char* text = g_value_get_string(&value);
    std::optional<std::string> result;
    result = text != nullptr ? std::string(text) : std::string();
    g_value_unset(&value);
    return result;
}

void ServiceAction::SetString(const char* name, const std::string& value) {
    GValue gvalue = G_VALUE_INIT;
    g_value_init(&gvalue, G_TYPE_STRING);
    g_value_set_static_string(&gvalue, value.c_str());
    gupnp_service_action_set_value(action_, name, &gvalue);
    g_value_unset(&gvalue);
}

void ServiceAction::SetUnsigned(const char* name, unsigned value) {
    GValue gvalue = G_VALUE_INIT;
    g_value_init(&gvalue, G_TYPE_UINT);
    g_value_set_uint(&gvalue, value);
    gupnp_service_action_set_value(action_, name, &gvalue);
    g_value_unset(&gvalue);
}

void ServiceAction::ReturnSuccess() {
    if (answered_)
        return;
    answered_ = true;
    gupnp_service_action_return_success(action_);
}

void ServiceAction::ReturnError(int code, const std::string& description) {
    if (answered_)
        return;
    answered_ = true;
    gupnp_service_action_return_error(action_, static_cast<guint>(code), description.c_str());
}

}  // namespace harmona::gupnp
