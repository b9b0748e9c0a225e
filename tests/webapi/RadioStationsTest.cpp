// The user's own internet radio stations through the real built library.cgi: added, marked as
// favourites and removed by POST requests, kept in the user's preference folder, listed as rows the
// page plays; bad input refused with a clear 4xx that changes nothing.
#include <gtest/gtest.h>

#include <string>
#include <thread>
#include <vector>

#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"

using namespace harmona::test;

namespace {

const std::string kStationsFile = "/usr/vanu/etc/preference/admin/radio.stations";
using Params = std::vector<std::pair<std::string, std::string>>;

CgiResult PostApi(const Params& params, const std::string& user = "admin") {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.method = "POST";
    request.contentType = "application/x-www-form-urlencoded";
    request.body = Query(params);
    request.remoteUser = user;
    return RunCgi(request);
}

CgiResult GetApi(const Params& params, const std::string& user = "admin") {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.queryString = Query(params);
    request.remoteUser = user;
    return RunCgi(request);
}

CgiResult Add(const std::string& name, const std::string& url) {
    return PostApi({{"action", "radio_add"}, {"name", name}, {"url", url}});
}

CgiResult ListNode(const std::string& node) {
    return GetApi({{"action", "list"}, {"node", node}});
}

std::vector<std::string> Titles(const CgiResult& r) {
    std::vector<std::string> titles;
    for (const Json::Value& row : r.json["tracks"])
        titles.push_back(row["title"].asString());
    return titles;
}

void ExpectError(const CgiResult& r, const char* status, const char* code) {
    EXPECT_NE(r.Header("Status").find(status), std::string::npos) << code << r.output;
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_FALSE(r.json["success"].asBool());
    EXPECT_EQ(r.json["error"].asString(), code) << r.output;
    EXPECT_TRUE(r.json["errinfo"].isObject());
    EXPECT_FALSE(r.json["message"].asString().empty());
    EXPECT_EQ(r.exitStatus, 0);
}

class RadioStations : public ::testing::Test {
  protected:
    void SetUp() override {
        StandardFixture();
        // The platform keeps the folder of the users' preferences; each user's own is made on the
        // first change.
        MakeDirs("/usr/vanu/etc/preference");
    }
};

TEST_F(RadioStations, AddedStationsAreListedInOrderAsRowsThePagePlays) {
    const CgiResult first = Add("  Jazz FM ", "http://198.51.100.7:8000/jazz.mp3");
    ASSERT_TRUE(first.jsonOk) << first.output;
    EXPECT_TRUE(first.json["success"].asBool());
    EXPECT_EQ(first.exitStatus, 1);
    EXPECT_EQ(first.json["station"]["title"].asString(), "Jazz FM");
    EXPECT_EQ(first.json["station"]["station"].asString(), "1");
    ASSERT_TRUE(Add("Ünïcode \"Radio\"", "HTTPS://radio.example/live?x=1&y=2").jsonOk);

    const CgiResult list = ListNode("inetradio_userdefined");
    ASSERT_TRUE(list.jsonOk) << list.output;
    EXPECT_TRUE(list.json["success"].asBool());
    EXPECT_EQ(Titles(list), (std::vector<std::string>{"Jazz FM", "Ünïcode \"Radio\""}));
    const Json::Value& row = list.json["tracks"][0];
    EXPECT_EQ(row["url"].asString(), "http://198.51.100.7:8000/jazz.mp3");
    EXPECT_EQ(row["station"].asString(), "1");
    EXPECT_FALSE(row["favorite"].asBool());
    EXPECT_FALSE(row.isMember("stream"));
    EXPECT_EQ(list.json["tracks"][1]["url"].asString(), "HTTPS://radio.example/live?x=1&y=2");
    EXPECT_EQ(list.json["tracks"][1]["station"].asString(), "2");
}

TEST_F(RadioStations, StationsAreKeptInTheUsersPreferenceFolderInTheConfSyntax) {
    ASSERT_TRUE(Add("Jazz FM", "http://198.51.100.7:8000/jazz.mp3").jsonOk);
    const std::string text = ReadFile(kStationsFile);
    EXPECT_NE(text.find("[1]\nname=\"Jazz FM\"\nurl=\"http://198.51.100.7:8000/jazz.mp3\"\n"
                        "favorite=0\n"),
              std::string::npos)
        << text;
    // Another user sees only his own.
    AddUser("other", 8);
    const CgiResult theirs =
        GetApi({{"action", "list"}, {"node", "inetradio_userdefined"}}, "other");
    ASSERT_TRUE(theirs.jsonOk) << theirs.output;
    EXPECT_EQ(theirs.json["tracks"].size(), 0u);
}

TEST_F(RadioStations, AFileWrittenByHandIsReadAndItsBadSectionsArePassedOver) {
    WriteFile(kStationsFile,
              "\xEF\xBB\xBF# mine\r\n[7]\r\nname = Seven \r\nurl=http://a.example/7\r\n"
              "favorite=1\r\n[x]\nname=No id\nurl=http://a.example/x\n"
              "[8]\nname=Bad scheme\nurl=ftp://a.example/8\n"
              "[9]\nname=\nurl=http://a.example/9\n"
              "[7]\nname=Same id\nurl=http://a.example/77\n"
              "[10]\nname=\"Ten\"\nurl=\"http://a.example/10\"\n");
    const CgiResult list = ListNode("inetradio_userdefined");
    ASSERT_TRUE(list.jsonOk) << list.output;
    EXPECT_EQ(Titles(list), (std::vector<std::string>{"Seven", "Ten"}));
    const CgiResult favorites = ListNode("inetradio_favorite");
    EXPECT_EQ(Titles(favorites), std::vector<std::string>{"Seven"});
    // The next id follows the highest one.
    const CgiResult added = Add("Eleven", "http://a.example/11");
    EXPECT_EQ(added.json["station"]["station"].asString(), "11") << added.output;
}

TEST_F(RadioStations, FavouritesListOnlyTheMarkedStations) {
    ASSERT_TRUE(Add("One", "http://a.example/1").jsonOk);
    ASSERT_TRUE(Add("Two", "http://a.example/2").jsonOk);
    ASSERT_TRUE(Add("Three", "http://a.example/3").jsonOk);
    EXPECT_EQ(ListNode("inetradio_favorite").json["tracks"].size(), 0u);
    for (const char* id : {"3", "1"}) {
        const CgiResult r =
            PostApi({{"action", "radio_favorite"}, {"station", id}, {"favorite", "1"}});
        ASSERT_TRUE(r.jsonOk) << r.output;
        EXPECT_TRUE(r.json["success"].asBool());
    }
    EXPECT_EQ(Titles(ListNode("inetradio_favorite")), (std::vector<std::string>{"One", "Three"}));
    ASSERT_TRUE(
        PostApi({{"action", "radio_favorite"}, {"station", "1"}, {"favorite", "0"}}).jsonOk);
    const CgiResult after = ListNode("inetradio_favorite");
    EXPECT_EQ(Titles(after), std::vector<std::string>{"Three"});
    EXPECT_TRUE(after.json["tracks"][0]["favorite"].asBool());
    EXPECT_EQ(ListNode("inetradio_userdefined").json["tracks"].size(), 3u);
}

TEST_F(RadioStations, RemovingAStationTakesItOutOfBothLists) {
    ASSERT_TRUE(Add("One", "http://a.example/1").jsonOk);
    ASSERT_TRUE(Add("Two", "http://a.example/2").jsonOk);
    ASSERT_TRUE(
        PostApi({{"action", "radio_favorite"}, {"station", "2"}, {"favorite", "1"}}).jsonOk);
    const CgiResult removed = PostApi({{"action", "radio_remove"}, {"station", "2"}});
    ASSERT_TRUE(removed.jsonOk) << removed.output;
    EXPECT_TRUE(removed.json["success"].asBool());
    EXPECT_EQ(Titles(ListNode("inetradio_userdefined")), std::vector<std::string>{"One"});
    EXPECT_EQ(ListNode("inetradio_favorite").json["tracks"].size(), 0u);
    ExpectError(PostApi({{"action", "radio_remove"}, {"station", "2"}}), "404",
                "station_not_found");
    ExpectError(PostApi({{"action", "radio_favorite"}, {"station", "5"}, {"favorite", "1"}}), "404",
                "station_not_found");
}

TEST_F(RadioStations, BadNamesUrlsAndIdsGet400AndChangeNothing) {
    ASSERT_TRUE(Add("Kept", "http://a.example/kept").jsonOk);
    const std::string before = ReadFile(kStationsFile);
    for (const std::string& name :
         {std::string(""), std::string("   "), std::string(129, 'n'), std::string("a\x01z"),
          std::string("tab\tin"), std::string("new\nline"), std::string("bad \xC3("),
          std::string("c1 \xC2\x85")}) {
        ExpectError(Add(name, "http://a.example/x"), "400", "name_invalid");
    }
    for (const std::string& url :
         {std::string(""), std::string("ftp://a.example/x"), std::string("javascript:alert(1)"),
          std::string("file:///etc/passwd"), std::string("http://"), std::string("http:///x"),
          std::string("http://user:pw@a.example/x"), std::string("http://a.example/a b"),
          std::string("http://a.example/\"x"), std::string("http://a.example:99999/"),
          std::string("http://a.example/\xC3\xA9"), std::string("//a.example/x"),
          "http://a.example/" + std::string(2048, 'u')}) {
        ExpectError(Add("Name", url), "400", "url_invalid");
    }
    for (const char* id : {"", "0", "x", "-1", "1234567890", "1/../2"}) {
        ExpectError(PostApi({{"action", "radio_remove"}, {"station", id}}), "400",
                    "station_invalid");
    }
    ExpectError(PostApi({{"action", "radio_favorite"}, {"station", "1"}, {"favorite", "yes"}}),
                "400", "favorite_invalid");
    EXPECT_EQ(ReadFile(kStationsFile), before);
}

TEST_F(RadioStations, NamesAndUrlsUpToTheirBoundsAreTaken) {
    const std::string url = "https://a.example/" + std::string(2048 - 18, 'u');
    const CgiResult r = Add(std::string(128, 'n') + "  ", url);
    ASSERT_TRUE(r.jsonOk) << r.output.substr(0, 300);
    EXPECT_TRUE(r.json["success"].asBool());
    const CgiResult list = ListNode("inetradio_userdefined");
    ASSERT_EQ(list.json["tracks"].size(), 1u);
    EXPECT_EQ(list.json["tracks"][0]["title"].asString(), std::string(128, 'n'));
    EXPECT_EQ(list.json["tracks"][0]["url"].asString(), url);
}

TEST_F(RadioStations, ChangesNeedAPostAndAGetChangesNothing) {
    for (const Params& params :
         {Params{{"action", "radio_add"}, {"name", "A"}, {"url", "http://a.example/"}},
          Params{{"action", "radio_remove"}, {"station", "1"}},
          Params{{"action", "radio_favorite"}, {"station", "1"}, {"favorite", "1"}}}) {
        ExpectError(GetApi(params), "405", "method_not_allowed");
    }
    EXPECT_FALSE(Exists(kStationsFile));
}

TEST_F(RadioStations, ARequestFromAnotherSiteOrWithoutALoginChangesNothing) {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.method = "POST";
    request.contentType = "application/x-www-form-urlencoded";
    request.body = Query({{"action", "radio_add"}, {"name", "A"}, {"url", "http://a.example/"}});
    request.extraEnv["HTTP_SEC_FETCH_SITE"] = "cross-site";
    const CgiResult crossSite = RunCgi(request);
    EXPECT_NE(crossSite.Header("Status").find("401"), std::string::npos) << crossSite.output;
    request.extraEnv.clear();
    request.hasRemoteUser = false;
    const CgiResult noLogin = RunCgi(request);
    EXPECT_NE(noLogin.Header("Status").find("401"), std::string::npos) << noLogin.output;
    EXPECT_FALSE(Exists(kStationsFile));
}

TEST_F(RadioStations, TheFiveHundredAndFirstStationIsRefused) {
    std::string text;
    for (int n = 1; n <= 500; ++n)
        text += "[" + std::to_string(n) + "]\nname=S" + std::to_string(n) +
                "\nurl=http://a.example/" + std::to_string(n) + "\n";
    WriteFile(kStationsFile, text);
    ExpectError(Add("One more", "http://a.example/501"), "409", "stations_full");
    EXPECT_EQ(ReadFile(kStationsFile), text);
    ASSERT_TRUE(PostApi({{"action", "radio_remove"}, {"station", "500"}}).jsonOk);
    EXPECT_TRUE(Add("One more", "http://a.example/501").json["success"].asBool());
}

TEST_F(RadioStations, AddsAtTheSameTimeKeepEveryStation) {
    std::vector<std::thread> adders;
    std::vector<CgiResult> results(8);
    for (int n = 0; n < 8; ++n)
        adders.emplace_back([n, &results] {
            results[n] =
                Add("Station " + std::to_string(n), "http://a.example/" + std::to_string(n));
        });
    for (std::thread& adder : adders)
        adder.join();
    for (const CgiResult& r : results)
        EXPECT_TRUE(r.json["success"].asBool()) << r.output;
    EXPECT_EQ(ListNode("inetradio_userdefined").json["tracks"].size(), 8u);
}

TEST_F(RadioStations, AStationsPathThatCannotBeReadGivesAnErrorNotAnEmptyList) {
    MakeDirs(kStationsFile);  // a directory where the file should be
    const CgiResult r = ListNode("inetradio_userdefined");
    ExpectError(r, "500", "stations_unreadable");
    ExpectError(Add("A", "http://a.example/"), "500", "stations_unwritable");
}

TEST_F(RadioStations, DirectorySourcesOnTheInternetSayTheyCannotBeReached) {
    // Their lists are set to addresses where nobody listens.
    WriteFile(kAudioConf,
              "radio_shoutcast_list=http://127.0.0.1:9/sc.xml\n"
              "radio_radioio_list=http://127.0.0.1:9/rio.xml\n");
    for (const char* node : {"inetradio_sc", "inetradio_rio"}) {
        const CgiResult r = ListNode(node);
        ExpectError(r, "503", "directory_unreachable");
    }
    // The category and its button hold no list of their own.
    for (const char* node : {"inetradio_root", "inetradio_new"}) {
        const CgiResult r = ListNode(node);
        EXPECT_NE(r.Header("Status").find("404"), std::string::npos) << node << r.output;
    }
}

TEST_F(RadioStations, ErrorTextsComeInTheUsersLanguage) {
    AddUser("admin", 255, "ger");
    const CgiResult r = PostApi({{"action", "radio_remove"}, {"station", "3"}});
    ExpectError(r, "404", "station_not_found");
    EXPECT_EQ(r.json["message"].asString(), "Der Eintrag konnte nicht abgerufen werden.");
}

}  // namespace
