// The audio daemon client on the control socket: one fixed-size record per command, on a
// connection of its own, and a reply read within a budget. The client runs in the test process
// against a scripted daemon on the real socket path /tmp/vanuaudiod.sock inside the sandbox.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <climits>
#include <cstring>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "src/daemonclient/AudioDaemon.h"
#include "tests/daemonclient/DaemonTestSupport.h"
#include "tests/harness/ScriptedDaemon.h"

using namespace harmona::test;

namespace {

// Log lines begin with a fixed unit and line number ("ctrl:27") that log readers match on; they do
// not follow the source lines.
const std::string kConnectFailed =
    "ctrl:27 Failed to connect to /tmp/vanuaudiod.sock. [No such file or directory]";

// One wrapper of the command table: how to call it with valid arguments, and what it must send.
struct Wrapper {
    int code;
    std::string arguments;
    std::function<int(char* reply, int size)> call;
};

char gReply[64];

const float kTenValues[10] = {1.0f,   -2.5f,  3.7f,    0.0f,     10.0f,
                              -0.04f, 100.0f, 1234.5f, -1000.0f, 0.05f};

std::vector<Wrapper> AllWrappers() {
    return {
        {1, "", [](char*, int) { return AudioDaemonCommand1(); }},
        {2, "", [](char*, int) { return AudioDaemonCommand2(); }},
        {3, "", [](char*, int) { return AudioDaemonCommand3(); }},
        {4, "", [](char*, int) { return AudioDaemonCommand4(); }},
        {5, "", [](char*, int) { return AudioDaemonCommand5(); }},
        {6, "", [](char*, int) { return AudioDaemonCommand6(); }},
        {7, "", [](char*, int) { return AudioDaemonCommand7(); }},
        {8, "-42", [](char*, int) { return AudioDaemonCommand8(-42); }},
        {9, "7", [](char*, int) { return AudioDaemonCommand9(7); }},
        {10, "", [](char*, int) { return AudioDaemonCommand10(); }},
        {11, "2147483647", [](char*, int) { return AudioDaemonCommand11(INT_MAX); }},
        {12, "", [](char*, int) { return AudioDaemonCommand12(); }},
        {13, "", [](char*, int) { return AudioDaemonCommand13(); }},
        {14, "", [](char*, int) { return AudioDaemonPrepareMediaServerList(); }},
        {15, "", [](char*, int) { return AudioDaemonCommand15(); }},
        {16, "20 10",
         [](char* reply, int size) { return AudioDaemonGetMediaServerList(20, 10, reply, size); }},
        {17, "-1 5",
         [](char* reply, int size) { return AudioDaemonCommand17(-1, 5, reply, size); }},
        {18, "-2147483648", [](char*, int) { return AudioDaemonCommand18(INT_MIN); }},
        {19, "", [](char* reply, int size) { return AudioDaemonCommand19(reply, size); }},
        {27, "3 4", [](char* reply, int size) { return AudioDaemonCommand27(3, 4, reply, size); }},
        {28, "", [](char*, int) { return AudioDaemonCommand28(); }},
        {29, "", [](char*, int) { return AudioDaemonCommand29(); }},
        {31, "", [](char*, int) { return AudioDaemonCommand31(); }},
        {32, "1", [](char*, int) { return AudioDaemonCommand32(1); }},
        {33, "", [](char*, int) { return AudioDaemonCommand33(); }},
        {34, "", [](char*, int) { return AudioDaemonCommand34(); }},
        {35, "1.0 -2.5 3.7 0.0 10.0 -0.0 100.0 1234.5 -1000.0 0.1",
         [](char*, int) { return AudioDaemonCommand35(kTenValues); }},
        {36, "0", [](char*, int) { return AudioDaemonCommand36(0); }},
        {37, "hello world", [](char*, int) { return AudioDaemonCommand37("hello world"); }},
        // A text is sent as it stands, never used as a format.
        {38, "/volume1/music/%s %n.mp3",
         [](char*, int) { return AudioDaemonCommand38("/volume1/music/%s %n.mp3"); }},
    };
}

// The record's first four bytes as the host lays out the code.
std::string NativeCode(std::int32_t code) {
    char bytes[4];
    std::memcpy(bytes, &code, 4);
    return std::string(bytes, 4);
}

class DaemonClient : public ::testing::Test {
  protected:
    void SetUp() override { TakeLogLines(); }
};

TEST_F(DaemonClient, EveryWrapperSendsItsExact8196ByteRecord) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("{}"); });
    const std::vector<Wrapper> wrappers = AllWrappers();
    for (const Wrapper& w : wrappers) {
        std::memset(gReply, 'x', sizeof(gReply));
        EXPECT_EQ(w.call(gReply, sizeof(gReply)), 0) << "command " << w.code;
    }
    const std::vector<DaemonRequest> requests = daemon.Requests();
    ASSERT_EQ(requests.size(), wrappers.size());
    for (size_t i = 0; i < wrappers.size(); ++i) {
        const DaemonRequest& r = requests[i];
        SCOPED_TRACE("command " + std::to_string(wrappers[i].code));
        EXPECT_EQ(r.size, 8196u);
        EXPECT_EQ(std::string(reinterpret_cast<const char*>(r.raw.data()), 4),
                  NativeCode(wrappers[i].code));
        EXPECT_EQ(r.command, wrappers[i].code);
        EXPECT_TRUE(r.argumentsTerminated);
        EXPECT_EQ(r.arguments, wrappers[i].arguments);
        // This client zeroes the bytes after the text: nothing else of the process leaks.
        const std::string area = r.ArgumentArea();
        EXPECT_EQ(area.find_first_not_of('\0', r.arguments.size()), std::string::npos);
    }
    EXPECT_TRUE(LoggedMessages().empty());
}

