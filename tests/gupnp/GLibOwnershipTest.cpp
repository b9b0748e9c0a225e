// The GLib wrappers give back every reference, handler and source exactly once, also when the
// object they refer to went first.
#include <gtest/gtest.h>

#include "platform/lib/gupnp/MainLoop.h"
#include "platform/lib/gupnp/Object.h"
#include "platform/lib/gupnp/Signal.h"

namespace {

using harmona::gupnp::Chars;
using harmona::gupnp::Error;
using harmona::gupnp::ObjectRef;
using harmona::gupnp::SignalConnection;
using harmona::gupnp::Source;

// Watches an object's finalization.
struct FinalizeWatch {
    explicit FinalizeWatch(GObject* object) { g_object_weak_ref(object, &Notify, this); }
    static void Notify(gpointer data, GObject*) {
        static_cast<FinalizeWatch*>(data)->finalized = true;
    }
    bool finalized = false;
};

TEST(GLibOwnership, ObjectRefDropsItsReferenceOnceAcrossMoves) {
    auto* object = static_cast<GObject*>(g_object_new(G_TYPE_OBJECT, nullptr));
    FinalizeWatch watch(object);
    {
        auto first = ObjectRef<GObject>::Adopt(object);
        ObjectRef<GObject> second = std::move(first);
        EXPECT_FALSE(first);
        EXPECT_EQ(second.get(), object);
        EXPECT_FALSE(watch.finalized);
    }
    EXPECT_TRUE(watch.finalized);
}

TEST(GLibOwnership, SharedReferenceKeepsTheObjectAliveAfterItsOwnerLetGo) {
    auto* object = static_cast<GObject*>(g_object_new(G_TYPE_OBJECT, nullptr));
    FinalizeWatch watch(object);
    auto shared = ObjectRef<GObject>::Share(object);
    g_object_unref(object);
    EXPECT_FALSE(watch.finalized);
    shared.Reset();
    EXPECT_TRUE(watch.finalized);
}

TEST(GLibOwnership, AdoptingAFloatingObjectSinksIt) {
    auto* floating = static_cast<GObject*>(g_object_new(G_TYPE_INITIALLY_UNOWNED, nullptr));
    ASSERT_TRUE(g_object_is_floating(floating));
    FinalizeWatch watch(floating);
    auto owned = ObjectRef<GObject>::Adopt(floating);
    EXPECT_FALSE(g_object_is_floating(floating));
    owned.Reset();
    EXPECT_TRUE(watch.finalized);
}

void CountNotify(GObject*, GParamSpec*, gpointer data) {
    ++*static_cast<int*>(data);
}

TEST(GLibOwnership, SignalHandlerIsDisconnectedWithItsConnection) {
    auto object =
        ObjectRef<GObject>::Adopt(static_cast<GObject*>(g_object_new(G_TYPE_OBJECT, nullptr)));
    int calls = 0;
    {
        SignalConnection connection(object.get(), "notify", G_CALLBACK(CountNotify), &calls);
        ASSERT_TRUE(connection);
        g_object_notify(object.get(), "nonexistent-is-ignored");
        SignalConnection moved = std::move(connection);
        EXPECT_FALSE(connection);
        EXPECT_TRUE(moved);
    }
    const guint remaining = g_signal_handlers_disconnect_matched(object.get(), G_SIGNAL_MATCH_DATA,
                                                                 0, 0, nullptr, nullptr, &calls);
    EXPECT_EQ(remaining, 0u);
}

TEST(GLibOwnership, ConnectionOutlivingItsInstanceIsHarmless) {
    auto* object = static_cast<GObject*>(g_object_new(G_TYPE_OBJECT, nullptr));
    FinalizeWatch watch(object);
    int calls = 0;
    SignalConnection connection(object, "notify", G_CALLBACK(CountNotify), &calls);
    g_object_unref(object);
    ASSERT_TRUE(watch.finalized);
    connection.Disconnect();
    EXPECT_FALSE(connection);
}

TEST(GLibOwnership, TimeoutSourceRunsUntilItsCallbackSaysStop) {
    GMainLoop* loop = g_main_loop_new(nullptr, FALSE);
    int ticks = 0;
    Source timer = Source::Timeout(1, [&] {
        if (++ticks < 3)
            return true;
        g_main_loop_quit(loop);
        return false;
    });
    Source guard = Source::Timeout(5000, [&] {
        g_main_loop_quit(loop);
        return false;
    });
    g_main_loop_run(loop);
    EXPECT_EQ(ticks, 3);
    EXPECT_FALSE(timer.active());  // ended by its callback
    EXPECT_TRUE(guard.active());
    timer.Remove();  // already ended by its callback: must not warn or remove another source
    guard.Remove();
    EXPECT_FALSE(guard.active());
    g_main_loop_unref(loop);
}

TEST(GLibOwnership, RemovedSourceNeverCallsBack) {
    bool called = false;
    {
        Source timer = Source::Timeout(0, [&] {
            called = true;
            return false;
        });
    }
    while (g_main_context_iteration(nullptr, FALSE)) {
    }
    EXPECT_FALSE(called);
}

TEST(GLibOwnership, ErrorAndCharsFreeWhatGLibAllocated) {
    Error error;
    gchar* contents = nullptr;
    EXPECT_FALSE(g_file_get_contents("/nonexistent/file", &contents, nullptr, error.out()));
    EXPECT_EQ(contents, nullptr);
    EXPECT_TRUE(error);
    EXPECT_NE(std::string(error.message()), "");
    Chars text(g_strdup("kept until the end of scope"));
    EXPECT_STREQ(text.c_str(), "kept until the end of scope");
}

}  // namespace
