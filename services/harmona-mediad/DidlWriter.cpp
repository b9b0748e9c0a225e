#include "services/harmona-mediad/DidlWriter.h"

#include <cstdio>
#include <cstring>

#include "common/util/XmlEscape.h"

namespace harmona::mediad {
namespace {

// Every value is written as well-formed XML text, whatever bytes the library holds.
using util::AppendXmlText;

constexpr std::string_view kTrackClassElement =
    "<upnp:class>object.item.audioItem.musicTrack</upnp:class>";

void AppendElement(std::string& out, const char* name, std::string_view text) {
    if (text.empty())
        return;
    out += '<';
    out += name;
    out += '>';
    AppendXmlText(out, text);
    out += "</";
    out += name;
    out += '>';
}

void AppendNumberElement(std::string& out, const char* name, int64_t value) {
    if (value > 0)
        AppendElement(out, name, std::to_string(value));
}

}  // namespace

std::string ProtocolInfo(const std::string& mimeType, const std::string& dlnaFeatures) {
    std::string out = "http-get:*:";
    AppendXmlText(out, mimeType);
    out += ':';
    AppendXmlText(out, dlnaFeatures.empty() ? "*" : dlnaFeatures);
    return out;
}

void AppendTrackItemBody(std::string& out, const TrackFields& track, std::string_view mediaBase) {
    out += "<dc:title>";
    AppendXmlText(out, track.title);
    out += "</dc:title>";
    out += kTrackClassElement;
    AppendElement(out, "dc:creator", track.artist);
    AppendElement(out, "upnp:artist", track.artist);
    AppendElement(out, "upnp:album", track.album);
    AppendElement(out, "upnp:genre", track.genre);
    if (track.year > 0 && track.year <= 9999)
        AppendElement(out, "dc:date", DateOfYear(track.year));
    char number[32];
    if (!track.artExtension.empty()) {
        out += "<upnp:albumArtURI>";
        out += mediaBase;
        out += "art/";
        out.append(number, static_cast<std::size_t>(std::snprintf(
                               number, sizeof number, "%lld", static_cast<long long>(track.id))));
        out += '.';
        out += track.artExtension;
        out += "</upnp:albumArtURI>";
    }
    AppendNumberElement(out, "upnp:originalTrackNumber", track.trackNo);
    if (track.id < 0)
        return;  // no stream name: no res
    out += "<res protocolInfo=\"";
    out += track.protocolInfo;
    out += '"';
    if (track.size >= 0) {
        out += " size=\"";
        out.append(number, static_cast<std::size_t>(std::snprintf(
                               number, sizeof number, "%lld", static_cast<long long>(track.size))));
        out += '"';
    }
    if (track.durationMs > 0) {
        out += " duration=\"";
        out += FormatDuration(track.durationMs);
        out += '"';
    }
    out += '>';
    out += mediaBase;
    out.append(number, static_cast<std::size_t>(std::snprintf(number, sizeof number, "%lld",
                                                              static_cast<long long>(track.id))));
    if (!track.streamExtension.empty()) {
        out += '.';
        out += track.streamExtension;
    }
    out += "</res>";
}

void AppendContainer(std::string& out, const ContainerFields& container,
                     std::string_view mediaBase) {
    out += "<container id=\"";
    AppendXmlText(out, container.id);
    out += "\" parentID=\"";
    AppendXmlText(out, container.parentId);
    out += "\" restricted=\"1\" childCount=\"";
    char number[32];
    out.append(number,
               static_cast<std::size_t>(std::snprintf(
                   number, sizeof number, "%lld", static_cast<long long>(container.childCount))));
    out += "\" searchable=\"0\"><dc:title>";
    AppendXmlText(out, container.title);
    out += "</dc:title><upnp:class>";
    AppendXmlText(out, container.upnpClass);
    out += "</upnp:class>";
    AppendElement(out, "dc:creator", container.artist);
    AppendElement(out, "upnp:artist", container.artist);
    if (container.year > 0 && container.year <= 9999)
        AppendElement(out, "dc:date", DateOfYear(container.year));
    if (!container.artExtension.empty()) {
        out += "<upnp:albumArtURI>";
        out += mediaBase;
        out += "art/";
        out.append(number,
                   static_cast<std::size_t>(std::snprintf(
                       number, sizeof number, "%lld", static_cast<long long>(container.artTrack))));
        out += '.';
        out += container.artExtension;
        out += "</upnp:albumArtURI>";
    }
    out += "</container>";
}

std::string DateOfYear(int64_t year) {
    if (year <= 0 || year > 9999)
        return {};
    char text[16];
    std::snprintf(text, sizeof(text), "%04d-01-01", static_cast<int>(year));
    return text;
}

void AppendItemStart(std::string& out, std::string_view id, std::string_view parentId,
                     std::string_view refId) {
    out += "<item id=\"";
    out += id;
    out += "\" parentID=\"";
    out += parentId;
    out += '"';
    if (!refId.empty()) {
        out += " refID=\"";
        out += refId;
        out += '"';
    }
    out += " restricted=\"1\">";
}

std::string FormatDuration(int64_t milliseconds) {
    char text[48];
    const int64_t seconds = milliseconds / 1000;
    std::snprintf(text, sizeof(text), "%lld:%02lld:%02lld.%03lld",
                  static_cast<long long>(seconds / 3600), static_cast<long long>(seconds / 60 % 60),
                  static_cast<long long>(seconds % 60),
                  static_cast<long long>(milliseconds % 1000));
    return text;
}

}  // namespace harmona::mediad