TEST_F(DaemonClient, CommandCodeIsInNativeByteOrderOnThisLittleEndianHost) {
    if (NativeCode(1) != std::string("\x01\0\0\0", 4))
        GTEST_SKIP() << "big-endian host";
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("{}"); });
    ASSERT_EQ(AudioDaemonCommand38("x"), 0);
    const std::vector<DaemonRequest> requests = daemon.Requests();
    ASSERT_EQ(requests.size(), 1u);
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(requests[0].raw.data()), 5),
              std::string("\x26\0\0\0x", 5));
}

TEST_F(DaemonClient, Command35WithOneAndMinusTwoPointFiveBeginsWithThoseAndTheThirdValue) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("ok"); });
    const float values[10] = {1, -2.5f, 7, 8, 9, 10, 11, 12, 13, 14};
    ASSERT_EQ(AudioDaemonCommand35(values), 0);
    const std::vector<DaemonRequest> requests = daemon.Requests();
    ASSERT_EQ(requests.size(), 1u);
    EXPECT_EQ(requests[0].arguments.rfind("1.0 -2.5 7.0", 0), 0u) << requests[0].arguments;
    EXPECT_EQ(requests[0].arguments, "1.0 -2.5 7.0 8.0 9.0 10.0 11.0 12.0 13.0 14.0");
}

TEST_F(DaemonClient, Command35WithHugeValuesStillFitsTheArgumentArea) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("ok"); });
    float values[10];
    for (float& v : values)
        v = -3.4e38f;
    ASSERT_EQ(AudioDaemonCommand35(values), 0);
    const std::vector<DaemonRequest> requests = daemon.Requests();
    ASSERT_EQ(requests.size(), 1u);
    EXPECT_TRUE(requests[0].argumentsTerminated);
    EXPECT_EQ(requests[0].arguments.substr(0, 4), "-339");
    EXPECT_EQ(std::count(requests[0].arguments.begin(), requests[0].arguments.end(), ' '), 9);
}

TEST_F(DaemonClient, TextLongerThanTheArgumentAreaIsCutAndTerminated) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("ok"); });
    const std::string text(10000, 'a');
    ASSERT_EQ(AudioDaemonCommand37(text.c_str()), 0);
    const std::vector<DaemonRequest> requests = daemon.Requests();
    ASSERT_EQ(requests.size(), 1u);
    EXPECT_EQ(requests[0].size, 8196u);
    EXPECT_TRUE(requests[0].argumentsTerminated);
    EXPECT_EQ(requests[0].arguments, std::string(8191, 'a'));
}

