#include "platform/plugin/Plugin.h"

#include <dlfcn.h>
#include <limits.h>
#include <unistd.h>

namespace harmona::plugin {

Plugin::~Plugin() {
    if (handle_ != nullptr)
        dlclose(handle_);
}

Plugin& Plugin::operator=(Plugin&& other) noexcept {
    if (this != &other) {
        if (handle_ != nullptr)
            dlclose(handle_);
        handle_ = other.handle_;
        error_ = std::move(other.error_);
        other.handle_ = nullptr;
    }
    return *this;
}

std::string ProgramDirectory() {
    char path[PATH_MAX];
    const ssize_t n = readlink("/proc/self/exe", path, sizeof(path) - 1);
    if (n <= 0)
        return "";
    const std::string program(path, static_cast<std::size_t>(n));
    const std::size_t slash = program.rfind('/');
    return slash == std::string::npos ? "" : program.substr(0, slash + 1);
}

Plugin Plugin::OpenBesideProgram(const char* fileName) {
    Plugin plugin;
    const std::string directory = ProgramDirectory();
    if (directory.empty()) {
        plugin.error_ = "cannot locate the running program";
        return plugin;
    }
    const std::string path = directory + fileName;
    plugin.handle_ = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (plugin.handle_ == nullptr) {
        const char* error = dlerror();
        plugin.error_ = error != nullptr ? error : ("cannot load " + path);
    }
    return plugin;
}

void* Plugin::Symbol(const char* symbol) const {
    return handle_ != nullptr ? dlsym(handle_, symbol) : nullptr;
}

}  // namespace harmona::plugin
