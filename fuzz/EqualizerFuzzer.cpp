// Fuzzes the equalizer profile reader (LoadEqualizerProfile) over a profile file of any bytes (an
// in-memory file, so that nothing is written to disk). The first input line is the label looked up.
#include <sys/mman.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>

#include "src/daemonclient/AudioDaemon.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string input(reinterpret_cast<const char*>(data), size);
    const std::size_t newline = input.find('\n');
    const std::string label = input.substr(0, std::min(newline, input.find('\0')));
    const std::string file = newline == std::string::npos ? "" : input.substr(newline + 1);

    const int fd = memfd_create("equalizer", MFD_CLOEXEC);
    if (fd < 0)
        std::abort();
    if (!file.empty() && write(fd, file.data(), file.size()) != static_cast<ssize_t>(file.size()))
        std::abort();
    const std::string path = "/proc/self/fd/" + std::to_string(fd);

    char value[64];
    std::memset(value, 'x', sizeof(value));
    const int found = LoadEqualizerProfile(path.c_str(), label.c_str(), value, sizeof(value));
    if (found < -1 || found > 1)
        std::abort();
    if (found == 1 && std::memchr(value, '\0', sizeof(value)) == nullptr)
        std::abort();  // bounded
    close(fd);
    return 0;
}
