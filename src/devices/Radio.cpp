// The internet radio category's children: a new-station button, then the radio sources.
#include "src/handler/HarmonaHandler.h"

namespace {

// One radio source of the tree.
struct RadioSource {
    const char* id;         // node id; null ends the table
    const char* textKey;    // key of the display text in section "player"
    const char* iconFile;   // file name inside kRadioIconFolder
    const char* thumbnail;  // kept with the source, not used by the tree
};

constexpr const char* kThumbInetRadio = "3rdparty/Harmona/images/thumb/thumb_inetradio.png";

const RadioSource RadioSourceTable[] = {
    {"inetradio_sc", "player_source_shoutcast", "icon_inetradio.png", kThumbInetRadio},
    {"inetradio_rio", "player_source_radioio", "icon_inetradio.png", kThumbInetRadio},
    {"inetradio_userdefined", "player_source_userdefined", "icon_inetradio.png", kThumbInetRadio},
    // The favourites take their text from "def_radio_station", not a player_source_ key.
    {"inetradio_favorite", "def_radio_station", "icon_inetradio.png", kThumbInetRadio},
    {nullptr, nullptr, nullptr, nullptr},
};

constexpr const char* kRadioRootId = "inetradio_root";
constexpr const char* kNewStationIcon = "3rdparty/Harmona/images/button/btn_new_station.png";
constexpr const char* kRadioIconFolder = "3rdparty/Harmona/images/files_class/";

}  // namespace

int HarmonaHandler::AddRadioChildren(Json::Value& children) {
    Json::Value texts = LoadUITexts();
    Json::Value node;
    // The button's text is in section "radio"; the sources' texts are in section "player".
    FillTreeNode(node, "inetradio_new", kRadioRootId, texts["radio"]["new_radio_title"].asString(),
                 kNewStationIcon, NODE_LEAF);
    children.append(node);
    for (const RadioSource* source = RadioSourceTable; source->id != nullptr; ++source) {
        FillTreeNode(node, source->id, kRadioRootId, texts["player"][source->textKey].asString(),
                     std::string(kRadioIconFolder) + source->iconFile, NODE_LEAF);
        children.append(node);
    }
    return 1;
}
