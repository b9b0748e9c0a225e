// Whether the services behind the page's lists answer: the local media server and the audio
// daemon. A failed request asks this to tell the user which one is missing and how; the page asks
// it (action=probe) when a tree reply cannot say whether a list is empty or its source failed.
#pragma once

namespace harmona::webapi {

enum class ServiceState { running, down, notAnswering };

// The local media server: no connection to its port is `down`; a connection that brings no reply
// byte to a small HTTP request within `answerMs` is `notAnswering`.
ServiceState ProbeLocalMediaServer(long answerMs = 3000);

// The audio daemon: no socket, or a refused connection, is `down`; a full listen queue or no reply
// to the media server list's preparation (the client's half-second budget) is `notAnswering`.
ServiceState ProbeAudioDaemon();

}  // namespace harmona::webapi
