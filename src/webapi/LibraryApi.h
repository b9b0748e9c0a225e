// The listening page's JSON API (webapi/library.cgi): what a tree node holds, as rows the page
// lists and plays. Actions:
//   action=list&node=<tree node id>  the node's sub-containers and tracks
//     [&object=<object id>]          for a media server on the network: that container of it
//                                    (default its root, "0"); its tracks as RemoteMedia.h says
//   action=track&stream=<stream id>  one track's metadata (404 when the library has no such track)
//   action=probe&service=<name>      whether the media server or the audio daemon answers
//   action=pl*, action=smart*        playlists and smart playlists made and changed (see
//                                    PlaylistEdit.h and docs/library-api.md)
//   the radio nodes and actions      RadioApi.h
//   action=remote_stream             a network media server's track, RemoteMedia.h
// Every error reply carries a stable "error" code (Failure.h).
// Library tracks carry stream ids only (TrackCatalog.h); the page plays "/media/<stream id>", which
// the web server passes on to the local media server behind the same login. Other rows carry the
// "url" the page plays.
#pragma once

#include <json/value.h>

#include <string>

#include "platform/cgi/ActionHandler.h"
#include "platform/dma/DMAParser.h"
#include "platform/playlist/PlaylistFile.h"
#include "src/webapi/Failure.h"
#include "src/webapi/TrackCatalog.h"

namespace harmona::webapi {

class LibraryApi : public ActionHandler {
  public:
    // Authorizes, reads the permission bits and dispatches `action`; the result is the exit
    // status (1 for a served request).
    int Process() override;

  private:
    int List(const std::string& node);
    int DescribeTrack(const char* stream);
    // Whether `service` ("media_server" or "audio_daemon") answers (ProbeAction.cpp).
    int Probe(const std::string& service);

    // The builders of a list reply; each fills `reply` or answers an error itself and returns 0.
    int ListBrowsedContainer(const std::string& objectId, Json::Value& reply);
    int ListPersonalPlaylist(const std::string& name, Json::Value& reply);
    int ListSharedPlaylist(const std::string& id, Json::Value& reply);
    int ListRandomPlaylist(Json::Value& reply);
    int ListMediaServer(const std::string& node, const std::string& objectId, Json::Value& reply);
    // The tracks of a playlist file (relative entries from the audio share); a missing file is an
    // empty list when `missingIsEmpty`, else not found.
    int ListPlaylistFile(const std::string& file, Json::Value& reply, bool missingIsEmpty = false);
    int ListPlaylistEntries(const playlist::PlaylistFileEntries& entries, Json::Value& reply,
                            bool missingIsEmpty = false);
    // The tracks of a playlist's paths, in order; paths the library does not hold are counted in
    // "missing" (their paths are never shown).
    void AppendPlaylistTracks(const std::vector<std::string>& paths, Json::Value& reply);

    // Browses the children of `objectId` on the ContentDirectory at `controlUrl` into `parser`;
    // 0 after answering a failure.
    int BrowseChildren(const std::string& controlUrl, const std::string& objectId,
                       DMAParser& parser);

    bool OpenCatalog();

    // Playlists made and changed from the page (PlaylistEdit.cpp) and smart playlists: their
    // tracks, their rules, made, changed and removed (SmartPlaylists.cpp). Each answers the
    // request itself; 1 for a served request.
    int EditPlaylist(const std::string& action);
    int EditSmartPlaylist(const std::string& action);
    int ListSmartPlaylist(const std::string& node, Json::Value& reply);
    // An error reply of those actions: the HTTP status, a stable "error" code the page words in
    // the user's language, and errinfo/message from the UI texts (section/key, null: the code).
    int FailWith(const char* status, const char* error, int line, const char* section = nullptr,
                 const char* key = nullptr, const std::string& detail = {});
    // The checks every changing request passes first: a POST of a bounded body. 0 after answering.
    int AdmitChange();

    // An error reply: the HTTP status, the error envelope and its text in the user's language.
    int Fail(Failure failure, const char* section, const char* key, int line);

    TrackCatalog catalog_;
    int permission_ = 0;  // the user's audio permission bits
};

}  // namespace harmona::webapi
