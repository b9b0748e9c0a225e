// The whole running system brought up by the test kit in one call (tests/harness/Stack.h): the
// page and the tree CGI answer through lighttpd, the services answer where the kit says, and its
// stop leaves nothing listening.
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <string>

#include "tests/harness/Stack.h"

using namespace harmona::test;

namespace {

// One HTTP/1.0 GET of `path` on 127.0.0.1:port as demo/secret; the whole reply.
std::string Get(unsigned short port, const std::string& path) {
    const int s = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_in to{};
    to.sin_family = AF_INET;
    to.sin_port = htons(port);
    inet_pton(AF_INET, "127.0.0.1", &to.sin_addr);
    std::string reply;
    const std::string request = "GET " + path +
                                " HTTP/1.0\r\nHost: 127.0.0.1\r\n"
                                "Authorization: Basic ZGVtbzpzZWNyZXQ=\r\n\r\n";  // demo:secret
    if (connect(s, reinterpret_cast<sockaddr*>(&to), sizeof(to)) == 0 &&
        send(s, request.data(), request.size(), MSG_NOSIGNAL) ==
            static_cast<ssize_t>(request.size())) {
        pollfd entry{s, POLLIN, 0};
        char buffer[4096];
        while (poll(&entry, 1, 10000) == 1) {
            const ssize_t n = recv(s, buffer, sizeof(buffer), 0);
            if (n <= 0)
                break;
            reply.append(buffer, static_cast<std::size_t>(n));
        }
    }
    close(s);
    return reply;
}

}  // namespace

TEST(RunningSystem, OneCallBringsUpThePageAndItsStopLeavesNothingListening) {
    RunningSystem system;
    ASSERT_TRUE(system.Start({0, 24, "secret"}));
    EXPECT_EQ(system.Url(), "http://127.0.0.1:" + std::to_string(Stack().defaultWebPort) + "/");

    const std::string page = Get(system.Port(), "/");
    EXPECT_EQ(page.rfind("HTTP/1.0 200", 0), 0u) << page.substr(0, 300);
    const std::string tree =
        Get(system.Port(), "/webapi/audiotree.cgi?action=gettreenode&node=audiotree_root");
    EXPECT_EQ(tree.rfind("HTTP/1.0 200", 0), 0u) << tree.substr(0, 300);
    EXPECT_NE(tree.find("\"id\":\"musiclib_root\""), std::string::npos) << tree;
    EXPECT_NE(tree.find("\"id\":\"mediaserver_root\""), std::string::npos) << tree;
    EXPECT_TRUE(Listening("127.0.0.1", Stack().mediadPort));
    EXPECT_TRUE(UnixSocketAnswers(Stack().daemonSocket));

    EXPECT_EQ(system.Stop(), 130) << system.Output();
    EXPECT_FALSE(Listening("127.0.0.1", system.Port()));
    EXPECT_FALSE(Listening("127.0.0.1", Stack().mediadPort));
    EXPECT_FALSE(UnixSocketAnswers(Stack().daemonSocket));
}
