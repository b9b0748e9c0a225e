#include "DidlWriter.h"

#include <pugixml.hpp>

#include <cstdio>
#include <sstream>

#include "Utf8.h"

namespace harmona::mediad {
namespace {

std::string XmlSafe(const std::string& text) {
    std::string safe = cgi::IsValidUtf8(text) ? text : cgi::RepairUtf8(text);
    for (char& c : safe) {
        const unsigned char byte = static_cast<unsigned char>(c);
        if (byte < 0x20 && c != '\t' && c != '\n' && c != '\r')
            c = ' ';
    }
    return safe;
}

void AddText(pugi::xml_node parent, const char* name, const std::string& text) {
    if (!text.empty())
        parent.append_child(name).text().set(XmlSafe(text).c_str());
}

void AddObject(pugi::xml_node didl, const DidlObject& object) {
    pugi::xml_node node = didl.append_child(object.container ? "container" : "item");
    node.append_attribute("id").set_value(XmlSafe(object.id).c_str());
    node.append_attribute("parentID").set_value(XmlSafe(object.parentId).c_str());
    node.append_attribute("restricted").set_value("1");
    if (object.container && object.childCount >= 0)
        node.append_attribute("childCount").set_value(static_cast<long long>(object.childCount));
    node.append_child("dc:title").text().set(XmlSafe(object.title).c_str());
    node.append_child("upnp:class").text().set(object.upnpClass.c_str());
    AddText(node, "upnp:artist", object.artist);
    AddText(node, "upnp:album", object.album);
    AddText(node, "upnp:genre", object.genre);
    if (object.container)
        return;
    if (object.trackNo > 0)
        node.append_child("upnp:originalTrackNumber")
            .text()
            .set(static_cast<long long>(object.trackNo));
    if (object.resUrl.empty())
        return;
    pugi::xml_node res = node.append_child("res");
    res.append_attribute("protocolInfo")
        .set_value(("http-get:*:" + object.mimeType + ":*").c_str());
    if (object.durationMs > 0)
        res.append_attribute("duration").set_value(FormatDuration(object.durationMs).c_str());
    res.text().set(object.resUrl.c_str());
}

struct StringWriter : pugi::xml_writer {
    std::string out;
    void write(const void* data, size_t size) override {
        out.append(static_cast<const char*>(data), size);
    }
};

}  // namespace

std::string FormatDuration(int64_t milliseconds) {
    char text[48];
    const int64_t seconds = milliseconds / 1000;
    std::snprintf(text, sizeof(text), "%lld:%02lld:%02lld.%03lld",
                  static_cast<long long>(seconds / 3600), static_cast<long long>(seconds / 60 % 60),
                  static_cast<long long>(seconds % 60),
                  static_cast<long long>(milliseconds % 1000));
    return text;
}

std::string WriteDidl(const std::vector<DidlObject>& objects) {
    pugi::xml_document document;
    pugi::xml_node didl = document.append_child("DIDL-Lite");
    didl.append_attribute("xmlns").set_value("urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/");
    didl.append_attribute("xmlns:dc").set_value("http://purl.org/dc/elements/1.1/");
    didl.append_attribute("xmlns:upnp").set_value("urn:schemas-upnp-org:metadata-1-0/upnp/");
    for (const DidlObject& object : objects)
        AddObject(didl, object);
    StringWriter writer;
    writer.out.reserve(256 + objects.size() * 400);
    document.save(writer, "", pugi::format_raw | pugi::format_no_declaration);
    return writer.out;
}

}  // namespace harmona::mediad
