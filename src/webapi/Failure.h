// The kinds of failure that library.cgi answers, each with its HTTP status and the stable code of
// the reply's "error" member, which the page turns into words in the user's language. The codes are
// fixed identifiers: the page and other actions match on them.
#pragma once

#include <string>

namespace harmona::webapi {

enum class Failure {
    requestInvalid,      // "request_invalid": an unknown action or a malformed argument (400)
    requestRefused,      // "request_refused": the user lacks the permission (403)
    nodeGone,            // "node_gone": the node, object or track does not exist (any more) (404)
    playlistUnreadable,  // "playlist_unreadable": a playlist file that cannot be read (404)
    tooLarge,            // "too_large": more than a request may hold (413)
    libraryUnavailable,  // "library_unavailable": library.db cannot be opened (503)
    mediaServerDown,     // "media_server_down": nothing answers at the media server (502)
    mediaServerTimeout,  // "media_server_timeout": it accepts but does not answer in time (504)
    mediaServerInvalid,  // "media_server_invalid": its answer is no Browse reply (502)
    audioDaemonDown,     // "audio_daemon_down": the audio daemon is not running (503)
    audioDaemonTimeout,  // "audio_daemon_timeout": it does not answer in time (504)
};

// The error replies' line numbers ("errinfo"."line"): fixed identifiers that log readers and the
// page match on, never source lines.
enum ErrorLine : int {
    kNoPermissionLine = 101,
    kUnknownActionLine = 102,
    kUnknownNodeLine = 103,
    kUnknownStreamLine = 104,
    kBrowseFailedLine = 105,
    kNoLibraryLine = 106,
    kPlaylistUnreadableLine = 107,
    kPlaylistTooLargeLine = 108,
    kBrowseTimedOutLine = 109,
    kBrowsedObjectGoneLine = 110,
    kBrowseTooLargeLine = 111,
    kAudioDaemonDownLine = 112,
    kAudioDaemonTimedOutLine = 113,
    kUnknownServiceLine = 114,
};

// The reply's "error" code.
const char* FailureCode(Failure failure);
// The HTTP status line ("404 Not Found").
const char* FailureStatus(Failure failure);

// What a failed browse (DMAParser::Error() and how long it took) says about the server: it was
// not there (no connection), did not answer in time, answered with an error for the object (a
// SOAP fault or an HTTP error status: the object does not exist), sent more than a request may
// hold, or sent something that is not a Browse reply.
Failure BrowseFailure(const std::string& error, long elapsedMs);

}  // namespace harmona::webapi