TEST_F(DaemonClient, WithNoDaemonListeningEveryWrapperFailsAndLogsOneConnectLine) {
    for (const Wrapper& w : AllWrappers()) {
        std::memset(gReply, 'x', sizeof(gReply));
        EXPECT_EQ(w.call(gReply, sizeof(gReply)), -1) << "command " << w.code;
        EXPECT_EQ(LoggedMessages(), std::vector<std::string>{kConnectFailed})
            << "command " << w.code;
        // A failure before the readability wait leaves the caller's buffer untouched.
        EXPECT_EQ(std::string(gReply, sizeof(gReply)), std::string(sizeof(gReply), 'x'));
    }
}

TEST_F(DaemonClient, SocketPathThatIsNoSocketFailsToConnect) {
    ASSERT_EQ(mkdir("/tmp/vanuaudiod.sock", 0755), 0);
    EXPECT_EQ(AudioDaemonCommand1(), -1);
    const std::vector<std::string> log = LoggedMessages();
    ASSERT_EQ(log.size(), 1u);
    EXPECT_EQ(log[0].rfind("ctrl:27 Failed to connect to /tmp/vanuaudiod.sock. [", 0), 0u)
        << log[0];
}

TEST_F(DaemonClient, AnswerAfterMoreThanHalfASecondGivesMinusOneAndNoLogLine) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("late", 700); });
    char reply[64];
    std::memset(reply, 'x', sizeof(reply));
    const Stopwatch watch;
    EXPECT_EQ(AudioDaemonGetMediaServerList(0, 10, reply, sizeof(reply)), -1);
    // The client gave up at its budget (-1 above: it did not wait for the late answer).
    EXPECT_LT(watch.ElapsedMs(), 2000);
    EXPECT_TRUE(LoggedMessages().empty());
    EXPECT_EQ(std::string(reply, sizeof(reply)), std::string(sizeof(reply), 'x'));
    EXPECT_EQ(daemon.Requests().size(), 1u);
}

TEST_F(DaemonClient, AnswerWithinTheBudgetIsRead) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("soon", 250); });
    char reply[64];
    EXPECT_EQ(AudioDaemonCommand19(reply, sizeof(reply)), 0);
    EXPECT_STREQ(reply, "soon");
    EXPECT_TRUE(LoggedMessages().empty());
}

TEST_F(DaemonClient, DaemonThatNeverAnswersGivesMinusOneWithinTheBudget) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Never(); });
    const Stopwatch watch;
    EXPECT_EQ(AudioDaemonPrepareMediaServerList(), -1);
    EXPECT_LT(watch.ElapsedMs(), 2000);
    EXPECT_TRUE(LoggedMessages().empty());
}

TEST_F(DaemonClient, DaemonThatNeverAcceptsGivesMinusOneWithinTheBudget) {
    DaemonOptions options;
    options.accept = false;
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("x"); }, options);
    const Stopwatch watch;
    EXPECT_EQ(AudioDaemonCommand2(), -1);
    EXPECT_LT(watch.ElapsedMs(), 2000);
    EXPECT_TRUE(LoggedMessages().empty());
}

TEST_F(DaemonClient, DaemonWithAFullListenQueueFailsTheConnectAtOnce) {
    DaemonOptions options;
    options.accept = false;
    options.backlog = 0;
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("x"); }, options);
    // Fill the queue with connections that are never accepted, until one would have to wait.
    std::vector<int> fillers;
    for (int i = 0; i < 8; ++i) {
        const int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0);
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        std::strcpy(address.sun_path, kDaemonSocketPath);
        const int rc = connect(fd, reinterpret_cast<sockaddr*>(&address), sizeof(address));
        fillers.push_back(fd);
        if (rc != 0)
            break;
    }
    const Stopwatch watch;
    EXPECT_EQ(AudioDaemonCommand3(), -1);
    EXPECT_LT(watch.ElapsedMs(), 2000);
    const std::vector<std::string> log = LoggedMessages();
    ASSERT_EQ(log.size(), 1u);
    EXPECT_EQ(log[0],
              "ctrl:27 Failed to connect to /tmp/vanuaudiod.sock. [Resource temporarily "
              "unavailable]");
    for (int fd : fillers)
        close(fd);
}

TEST_F(DaemonClient, DaemonThatClosesWithoutAnsweringGivesMinusOneAndTheReadLine) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Close(); });
    char reply[64];
    std::memset(reply, 'x', sizeof(reply));
    EXPECT_EQ(AudioDaemonGetMediaServerList(0, 10, reply, sizeof(reply)), -1);
    const std::vector<std::string> log = LoggedMessages();
    ASSERT_EQ(log.size(), 1u);
    EXPECT_EQ(log[0].rfind("ctrl:90 Failed to read action [", 0), 0u) << log[0];
    // The readability wait succeeded (end of stream), so the buffer was zeroed before the read.
    EXPECT_EQ(std::string(reply, sizeof(reply)), std::string(sizeof(reply), '\0'));
}

