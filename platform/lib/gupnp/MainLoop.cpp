#include "platform/lib/gupnp/MainLoop.h"

#include <gio/gio.h>
#include <glib-unix.h>

namespace harmona::gupnp {

gboolean Source::Dispatch(gpointer data) {
    auto* callback = static_cast<Callback*>(data);
    return (*callback)() ? G_SOURCE_CONTINUE : G_SOURCE_REMOVE;
}

// Attached to the thread-default main context (the global default one on the main thread), so
// that a loop on a thread of its own runs its sources.
Source Source::Attach(GSource* source, Callback callback) {
    Source attached;
    attached.callback_ = std::make_unique<Callback>(std::move(callback));
    attached.context_ = g_main_context_ref_thread_default();
    g_source_set_callback(source, &Source::Dispatch, attached.callback_.get(), nullptr);
    attached.id_ = g_source_attach(source, attached.context_);
    g_source_unref(source);
    return attached;
}

Source Source::Timeout(unsigned milliseconds, Callback callback) {
    return Attach(g_timeout_source_new(milliseconds), std::move(callback));
}

Source Source::Idle(Callback callback) {
    return Attach(g_idle_source_new(), std::move(callback));
}

Source Source::UnixSignal(int signalNumber, Callback callback) {
    return Attach(g_unix_signal_source_new(signalNumber), std::move(callback));
}

bool Source::active() const {
    if (id_ == 0)
        return false;
    GSource* source = g_main_context_find_source_by_id(context_, id_);
    return source != nullptr && !g_source_is_destroyed(source);
}

void Source::Remove() {
    // A source whose callback returned false is gone already; removing it again would warn.
    if (id_ != 0) {
        GSource* source = g_main_context_find_source_by_id(context_, id_);
        if (source != nullptr && !g_source_is_destroyed(source))
            g_source_destroy(source);
        id_ = 0;
    }
    if (context_ != nullptr)
        g_main_context_unref(std::exchange(context_, nullptr));
    callback_.reset();
}

namespace {

struct ThreadJob {
    std::function<void()> work;
    std::function<void()> done;
};

void RunThreadJob(GTask* task, gpointer, gpointer data, GCancellable*) {
    static_cast<ThreadJob*>(data)->work();
    g_task_return_boolean(task, TRUE);
}

void FinishThreadJob(GObject*, GAsyncResult*, gpointer data) {
    std::unique_ptr<ThreadJob> job(static_cast<ThreadJob*>(data));
    job->done();
}

}  // namespace

void RunInThread(std::function<void()> work, std::function<void()> done) {
    auto* job = new ThreadJob{std::move(work), std::move(done)};
    GTask* task = g_task_new(nullptr, nullptr, &FinishThreadJob, job);
    g_task_set_task_data(task, job, nullptr);
    g_task_run_in_thread(task, &RunThreadJob);
    g_object_unref(task);
}

}  // namespace harmona::gupnp
