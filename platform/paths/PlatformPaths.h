// The platform's fixed places (platform/README.md, "Fixed paths"). Constants of the code: no
// configuration or environment variable changes them (tests cover them with tmpfs in a private
// mount namespace).
#pragma once

#include <cstddef>

namespace harmona::paths {

inline constexpr const char* kTextsPrefix = "/var/packages/Harmona/target/app/texts/";
inline constexpr const char* kUsersConf = "/var/packages/Harmona/etc/users.conf";
inline constexpr const char* kAudioConf = "/var/packages/Harmona/etc/audio.conf";
inline constexpr const char* kSharedSmartPlaylists = "/var/packages/Harmona/etc/smart.playlist";
inline constexpr const char* kEqualizerSystem = "/var/packages/Harmona/target/etc/equalizer.system";
inline constexpr const char* kEqualizerUser = "/var/packages/Harmona/etc/equalizer.user";
inline constexpr const char* kLibraryDb = "/var/packages/Harmona/var/library.db";
inline constexpr const char* kPreferencePrefix = "/usr/vanu/etc/preference/";
inline constexpr const char* kIPodDirectory = "/usr/vanu/etc/audio/ipod/";
inline constexpr const char* kIPodMountpointFile = "/usr/vanu/etc/audio/ipod/mountpoint";
inline constexpr const char* kServicePidDir = "/run/vanu/service/";
inline constexpr const char* kDaemonSocket = "/tmp/vanuaudiod.sock";
inline constexpr const char* kDefaultAudioShare = "/volume1/music";
// Below a user's preference directory: the folder of the personal playlists, and the user's smart
// playlist file in it.
inline constexpr const char* kPlaylistsFolder = "/playlists";
inline constexpr const char* kSmartPlaylistFile = "/smart.playlist";
// The user's random-100 playlist: this prefix followed by the login user name.
inline constexpr const char* kRandom100Prefix = "/tmp/==DynaRandom100==.";

// The local media server (harmona-mediad): the platform service whose pid file says that it runs,
// the port it serves on (127.0.0.1 and the LAN) and its ContentDirectory's control URL.
inline constexpr int kLocalMediaServerService = 3;
inline constexpr unsigned short kLocalMediaServerPort = 50003;
inline constexpr const char* kLocalMediaServerControlUrl =
    "http://127.0.0.1:50003/ContentDirectory/control";

namespace detail {
// The port number written after "http://127.0.0.1:" in `url`, or -1.
constexpr long LoopbackUrlPort(const char* url) {
    const char* prefix = "http://127.0.0.1:";
    std::size_t i = 0;
    for (; prefix[i] != '\0'; ++i) {
        if (url[i] != prefix[i])
            return -1;
    }
    long port = 0;
    for (; url[i] >= '0' && url[i] <= '9'; ++i)
        port = port * 10 + (url[i] - '0');
    return url[i] == '/' ? port : -1;
}
}  // namespace detail
static_assert(detail::LoopbackUrlPort(kLocalMediaServerControlUrl) == kLocalMediaServerPort,
              "the control URL names the local media server's port");

}  // namespace harmona::paths
