// Unit info of the audio daemon client: one wrapper per command code, each sending one request
// record through AudioDaemonCall.
#include <syslog.h>

#include <cstdio>
#include <cstring>

#include "src/daemonclient/AudioDaemon.h"

namespace {

// The unit name and the line numbers of the "Bad parameters" log lines: fixed identifiers that log
// readers match on, not source lines, so they must not follow the code when it moves.
constexpr const char* kUnit = "info";
constexpr int kLineBadParameters16 = 62;
constexpr int kLineBadParameters17 = 88;
constexpr int kLineBadParameters19 = 135;
constexpr int kLineBadParameters27 = 160;
constexpr int kLineBadParameters37 = 188;
constexpr int kLineBadParameters38 = 216;

// Replies that a wrapper discards are read into a local buffer of this size.
constexpr int kDiscardedReplySize = 8192;

// A record for `command` with an empty argument text. The bytes after the text mean nothing to the
// daemon; zeroing them keeps stack contents of this process from reaching it.
void Prepare(AudioDaemonRequest& request, int command) {
    std::memset(&request, 0, sizeof(request));
    request.command = command;
}

int CallDiscardingReply(const AudioDaemonRequest& request) {
    char reply[kDiscardedReplySize];
    return AudioDaemonCall(&request, reply, sizeof(reply));
}

int CommandWithoutArguments(int command) {
    AudioDaemonRequest request;
    Prepare(request, command);
    return CallDiscardingReply(request);
}

int CommandWithInt(int command, int value) {
    AudioDaemonRequest request;
    Prepare(request, command);
    std::snprintf(request.arguments, sizeof(request.arguments), "%d", value);
    return CallDiscardingReply(request);
}

int CommandWithText(int command, const char* text, int checkLine) {
    if (text == nullptr) {
        syslog(LOG_ERR, "%s:%d Bad parameters", kUnit, checkLine);
        return -1;
    }
    AudioDaemonRequest request;
    Prepare(request, command);
    std::snprintf(request.arguments, sizeof(request.arguments), "%s", text);
    return CallDiscardingReply(request);
}

// The commands that answer into the caller's buffer, after the check of that buffer.
int CommandWithReply(int command, const char* arguments, char* reply, int replySize,
                     int checkLine) {
    if (reply == nullptr || replySize <= 0) {
        syslog(LOG_ERR, "%s:%d Bad parameters", kUnit, checkLine);
        return -1;
    }
    AudioDaemonRequest request;
    Prepare(request, command);
    std::snprintf(request.arguments, sizeof(request.arguments), "%s", arguments);
    return AudioDaemonCall(&request, reply, replySize);
}

int CommandWithTwoIntsAndReply(int command, int first, int second, char* reply, int replySize,
                               int checkLine) {
    char arguments[32];
    std::snprintf(arguments, sizeof(arguments), "%d %d", first, second);
    return CommandWithReply(command, arguments, reply, replySize, checkLine);
}

}  // namespace

int AudioDaemonCommand1() {
    return CommandWithoutArguments(1);
}
int AudioDaemonCommand2() {
    return CommandWithoutArguments(2);
}
int AudioDaemonCommand3() {
    return CommandWithoutArguments(3);
}
int AudioDaemonCommand4() {
    return CommandWithoutArguments(4);
}
int AudioDaemonCommand5() {
    return CommandWithoutArguments(5);
}
int AudioDaemonCommand6() {
    return CommandWithoutArguments(6);
}
int AudioDaemonCommand7() {
    return CommandWithoutArguments(7);
}
int AudioDaemonCommand8(int value) {
    return CommandWithInt(8, value);
}
int AudioDaemonCommand9(int value) {
    return CommandWithInt(9, value);
}
int AudioDaemonCommand10() {
    return CommandWithoutArguments(10);
}
int AudioDaemonCommand11(int value) {
    return CommandWithInt(11, value);
}
int AudioDaemonCommand12() {
    return CommandWithoutArguments(12);
}
int AudioDaemonCommand13() {
    return CommandWithoutArguments(13);
}
int AudioDaemonPrepareMediaServerList() {
    return CommandWithoutArguments(harmona::paths::kDaemonCommandPrepareMediaServerList);
}
int AudioDaemonCommand15() {
    return CommandWithoutArguments(15);
}
int AudioDaemonGetMediaServerList(int offset, int count, char* reply, int replySize) {
    return CommandWithTwoIntsAndReply(harmona::paths::kDaemonCommandGetMediaServerList, offset,
                                      count, reply, replySize, kLineBadParameters16);
}
int AudioDaemonCommand17(int first, int second, char* reply, int replySize) {
    return CommandWithTwoIntsAndReply(17, first, second, reply, replySize, kLineBadParameters17);
}
int AudioDaemonCommand18(int value) {
    return CommandWithInt(18, value);
}
int AudioDaemonCommand19(char* reply, int replySize) {
    return CommandWithReply(19, "", reply, replySize, kLineBadParameters19);
}
int AudioDaemonCommand27(int first, int second, char* reply, int replySize) {
    return CommandWithTwoIntsAndReply(27, first, second, reply, replySize, kLineBadParameters27);
}
int AudioDaemonCommand28() {
    return CommandWithoutArguments(28);
}
int AudioDaemonCommand29() {
    return CommandWithoutArguments(29);
}
int AudioDaemonCommand31() {
    return CommandWithoutArguments(31);
}
int AudioDaemonCommand32(int value) {
    return CommandWithInt(32, value);
}
int AudioDaemonCommand33() {
    return CommandWithoutArguments(33);
}
int AudioDaemonCommand34() {
    return CommandWithoutArguments(34);
}
int AudioDaemonCommand35(const float values[10]) {
    if (values == nullptr)  // nothing to print
        return -1;
    AudioDaemonRequest request;
    Prepare(request, 35);
    // The first value, then a space and the value for each further one. Ten such values always fit
    // in the argument text; the prints are bounded all the same.
    size_t used = 0;
    for (int i = 0; i < 10 && used < sizeof(request.arguments); ++i) {
        const int written =
            std::snprintf(request.arguments + used, sizeof(request.arguments) - used,
                          i == 0 ? "%3.1f" : " %3.1f", static_cast<double>(values[i]));
        if (written < 0)
            break;
        used += static_cast<size_t>(written);
    }
    return CallDiscardingReply(request);
}
int AudioDaemonCommand36(int value) {
    return CommandWithInt(36, value);
}
int AudioDaemonCommand37(const char* text) {
    return CommandWithText(37, text, kLineBadParameters37);
}
int AudioDaemonCommand38(const char* text) {
    return CommandWithText(38, text, kLineBadParameters38);
}
