#include "platform/medialib/StreamName.h"

#include "common/util/Number.h"

namespace harmona::medialib {
namespace {

constexpr std::string_view kHttpScheme = "http://";

bool IsStreamExtension(std::string_view text) {
    return !text.empty() && text.size() <= kMaxStreamExtensionLength &&
           text.find_first_not_of("abcdefghijklmnopqrstuvwxyz0123456789") == std::string_view::npos;
}

}  // namespace

std::optional<StreamName> ParseStreamName(std::string_view name) {
    const std::size_t dot = name.find('.');
    StreamName parsed;
    if (dot != std::string_view::npos) {
        const std::string_view extension = name.substr(dot + 1);
        if (!IsStreamExtension(extension))
            return std::nullopt;
        parsed.extension = std::string(extension);
    }
    const std::string_view digits = name.substr(0, dot);
    static_assert(kMaxStreamIdDigits == 18, "ParseDecimalDigits takes 1 to 18 digits");
    if (!util::ParseDecimalDigits(digits, parsed.trackId))
        return std::nullopt;
    return parsed;
}

std::string StreamExtensionOf(const std::string& path) {
    std::string extension = LowerExtension(path);
    if (!IsStreamExtension(extension))
        extension.clear();
    return extension;
}

std::optional<std::string> StreamNameOf(std::int64_t trackId, const std::string& path) {
    if (trackId < 0)
        return std::nullopt;
    const std::string extension = StreamExtensionOf(path);
    return extension.empty() ? std::to_string(trackId) : std::to_string(trackId) + "." + extension;
}

std::optional<std::int64_t> TrackIdOfLocalResource(std::string_view url) {
    if (url.substr(0, kHttpScheme.size()) != kHttpScheme)
        return std::nullopt;
    const std::size_t path = url.find('/', kHttpScheme.size());
    if (path == std::string_view::npos || url.substr(path, kMediaUrlPath.size()) != kMediaUrlPath)
        return std::nullopt;
    const std::optional<StreamName> name = ParseStreamName(url.substr(path + kMediaUrlPath.size()));
    if (!name)
        return std::nullopt;
    return name->trackId;
}

}  // namespace harmona::medialib
