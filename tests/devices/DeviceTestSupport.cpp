#include "tests/devices/DeviceTestSupport.h"

#include <cstdlib>

#include "tests/harness/Fixtures.h"

namespace harmona::test {

void WriteDeviceFixture() {
    WriteFile(std::string(kTextsDir) + "enu/strings",
              std::string("[player]\n") + "refresh_btn_title=" + kRefreshButtonText + "\n" +
                  "player_source_shoutcast=" + kShoutcastText + "\n" + "player_source_radioio=" +
                  kRadioIoText + "\n" + "player_source_userdefined=" + kUserDefinedText + "\n" +
                  "def_radio_station=" + kFavoriteText + "\n" +
                  "player_source_favorite=wrong key for the favourites\n" +
                  "new_radio_title=wrong section for the button\n" + "\n[radio]\n" +
                  "radio=Internet Radio\n" + "new_radio_title=" + kNewStationText + "\n" +
                  "player_source_shoutcast=wrong section for a source\n" +
                  "def_radio_station=wrong section for the favourites\n" +
                  "refresh_btn_title=wrong section for the iPod button\n");
    AddUser("admin", 1 | 4 | 8 | 16, "enu");
}

std::unique_ptr<HarmonaHandler> MakeHandler() {
    setenv("REMOTE_USER", "admin", 1);
    unsetenv("HTTP_ACCEPT_LANGUAGE");
    unsetenv("QUERY_STRING");
    unsetenv("REQUEST_METHOD");
    return std::make_unique<HarmonaHandler>();
}

std::string Text(const Json::Value& node, const char* member) {
    return node.isObject() && node.isMember(member) ? node[member].asString() : "";
}

bool Has(const Json::Value& node, const char* member) {
    return node.isObject() && node.isMember(member);
}

}  // namespace harmona::test
