// A signal handler connected for the lifetime of this object. The instance is held by a weak
// reference, so that an instance that went first (a device proxy GUPnP dropped, say) is no error:
// its handlers went with it.
#pragma once

#include <glib-object.h>

#include <utility>

namespace harmona::gupnp {

class SignalConnection {
  public:
    SignalConnection() = default;
    // g_signal_connect(instance, name, handler, data), disconnected by the destructor.
    SignalConnection(gpointer instance, const char* name, GCallback handler, gpointer data) {
        id_ = g_signal_connect(instance, name, handler, data);
        if (id_ != 0)
            g_weak_ref_init(&instance_, instance);
    }
    ~SignalConnection() { Disconnect(); }
    SignalConnection(SignalConnection&& other) noexcept { MoveFrom(other); }
    SignalConnection& operator=(SignalConnection&& other) noexcept {
        if (this != &other) {
            Disconnect();
            MoveFrom(other);
        }
        return *this;
    }
    SignalConnection(const SignalConnection&) = delete;
    SignalConnection& operator=(const SignalConnection&) = delete;

    explicit operator bool() const { return id_ != 0; }

    void Disconnect() {
        if (id_ == 0)
            return;
        gpointer instance = g_weak_ref_get(&instance_);
        if (instance != nullptr) {
            g_signal_handler_disconnect(instance, id_);
            g_object_unref(instance);
        }
        g_weak_ref_clear(&instance_);
        id_ = 0;
    }

  private:
    void MoveFrom(SignalConnection& other) {
        id_ = std::exchange(other.id_, 0);
        if (id_ == 0)
            return;
        gpointer instance = g_weak_ref_get(&other.instance_);
        g_weak_ref_init(&instance_, instance);
        if (instance != nullptr)
            g_object_unref(instance);
        g_weak_ref_clear(&other.instance_);
    }

    gulong id_ = 0;
    GWeakRef instance_{};
};

}  // namespace harmona::gupnp
