// action=probe&service=media_server|audio_daemon: whether a service behind the page's lists
// answers now. The page asks when a reply of the tree CGI cannot tell an empty list from a failed
// one (an empty container, an empty media server search): {"success": true, "service"} when the
// service answers, else the error reply of its failure kind.
#include <json/value.h>

#include "platform/cgi/ApplicationRequest.h"

#include "src/webapi/ApiError.h"
#include "src/webapi/Failure.h"
#include "src/webapi/LibraryApi.h"
#include "src/webapi/ServiceProbe.h"

namespace harmona::webapi {
namespace {}  // namespace

int LibraryApi::Probe(const std::string& service) {
    ServiceState state = ServiceState::running;
    if (service == "media_server") {
        state = ProbeLocalMediaServer();
        if (state == ServiceState::down)
            return Fail(Failure::mediaServerDown, kSystemSection, kSystemText, kBrowseFailedLine);
        if (state == ServiceState::notAnswering)
            return Fail(Failure::mediaServerTimeout, kSystemSection, kSystemText,
                        kBrowseTimedOutLine);
    } else if (service == "audio_daemon") {
        // The audio daemon lists the media servers: without that permission there is no use of it.
        if ((permission_ & cgi::kPermissionMediaServer) == 0)
            return Fail(Failure::requestRefused, kSystemSection, kSystemText, kNoPermissionLine);
        state = ProbeAudioDaemon();
        if (state == ServiceState::down)
            return Fail(Failure::audioDaemonDown, kSystemSection, kSystemText,
                        kAudioDaemonDownLine);
        if (state == ServiceState::notAnswering)
            return Fail(Failure::audioDaemonTimeout, kSystemSection, kSystemText,
                        kAudioDaemonTimedOutLine);
    } else {
        return Fail(Failure::requestInvalid, kNotFoundSection, kNotFoundText, kUnknownServiceLine);
    }
    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    reply["service"] = service;
    PrintResponse(std::move(reply), kJsonReplyType);
    return 1;
}

}  // namespace harmona::webapi
