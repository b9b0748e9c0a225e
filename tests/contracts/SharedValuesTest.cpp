// Fixed values that two programs share, each defined once under platform/: the MIME types the
// media server offers, the audio daemon's request record, and the random-100 playlist that the
// tree CGI draws and library.cgi lists.
#include <curl/curl.h>
#include <gtest/gtest.h>
#include <json/json.h>
#include <unistd.h>

#include <cstring>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include <pugixml.hpp>

#include "platform/medialib/MediaFiles.h"
#include "platform/paths/DaemonProtocol.h"
#include "platform/paths/PlatformPaths.h"
#include "services/vanuaudiod/Protocol.h"
#include "src/daemonclient/AudioDaemon.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/harness/ScriptedDaemon.h"
#include "tests/mediad/MediadTestKit.h"

using namespace harmona;

namespace {

size_t Collect(char* data, size_t size, size_t count, void* out) {
    static_cast<std::string*>(out)->append(data, size * count);
    return size * count;
}

// The Source of the local media server's ConnectionManager GetProtocolInfo; "<failed>" when the
// action does not answer.
std::string SourceProtocolInfoOfTheServer() {
    const std::string body =
        "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n"
        "<s:Envelope xmlns:s=\"http://schemas.xmlsoap.org/soap/envelope/\" "
        "s:encodingStyle=\"http://schemas.xmlsoap.org/soap/encoding/\"><s:Body>"
        "<u:GetProtocolInfo xmlns:u=\"urn:schemas-upnp-org:service:ConnectionManager:1\"/>"
        "</s:Body></s:Envelope>";
    const std::string url = "http://127.0.0.1:" + std::to_string(paths::kLocalMediaServerPort) +
                            "/ConnectionManager/control";
    std::string reply;
    CURL* curl = curl_easy_init();
    curl_slist* headers = nullptr;
    headers = curl_slist_append(headers, "Content-Type: text/xml; charset=\"utf-8\"");
    headers = curl_slist_append(
        headers,
        "SOAPACTION: \"urn:schemas-upnp-org:service:ConnectionManager:1#GetProtocolInfo\"");
    curl_easy_setopt(curl, CURLOPT_URL, url.c_str());
    curl_easy_setopt(curl, CURLOPT_HTTPHEADER, headers);
    curl_easy_setopt(curl, CURLOPT_POSTFIELDS, body.c_str());
    curl_easy_setopt(curl, CURLOPT_WRITEFUNCTION, Collect);
    curl_easy_setopt(curl, CURLOPT_WRITEDATA, &reply);
    curl_easy_setopt(curl, CURLOPT_TIMEOUT, 30L);
    long status = 0;
    if (curl_easy_perform(curl) == CURLE_OK)
        curl_easy_getinfo(curl, CURLINFO_RESPONSE_CODE, &status);
    curl_slist_free_all(headers);
    curl_easy_cleanup(curl);
    pugi::xml_document envelope;
    if (status != 200 || !envelope.load_string(reply.c_str()))
        return "<failed>";
    const pugi::xml_node source = envelope.find_node([](const pugi::xml_node& node) {
        const char* name = node.name();
        const char* colon = std::strchr(name, ':');
        return std::strcmp(colon != nullptr ? colon + 1 : name, "Source") == 0;
    });
    return source ? source.text().get() : "<missing>";
}

}  // namespace

TEST(MediaServerProtocols, ConnectionManagerOffersEachMimeTypeOfTheAudioTypesOnce) {
    ASSERT_NO_FATAL_FAILURE(test::mediad::IndexStandardShare());
    test::mediad::ServerProcess server;
    ASSERT_TRUE(server.Start()) << "harmona-mediad did not come up";
    const std::string source = SourceProtocolInfoOfTheServer();

    // The table written out here on its own: each MIME type once, in table order.
    std::vector<std::string> expected;
    std::set<std::string> seen;
    for (const medialib::AudioType& type : medialib::kAudioTypes) {
        if (seen.insert(type.mime).second)
            expected.push_back(std::string("http-get:*:") + type.mime + ":*");
    }
    std::vector<std::string> offered;
    for (std::size_t start = 0; start <= source.size();) {
        const std::size_t comma = std::min(source.find(',', start), source.size());
        offered.push_back(source.substr(start, comma - start));
        start = comma + 1;
    }
    EXPECT_EQ(offered, expected) << source;
    EXPECT_EQ(source, medialib::SourceProtocolInfo());
    EXPECT_EQ(server.Stop(), 0);
}