TEST_F(DaemonClient, DaemonThatHangsUpBeforeReadingNeverKillsTheClient) {
    // A bare listener that accepts and closes at once: the client's write may meet a closed peer
    // (EPIPE, which must not raise SIGPIPE) or its read the end of stream.
    const int listener = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strcpy(address.sun_path, kDaemonSocketPath);
    ASSERT_EQ(bind(listener, reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
    ASSERT_EQ(listen(listener, 4), 0);
    std::thread hangUp([listener] {
        const int fd = accept(listener, nullptr, nullptr);
        if (fd >= 0)
            close(fd);
    });
    EXPECT_EQ(AudioDaemonCommand4(), -1);
    hangUp.join();
    close(listener);
    const std::vector<std::string> log = LoggedMessages();
    ASSERT_EQ(log.size(), 1u);
    EXPECT_TRUE(log[0] == "ctrl:74 Failed to send command." ||
                log[0].rfind("ctrl:90 Failed to read action [", 0) == 0)
        << log[0];
}

TEST_F(DaemonClient, ReplyAsLongAsTheBufferFillsItWithoutTerminator) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("0123456789"); });
    char reply[12];
    std::memset(reply, 'x', sizeof(reply));
    ASSERT_EQ(AudioDaemonCommand17(1, 2, reply, 10), 0);
    EXPECT_EQ(std::string(reply, 10), "0123456789");
    EXPECT_EQ(std::string(reply + 10, 2), "xx");  // nothing written beyond the given size
}

TEST_F(DaemonClient, LongerReplyIsCutToTheBufferSize) {
    ScriptedDaemon daemon(
        [](const DaemonRequest&) { return DaemonAnswer::Reply(std::string(100000, 'r')); });
    char reply[40];
    std::memset(reply, 'x', sizeof(reply));
    ASSERT_EQ(AudioDaemonCommand27(1, 2, reply, 32), 0);
    EXPECT_EQ(std::string(reply, 32), std::string(32, 'r'));
    EXPECT_EQ(std::string(reply + 32, 8), std::string(8, 'x'));
    // The discarded-reply wrappers read an oversized answer into their own 8192 bytes safely.
    EXPECT_EQ(AudioDaemonCommand5(), 0);
}

TEST_F(DaemonClient, ShorterReplyIsTerminatedByTheZeroing) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("abc"); });
    char reply[16];
    std::memset(reply, 'x', sizeof(reply));
    ASSERT_EQ(AudioDaemonGetMediaServerList(0, 10, reply, sizeof(reply)), 0);
    EXPECT_EQ(std::string(reply, sizeof(reply)), std::string("abc") + std::string(13, '\0'));
}

TEST_F(DaemonClient, ReplyInPiecesIsCutToTheFirstPiece) {
    ScriptedDaemon daemon(
        [](const DaemonRequest&) { return DaemonAnswer::InPieces("{\"list\": []}", {3}, 200); });
    char reply[64];
    ASSERT_EQ(AudioDaemonGetMediaServerList(0, 10, reply, sizeof(reply)), 0);
    EXPECT_STREQ(reply, "{\"l");
}

TEST_F(DaemonClient, Command16WithNullBufferOrSizeZeroLogsBadParametersAndSendsNothing) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("{}"); });
    char reply[8];
    EXPECT_EQ(AudioDaemonGetMediaServerList(0, 10, nullptr, 100), -1);
    EXPECT_EQ(AudioDaemonGetMediaServerList(0, 10, reply, 0), -1);
    EXPECT_EQ(AudioDaemonGetMediaServerList(0, 10, reply, -5), -1);
    EXPECT_EQ(LoggedMessages(), std::vector<std::string>(3, "info:62 Bad parameters"));
    EXPECT_EQ(daemon.Connections(), 0);
    EXPECT_TRUE(daemon.Requests().empty());
}

