#include "src/webapi/LibraryApi.h"

#include <chrono>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <string_view>

#include "platform/cgi/ApplicationRequest.h"
#include "platform/dma/DMABrowse.h"
#include "platform/dma/DMAParser.h"
#include "platform/dma/SoapBrowse.h"
#include "platform/medialib/MediaFiles.h"
#include "platform/medialib/StreamName.h"
#include "platform/paths/PlatformPaths.h"
#include "platform/playlist/PlaylistFile.h"
#include "platform/playlist/PlaylistList.h"
#include "platform/texts/LocalizedStringParser.h"
#include "src/daemonclient/MediaServerList.h"
#include "src/webapi/ApiError.h"
#include "src/webapi/CoverArt.h"
#include "src/webapi/Failure.h"
#include "src/webapi/PlaylistEdit.h"
#include "src/webapi/RadioApi.h"
#include "src/webapi/RemoteMedia.h"
#include "src/webapi/SearchAction.h"
#include "src/webapi/ServiceProbe.h"
#include "src/webapi/UserLanguage.h"

namespace harmona::webapi {

namespace {

// The error replies: the kind of failure (its HTTP status and "error" code, Failure.h), the UI
// text shown, and a fixed line number that log readers and the page match on.

// Tree node ids of what the page lists (the ids the tree CGI hands out).
inline constexpr std::string_view kLibraryPrefix = "musiclib_";
inline constexpr std::string_view kPersonalPrefix = "musiclib_music_personal/playlist/";
inline constexpr std::string_view kSharedPrefix = "musiclib_music_shared/playlist/";
// The playlist categories (and their smart playlists): no media server containers.
inline constexpr std::string_view kPersonalCategory = "musiclib_music_personal";
inline constexpr std::string_view kSharedCategory = "musiclib_music_shared";
inline constexpr std::string_view kMediaServerPrefix = "mediaserver_";
inline constexpr const char* kMediaServerRootObject = "0";
inline constexpr std::string_view kRandomNode = "musiclib_random";
inline constexpr std::string_view kLibraryRootNode = "musiclib_root";

bool StartsWith(std::string_view text, std::string_view prefix) {
    return text.compare(0, prefix.size(), prefix) == 0;
}

Json::Value TrackRow(const Track& track) {
    Json::Value row(Json::objectValue);
    row["stream"] = track.stream;
    row["title"] = track.title;
    row["artist"] = track.artist;
    row["album"] = track.album;
    row["duration"] = track.durationMs < 0
                          ? Json::Int64(-1)
                          : static_cast<Json::Int64>(std::llround(track.durationMs / 1000.0));
    return row;
}

Json::Value EmptyListReply(const std::string& node) {
    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    reply["node"] = node;
    reply["containers"] = Json::Value(Json::arrayValue);
    reply["tracks"] = Json::Value(Json::arrayValue);
    reply["missing"] = 0;
    return reply;
}

}  // namespace

int LibraryApi::Process() {
    const cgi::AdmittedRequest admitted = cgi::AdmitApplicationRequest(webMan);
    if (admitted.admission == cgi::Admission::refused)
        return 0;  // the 401 reply is out
    permission_ = admitted.permission;
    if (admitted.admission == cgi::Admission::noPermission)
        return Fail(Failure::requestRefused, kSystemSection, kSystemText, kNoPermissionLine);
    const char* action = webMan.In("action", "");
    if (std::strcmp(action, "list") == 0)
        return List(webMan.In("node", ""));
    if (std::strcmp(action, "track") == 0)
        return DescribeTrack(webMan.In("stream", ""));
    if (std::strcmp(action, "probe") == 0)
        return Probe(webMan.In("service", ""));
    if (IsPlaylistEditAction(action))
        return EditPlaylist(action);
    if (IsSmartPlaylistAction(action))
        return EditSmartPlaylist(action);
    if (IsRadioAction(action))
        return ServeRadioAction(*this, webMan, action);
    if (action == kSearchAction)
        return ServeSearch(*this, webMan);
    if (action == kRemoteStreamAction)
        return ServeRemoteStream(*this, webMan, permission_);
    if (IsCoverArtAction(action))
        return ServeCoverArtAction(*this, webMan, action);
    if (action == kLanguageAction)
        return ServeLanguageAction(*this, webMan);
    return Fail(Failure::requestInvalid, kNotFoundSection, kNotFoundText, kUnknownActionLine);
}

int LibraryApi::List(const std::string& node) {
    Json::Value reply = EmptyListReply(node);
    int built = 0;
    if (StartsWith(node, kPersonalPrefix))
        built = ListPersonalPlaylist(node.substr(kPersonalPrefix.size()), reply);
    else if (StartsWith(node, kSharedPrefix))
        built = ListSharedPlaylist(node.substr(kSharedPrefix.size()), reply);
    else if (StartsWith(node, kMediaServerPrefix))
        built = ListMediaServer(node, webMan.In("object", kMediaServerRootObject), reply);
    else if (IsSmartPlaylistNode(node))
        built = ListSmartPlaylist(node, reply);
    else if (node == kRandomNode)
        built = ListRandomPlaylist(reply);
    else if (IsRadioNode(node))
        built = ListRadioNode(*this, webMan, node, reply);
    else if (StartsWith(node, kLibraryPrefix) && node != kLibraryRootNode &&
             !StartsWith(node, kPersonalCategory) && !StartsWith(node, kSharedCategory))
        built = ListBrowsedContainer(node.substr(kLibraryPrefix.size()), reply);
    else
        return Fail(Failure::nodeGone, kNotFoundSection, kNotFoundText, kUnknownNodeLine);
    if (built == 0)
        return 0;
    PrintResponse(std::move(reply), kJsonReplyType);
    return 1;
}

int LibraryApi::DescribeTrack(const char* stream) {
    if (!OpenCatalog())
        return Fail(Failure::libraryUnavailable, kSystemSection, kSystemText, kNoLibraryLine);
    const std::optional<Track> track = catalog_.ByStreamId(stream);
    if (!track)
        return Fail(Failure::nodeGone, kNotFoundSection, kNotFoundText, kUnknownStreamLine);
    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    reply["track"] = TrackRow(*track);
    PrintResponse(std::move(reply), kJsonReplyType);
    return 1;
}

int LibraryApi::BrowseChildren(const std::string& controlUrl, const std::string& objectId,
                               DMAParser& parser) {
    DMABrowse browse(BrowseDirectChildren, controlUrl);
    browse.objectId = objectId;
    if (browse.Prepare() != 0)
        return Fail(Failure::nodeGone, kNotFoundSection, kNotFoundText, kUnknownNodeLine);
    const auto started = std::chrono::steady_clock::now();
    if (parser.Parse(&browse) == 0)
        return 1;
    const long elapsedMs = static_cast<long>(std::chrono::duration_cast<std::chrono::milliseconds>(
                                                 std::chrono::steady_clock::now() - started)
                                                 .count());
    switch (BrowseFailure(parser.Error(), elapsedMs)) {
        case Failure::nodeGone:
            return Fail(Failure::nodeGone, kNotFoundSection, kNotFoundText, kBrowsedObjectGoneLine);
        case Failure::mediaServerTimeout:
            return Fail(Failure::mediaServerTimeout, kSystemSection, kSystemText,
                        kBrowseTimedOutLine);
        case Failure::tooLarge:
            return Fail(Failure::tooLarge, kSystemSection, kSystemText, kBrowseTooLargeLine);
        case Failure::mediaServerInvalid:
            return Fail(Failure::mediaServerInvalid, kSystemSection, kSystemText,
                        kBrowseFailedLine);
        default:
            return Fail(Failure::mediaServerDown, kSystemSection, kSystemText, kBrowseFailedLine);
    }
}

int LibraryApi::ListBrowsedContainer(const std::string& objectId, Json::Value& reply) {
    if (!OpenCatalog())
        return Fail(Failure::libraryUnavailable, kSystemSection, kSystemText, kNoLibraryLine);
    DMAParser parser;
    if (BrowseChildren(paths::kLocalMediaServerControlUrl, objectId, parser) == 0)
        return 0;
    const DMAParser::ItemList* items = parser.GetResult();
    if (items == nullptr)
        return 1;
    Json::Value& containers = reply["containers"];
    Json::Value& tracks = reply["tracks"];
    for (const ItemNode* item : *items) {
        if (item->isContainer) {
            Json::Value row(Json::objectValue);
            row["node"] = std::string(kLibraryPrefix) + item->getValueByKey("id");
            row["title"] = item->getValueByKey("title");
            containers.append(std::move(row));
            continue;
        }
        const std::optional<std::int64_t> id =
            medialib::TrackIdOfLocalResource(item->getValueByKey("res"));
        const std::optional<Track> track = id ? catalog_.ById(*id) : std::nullopt;
        if (track)
            tracks.append(TrackRow(*track));
        else
            reply["missing"] = reply["missing"].asInt() + 1;
    }
    return 1;
}

int LibraryApi::ListMediaServer(const std::string& node, const std::string& objectId,
                                Json::Value& reply) {
    if ((permission_ & cgi::kPermissionMediaServer) == 0)
        return Fail(Failure::requestRefused, kSystemSection, kSystemText, kNoPermissionLine);
    // Only a server that the audio daemon lists right now is browsed, by the control URL it gave:
    // a request never makes this program connect to an address of its own choosing.
    const std::string controlUrl = node.substr(kMediaServerPrefix.size());
    // Nor one whose control URL names this machine or a link-local host, whoever listed it.
    if (!dma::IsNetworkHostUrl(controlUrl))
        return Fail(Failure::nodeGone, kNotFoundSection, kNotFoundText, kUnknownNodeLine);
    bool listed = false;
    daemonclient::ReadMediaServerList([&](const daemonclient::ListedMediaServer& server) {
        listed = listed || server.controlUrl == controlUrl;
    });
    if (!listed) {
        // Not listed: gone from the network, or the daemon that lists servers cannot say.
        switch (ProbeAudioDaemon()) {
            case ServiceState::down:
                return Fail(Failure::audioDaemonDown, kSystemSection, kSystemText,
                            kAudioDaemonDownLine);
            case ServiceState::notAnswering:
                return Fail(Failure::audioDaemonTimeout, kSystemSection, kSystemText,
                            kAudioDaemonTimedOutLine);
            case ServiceState::running:
                break;
        }
        return Fail(Failure::nodeGone, kNotFoundSection, kNotFoundText, kUnknownNodeLine);
    }
    DMAParser parser;
    if (BrowseChildren(controlUrl, objectId, parser) == 0)
        return 0;
    const DMAParser::ItemList* items = parser.GetResult();
    if (items == nullptr)
        return 1;
    int notPlayableHere = 0;
    for (const ItemNode* item : *items) {
        // A track is played through this server when its resource is on the server's own host.
        if (!item->isContainer) {
            if (!AppendRemoteTrack(node, controlUrl, *item, reply["tracks"]))
                ++notPlayableHere;
            continue;
        }
        Json::Value row(Json::objectValue);
        row["node"] = node;
        row["object"] = item->getValueByKey("id");
        row["title"] = item->getValueByKey("title");
        reply["containers"].append(std::move(row));
    }
    reply["missing"] = notPlayableHere;
    return 1;
}

int LibraryApi::ListPersonalPlaylist(const std::string& name, Json::Value& reply) {
    const playlist::PlaylistFileEntries entries = playlist::ReadPersonalPlaylist(
        webMan.GetPreferenceDir().c_str(), name, medialib::AudioSharePath());
    if (entries.status == playlist::PlaylistFileStatus::missing)
        return Fail(Failure::nodeGone, kNotFoundSection, kNotFoundText, kUnknownNodeLine);
    return ListPlaylistEntries(entries, reply);
}

int LibraryApi::ListSharedPlaylist(const std::string& id, Json::Value& reply) {
    if (id.empty() || id.size() > 10 || id.find_first_not_of("0123456789") != std::string::npos)
        return Fail(Failure::nodeGone, kNotFoundSection, kNotFoundText, kUnknownNodeLine);
    if (!OpenCatalog())
        return Fail(Failure::libraryUnavailable, kSystemSection, kSystemText, kNoLibraryLine);
    const auto paths = catalog_.SharedPlaylistPaths(std::strtoll(id.c_str(), nullptr, 10),
                                                    playlist::kMaxPlaylistEntries);
    if (!paths)
        return Fail(Failure::nodeGone, kNotFoundSection, kNotFoundText, kUnknownNodeLine);
    if (paths->tooLarge)
        return Fail(Failure::tooLarge, kSystemSection, kSystemText, kPlaylistTooLargeLine);
    AppendPlaylistTracks(paths->paths, reply);
    return 1;
}

int LibraryApi::ListRandomPlaylist(Json::Value& reply) {
    // The file that "New Random 100" drew for this user; none yet is an empty list, marked as not
    // drawn so that the page can draw one.
    const std::string file = paths::kRandom100Prefix + webMan.GetLoginUserName();
    const playlist::PlaylistFileEntries entries =
        playlist::ReadPlaylistFile(file, medialib::AudioSharePath());
    reply["drawn"] = entries.status != playlist::PlaylistFileStatus::missing;
    return ListPlaylistEntries(entries, reply, true);
}

int LibraryApi::ListPlaylistFile(const std::string& file, Json::Value& reply, bool missingIsEmpty) {
    return ListPlaylistEntries(playlist::ReadPlaylistFile(file, medialib::AudioSharePath()), reply,
                               missingIsEmpty);
}

int LibraryApi::ListPlaylistEntries(const playlist::PlaylistFileEntries& entries,
                                    Json::Value& reply, bool missingIsEmpty) {
    if (entries.status == playlist::PlaylistFileStatus::missing && missingIsEmpty)
        return 1;
    if (entries.status == playlist::PlaylistFileStatus::tooLarge)
        return Fail(Failure::tooLarge, kSystemSection, kSystemText, kPlaylistTooLargeLine);
    if (entries.status != playlist::PlaylistFileStatus::ok)
        return Fail(Failure::playlistUnreadable, kNotFoundSection, kNotFoundText,
                    kPlaylistUnreadableLine);
    if (!OpenCatalog())
        return Fail(Failure::libraryUnavailable, kSystemSection, kSystemText, kNoLibraryLine);
    AppendPlaylistTracks(entries.paths, reply);
    return 1;
}

void LibraryApi::AppendPlaylistTracks(const std::vector<std::string>& paths, Json::Value& reply) {
    Json::Value& tracks = reply["tracks"];
    int missing = 0;
    for (std::size_t entry = 0; entry < paths.size(); ++entry) {
        if (const std::optional<Track> track = catalog_.ByPath(paths[entry])) {
            // Its place among the playlist's entries: what a change of the playlist names.
            Json::Value row = TrackRow(*track);
            row["entry"] = Json::UInt64(entry);
            tracks.append(std::move(row));
        } else {
            ++missing;
        }
    }
    reply["missing"] = missing;
}

bool LibraryApi::OpenCatalog() {
    return catalog_.Open(paths::kLibraryDb);
}

int LibraryApi::Fail(Failure failure, const char* section, const char* key, int line) {
    return AnswerError(*this, webMan,
                       {FailureStatus(failure), section, key, line, FailureCode(failure)});
}

}  // namespace harmona::webapi
