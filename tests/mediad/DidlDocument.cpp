#include "tests/mediad/DidlDocument.h"

#include <libgupnp-av/gupnp-av.h>
#include <libxml/parser.h>
#include <libxml/xmlerror.h>

#include <pugixml.hpp>

#include "platform/lib/gupnp/Object.h"
#include "platform/lib/gupnp/Signal.h"

namespace harmona::test::mediad {
namespace {

std::string ChildText(pugi::xml_node node, const char* name) {
    return node.child(name).text().get();
}

DidlObjectRecord ReadObject(pugi::xml_node node) {
    DidlObjectRecord object;
    object.container = std::string(node.name()) == "container";
    object.id = node.attribute("id").value();
    object.parentId = node.attribute("parentID").value();
    object.refId = node.attribute("refID").value();
    if (pugi::xml_attribute count = node.attribute("childCount"))
        object.childCount = count.as_llong(-1);
    object.title = ChildText(node, "dc:title");
    object.upnpClass = ChildText(node, "upnp:class");
    object.creator = ChildText(node, "dc:creator");
    object.artist = ChildText(node, "upnp:artist");
    object.album = ChildText(node, "upnp:album");
    object.genre = ChildText(node, "upnp:genre");
    object.date = ChildText(node, "dc:date");
    object.albumArtUri = ChildText(node, "upnp:albumArtURI");
    object.trackNumber = ChildText(node, "upnp:originalTrackNumber");
    pugi::xml_node res = node.child("res");
    object.res = res.text().get();
    object.protocolInfo = res.attribute("protocolInfo").value();
    object.size = res.attribute("size").value();
    object.duration = res.attribute("duration").value();
    return object;
}

// Collects libxml2's messages while it lives (libxml2 keeps one handler per thread).
class Libxml2Messages {
  public:
    Libxml2Messages() { xmlSetStructuredErrorFunc(this, &Libxml2Messages::Collect); }
    ~Libxml2Messages() { xmlSetStructuredErrorFunc(nullptr, nullptr); }
    const std::string& text() const { return text_; }

  private:
    static void Collect(void* self, xmlErrorPtr error) {
        auto* messages = static_cast<Libxml2Messages*>(self);
        if (error != nullptr && error->message != nullptr)
            messages->text_ += error->message;
    }
    std::string text_;
};

std::string Text(const char* text) {
    return text != nullptr ? text : "";
}

void OnObjectAvailable(GUPnPDIDLLiteParser*, GUPnPDIDLLiteObject* object, gpointer data) {
    auto* objects = static_cast<std::vector<DidlObjectRecord>*>(data);
    DidlObjectRecord record;
    record.container = GUPNP_IS_DIDL_LITE_CONTAINER(object);
    record.id = Text(gupnp_didl_lite_object_get_id(object));
    record.parentId = Text(gupnp_didl_lite_object_get_parent_id(object));
    record.title = Text(gupnp_didl_lite_object_get_title(object));
    record.upnpClass = Text(gupnp_didl_lite_object_get_upnp_class(object));
    if (GUPNP_IS_DIDL_LITE_ITEM(object))
        record.refId = Text(gupnp_didl_lite_item_get_ref_id(GUPNP_DIDL_LITE_ITEM(object)));
    if (GUPNP_IS_DIDL_LITE_CONTAINER(object))
        record.childCount =
            gupnp_didl_lite_container_get_child_count(GUPNP_DIDL_LITE_CONTAINER(object));
    objects->push_back(std::move(record));
}

}  // namespace

bool ParsesStrictlyWithLibxml2(const std::string& didl, std::string* error) {
    Libxml2Messages messages;
    xmlDocPtr document = xmlReadMemory(didl.data(), static_cast<int>(didl.size()), "didl.xml",
                                       nullptr, XML_PARSE_NONET | XML_PARSE_HUGE);
    const bool parsed = document != nullptr && messages.text().empty();
    if (document != nullptr)
        xmlFreeDoc(document);
    *error = messages.text();
    return parsed;
}

GupnpAvDocument ParseWithGupnpAv(const std::string& didl) {
    GupnpAvDocument result;
    Libxml2Messages messages;
    auto parser = gupnp::ObjectRef<GUPnPDIDLLiteParser>::Adopt(gupnp_didl_lite_parser_new());
    gupnp::SignalConnection available(parser.get(), "object-available",
                                      G_CALLBACK(OnObjectAvailable), &result.objects);
    gupnp::Error error;
    result.parsed = gupnp_didl_lite_parser_parse_didl(parser.get(), didl.c_str(), error.out());
    result.messages = messages.text() + error.message();
    return result;
}

DidlDocument ParseDidl(const std::string& didl) {
    DidlDocument document;
    pugi::xml_document xml;
    const pugi::xml_parse_result result = xml.load_buffer(didl.data(), didl.size());
    if (!result) {
        document.error = result.description();
        return document;
    }
    pugi::xml_node root = xml.child("DIDL-Lite");
    if (!root) {
        document.error = "no DIDL-Lite element";
        return document;
    }
    document.parsed = true;
    for (pugi::xml_node node : root.children())
        document.objects.push_back(ReadObject(node));
    return document;
}

bool IsStrictXmlText(const std::string& text) {
    for (std::size_t i = 0; i < text.size();) {
        const auto byte = [&](std::size_t k) { return static_cast<unsigned char>(text[i + k]); };
        char32_t code = byte(0);
        std::size_t length = 1;
        if (code >= 0xF0) {
            length = 4;
            code &= 0x07;
        } else if (code >= 0xE0) {
            length = 3;
            code &= 0x0F;
        } else if (code >= 0xC0) {
            length = 2;
            code &= 0x1F;
        } else if (code >= 0x80) {
            return false;
        }
        if (i + length > text.size())
            return false;
        for (std::size_t k = 1; k < length; ++k) {
            if ((byte(k) & 0xC0) != 0x80)
                return false;
            code = (code << 6) | (byte(k) & 0x3F);
        }
        const bool allowed =
            code == 0x9 || code == 0xA || code == 0xD || (code >= 0x20 && code <= 0xD7FF) ||
            (code >= 0xE000 && code <= 0xFFFD) || (code >= 0x10000 && code <= 0x10FFFF);
        const bool nonCharacter = (code >= 0xFDD0 && code <= 0xFDEF) || (code & 0xFFFE) == 0xFFFE;
        if (!allowed || nonCharacter)
            return false;
        i += length;
    }
    return true;
}

}  // namespace harmona::test::mediad
