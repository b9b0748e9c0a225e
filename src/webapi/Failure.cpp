#include "src/webapi/Failure.h"

#include "src/webapi/ApiError.h"

#include "platform/dma/SoapBrowse.h"

namespace harmona::webapi {

const char* FailureCode(Failure failure) {
    switch (failure) {
        case Failure::requestInvalid:
            return "request_invalid";
        case Failure::requestRefused:
            return "request_refused";
        case Failure::nodeGone:
            return "node_gone";
        case Failure::playlistUnreadable:
            return "playlist_unreadable";
        case Failure::tooLarge:
            return "too_large";
        case Failure::libraryUnavailable:
            return "library_unavailable";
        case Failure::mediaServerDown:
            return "media_server_down";
        case Failure::mediaServerTimeout:
            return "media_server_timeout";
        case Failure::mediaServerInvalid:
            return "media_server_invalid";
        case Failure::audioDaemonDown:
            return "audio_daemon_down";
        case Failure::audioDaemonTimeout:
            return "audio_daemon_timeout";
    }
    return "request_invalid";
}

const char* FailureStatus(Failure failure) {
    switch (failure) {
        case Failure::requestInvalid:
            return kStatusBadRequest;
        case Failure::requestRefused:
            return kStatusForbidden;
        case Failure::nodeGone:
        case Failure::playlistUnreadable:
            return kStatusNotFound;
        case Failure::tooLarge:
            return kStatusTooLarge;
        case Failure::mediaServerDown:
        case Failure::mediaServerInvalid:
            return kStatusBadGateway;
        case Failure::libraryUnavailable:
        case Failure::audioDaemonDown:
            return kStatusUnavailable;
        case Failure::mediaServerTimeout:
        case Failure::audioDaemonTimeout:
            return kStatusGatewayTimeout;
    }
    return kStatusBadRequest;
}

Failure BrowseFailure(const std::string& error, long elapsedMs) {
    const auto startsWith = [&error](const char* prefix) { return error.rfind(prefix, 0) == 0; };
    // The server answered, but not with the object's children.
    if (startsWith("HTTP status ") || error == "SOAP fault")
        return Failure::nodeGone;
    if (startsWith("too large: "))
        return Failure::tooLarge;
    if (error == "not a BrowseResponse" || error == "Result is not DIDL-Lite")
        return Failure::mediaServerInvalid;
    // The browse's own budget, or the HTTP client's ("Timeout was reached", "... timed out").
    if (error.find("time limit") != std::string::npos ||
        error.find("Timeout") != std::string::npos ||
        error.find("timed out") != std::string::npos || elapsedMs >= dma::kWholeReplyTimeoutMs)
        return Failure::mediaServerTimeout;
    // Refused, reset or closed without a reply: nothing serves there.
    return Failure::mediaServerDown;
}

}  // namespace harmona::webapi
