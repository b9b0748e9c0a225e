// A shared object loaded on demand, beside the running program. Heavy C libraries (libcurl with
// its TLS stack, libgpod with GLib) live in such plugins, so that the requests that do not need
// them do not pay for loading them at every process start.
#pragma once

#include <string>

namespace harmona::plugin {

// Move-only owner of a dlopen handle.
class Plugin {
  public:
    Plugin() = default;
    ~Plugin();
    Plugin(Plugin&& other) noexcept : handle_(other.handle_) { other.handle_ = nullptr; }
    Plugin& operator=(Plugin&& other) noexcept;
    Plugin(const Plugin&) = delete;
    Plugin& operator=(const Plugin&) = delete;

    // Loads `fileName` from the folder of the running program (/proc/self/exe); an empty Plugin
    // when it cannot be loaded (the reason is in Error()).
    static Plugin OpenBesideProgram(const char* fileName);

    explicit operator bool() const { return handle_ != nullptr; }

    // The address of `symbol`, or nullptr.
    void* Symbol(const char* symbol) const;

    template <typename Function>
    Function* Get(const char* symbol) const {
        return reinterpret_cast<Function*>(Symbol(symbol));
    }

    const std::string& Error() const { return error_; }

  private:
    void* handle_ = nullptr;
    std::string error_;
};

// The folder that holds the running program, with a trailing '/'; empty when unknown.
std::string ProgramDirectory();

}  // namespace harmona::plugin
