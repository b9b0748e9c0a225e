// The albums and cover images of library.cgi over a real library.db: albums grouped as the media
// server groups them, with year, track count and cover, an album artist's albums and tracks, each
// track's cover, and the refusals of bad requests.
#include <gtest/gtest.h>

#include <unistd.h>

#include <string>
#include <vector>

#include "platform/lib/sqlite/Database.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"

using namespace harmona;
using namespace harmona::test;

namespace {

CgiResult Api(const std::vector<std::pair<std::string, std::string>>& params) {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.queryString = Query(params);
    request.remoteUser = "admin";
    return RunCgi(request);
}

// Tracks 1-3: album "Blue & Green" by "Zoë Ørsted" (album artist; track 2's artist differs), 2009
// and 2011, a PNG cover beside tracks 2 and 3; 4-5: album "Live" with no album artist, by
// "Zoë Ørsted", 1999, a JPEG cover; 6: "Other" by "Someone", no cover; 7: no album.
void MakeAlbumLibrary() {
    std::vector<TrackRow> rows;
    for (std::int64_t n = 1; n <= 7; ++n)
        rows.push_back({n, "/volume1/music/t" + std::to_string(n) + ".flac",
                        "Title " + std::to_string(n), "Zoë Ørsted", 60000 * n});
    MakeLibraryDb(rows);
    sqlite::Database db = sqlite::Database::Open(kLibraryDb, SQLITE_OPEN_READWRITE, 5000);
    ASSERT_TRUE(db);
    ASSERT_EQ(
        db.Execute("ALTER TABLE track ADD COLUMN art_path TEXT;"
                   "UPDATE track SET album = 'Blue & Green', album_artist = 'Zoë Ørsted', "
                   "year = 2009 + 2 * (id - 1) / 2, track_no = 4 - id WHERE id <= 3;"
                   "UPDATE track SET artist = 'Guest' WHERE id = 2;"
                   "UPDATE track SET art_path = '/volume1/music/Cover.PNG' WHERE id IN (2, 3);"
                   "UPDATE track SET album = 'Live', year = 1999, "
                   "art_path = '/volume1/music/folder.jpeg' WHERE id IN (4, 5);"
                   "UPDATE track SET album = 'Other', artist = 'Someone' WHERE id = 6;"),
        SQLITE_OK);
}

const Json::Value* AlbumNamed(const Json::Value& reply, const std::string& title) {
    for (const Json::Value& album : reply["albums"])
        if (album["title"].asString() == title)
            return &album;
    return nullptr;
}

class CoverArt : public ::testing::Test {
  protected:
    void SetUp() override {
        StandardFixture();
        MakeAlbumLibrary();
    }
};

TEST_F(CoverArt, AlbumsComeWithYearTrackCountCoverAndTheTreesNodeIds) {
    const CgiResult r = Api({{"action", "albums"}, {"node", "musiclib_music_album"}});
    ASSERT_TRUE(r.jsonOk) << r.body;
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_TRUE(r.json["success"].asBool());
    ASSERT_EQ(r.json["albums"].size(), 3u) << r.body;
    const Json::Value* blue = AlbumNamed(r.json, "Blue & Green");
    ASSERT_NE(blue, nullptr);
    EXPECT_EQ((*blue)["node"].asString(),
              "musiclib_album:Zo%C3%AB%20%C3%98rsted/Blue%20%26%20Green");
    EXPECT_EQ((*blue)["artist"].asString(), "Zoë Ørsted");
    EXPECT_EQ((*blue)["year"].asInt(), 2011);  // the latest of its tracks
    EXPECT_EQ((*blue)["tracks"].asInt(), 3);
    EXPECT_EQ((*blue)["cover"].asString(), "media/art/2.png");  // the first track with a cover
    const Json::Value* live = AlbumNamed(r.json, "Live");
    ASSERT_NE(live, nullptr);
    EXPECT_EQ((*live)["node"].asString(), "musiclib_album:Zo%C3%AB%20%C3%98rsted/Live");
    EXPECT_EQ((*live)["cover"].asString(), "media/art/4.jpg");
    const Json::Value* other = AlbumNamed(r.json, "Other");
    ASSERT_NE(other, nullptr);
    EXPECT_TRUE((*other)["cover"].isNull());
    EXPECT_EQ(r.body.find("/volume1"), std::string::npos) << r.body;

    const CgiResult latest = Api({{"action", "albums"}, {"node", "musiclib_music_latestalbum"}});
    ASSERT_TRUE(latest.jsonOk) << latest.body;
    ASSERT_NE(AlbumNamed(latest.json, "Live"), nullptr);
    EXPECT_EQ((*AlbumNamed(latest.json, "Live"))["node"].asString(),
              "musiclib_latest:Zo%C3%AB%20%C3%98rsted/Live");
}

TEST_F(CoverArt, AnArtistListsItsAlbumsAndAllItsTracksAlbumByAlbum) {
    const CgiResult r =
        Api({{"action", "albums"}, {"node", "musiclib_artist:Zo%C3%AB%20%C3%98rsted"}});
    ASSERT_TRUE(r.jsonOk) << r.body;
    ASSERT_EQ(r.json["albums"].size(), 2u) << r.body;
    EXPECT_EQ(r.json["albums"][0]["node"].asString(),
              "musiclib_artist:Zo%C3%AB%20%C3%98rsted/Blue%20%26%20Green");
    EXPECT_EQ(r.json["albums"][1]["node"].asString(),
              "musiclib_artist:Zo%C3%AB%20%C3%98rsted/Live");
    std::vector<std::string> streams;
    for (const Json::Value& track : r.json["tracks"])
        streams.push_back(track["stream"].asString());
    // "Blue & Green" by its track numbers (3, 2, 1), then "Live".
    EXPECT_EQ(streams,
              (std::vector<std::string>{"3.flac", "2.flac", "1.flac", "4.flac", "5.flac"}));
    EXPECT_EQ(r.json["tracks"][1]["artist"].asString(), "Guest");
    EXPECT_EQ(r.json["tracks"][1]["album"].asString(), "Blue & Green");
    EXPECT_EQ(r.json["tracks"][1]["duration"].asInt(), 120);
    EXPECT_EQ(r.json["tracks"][1]["cover"].asString(), "media/art/2.png");
    EXPECT_TRUE(r.json["tracks"][2]["cover"].isNull());

    const CgiResult nobody = Api({{"action", "albums"}, {"node", "musiclib_artist:Nobody"}});
    ASSERT_TRUE(nobody.jsonOk) << nobody.body;
    EXPECT_EQ(nobody.json["albums"].size(), 0u);
    EXPECT_EQ(nobody.json["tracks"].size(), 0u);
}

TEST_F(CoverArt, EachTrackNamesItsCoverOrNone) {
    const CgiResult r =
        Api({{"action", "covers"}, {"streams", "2.flac,1.flac,4.flac,99.flac,3.mp3"}});
    ASSERT_TRUE(r.jsonOk) << r.body;
    EXPECT_EQ(r.json["covers"]["2.flac"].asString(), "media/art/2.png");
    EXPECT_EQ(r.json["covers"]["4.flac"].asString(), "media/art/4.jpg");
    EXPECT_TRUE(r.json["covers"]["1.flac"].isNull());
    EXPECT_TRUE(r.json["covers"]["99.flac"].isNull());  // no such track
    EXPECT_TRUE(r.json["covers"]["3.mp3"].isNull());    // not the name of track 3's file
    EXPECT_EQ(r.json["covers"].size(), 5u);
}

TEST_F(CoverArt, AnIndexWithoutCoverColumnHasNoCovers) {
    MakeGeneratedLibrary(3);
    const CgiResult r = Api({{"action", "covers"}, {"streams", "1.mp3"}});
    ASSERT_TRUE(r.jsonOk) << r.body;
    EXPECT_TRUE(r.json["covers"]["1.mp3"].isNull());
}

TEST_F(CoverArt, BadRequestsAreRefusedWithTheirCodes) {
    struct Case {
        std::vector<std::pair<std::string, std::string>> params;
        const char* status;
        const char* error;
    };
    std::string many;
    for (int n = 1; n <= 201; ++n)
        many += (n > 1 ? "," : "") + std::to_string(n) + ".flac";
    const std::vector<Case> cases = {
        {{{"action", "albums"}, {"node", "musiclib_music_all"}}, "404", "node_gone"},
        {{{"action", "albums"}}, "404", "node_gone"},
        {{{"action", "albums"}, {"node", "musiclib_artist:"}}, "404", "node_gone"},
        {{{"action", "albums"}, {"node", "musiclib_artist:a/b"}}, "404", "node_gone"},
        {{{"action", "albums"}, {"node", "musiclib_artist:%zz"}}, "404", "node_gone"},
        {{{"action", "albums"}, {"node", "musiclib_artist:a b"}}, "404", "node_gone"},
        {{{"action", "covers"}}, "400", "request_invalid"},
        {{{"action", "covers"}, {"streams", "1.flac,,2.flac"}}, "400", "request_invalid"},
        {{{"action", "covers"}, {"streams", "../etc/passwd"}}, "400", "request_invalid"},
        {{{"action", "covers"}, {"streams", many}}, "413", "too_large"},
    };
    for (const Case& c : cases) {
        const CgiResult r = Api(c.params);
        SCOPED_TRACE(Query(c.params).substr(0, 80));
        EXPECT_NE(r.Header("Status").find(c.status), std::string::npos) << r.output;
        ASSERT_TRUE(r.jsonOk) << r.body;
        EXPECT_FALSE(r.json["success"].asBool());
        EXPECT_EQ(r.json["error"].asString(), c.error);
        EXPECT_EQ(r.exitStatus, 0);
    }
}

TEST_F(CoverArt, AMissingLibraryIsUnavailable) {
    ASSERT_EQ(unlink(kLibraryDb), 0);
    const CgiResult r = Api({{"action", "albums"}, {"node", "musiclib_music_album"}});
    EXPECT_NE(r.Header("Status").find("503"), std::string::npos) << r.output;
    ASSERT_TRUE(r.jsonOk) << r.body;
    EXPECT_EQ(r.json["error"].asString(), "library_unavailable");
}

}  // namespace
