// The GLib main loop that GUPnP's services run on, and the sources attached to it: a timer or a
// Unix signal watch that is removed when its owner goes, so that no callback outlives its object.
#pragma once

#include <glib.h>

#include <functional>
#include <memory>
#include <utility>

namespace harmona::gupnp {

// A GMainLoop on the thread-default context.
class MainLoop {
  public:
    MainLoop() : loop_(g_main_loop_new(nullptr, FALSE)) {}
    ~MainLoop() { g_main_loop_unref(loop_); }
    MainLoop(const MainLoop&) = delete;
    MainLoop& operator=(const MainLoop&) = delete;

    void Run() { g_main_loop_run(loop_); }
    void Quit() { g_main_loop_quit(loop_); }
    GMainLoop* get() const { return loop_; }

  private:
    GMainLoop* loop_;
};

// A source attached to the default main context, destroyed with this object. The callback is
// owned here; it returns true to keep the source, false to end it.
class Source {
  public:
    using Callback = std::function<bool()>;

    Source() = default;
    ~Source() { Remove(); }
    Source(Source&& other) noexcept
        : id_(std::exchange(other.id_, 0)),
          context_(std::exchange(other.context_, nullptr)),
          callback_(std::move(other.callback_)) {}
    Source& operator=(Source&& other) noexcept {
        if (this != &other) {
            Remove();
            id_ = std::exchange(other.id_, 0);
            context_ = std::exchange(other.context_, nullptr);
            callback_ = std::move(other.callback_);
        }
        return *this;
    }
    Source(const Source&) = delete;
    Source& operator=(const Source&) = delete;

    // Calls `callback` every `milliseconds` while it returns true.
    static Source Timeout(unsigned milliseconds, Callback callback);
    // Calls `callback` whenever the loop has nothing of default priority (or higher) to do.
    static Source Idle(Callback callback);
    // Calls `callback` in the loop when `signalNumber` (SIGTERM, SIGINT, SIGHUP, ...) arrives.
    static Source UnixSignal(int signalNumber, Callback callback);

    // Attached and not ended (a source whose callback returned false is no longer active).
    bool active() const;
    void Remove();

  private:
    static gboolean Dispatch(gpointer data);
    // Takes over `source` (one reference) and attaches it with `callback`.
    static Source Attach(GSource* source, Callback callback);

    guint id_ = 0;
    GMainContext* context_ = nullptr;  // where the source is attached
    // On the heap so that the address handed to GLib survives a move of this object.
    std::unique_ptr<Callback> callback_;
};

// Runs `work` on a thread of GLib's pool, then `done` in the main context of the calling thread
// (its loop must be running): for work that must not hold up a network loop, such as loading a
// library or writing a large reply. Whatever both capture must stay valid until `done` ran.
void RunInThread(std::function<void()> work, std::function<void()> done);

}  // namespace harmona::gupnp
