// The audio daemon client: the control socket exchange and its command wrappers, the audio file
// type test and the equalizer profile lookup. Plain functions returning 0 for success and -1 for
// failure (the file type and profile helpers say their own results).
#pragma once

#include <cstdint>

#include "platform/paths/DaemonProtocol.h"

// The request record, written to the socket as it lies in memory: the command code in the host's
// native byte order, then the NUL-terminated argument text (platform/paths/DaemonProtocol.h).
struct AudioDaemonRequest {
    std::int32_t command;
    char arguments[harmona::paths::kDaemonArgumentSize];
};
static_assert(sizeof(AudioDaemonRequest) == harmona::paths::kDaemonRequestSize,
              "the daemon reads exactly one record a request");

// ---- unit ctrl: connection and exchange ----

// A connected socket descriptor (>= 0) to /tmp/vanuaudiod.sock, or a negative value on failure.
int AudioDaemonConnect();

// Sends `request` on a connection of its own and reads one reply into `reply` (zeroed first, at
// most `replySize` bytes, one read). 0 when a reply of at least one byte was read, -1 otherwise.
// Both waits share one budget of half a second.
int AudioDaemonCall(const AudioDaemonRequest* request, char* reply, int replySize);

// ---- unit info: one wrapper per command code ----
// Each returns AudioDaemonCall's result (0 or -1), or -1 when its own argument check fails. The
// wrappers without a reply buffer discard the reply: they only say whether the daemon answered.
// Only commands 14 and 16 (the media server list) are used by the tree; the others are named by
// their code. They stay although no program here calls them: the client covers the daemon's whole
// command table, so that any caller of this library finds every command it may send;
// DaemonClient.EveryWrapperSendsItsExact8196ByteRecord pins the record of each.

int AudioDaemonCommand1();
int AudioDaemonCommand2();
int AudioDaemonCommand3();
int AudioDaemonCommand4();
int AudioDaemonCommand5();
int AudioDaemonCommand6();
int AudioDaemonCommand7();
int AudioDaemonCommand8(int value);
int AudioDaemonCommand9(int value);
int AudioDaemonCommand10();
int AudioDaemonCommand11(int value);
int AudioDaemonCommand12();
int AudioDaemonCommand13();
// Command 14: asks the daemon to prepare its media server list.
int AudioDaemonPrepareMediaServerList();
int AudioDaemonCommand15();
// Command 16: the media servers from `offset`, at most `count` of them, as JSON text in `reply`.
int AudioDaemonGetMediaServerList(int offset, int count, char* reply, int replySize);
int AudioDaemonCommand17(int first, int second, char* reply, int replySize);
int AudioDaemonCommand18(int value);
int AudioDaemonCommand19(char* reply, int replySize);
int AudioDaemonCommand27(int first, int second, char* reply, int replySize);
int AudioDaemonCommand28();
int AudioDaemonCommand29();
int AudioDaemonCommand31();
int AudioDaemonCommand32(int value);
int AudioDaemonCommand33();
int AudioDaemonCommand34();
// Command 35: exactly ten values, sent as "%3.1f" each, joined by single spaces.
int AudioDaemonCommand35(const float values[10]);
int AudioDaemonCommand36(int value);
int AudioDaemonCommand37(const char* text);
int AudioDaemonCommand38(const char* text);

// ---- unit ctrl: equalizer profiles ----

// Looks `label` up in the profile file at `path`: 1 found (the trimmed value is in `value`), 0 not
// in the file, -1 failure (unopenable file, an illegal line, a failed trim, bad arguments).
int LoadEqualizerProfile(const char* path, const char* label, char* value, int size);

// The default equalizer profile's value: 1 found, 0 equalizer off or no such profile, negative on
// failure.
int GetDefaultEqualizerProfile(char* value, int size);

// ---- file type ----

// 1 when `path` names an audio file playable for `selector` (0: anything; 2, 3 and any other value:
// the extension lists in FileType.cpp; paths beginning with "http" always), 0 otherwise.
int IsSupportedAudioFile(int selector, const char* path);
