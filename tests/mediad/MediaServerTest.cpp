// The local media server: harmona-mediad over the indexed generated share, browsed with an
// independent client (hand-written SOAP over libcurl) and with the project's own browse library,
// and through the real CGI.
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <chrono>
#include <cstring>
#include <pugixml.hpp>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "platform/dma/DMABrowse.h"
#include "platform/dma/DMAParser.h"
#include "services/harmona-mediad/DeviceDescription.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/mediad/MediadTestKit.h"

namespace harmona::test::mediad {
namespace {

const char* const kCategories[] = {"music_all",   "music_file", "music_album",      "music_aa",
                                   "music_genre", "random",     "music_latestalbum"};

std::vector<std::string> Titles(const BrowseReply& reply) {
    std::vector<std::string> titles;
    for (const DidlEntry& entry : reply.entries)
        titles.push_back(entry.title);
    return titles;
}

const DidlEntry* FindTitle(const BrowseReply& reply, const std::string& title) {
    for (const DidlEntry& entry : reply.entries) {
        if (entry.title == title)
            return &entry;
    }
    return nullptr;
}

class LocalMediaServer : public ::testing::Test {
  protected:
    void SetUp() override {
        ASSERT_NO_FATAL_FAILURE(IndexStandardShare());
        ASSERT_TRUE(server_.Start()) << "harmona-mediad did not come up";
    }
    ServerProcess server_;
};

TEST_F(LocalMediaServer, RootHoldsTheSevenCategoriesInOrder) {
    const BrowseReply root = SoapBrowse("0");
    ASSERT_EQ(root.httpStatus, 200) << root.raw;
    ASSERT_EQ(root.entries.size(), 7u) << root.raw;
    for (std::size_t i = 0; i < 7; ++i) {
        EXPECT_EQ(root.entries[i].id, kCategories[i]);
        EXPECT_EQ(root.entries[i].parentId, "0");
        EXPECT_TRUE(root.entries[i].container);
    }
    EXPECT_EQ(root.numberReturned, 7);
    EXPECT_EQ(root.totalMatches, 7);
    EXPECT_EQ(root.entries[0].childCount, 5);  // all music
}

TEST_F(LocalMediaServer, AllMusicHoldsEveryTrackWithTagsAndAServedResource) {
    const BrowseReply all = SoapBrowse("music_all");
    ASSERT_EQ(all.entries.size(), 5u) << all.raw;
    EXPECT_EQ(all.totalMatches, 5);
    const DidlEntry* first = FindTitle(all, "First <Song> & \"more\"");
    ASSERT_NE(first, nullptr) << all.raw;  // escaped on the wire, whole after parsing
    EXPECT_FALSE(first->container);
    EXPECT_EQ(first->parentId, "music_all");
    EXPECT_EQ(first->upnpClass, "object.item.audioItem.musicTrack");
    EXPECT_EQ(first->artist, "Band A");
    EXPECT_EQ(first->album, "Alpha & Omega");
    EXPECT_EQ(first->protocolInfo,
              "http-get:*:audio/flac:DLNA.ORG_OP=01;DLNA.ORG_CI=0;"
              "DLNA.ORG_FLAGS=01700000000000000000000000000000");
    // Browsed over loopback, the resource is on loopback too: the URL works for whoever asked.
    EXPECT_EQ(first->res.rfind("http://127.0.0.1:50003/media/", 0), 0u) << first->res;
    EXPECT_EQ(first->id.rfind("track:", 0), 0u);
}

TEST_F(LocalMediaServer, FoldersAreNestedAsOnTheShare) {
    const BrowseReply top = SoapBrowse("music_file");
    EXPECT_EQ(Titles(top), (std::vector<std::string>{"Jazz", "Rock", "Zulu"})) << top.raw;
    const DidlEntry* jazz = FindTitle(top, "Jazz");
    ASSERT_NE(jazz, nullptr);
    EXPECT_TRUE(jazz->container);
    EXPECT_EQ(jazz->childCount, 1);  // Blue
    const BrowseReply jazzChildren = SoapBrowse(jazz->id);
    ASSERT_EQ(jazzChildren.entries.size(), 1u) << jazzChildren.raw;  // notes.txt is no audio
    const BrowseReply blue = SoapBrowse(jazzChildren.entries[0].id);
    EXPECT_EQ(Titles(blue), (std::vector<std::string>{"Late", "Fourth"})) << blue.raw;
    EXPECT_EQ(blue.entries[0].parentId, jazzChildren.entries[0].id);
    const BrowseReply late = SoapBrowse(blue.entries[0].id);
    EXPECT_EQ(Titles(late), (std::vector<std::string>{"Third"}));
    // A folder's metadata names its parent folder.
    const BrowseReply meta = SoapBrowse(blue.entries[0].id, "BrowseMetadata");
    ASSERT_EQ(meta.entries.size(), 1u);
    EXPECT_EQ(meta.entries[0].parentId, jazzChildren.entries[0].id);
    EXPECT_EQ(meta.entries[0].title, "Late");
}

TEST_F(LocalMediaServer, AlbumsArtistsGenresRandomAndLatestAlbums) {
    const BrowseReply albums = SoapBrowse("music_album");
    EXPECT_EQ(Titles(albums), (std::vector<std::string>{"Alpha & Omega", "Blue"})) << albums.raw;
    const BrowseReply alpha = SoapBrowse(albums.entries[0].id);
    EXPECT_EQ(Titles(alpha), (std::vector<std::string>{"First <Song> & \"more\"", "Second"}));
    EXPECT_EQ(albums.entries[0].childCount, 2);
    EXPECT_EQ(albums.entries[0].artist, "Band A");

    const BrowseReply artists = SoapBrowse("music_aa");
    EXPECT_EQ(Titles(artists), (std::vector<std::string>{"Band A", "Trio"})) << artists.raw;
    const BrowseReply trioAlbums = SoapBrowse(artists.entries[1].id);
    EXPECT_EQ(Titles(trioAlbums), (std::vector<std::string>{"Blue"}));
    // The same album, listed under its artist with an id of its own (one parent per object).
    EXPECT_EQ(trioAlbums.entries[0].title, albums.entries[1].title);
    EXPECT_EQ(trioAlbums.entries[0].parentId, artists.entries[1].id);
    EXPECT_EQ(Titles(SoapBrowse(trioAlbums.entries[0].id)),
              (std::vector<std::string>{"Third", "Fourth"}));  // track number order

    const BrowseReply genres = SoapBrowse("music_genre");
    EXPECT_EQ(Titles(genres), (std::vector<std::string>{"Jazz", "Pop", "Rock"})) << genres.raw;
    EXPECT_EQ(Titles(SoapBrowse(genres.entries[1].id)), (std::vector<std::string>{"Zulu"}));

    const BrowseReply random = SoapBrowse("random");
    EXPECT_EQ(random.totalMatches, 5);
    std::set<std::string> randomTitles;
    for (const DidlEntry& entry : random.entries)
        randomTitles.insert(entry.title);
    EXPECT_EQ(randomTitles.size(), 5u);

    const BrowseReply latest = SoapBrowse("music_latestalbum");
    EXPECT_EQ(latest.totalMatches, 2);
    std::vector<std::string> latestTitles = Titles(latest);
    std::sort(latestTitles.begin(), latestTitles.end());
    EXPECT_EQ(latestTitles, (std::vector<std::string>{"Alpha & Omega", "Blue"}));
}

TEST_F(LocalMediaServer, PagingGivesTheRequestedSliceAndTheTotal) {
    const BrowseReply all = SoapBrowse("music_all");
    ASSERT_EQ(all.entries.size(), 5u);
    const BrowseReply page = SoapBrowse("music_all", "BrowseDirectChildren", 1, 2);
    EXPECT_EQ(page.numberReturned, 2);
    EXPECT_EQ(page.totalMatches, 5);
    ASSERT_EQ(page.entries.size(), 2u);
    EXPECT_EQ(page.entries[0].id, all.entries[1].id);
    EXPECT_EQ(page.entries[1].id, all.entries[2].id);
    const BrowseReply past = SoapBrowse("music_all", "BrowseDirectChildren", 9, 2);
    EXPECT_EQ(past.numberReturned, 0);
    EXPECT_EQ(past.totalMatches, 5);
    const BrowseReply tail = SoapBrowse("music_file", "BrowseDirectChildren", 2, 10);
    EXPECT_EQ(Titles(tail), (std::vector<std::string>{"Zulu"}));
    EXPECT_EQ(tail.totalMatches, 3);
}

TEST_F(LocalMediaServer, SortCriteriaOnTitleBothWays) {
    const std::vector<std::string> ascending = {"First <Song> & \"more\"", "Fourth", "Second",
                                                "Third", "Zulu"};
    EXPECT_EQ(Titles(SoapBrowse("music_all", "BrowseDirectChildren", 0, 0, "+dc:title")),
              ascending);
    std::vector<std::string> descending(ascending.rbegin(), ascending.rend());
    EXPECT_EQ(Titles(SoapBrowse("music_all", "BrowseDirectChildren", 0, 0, "-dc:title")),
              descending);
    EXPECT_EQ(Titles(SoapBrowse("music_file", "BrowseDirectChildren", 0, 0, "-dc:title")),
              (std::vector<std::string>{"Zulu", "Rock", "Jazz"}));
    EXPECT_EQ(SoapBrowse("music_all", "BrowseDirectChildren", 0, 0, "+upnp:producer").upnpError,
              709);
    EXPECT_EQ(SoapSimpleAction("GetSortCapabilities", "SortCaps"),
              "dc:title,upnp:artist,upnp:album,upnp:originalTrackNumber,dc:date");
    EXPECT_EQ(SoapSimpleAction("GetSearchCapabilities", "SearchCaps"), "");
    EXPECT_NE(SoapSimpleAction("GetSystemUpdateID", "Id"), "<failed>");
}

TEST_F(LocalMediaServer, MetadataOfAnItemAndOfACategory) {
    const BrowseReply all = SoapBrowse("music_all");
    ASSERT_FALSE(all.entries.empty());
    const BrowseReply item = SoapBrowse(all.entries[0].id, "BrowseMetadata");
    ASSERT_EQ(item.entries.size(), 1u) << item.raw;
    EXPECT_EQ(item.entries[0].title, all.entries[0].title);
    EXPECT_EQ(item.totalMatches, 1);
    const BrowseReply category = SoapBrowse("music_genre", "BrowseMetadata");
    ASSERT_EQ(category.entries.size(), 1u);
    EXPECT_EQ(category.entries[0].parentId, "0");
    EXPECT_EQ(category.entries[0].childCount, 3);
}

TEST_F(LocalMediaServer, UnknownObjectIdsGetError701) {
    for (const char* id : {"nope", "album:%ZZ/x", "genre:Polka", "track:999999", "folder:..",
                           "folder:Nowhere", "music_all/../x"}) {
        SCOPED_TRACE(id);
        const BrowseReply reply = SoapBrowse(id);
        EXPECT_EQ(reply.httpStatus, 500);
        EXPECT_EQ(reply.upnpError, 701) << reply.raw;
    }
    EXPECT_EQ(SoapBrowse("track:999999", "BrowseMetadata").upnpError, 701);
}

TEST_F(LocalMediaServer, RangeGetOfAResourceServesTheIndexedFile) {
    const BrowseReply all = SoapBrowse("music_all");
    const DidlEntry* fourth = FindTitle(all, "Fourth");
    ASSERT_NE(fourth, nullptr);
    const std::string file = ReadFile(std::string(kShare) + "/Jazz/Blue/04 Fourth.wav");
    ASSERT_GT(file.size(), 100u);
    const HttpReply part = HttpGet(fourth->res, "10-49");
    EXPECT_EQ(part.status, 206);
    EXPECT_EQ(part.contentType, "audio/wav");
    EXPECT_EQ(part.body, file.substr(10, 40));
    const HttpReply whole = HttpGet(fourth->res);
    EXPECT_EQ(whole.status, 200);
    EXPECT_EQ(whole.body, file);
    // Only files of the index, by id: no path of the request is ever opened.
    const std::string base = fourth->res.substr(0, fourth->res.rfind('/') + 1);
    EXPECT_EQ(HttpGet(base + "999999.wav").status, 404);
    // Nothing but a file of the index, by its track id, is ever served.
    const HttpReply traversal = HttpGet(base + "..%2F..%2Fetc%2Fpasswd");
    EXPECT_GE(traversal.status, 400);
    EXPECT_EQ(traversal.body.find("root:"), std::string::npos);
    const HttpReply byPath = HttpGet("http://127.0.0.1:50003/volume1/music/loose.ogg");
    EXPECT_GE(byPath.status, 400);
    EXPECT_EQ(byPath.body.find("OggS"), std::string::npos);
}

// The listing names a folder's cover image in upnp:albumArtURI; the server serves it by track id,
// as it serves the audio, and nothing else under that path.
TEST_F(LocalMediaServer, CoverArtNamedInTheListingIsServed) {
    const std::string cover = std::string(kShare) + "/Jazz/Blue/folder.jpg";
    const std::string picture = std::string("\xFF\xD8\xFF\xE0") + "a cover image";
    WriteFile(cover, picture);
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    std::string url;
    for (int attempt = 0; attempt < 50 && url.empty(); ++attempt) {
        const BrowseReply all = SoapBrowse("music_all");
        const std::size_t open = all.raw.find("upnp:albumArtURI&gt;");
        if (open != std::string::npos) {
            const std::size_t start = open + std::string("upnp:albumArtURI&gt;").size();
            url = all.raw.substr(start, all.raw.find("&lt;", start) - start);
        } else {
            std::this_thread::sleep_for(std::chrono::milliseconds(100));
        }
    }
    ASSERT_EQ(url.rfind("http://127.0.0.1:50003/media/art/", 0), 0u) << url;
    const HttpReply art = HttpGet(url);
    EXPECT_EQ(art.status, 200);
    EXPECT_EQ(art.contentType, "image/jpeg");
    EXPECT_EQ(art.body, picture);
    // Another extension than the listing's, or a track without a cover: nothing.
    EXPECT_EQ(HttpGet(url.substr(0, url.rfind('.')) + ".png").status, 404);
    EXPECT_EQ(HttpGet("http://127.0.0.1:50003/media/art/999999.jpg").status, 404);
}

// A cover image carries an entity tag and its time: a browser that keeps it asks again with them
// and gets 304 without the image while the file is unchanged, the image again once it changed.
TEST_F(LocalMediaServer, CoverArtCarriesValidatorsAndAnUnchangedOneIsNotSentAgain) {
    const std::string cover = std::string(kShare) + "/Jazz/Blue/cover.png";
    WriteFile(cover, std::string("\x89PNG\r\n\x1a\n") + "a cover image");
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    std::string path;
    for (int attempt = 0; attempt < 50 && path.empty(); ++attempt) {
        const BrowseReply all = SoapBrowse("music_all");
        const std::size_t at = all.raw.find("/media/art/");
        if (at != std::string::npos)
            path = all.raw.substr(at, all.raw.find("&lt;", at) - at);
        else
            std::this_thread::sleep_for(std::chrono::milliseconds(100));
    }
    ASSERT_EQ(path.size() > 4 ? path.substr(path.size() - 4) : "", ".png") << path;
    const HttpReply first = HttpGet("http://127.0.0.1:50003" + path);
    ASSERT_EQ(first.status, 200);
    const auto header = [](const std::string& headers, const std::string& name) {
        const std::size_t at = headers.find("\r\n" + name + ": ");
        if (at == std::string::npos)
            return std::string();
        const std::size_t start = at + name.size() + 4;
        return headers.substr(start, headers.find("\r\n", start) - start);
    };
    const std::string tag = header(first.headers, "ETag");
    const std::string modified = header(first.headers, "Last-Modified");
    ASSERT_FALSE(tag.empty()) << first.headers;
    EXPECT_EQ(tag.front(), '"');
    EXPECT_FALSE(modified.empty()) << first.headers;
    const auto ask = [&](const std::string& condition) {
        return RawHttpExchange("127.0.0.1", 50003,
                               "GET " + path + " HTTP/1.1\r\nHost: 127.0.0.1\r\n" + condition +
                                   "\r\nConnection: close\r\n\r\n");
    };
    const std::string byTag = ask("If-None-Match: " + tag);
    EXPECT_EQ(byTag.rfind("HTTP/1.1 304", 0), 0u) << byTag;
    EXPECT_EQ(byTag.find("a cover image"), std::string::npos);
    const std::string byTime = ask("If-Modified-Since: " + modified);
    EXPECT_EQ(byTime.rfind("HTTP/1.1 304", 0), 0u) << byTime;
    const std::string otherTag = ask("If-None-Match: \"another\"");
    EXPECT_EQ(otherTag.rfind("HTTP/1.1 200", 0), 0u) << otherTag;
    EXPECT_NE(otherTag.find("a cover image"), std::string::npos);
    // The audio is not made conditional: a track's reply is the same as before.
    const BrowseReply all = SoapBrowse("music_all");
    const DidlEntry* fourth = FindTitle(all, "Fourth");
    ASSERT_NE(fourth, nullptr);
    EXPECT_EQ(header(HttpGet(fourth->res).headers, "ETag"), "");
}

TEST_F(LocalMediaServer, TheProjectsBrowseLibraryListsEveryCategory) {
    for (const char* category : kCategories) {
        SCOPED_TRACE(category);
        DMABrowse browse(BrowseDirectChildren, kControlUrl);
        browse.objectId = category;
        ASSERT_EQ(browse.Prepare(), 0);
        DMAParser parser;
        ASSERT_EQ(parser.Parse(&browse), 0) << parser.Error();
        const BrowseReply independent = SoapBrowse(category);
        ASSERT_NE(parser.GetResult(), nullptr);
        ASSERT_EQ(parser.GetResult()->size(), independent.entries.size());
        if (std::string(category) == "random")
            continue;  // a new draw each time
        for (std::size_t i = 0; i < independent.entries.size(); ++i) {
            EXPECT_EQ((*parser.GetResult())[i]->getValueByKey("id"), independent.entries[i].id);
            EXPECT_EQ((*parser.GetResult())[i]->getValueByKey("title"),
                      independent.entries[i].title);
        }
    }
}

TEST_F(LocalMediaServer, PidFileWhileRunningAndGoneAfterStop) {
    ASSERT_TRUE(Exists(kPidFile));
    EXPECT_EQ(std::atol(ReadFile(kPidFile).c_str()), server_.pid());
    EXPECT_EQ(server_.Stop(), 0);
    EXPECT_FALSE(Exists(kPidFile));
}

// One M-SEARCH for a MediaServer sent from hm1; the first answer (lower-cased: header names are
// case-insensitive), or "" after `waitMs`.
std::string SearchForMediaServer(int waitMs) {
    const int s = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    if (s < 0)
        return "";
    sockaddr_in local{};
    local.sin_family = AF_INET;
    inet_pton(AF_INET, "192.0.2.2", &local.sin_addr);
    in_addr interfaceAddress{};
    inet_pton(AF_INET, "192.0.2.2", &interfaceAddress);
    setsockopt(s, IPPROTO_IP, IP_MULTICAST_IF, &interfaceAddress, sizeof(interfaceAddress));
    const std::string search =
        "M-SEARCH * HTTP/1.1\r\nHOST: 239.255.255.250:1900\r\nMAN: \"ssdp:discover\"\r\nMX: 1\r\n"
        "ST: urn:schemas-upnp-org:device:MediaServer:1\r\n\r\n";
    sockaddr_in group{};
    group.sin_family = AF_INET;
    group.sin_port = htons(1900);
    inet_pton(AF_INET, "239.255.255.250", &group.sin_addr);
    std::string answer;
    if (bind(s, reinterpret_cast<sockaddr*>(&local), sizeof(local)) == 0 &&
        sendto(s, search.data(), search.size(), 0, reinterpret_cast<sockaddr*>(&group),
               sizeof(group)) > 0) {
        pollfd pfd{s, POLLIN, 0};
        while (answer.find("location") == std::string::npos && poll(&pfd, 1, waitMs) > 0) {
            char buffer[2048];
            const ssize_t got = recv(s, buffer, sizeof(buffer), 0);
            if (got <= 0)
                break;
            answer.assign(buffer, static_cast<std::size_t>(got));
            std::transform(answer.begin(), answer.end(), answer.begin(),
                           [](unsigned char c) { return std::tolower(c); });
        }
    }
    close(s);
    return answer;
}

TEST_F(LocalMediaServer, TheDeviceAnswersAnSsdpSearchOnTheNetwork) {
    // The server started with no LAN at all; the interface appears afterwards, and the server
    // follows it without a restart.
    SetUpNetwork();
    std::string answer;
    for (int attempt = 0; attempt < 10 && answer.empty(); ++attempt)
        answer = SearchForMediaServer(1000);
    EXPECT_NE(answer.find("location: http://192.0.2.1:50003/"), std::string::npos) << answer;
    EXPECT_NE(answer.find("urn:schemas-upnp-org:device:mediaserver:1"), std::string::npos);
}

// The description of the server at the location an SSDP search gives (empty when none answers).
std::string DescriptionOnTheWire() {
    std::string answer;
    for (int attempt = 0; attempt < 10 && answer.empty(); ++attempt)
        answer = SearchForMediaServer(1000);
    const std::size_t at = answer.find("location: ");
    if (at == std::string::npos)
        return "";
    return HttpGet(answer.substr(at + 10, answer.find("\r\n", at) - (at + 10))).body;
}

// The owner's name for the server is what control points list: cleaned to printable text, its
// blanks at either end dropped, escaped in the description.
TEST_F(LocalMediaServer, TheFriendlyNameGivenAtStartIsTheOneOnTheWire) {
    server_.Stop();
    ASSERT_TRUE(server_.Start({"--friendly-name", "  Kitchen & <Shelf>\x01 "}));
    SetUpNetwork();
    const std::string body = DescriptionOnTheWire();
    pugi::xml_document description;
    ASSERT_TRUE(description.load_string(body.c_str())) << body;
    EXPECT_EQ(std::string(description.child("root").child("device").child_value("friendlyName")),
              "Kitchen & <Shelf>");
}

TEST(FriendlyName, ALongNameIsCutToSixtyFourBytesBetweenCharactersAndABlankOneIsTheDefault) {
    const std::string name =
        harmona::mediad::ChosenFriendlyName(std::string(63, 'a') + "\xc3\xa9 and more");
    EXPECT_EQ(name, std::string(63, 'a'));
    EXPECT_EQ(harmona::mediad::ChosenFriendlyName(std::string(64, 'b') + "c"),
              std::string(64, 'b'));
    EXPECT_EQ(harmona::mediad::ChosenFriendlyName("Caf\xc3\xa9 \xff Sofa"), "Caf\xc3\xa9   Sofa");
    EXPECT_EQ(harmona::mediad::ChosenFriendlyName(""), harmona::mediad::DefaultFriendlyName());
    EXPECT_EQ(harmona::mediad::ChosenFriendlyName(" \t\n "),
              harmona::mediad::DefaultFriendlyName());
}

// The device description at the location the SSDP answer gives: this machine's UDN and friendly
// name filled in, both services with the URLs they are served at, and each service description
// served as the data file the build installs beside the program.
TEST_F(LocalMediaServer, TheDescriptionOnTheWireNamesThisDeviceAndServesBothServiceDescriptions) {
    SetUpNetwork();
    std::string answer;
    for (int attempt = 0; attempt < 10 && answer.empty(); ++attempt)
        answer = SearchForMediaServer(1000);
    const std::size_t at = answer.find("location: ");
    ASSERT_NE(at, std::string::npos) << answer;
    const std::string location =
        answer.substr(at + 10, answer.find("\r\n", at) - (at + 10));  // lower-cased, as sent
    const HttpReply reply = HttpGet(location);
    ASSERT_EQ(reply.status, 200) << location;
    pugi::xml_document description;
    ASSERT_TRUE(description.load_string(reply.body.c_str())) << reply.body;
    const pugi::xml_node device = description.child("root").child("device");
    EXPECT_STREQ(device.child_value("deviceType"), "urn:schemas-upnp-org:device:MediaServer:1");
    char host[256] = {};
    gethostname(host, sizeof(host) - 1);
    EXPECT_EQ(std::string(device.child_value("friendlyName")),
              std::string("Harmona Music Library (") + host + ")");
    const std::string udn = device.child_value("UDN");
    EXPECT_EQ(udn.rfind("uuid:4861726d-", 0), 0u) << udn;
    std::string lowerUdn = udn;
    std::transform(lowerUdn.begin(), lowerUdn.end(), lowerUdn.begin(),
                   [](unsigned char c) { return std::tolower(c); });
    EXPECT_NE(answer.find("usn: " + lowerUdn + "::"), std::string::npos) << answer;
    const std::string data = std::string(HARMONA_MEDIAD_DATA_BESIDE) + "/services/";
    std::vector<std::string> types;
    for (pugi::xml_node service : device.child("serviceList").children("service")) {
        const std::string name = std::string(service.child_value("serviceId"))
                                     .substr(std::strlen("urn:upnp-org:serviceId:"));
        types.push_back(service.child_value("serviceType"));
        EXPECT_EQ(std::string(service.child_value("SCPDURL")), "/" + name + ".xml");
        EXPECT_EQ(std::string(service.child_value("controlURL")), "/" + name + "/control");
        EXPECT_EQ(std::string(service.child_value("eventSubURL")), "/" + name + "/event");
        const HttpReply scpd = HttpGet("http://127.0.0.1:50003/" + name + ".xml");
        EXPECT_EQ(scpd.status, 200) << name;
        EXPECT_EQ(scpd.body, ReadFile(data + name + ".xml")) << name;
    }
    EXPECT_EQ(types,
              (std::vector<std::string>{"urn:schemas-upnp-org:service:ContentDirectory:1",
                                        "urn:schemas-upnp-org:service:ConnectionManager:1"}));
}

// A SOAP action posted to one of the two services over a connection of its own; the raw response.
std::string PostAction(const std::string& service, const std::string& action,
                       const std::string& arguments = "") {
    const std::string type = "urn:schemas-upnp-org:service:" + service + ":1";
    const std::string body =
        "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n"
        "<s:Envelope xmlns:s=\"http://schemas.xmlsoap.org/soap/envelope/\" "
        "s:encodingStyle=\"http://schemas.xmlsoap.org/soap/encoding/\"><s:Body><u:" +
        action + " xmlns:u=\"" + type + "\">" + arguments + "</u:" + action +
        "></s:Body></s:Envelope>";
    return RawHttpExchange("127.0.0.1", 50003,
                           "POST /" + service +
                               "/control HTTP/1.1\r\nHost: 127.0.0.1:50003\r\n"
                               "Content-Type: text/xml; charset=\"utf-8\"\r\nSOAPAction: \"" +
                               type + "#" + action +
                               "\"\r\nContent-Length: " + std::to_string(body.size()) +
                               "\r\nConnection: close\r\n\r\n" + body);
}

TEST_F(LocalMediaServer, AnActionNeitherServiceHasGets401InvalidAction) {
    for (const auto& [service, action] :
         {std::make_pair("ContentDirectory", "Search"),
          std::make_pair("ContentDirectory", "GetProtocolInfo"),
          std::make_pair("ConnectionManager", "PrepareForConnection"),
          std::make_pair("ConnectionManager", "Browse")}) {
        const std::string response = PostAction(service, action);
        EXPECT_EQ(response.rfind("HTTP/1.1 500", 0), 0u) << service << " " << action << response;
        EXPECT_NE(response.find("<errorCode>401</errorCode>"), std::string::npos) << response;
        EXPECT_NE(response.find("<errorDescription>Invalid Action</errorDescription>"),
                  std::string::npos)
            << response;
    }
}

TEST_F(LocalMediaServer, TheConnectionManagerAnswersItsThreeActions) {
    const std::string protocols = PostAction("ConnectionManager", "GetProtocolInfo");
    EXPECT_EQ(protocols.rfind("HTTP/1.1 200", 0), 0u) << protocols;
    EXPECT_NE(protocols.find("<Source>http-get:*:audio/"), std::string::npos) << protocols;
    EXPECT_NE(protocols.find("<Sink></Sink>"), std::string::npos) << protocols;
    const std::string ids = PostAction("ConnectionManager", "GetCurrentConnectionIDs");
    EXPECT_NE(ids.find("<ConnectionIDs>0</ConnectionIDs>"), std::string::npos) << ids;
    const std::string info = PostAction("ConnectionManager", "GetCurrentConnectionInfo",
                                        "<ConnectionID>0</ConnectionID>");
    EXPECT_NE(info.find("<Direction>Output</Direction>"), std::string::npos) << info;
    EXPECT_NE(info.find("<Status>OK</Status>"), std::string::npos) << info;
    const std::string unknown = PostAction("ConnectionManager", "GetCurrentConnectionInfo",
                                           "<ConnectionID>7</ConnectionID>");
    EXPECT_NE(unknown.find("<errorCode>706</errorCode>"), std::string::npos) << unknown;
}

TEST_F(LocalMediaServer, TheRealCgiListsTheAlbumsOfTheShare) {
    StandardFixture();
    const CgiResult r = Get(Query({{"action", "gettreenode"}, {"node", "musiclib_music_album"}}));
    ASSERT_TRUE(r.jsonOk) << r.body;
    ASSERT_EQ(r.json.size(), 2u) << r.body;
    EXPECT_EQ(r.json[0]["text"].asString(), "Alpha &amp; Omega");
    EXPECT_EQ(r.json[1]["text"].asString(), "Blue");
    EXPECT_EQ(r.json[0]["pid"].asString(), "musiclib_music_album");
    // One level further: the album's tracks, by the node id the tree made.
    const CgiResult tracks =
        Get(Query({{"action", "gettreenode"}, {"node", r.json[1]["id"].asString()}}));
    ASSERT_TRUE(tracks.jsonOk) << tracks.body;
    ASSERT_EQ(tracks.json.size(), 2u) << tracks.body;
    EXPECT_EQ(tracks.json[0]["text"].asString(), "Third");
}

TEST_F(LocalMediaServer, TheRootTreeShowsTheLibraryExactlyWhileTheServerRuns) {
    StandardFixture();
    const auto ids = [] {
        const CgiResult r = Get(Query({{"action", "gettreenode"}, {"node", "audiotree_root"}}));
        std::vector<std::string> found;
        for (const auto& node : r.json)
            found.push_back(node["id"].asString());
        return found;
    };
    const std::vector<std::string> running = ids();
    ASSERT_FALSE(running.empty());
    EXPECT_EQ(running[0], "musiclib_root");
    ASSERT_EQ(server_.Stop(), 0);
    const std::vector<std::string> stopped = ids();
    EXPECT_TRUE(std::find(stopped.begin(), stopped.end(), "musiclib_root") == stopped.end());
    EXPECT_FALSE(stopped.empty());
}

}  // namespace
}  // namespace harmona::test::mediad