TEST_F(DaemonClient, EveryBadParametersCheckLogsItsLineAndSendsNothing) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("{}"); });
    char reply[8];
    EXPECT_EQ(AudioDaemonCommand17(1, 2, nullptr, 8), -1);
    EXPECT_EQ(AudioDaemonCommand17(1, 2, reply, 0), -1);
    EXPECT_EQ(AudioDaemonCommand19(nullptr, 8), -1);
    EXPECT_EQ(AudioDaemonCommand19(reply, -1), -1);
    EXPECT_EQ(AudioDaemonCommand27(1, 2, nullptr, 8), -1);
    EXPECT_EQ(AudioDaemonCommand27(1, 2, reply, 0), -1);
    EXPECT_EQ(AudioDaemonCommand37(nullptr), -1);
    EXPECT_EQ(AudioDaemonCommand38(nullptr), -1);
    EXPECT_EQ(LoggedMessages(),
              (std::vector<std::string>{"info:88 Bad parameters", "info:88 Bad parameters",
                                        "info:135 Bad parameters", "info:135 Bad parameters",
                                        "info:160 Bad parameters", "info:160 Bad parameters",
                                        "info:188 Bad parameters", "info:216 Bad parameters"}));
    EXPECT_EQ(daemon.Connections(), 0);
}

TEST_F(DaemonClient, CallWithoutReplyBufferLogsBadParameterOfCtrl) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("{}"); });
    AudioDaemonRequest request{};
    request.command = 1;
    char reply[8];
    EXPECT_EQ(AudioDaemonCall(&request, nullptr, 8), -1);
    EXPECT_EQ(AudioDaemonCall(&request, reply, 0), -1);
    EXPECT_EQ(LoggedMessages(), std::vector<std::string>(2, "ctrl:46 Bad parameter"));
    EXPECT_EQ(daemon.Connections(), 0);
}

TEST_F(DaemonClient, CallSendsTheRecordAsItLies) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("ok"); });
    AudioDaemonRequest request;
    std::memset(&request, 0x5a, sizeof(request));  // not terminated: the call does not check
    request.command = -7;
    char reply[8];
    ASSERT_EQ(AudioDaemonCall(&request, reply, sizeof(reply)), 0);
    const std::vector<DaemonRequest> requests = daemon.Requests();
    ASSERT_EQ(requests.size(), 1u);
    EXPECT_EQ(std::memcmp(requests[0].raw.data(), &request, sizeof(request)), 0);
    EXPECT_EQ(requests[0].command, -7);
    EXPECT_FALSE(requests[0].argumentsTerminated);
}

TEST_F(DaemonClient, ConnectGivesADescriptorThatTheCallerCloses) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Never(); });
    const int fd = AudioDaemonConnect();
    ASSERT_GE(fd, 0);
    EXPECT_NE(fcntl(fd, F_GETFD), -1);
    close(fd);
    EXPECT_TRUE(LoggedMessages().empty());
}

// The client closes a connection only when its descriptor is above 0: descriptor 0 stays open.
TEST_F(DaemonClient, DescriptorZeroIsNeverClosed) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("ok"); });
    const int savedStdin = dup(0);
    ASSERT_GE(savedStdin, 0);
    close(0);  // the next socket gets descriptor 0
    const int result = AudioDaemonCommand6();
    const bool zeroStillOpen = fcntl(0, F_GETFD) != -1;
    int type = 0;
    socklen_t length = sizeof(type);
    const bool zeroIsSocket = getsockopt(0, SOL_SOCKET, SO_TYPE, &type, &length) == 0;
    dup2(savedStdin, 0);
    close(savedStdin);
    EXPECT_EQ(result, 0);
    EXPECT_TRUE(zeroStillOpen);
    EXPECT_TRUE(zeroIsSocket);
    EXPECT_EQ(type, SOCK_STREAM);
}

TEST_F(DaemonClient, EachCommandUsesAConnectionOfItsOwn) {
    ScriptedDaemon daemon([](const DaemonRequest&) { return DaemonAnswer::Reply("ok"); });
    for (int i = 0; i < 3; ++i)
        EXPECT_EQ(AudioDaemonCommand1(), 0);
    EXPECT_EQ(daemon.Connections(), 3);
    // No descriptor is leaked: a fresh one gets the lowest free number again.
    const int before = dup(1);
    close(before);
    EXPECT_EQ(AudioDaemonCommand1(), 0);
    const int after = dup(1);
    close(after);
    EXPECT_EQ(before, after);
}

}  // namespace
