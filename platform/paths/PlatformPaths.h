// The platform's fixed places (platform/README.md, "Fixed paths"). Constants of the code: no
// configuration or environment variable changes them (tests cover them with tmpfs in a private
// mount namespace).
#pragma once

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
inline constexpr const char* kLocalMediaServerControlUrl =
    "http://127.0.0.1:50003/ContentDirectory/control";

}  // namespace harmona::paths
