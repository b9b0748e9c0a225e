#include "platform/radio/StationDirectory.h"

#include <pugixml.hpp>

#include <cstring>
#include <set>

#include "common/util/Trim.h"
#include "common/util/Utf8.h"
#include "platform/radio/RadioStations.h"

namespace harmona::radio {

namespace {

bool IsTuneInBase(std::string_view base) {
    if (base.empty() || base.size() > kMaxTuneInBaseBytes || base[0] != '/' ||
        (base.size() > 1 && base[1] == '/'))
        return false;
    for (const char c : base) {
        const auto byte = static_cast<unsigned char>(c);
        if (byte <= 0x20 || byte >= 0x7f ||
            std::string_view("?#\\\"<>^`{|}").find(c) != std::string_view::npos)
            return false;
    }
    return true;
}

bool StartsWithNoCase(std::string_view text, std::string_view prefix) {
    if (text.size() < prefix.size())
        return false;
    for (std::size_t i = 0; i < prefix.size(); ++i) {
        char c = text[i];
        if (c >= 'A' && c <= 'Z')
            c = static_cast<char>(c - 'A' + 'a');
        if (c != prefix[i])
            return false;
    }
    return true;
}

}  // namespace

std::optional<std::string> CleanDirectoryText(std::string_view text) {
    if (!util::IsValidUtf8(text))
        return std::nullopt;
    std::string cleaned;
    cleaned.reserve(text.size() < 1024 ? text.size() : 1024);
    for (std::size_t i = 0; i < text.size();) {
        const std::size_t length = util::Utf8SequenceLength(text, i);
        if (length == 0)
            return std::nullopt;
        const char32_t c = util::DecodeUtf8(text, i, length);
        if (c < 0x20 || (c >= 0x7f && c <= 0x9f) || c == 0x2028 || c == 0x2029) {
            // One space for a run of control characters and spaces.
            if (!cleaned.empty() && cleaned.back() != ' ')
                cleaned += ' ';
        } else {
            cleaned.append(text.substr(i, length));
        }
        i += length;
        // Enough has been read to fill the bound once trimmed.
        if (cleaned.size() > 2 * kMaxDirectoryTextBytes)
            break;
    }
    std::string_view kept = util::Trim(cleaned, util::kAsciiWhiteSpace);
    kept = util::Trim(util::CutUtf8(kept, kMaxDirectoryTextBytes), util::kAsciiWhiteSpace);
    return std::string(kept);
}

DirectoryList ParseDirectoryList(std::string_view xml) {
    DirectoryList list;
    pugi::xml_document document;
    // No parse_doctype: a DTD is skipped, and pugixml never loads external entities.
    const pugi::xml_parse_result parsed =
        document.load_buffer(xml.data(), xml.size(), pugi::parse_default, pugi::encoding_utf8);
    if (!parsed)
        return list;
    const pugi::xml_node root = document.document_element();
    if (std::strcmp(root.name(), "stationlist") != 0)
        return list;
    list.tuneInBase = kDefaultTuneInBase;
    const pugi::xml_node tuneIn = root.child("tunein");
    if (tuneIn) {
        const std::string_view base = tuneIn.attribute("base").value();
        if (!IsTuneInBase(base))
            return list;
        list.tuneInBase = std::string(base);
    }
    list.valid = true;
    std::set<std::string> seen;
    for (const pugi::xml_node row : root.children("station")) {
        const std::string_view id = row.attribute("id").value();
        const std::optional<std::string> name = CleanDirectoryText(row.attribute("name").value());
        const std::optional<std::string> genre = CleanDirectoryText(row.attribute("genre").value());
        if (!ParseStationId(id) || !name || name->empty() || !genre ||
            !seen.insert(std::string(id)).second) {
            ++list.skipped;
            continue;
        }
        if (list.stations.size() == kMaxDirectoryStations) {
            ++list.skipped;
            continue;
        }
        DirectoryStation station;
        station.id = std::string(id);
        station.name = *name;
        station.genre = *genre;
        const std::string_view bitrate = row.attribute("br").value();
        if (!bitrate.empty() && bitrate.size() <= 5 &&
            bitrate.find_first_not_of("0123456789") == std::string_view::npos)
            station.bitrate = std::stol(std::string(bitrate));
        list.stations.push_back(std::move(station));
    }
    return list;
}

std::string UrlOrigin(std::string_view url) {
    if (!IsStationUrl(url))
        return {};
    const std::size_t hostStart = url.find("://") + 3;
    const std::size_t hostEnd = url.find_first_of("/?#", hostStart);
    return std::string(url.substr(0, hostEnd));
}

std::string TuneInUrl(std::string_view listUrl, std::string_view tuneInBase, std::string_view id) {
    const std::string origin = UrlOrigin(listUrl);
    if (origin.empty() || !IsTuneInBase(tuneInBase))
        return {};
    return origin + std::string(tuneInBase) + "?id=" + std::string(id);
}

std::optional<std::string> PlaylistStreamUrl(std::string_view pls) {
    std::size_t at = 0;
    while (at < pls.size()) {
        std::size_t end = pls.find('\n', at);
        if (end == std::string_view::npos)
            end = pls.size();
        const std::string_view line = util::Trim(pls.substr(at, end - at), util::kAsciiWhiteSpace);
        at = end + 1;
        const std::size_t equals = line.find('=');
        if (equals == std::string_view::npos)
            continue;
        const std::string_view key = util::Trim(line.substr(0, equals), util::kAsciiWhiteSpace);
        if (key.size() != 5 || !StartsWithNoCase(key, "file1"))
            continue;
        const std::string_view value = util::Trim(line.substr(equals + 1), util::kAsciiWhiteSpace);
        if (!IsStationUrl(value))
            return std::nullopt;
        return std::string(value);
    }
    return std::nullopt;
}

}  // namespace harmona::radio
