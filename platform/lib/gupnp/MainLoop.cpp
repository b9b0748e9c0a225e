#include "gupnp/MainLoop.h"

#include <glib-unix.h>

namespace harmona::gupnp {

gboolean Source::Dispatch(gpointer data) {
    auto* callback = static_cast<Callback*>(data);
    return (*callback)() ? G_SOURCE_CONTINUE : G_SOURCE_REMOVE;
}

Source Source::Timeout(unsigned milliseconds, Callback callback) {
    Source source;
    source.callback_ = std::make_unique<Callback>(std::move(callback));
    source.id_ = g_timeout_add(milliseconds, &Source::Dispatch, source.callback_.get());
    return source;
}

Source Source::UnixSignal(int signalNumber, Callback callback) {
    Source source;
    source.callback_ = std::make_unique<Callback>(std::move(callback));
    source.id_ = g_unix_signal_add(signalNumber, &Source::Dispatch, source.callback_.get());
    return source;
}

void Source::Remove() {
    // A source whose callback returned false is gone already; removing it again would warn.
    if (id_ != 0) {
        GSource* source = g_main_context_find_source_by_id(nullptr, id_);
        if (source != nullptr && !g_source_is_destroyed(source))
            g_source_remove(id_);
        id_ = 0;
    }
    callback_.reset();
}

}  // namespace harmona::gupnp
