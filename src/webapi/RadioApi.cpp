#include "src/webapi/RadioApi.h"

#include <syslog.h>

#include <cstring>

#include "platform/radio/RadioStations.h"
#include "src/webapi/ApiError.h"
#include "src/webapi/RadioDirectory.h"

namespace harmona::webapi {

namespace {

inline constexpr std::string_view kUserDefinedNode = "inetradio_userdefined";
inline constexpr std::string_view kFavoriteNode = "inetradio_favorite";

inline constexpr std::string_view kAddAction = "radio_add";
inline constexpr std::string_view kRemoveAction = "radio_remove";
inline constexpr std::string_view kFavoriteAction = "radio_favorite";

// The errors, with fixed line numbers that log readers match on (401 and 411 on are the
// directories', RadioDirectory.cpp).
constexpr ApiError kStationsUnreadable{kStatusServerError, kSystemSection, kSystemText, 402,
                                       "stations_unreadable"};
constexpr ApiError kNotPost{kStatusMethodNotAllowed, kSystemSection, kSystemText, 403,
                            "method_not_allowed"};
constexpr ApiError kNameInvalid{kStatusBadRequest, kSystemSection, kSystemText, 404,
                                "name_invalid"};
constexpr ApiError kUrlInvalid{kStatusBadRequest, kSystemSection, kSystemText, 405, "url_invalid"};
constexpr ApiError kStationInvalid{kStatusBadRequest, kNotFoundSection, kNotFoundText, 406,
                                   "station_invalid"};
constexpr ApiError kStationNotFound{kStatusNotFound, kNotFoundSection, kNotFoundText, 407,
                                    "station_not_found"};
constexpr ApiError kFavoriteInvalid{kStatusBadRequest, kSystemSection, kSystemText, 408,
                                    "favorite_invalid"};
constexpr ApiError kStationsFull{kStatusConflict, kSystemSection, kSystemText, 409,
                                 "stations_full"};
constexpr ApiError kStationsUnwritable{kStatusServerError, kSystemSection, kSystemText, 410,
                                       "stations_unwritable"};

Json::Value StationRow(const radio::Station& station) {
    Json::Value row(Json::objectValue);
    row["station"] = std::to_string(station.id);
    row["title"] = station.name;
    row["artist"] = "";
    row["album"] = "";
    row["duration"] = -1;
    row["url"] = station.url;
    row["favorite"] = station.favorite;
    return row;
}

int AnswerChange(ActionHandler& handler, WebMan& webMan, radio::ChangeOutcome outcome,
                 Json::Value reply) {
    switch (outcome) {
        case radio::ChangeOutcome::ok:
            reply["success"] = true;
            handler.PrintResponse(std::move(reply), kJsonReplyType);
            return 1;
        case radio::ChangeOutcome::notFound:
            return AnswerError(handler, webMan, kStationNotFound);
        case radio::ChangeOutcome::full:
            return AnswerError(handler, webMan, kStationsFull);
        case radio::ChangeOutcome::unwritable:
            break;
    }
    syslog(LOG_ERR, "radio: cannot write the stations of %s", webMan.GetLoginUserName().c_str());
    return AnswerError(handler, webMan, kStationsUnwritable);
}

int AddStation(ActionHandler& handler, WebMan& webMan) {
    const std::optional<std::string> name = radio::CleanStationName(webMan.In("name", ""));
    if (!name)
        return AnswerError(handler, webMan, kNameInvalid);
    const std::string url = webMan.In("url", "");
    if (!radio::IsStationUrl(url))
        return AnswerError(handler, webMan, kUrlInvalid);
    radio::Station added;
    const radio::ChangeOutcome outcome =
        radio::AddStation(webMan.GetPreferenceDir(), *name, url, added);
    Json::Value reply(Json::objectValue);
    if (outcome == radio::ChangeOutcome::ok)
        reply["station"] = StationRow(added);
    return AnswerChange(handler, webMan, outcome, std::move(reply));
}

int ChangeStation(ActionHandler& handler, WebMan& webMan, std::string_view action) {
    const std::optional<std::uint32_t> id = radio::ParseStationId(webMan.In("station", ""));
    if (!id)
        return AnswerError(handler, webMan, kStationInvalid);
    if (action == kRemoveAction)
        return AnswerChange(handler, webMan, radio::RemoveStation(webMan.GetPreferenceDir(), *id),
                            Json::Value(Json::objectValue));
    const char* favorite = webMan.In("favorite", "");
    if (std::strcmp(favorite, "1") != 0 && std::strcmp(favorite, "0") != 0)
        return AnswerError(handler, webMan, kFavoriteInvalid);
    return AnswerChange(handler, webMan,
                        radio::SetFavorite(webMan.GetPreferenceDir(), *id, favorite[0] == '1'),
                        Json::Value(Json::objectValue));
}

}  // namespace

bool IsRadioNode(std::string_view node) {
    return node == kUserDefinedNode || node == kFavoriteNode || IsDirectoryNode(node);
}

int ListRadioNode(ActionHandler& handler, WebMan& webMan, const std::string& node,
                  Json::Value& reply) {
    if (IsDirectoryNode(node))
        return ListDirectory(handler, webMan, node, reply);
    const radio::StationList list = radio::ReadStations(webMan.GetPreferenceDir());
    if (list.status != radio::ReadStatus::ok)
        return AnswerError(handler, webMan, kStationsUnreadable);
    const bool favoritesOnly = node == kFavoriteNode;
    Json::Value& tracks = reply["tracks"];
    for (const radio::Station& station : list.stations)
        if (!favoritesOnly || station.favorite)
            tracks.append(StationRow(station));
    return 1;
}

bool IsRadioAction(std::string_view action) {
    return action == kAddAction || action == kRemoveAction || action == kFavoriteAction ||
           action == kTuneInAction;
}

int ServeRadioAction(ActionHandler& handler, WebMan& webMan, std::string_view action) {
    // Tuning in changes nothing: the page's audio element asks for it with a GET.
    if (action == kTuneInAction)
        return ServeTuneIn(handler, webMan);
    if (!IsPostRequest())
        return AnswerError(handler, webMan, kNotPost);
    if (action == kAddAction)
        return AddStation(handler, webMan);
    return ChangeStation(handler, webMan, action);
}

}  // namespace harmona::webapi
