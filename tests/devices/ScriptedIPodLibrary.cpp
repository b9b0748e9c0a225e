#include "tests/devices/ScriptedIPodLibrary.h"

#include "platform/ipod/IPodPlaylist.h"

namespace harmona::test {

ScriptedIPod& Script() {
    static ScriptedIPod script;
    return script;
}

}  // namespace harmona::test

// Builds the scripted list with the real record builder, whatever the result, as a faulty library
// might; the caller is expected to free it either way.
int VANUIPodPlaylistGetAll(PLAYLIST_INFO** head) {
    harmona::test::ScriptedIPod& script = harmona::test::Script();
    ++script.calls;
    harmona::playlist::PlaylistListBuilder builder;
    for (const auto& [name, key] : script.records)
        builder.Append(0, name, key);
    *head = builder.Release();
    return script.result;
}
