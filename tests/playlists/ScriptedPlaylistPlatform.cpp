// Scripted replacements, linked only into playlists_fault_tests, for what the real platform cannot
// produce: a personal playlist name holding "/" (a file name cannot), and a failing smart playlist
// listing (the real one always succeeds). Defining these symbols here keeps the static libraries'
// real definitions out of this one program.
#include "tests/playlists/ScriptedPlaylistPlatform.h"

#include "platform/playlist/PlaylistList.h"
#include "src/handler/HarmonaHandler.h"

namespace harmona::test {

ScriptedPlatform& Scripted() {
    static ScriptedPlatform script;
    return script;
}

}  // namespace harmona::test

namespace {

int ListScripted(const harmona::test::ScriptedList& list, PLAYLIST_INFO** head) {
    *head = nullptr;
    if (list.result < 0)
        return list.result;
    harmona::playlist::PlaylistListBuilder builder;
    for (const auto& [id, name] : list.records)
        builder.Append(id, name, {});
    *head = builder.Release();
    return list.result;
}

}  // namespace

int VANUPersonalPlaylistListAll(const char* prefDir, PLAYLIST_INFO** head, int, int) {
    harmona::test::Scripted().personalPrefDir = prefDir;
    return ListScripted(harmona::test::Scripted().personal, head);
}

int VANUPlaylistListAll(PLAYLIST_INFO** head, int, int, int) {
    return ListScripted(harmona::test::Scripted().shared, head);
}

int HarmonaHandler::ListSmartPlaylists(Json::Value& children, const char* category) {
    harmona::test::Scripted().smartCategories.push_back(category);
    return harmona::test::Scripted().smartResult;
}
