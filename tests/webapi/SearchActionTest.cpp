// library.cgi's action=search run as the web server runs it, over a real library.db: the groups
// and their rows, the bounds of a query, hostile queries, and the same admission and permission
// as every other action.
#include <gtest/gtest.h>

#include <unistd.h>

#include <set>
#include <string>
#include <vector>

#include "platform/lib/sqlite/Database.h"
#include "platform/medialib/LibrarySchema.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"

using namespace harmona;
using namespace harmona::test;

namespace {

CgiResult Search(const std::string& q, const std::string& user = "admin") {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.queryString = Query({{"action", "search"}, {"q", q}});
    request.remoteUser = user;
    return RunCgi(request);
}

void ExpectError(const CgiResult& r, const char* status, const char* code) {
    EXPECT_NE(r.Header("Status").find(status), std::string::npos) << r.output;
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_FALSE(r.json["success"].asBool());
    EXPECT_EQ(r.json["error"].asString(), code) << r.output;
    EXPECT_FALSE(r.json["message"].asString().empty());
    EXPECT_EQ(r.exitStatus, 0);
}

std::vector<std::string> Titles(const Json::Value& rows) {
    std::vector<std::string> titles;
    for (const Json::Value& row : rows)
        titles.push_back(row["title"].asString());
    return titles;
}

class SearchAction : public ::testing::Test {
  protected:
    void SetUp() override {
        StandardFixture();
        MakeDirs("/var/packages/Harmona/var");
        db = sqlite::Database::Open(kLibraryDb, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, 3000);
        ASSERT_TRUE(db);
        ASSERT_TRUE(medialib::EnsureLibrarySchema(db));
        ASSERT_EQ(
            db.Execute(
                "INSERT INTO track (path, title, artist, album, album_artist, genre, duration_ms) "
                "VALUES ('/volume1/music/Beatles/01.mp3', 'Come Together', 'The Beatles', "
                "'Abbey Road', NULL, 'Rock', 259946), "
                "('/volume1/music/Beatles/02.flac', 'Something', 'The Beatles', 'Abbey Road', "
                "NULL, 'Rock', 182000), "
                "('/volume1/music/MJ/Beat It.m4a', 'Beat It', 'Michael Jackson', 'Thriller', "
                "NULL, 'Pop', NULL), "
                "('/volume1/music/Davis/So What.ogg', 'So What', 'Miles Davis', 'Kind of Blue', "
                "NULL, 'Jazz', 562000)"),
            SQLITE_OK)
            << db.Error();
    }
    sqlite::Database db;
};

TEST_F(SearchAction, TracksAlbumsAndArtistsComeGroupedAsRowsAndNodesThePageOpens) {
    const CgiResult r = Search("beat");
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_NE(r.Header("Content-Type").find("application/json"), std::string::npos);
    EXPECT_TRUE(r.json["success"].asBool());
    EXPECT_EQ(r.json["query"].asString(), "beat");
    // In the library's order.
    EXPECT_EQ(Titles(r.json["tracks"]),
              (std::vector<std::string>{"Come Together", "Something", "Beat It"}));
    const Json::Value& row = r.json["tracks"][0];
    EXPECT_EQ(row.getMemberNames(),
              (std::vector<std::string>{"album", "artist", "duration", "stream", "title"}));
    EXPECT_EQ(row["stream"].asString(), "1.mp3");
    EXPECT_EQ(row["artist"].asString(), "The Beatles");
    EXPECT_EQ(row["album"].asString(), "Abbey Road");
    EXPECT_EQ(row["duration"].asInt(), 260);
    EXPECT_EQ(r.json["tracks"][2]["duration"].asInt(), -1);
    EXPECT_EQ(r.json["tracks"][2]["stream"].asString(), "3.m4a");

    ASSERT_EQ(r.json["albums"].size(), 1u);
    EXPECT_EQ(r.json["albums"][0]["title"].asString(), "Abbey Road");
    EXPECT_EQ(r.json["albums"][0]["artist"].asString(), "The Beatles");
    EXPECT_EQ(r.json["albums"][0]["tracks"].asInt(), 2);
    EXPECT_EQ(r.json["albums"][0]["node"].asString(), "musiclib_album:The%20Beatles/Abbey%20Road");
    ASSERT_EQ(r.json["artists"].size(), 1u);
    EXPECT_EQ(r.json["artists"][0]["title"].asString(), "The Beatles");
    EXPECT_EQ(r.json["artists"][0]["node"].asString(), "musiclib_artist:The%20Beatles");
    EXPECT_EQ(r.json["artists"][0]["albums"].asInt(), 1);
    EXPECT_FALSE(r.json["more"]["tracks"].asBool());
    EXPECT_FALSE(r.json["more"]["albums"].asBool());
    EXPECT_FALSE(r.json["more"]["artists"].asBool());
    // No path of the server's files.
    EXPECT_EQ(r.body.find("/volume1"), std::string::npos) << r.body;
}

TEST_F(SearchAction, AllWordsMustBeFoundAndAnEmptyQueryFindsNothing) {
    const CgiResult both = Search("miles blue");
    ASSERT_TRUE(both.jsonOk) << both.output;
    EXPECT_EQ(Titles(both.json["tracks"]), std::vector<std::string>{"So What"});
    EXPECT_EQ(Titles(both.json["albums"]), std::vector<std::string>{"Kind of Blue"});
    EXPECT_EQ(both.json["artists"].size(), 0u);  // "blue" is not in the artist's name
    const CgiResult none = Search("miles abbey");
    EXPECT_EQ(none.json["tracks"].size(), 0u);
    for (const std::string q : {"", "   ", "\"*-"}) {
        const CgiResult empty = Search(q);
        ASSERT_TRUE(empty.jsonOk) << empty.output;
        EXPECT_TRUE(empty.json["success"].asBool());
        EXPECT_EQ(empty.json["tracks"].size(), 0u);
        EXPECT_EQ(empty.json["albums"].size(), 0u);
        EXPECT_EQ(empty.json["artists"].size(), 0u);
    }
}

TEST_F(SearchAction, HostileQueriesAreAnsweredAsText) {
    for (const std::string q :
         {"\"", "*", "-", "NEAR", "NEAR(beat, abbey)", "beat OR miles", "beat NOT it",
          "{title}:beat", "title:beat", "'; DROP TABLE track; --", "%", "\\", "^", "(", ")",
          "\xE2\x80\x94", "<script>"}) {
        SCOPED_TRACE(q);
        const CgiResult r = Search(q);
        ASSERT_TRUE(r.jsonOk) << r.output;
        EXPECT_TRUE(r.json["success"].asBool()) << r.output;
        EXPECT_EQ(r.exitStatus, 1);
    }
    EXPECT_EQ(Titles(Search("beat OR miles").json["tracks"]), std::vector<std::string>{});
    EXPECT_EQ(Titles(Search("-beat\"").json["tracks"]).size(), 3u);
    const CgiResult still = Search("something");
    EXPECT_EQ(Titles(still.json["tracks"]), std::vector<std::string>{"Something"});
}

TEST_F(SearchAction, QueriesTooLongOfTooManyWordsOrNotUtf8GetA400AndNoResults) {
    ExpectError(Search(std::string(201, 'a')), "400", "request_invalid");
    ExpectError(Search("a b c d e f g h i"), "400", "request_invalid");
    ExpectError(Search("be\xC3\x28t"), "400", "request_invalid");
    const CgiResult longest = Search(std::string(200, 'a'));
    ASSERT_TRUE(longest.jsonOk) << longest.output;
    EXPECT_TRUE(longest.json["success"].asBool());
}

TEST_F(SearchAction, EachGroupIsBounded) {
    sqlite::Statement insert =
        db.Prepare("INSERT INTO track (path, title, artist, album) VALUES (?1, ?2, ?3, ?4)");
    ASSERT_TRUE(insert);
    ASSERT_EQ(db.Execute("BEGIN"), SQLITE_OK);
    for (int i = 0; i < 3000; ++i) {
        insert.Reset();
        insert.Bind(1, "/volume1/music/many/" + std::to_string(i) + ".mp3");
        insert.Bind(2, "Many " + std::to_string(i));
        insert.Bind(3, "Many Artist " + std::to_string(i % 300));
        insert.Bind(4, "Many Album " + std::to_string(i % 1000));
        ASSERT_EQ(insert.Step(), SQLITE_DONE);
    }
    ASSERT_EQ(db.Execute("COMMIT"), SQLITE_OK);
    const CgiResult r = Search("many");
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_EQ(r.json["tracks"].size(), 50u);
    EXPECT_EQ(r.json["albums"].size(), 20u);
    EXPECT_EQ(r.json["artists"].size(), 20u);
    EXPECT_TRUE(r.json["more"]["tracks"].asBool());
    EXPECT_TRUE(r.json["more"]["albums"].asBool());
    EXPECT_TRUE(r.json["more"]["artists"].asBool());
    std::set<std::string> streams;
    for (const Json::Value& row : r.json["tracks"])
        streams.insert(row["stream"].asString());
    EXPECT_EQ(streams.size(), 50u);
}

TEST_F(SearchAction, AUserWithoutPermissionGetsWhatEveryOtherActionGives) {
    AddUser("guest", 0);
    const CgiResult search = Search("beat", "guest");
    CgiRequest list;
    list.program = LibraryCgiProgram();
    list.queryString = "action=list&node=musiclib_music_all";
    list.remoteUser = "guest";
    const CgiResult listed = RunCgi(list);
    ExpectError(search, "403", "request_refused");
    EXPECT_EQ(search.json["error"], listed.json["error"]);
    EXPECT_EQ(search.Header("Status"), listed.Header("Status"));
    EXPECT_EQ(search.body.find("Beat It"), std::string::npos);
}

TEST_F(SearchAction, NoLoginOrAnotherSiteGets401AndNoBody) {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.queryString = "action=search&q=beat";
    request.hasRemoteUser = false;
    CgiResult r = RunCgi(request);
    EXPECT_NE(r.Header("Status").find("401"), std::string::npos) << r.output;
    EXPECT_TRUE(r.body.empty()) << r.body;
    request.hasRemoteUser = true;
    request.extraEnv["HTTP_SEC_FETCH_SITE"] = "cross-site";
    r = RunCgi(request);
    EXPECT_NE(r.Header("Status").find("401"), std::string::npos) << r.output;
    EXPECT_TRUE(r.body.empty()) << r.body;
}

TEST_F(SearchAction, WithoutALibraryOrItsSearchIndexTheSearchIsUnavailable) {
    ASSERT_EQ(db.Execute("DROP TABLE track_search"), SQLITE_OK);
    ExpectError(Search("beat"), "503", "library_unavailable");
    db = sqlite::Database();
    ASSERT_EQ(unlink(kLibraryDb), 0);
    ExpectError(Search("beat"), "503", "library_unavailable");
}

}  // namespace