TEST(DaemonRecord, TheRecordTheClientSendsIsOneTheDaemonParses) {
    test::StandardFixture();
    std::vector<test::DaemonRequest> requests;
    {
        test::ScriptedDaemon daemon(test::ServeMediaServers(test::MakeMediaServers(3)));
        char reply[paths::kDaemonListReplyBufferSize];
        ASSERT_EQ(AudioDaemonGetMediaServerList(2, paths::kDaemonListPageSize, reply,
                                                static_cast<int>(sizeof(reply))),
                  0);
        ASSERT_EQ(AudioDaemonCommand37("some text"), 0);
        requests = daemon.Requests();
    }
    ASSERT_EQ(requests.size(), 2u);
    vanuaudiod::Request parsed;
    for (const test::DaemonRequest& request : requests) {
        EXPECT_EQ(request.size, paths::kDaemonRequestSize);
        ASSERT_TRUE(vanuaudiod::ParseRequest(request.raw.data(), request.size, parsed));
        EXPECT_EQ(parsed.command, request.command);
        EXPECT_EQ(parsed.arguments, request.arguments);
    }
    EXPECT_EQ(requests[0].command, paths::kDaemonCommandGetMediaServerList);
    EXPECT_EQ(requests[0].arguments, "2 " + std::to_string(paths::kDaemonListPageSize));
    int offset = -1;
    int count = -1;
    EXPECT_TRUE(vanuaudiod::ParsePageArguments(requests[0].arguments, offset, count));
    EXPECT_EQ(offset, 2);
    EXPECT_EQ(count, paths::kDaemonListPageSize);
    EXPECT_EQ(requests[1].arguments, "some text");
}

TEST(DaemonRecord, AFullPageOfTheLongestServersFitsTheClientsReplyBuffer) {
    std::vector<vanuaudiod::MediaServer> servers(paths::kDaemonListPageSize);
    for (vanuaudiod::MediaServer& server : servers) {
        // Characters that JSON escapes take twice their bytes: the longest reply there is.
        server.friendlyName = std::string(vanuaudiod::kMaxFriendlyNameBytes, '"');
        server.controlUrl = std::string(vanuaudiod::kMaxControlUrlBytes, '\\');
        server.udn = std::string(vanuaudiod::kMaxUdnBytes, '"');
        server.ip = std::string(vanuaudiod::kMaxIpBytes, '"');
    }
    const std::string reply = vanuaudiod::ListReply(servers, 0, paths::kDaemonListPageSize);
    EXPECT_LT(reply.size(), paths::kDaemonListReplyBufferSize);
    Json::Value parsed;
    std::istringstream text(reply);
    std::string errors;
    ASSERT_TRUE(Json::parseFromStream(Json::CharReaderBuilder(), text, &parsed, &errors)) << errors;
    EXPECT_EQ(parsed["list"].size(), static_cast<Json::ArrayIndex>(paths::kDaemonListPageSize));
    EXPECT_EQ(parsed["total"].asInt(), paths::kDaemonListPageSize);
}

TEST(RandomPlaylist, TheTreeDrawsTheFileThatLibraryCgiLists) {
    test::StandardFixture();
    test::MakeGeneratedLibrary(150);
    const std::string file = std::string(paths::kRandom100Prefix) + "admin";
    test::CgiRequest draw;
    draw.queryString = "action=rerandom100";
    ASSERT_EQ(test::RunCgi(draw).exitStatus, 1);
    EXPECT_EQ(access(file.c_str(), F_OK), 0) << file;

    test::CgiRequest list;
    list.program = HARMONA_LIBRARY_CGI_PATH;
    list.queryString = "action=list&node=musiclib_random";
    const test::CgiResult listed = test::RunCgi(list);
    ASSERT_TRUE(listed.jsonOk) << listed.output;
    EXPECT_EQ(listed.json["tracks"].size(), 100u);
    // The same file emptied of tracks: library.cgi reads that very file.
    test::WriteFile(file, "#EXTM3U\n");
    const test::CgiResult emptied = test::RunCgi(list);
    ASSERT_TRUE(emptied.jsonOk) << emptied.output;
    EXPECT_EQ(emptied.json["tracks"].size(), 0u);
    EXPECT_TRUE(emptied.json["success"].asBool());
}
