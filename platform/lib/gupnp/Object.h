// Ownership of GLib and GObject values, in the manner of MPD's src/lib/ wrappers: one class owns
// one reference (or one allocation) and gives it back exactly once, moves but never copies.
#pragma once

#include <glib-object.h>

#include <utility>

namespace harmona::gupnp {

// One reference to a GObject (or any type derived from it).
template <typename T>
class ObjectRef {
  public:
    ObjectRef() = default;
    ~ObjectRef() { Reset(); }
    ObjectRef(ObjectRef&& other) noexcept : object_(std::exchange(other.object_, nullptr)) {}
    ObjectRef& operator=(ObjectRef&& other) noexcept {
        std::swap(object_, other.object_);
        return *this;
    }
    ObjectRef(const ObjectRef&) = delete;
    ObjectRef& operator=(const ObjectRef&) = delete;

    // Takes over a reference the caller owns (a "transfer full" return value). A floating
    // reference is sunk first, so that the object is owned here and nowhere else.
    static ObjectRef Adopt(T* object) {
        ObjectRef ref;
        if (object != nullptr && g_object_is_floating(object))
            g_object_ref_sink(object);
        ref.object_ = object;
        return ref;
    }
    // Adds a reference of its own to an object that somebody else owns ("transfer none").
    static ObjectRef Share(T* object) {
        ObjectRef ref;
        ref.object_ = object != nullptr ? static_cast<T*>(g_object_ref(object)) : nullptr;
        return ref;
    }

    T* get() const { return object_; }
    explicit operator bool() const { return object_ != nullptr; }

    // Gives the reference up to a caller that will unref it.
    T* Release() { return std::exchange(object_, nullptr); }
    void Reset() {
        if (object_ != nullptr)
            g_object_unref(std::exchange(object_, nullptr));
    }

  private:
    T* object_ = nullptr;
};

// A GError that the callee filled; freed here. Pass `out()` as the GError** argument.
class Error {
  public:
    Error() = default;
    ~Error() { Clear(); }
    Error(Error&& other) noexcept : error_(std::exchange(other.error_, nullptr)) {}
    Error& operator=(Error&& other) noexcept {
        std::swap(error_, other.error_);
        return *this;
    }
    Error(const Error&) = delete;
    Error& operator=(const Error&) = delete;

    GError** out() {
        Clear();
        return &error_;
    }
    explicit operator bool() const { return error_ != nullptr; }
    const GError* get() const { return error_; }
    const char* message() const { return error_ != nullptr ? error_->message : ""; }
    void Clear() {
        if (error_ != nullptr)
            g_error_free(std::exchange(error_, nullptr));
    }

  private:
    GError* error_ = nullptr;
};

// A string or block that GLib allocated and the caller must g_free.
class Chars {
  public:
    Chars() = default;
    explicit Chars(char* owned) : chars_(owned) {}
    ~Chars() { g_free(chars_); }
    Chars(Chars&& other) noexcept : chars_(std::exchange(other.chars_, nullptr)) {}
    Chars& operator=(Chars&& other) noexcept {
        std::swap(chars_, other.chars_);
        return *this;
    }
    Chars(const Chars&) = delete;
    Chars& operator=(const Chars&) = delete;

    const char* get() const { return chars_; }
    const char* c_str() const { return chars_ != nullptr ? chars_ : ""; }
    explicit operator bool() const { return chars_ != nullptr; }

  private:
    char* chars_ = nullptr;
};

}  // namespace harmona::gupnp
