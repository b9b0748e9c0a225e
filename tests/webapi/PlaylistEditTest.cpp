// Playlists and smart playlists made and changed through library.cgi, run as the web server runs
// it: personal playlist files and smart playlist files on disk, shared playlists in a real
// library.db, and bad requests that change nothing.
#include <gtest/gtest.h>

#include <sys/stat.h>

#include <string>
#include <vector>

#include "platform/lib/sqlite/Database.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"

using namespace harmona::test;

namespace {

using Params = std::vector<std::pair<std::string, std::string>>;
using Strings = std::vector<std::string>;

CgiResult Change(const Params& params, const std::string& user = "admin",
                 std::map<std::string, std::string> extraEnv = {}) {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.method = "POST";
    request.contentType = "application/x-www-form-urlencoded; charset=UTF-8";
    request.body = Query(params);
    request.remoteUser = user;
    request.extraEnv = std::move(extraEnv);
    return RunCgi(request);
}

CgiResult Read(const Params& params, const std::string& user = "admin") {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.queryString = Query(params);
    request.remoteUser = user;
    return RunCgi(request);
}

Strings StreamsOf(const CgiResult& r) {
    Strings streams;
    for (const Json::Value& track : r.json["tracks"])
        streams.push_back(track["stream"].asString());
    return streams;
}

Strings ListStreams(const std::string& node, const std::string& user = "admin") {
    const CgiResult r = Read({{"action", "list"}, {"node", node}}, user);
    EXPECT_TRUE(r.jsonOk) << r.output;
    EXPECT_TRUE(r.json["success"].asBool()) << r.body;
    return StreamsOf(r);
}

// A refused change: its status, "success": false and the error code.
void ExpectRefused(const CgiResult& r, const char* status, const char* error) {
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_NE(r.Header("Status").find(status), std::string::npos) << r.output;
    EXPECT_FALSE(r.json["success"].asBool());
    EXPECT_EQ(r.json["error"].asString(), error) << r.body;
    EXPECT_EQ(r.exitStatus, 0);
}

void Sql(const std::string& statements) {
    harmona::sqlite::Database db =
        harmona::sqlite::Database::Open(kLibraryDb, SQLITE_OPEN_READWRITE, 2000);
    ASSERT_TRUE(db);
    ASSERT_EQ(db.Execute(statements.c_str()), SQLITE_OK) << db.Error();
}

Strings SqlColumn(const std::string& query) {
    harmona::sqlite::Database db = harmona::sqlite::Database::OpenReadOnly(kLibraryDb, 2000);
    Strings values;
    harmona::sqlite::Statement select = db.Prepare(query);
    while (select && select.Step() == SQLITE_ROW)
        values.emplace_back(select.ColumnText(0));
    return values;
}

// A library of ten tracks with genres, years, dates added and folders:
//   1-4 Jazz of 1990 to 1993 in "Jazz/", 5-7 Rock of 2010 to 2012, 8-10 Pop of 2020, added long
//   ago.
void MakeRuleLibrary() {
    MakeGeneratedLibrary(10);
    Sql("UPDATE track SET genre = 'Jazz', year = 1989 + id, path = '/volume1/music/Jazz/' || id || "
        "'.mp3' WHERE id <= 4;"
        "UPDATE track SET genre = 'Rock', year = 2005 + id WHERE id BETWEEN 5 AND 7;"
        "UPDATE track SET genre = 'Pop', year = 2020 WHERE id >= 8;"
        "UPDATE track SET added = strftime('%s', 'now') WHERE id IN (2, 6);"
        "UPDATE track SET title = 'Zulu' WHERE id = 1;");
}

class PlaylistEdit : public ::testing::Test {
  protected:
    void SetUp() override {
        StandardFixture();
        // "listener" has no right to change the shared playlists.
        WriteUsersConf({{"admin", {"29", ""}}, {"listener", {"9", ""}}});
        MakeDirs("/usr/vanu/etc/preference");
    }
};

// --- smart playlists -------------------------------------------------------------------------

TEST_F(PlaylistEdit, SmartPlaylistListsTheTracksItsRulesSelect) {
    MakeRuleLibrary();
    WriteFile(UserSmartPlaylistFile("admin"),
              "[Jazz]\ngenre=jazz\n"
              "[Nineties by title]\nyear_from=1990\nyear_to=1999\norder=title\nlimit=3\n"
              "[Fresh]\nadded_within_days=7\n"
              "[Folder]\npath=Jazz\nduration_max=4\n"
              "[Everything]\n");
    EXPECT_EQ(ListStreams("musiclib_music_personal/smart/Jazz"),
              (Strings{"1.mp3", "2.mp3", "3.mp3", "4.mp3"}));
    // Titles 2, 3, 4 ("Title n") sort before "Zulu" (track 1); a limit of 3.
    EXPECT_EQ(ListStreams("musiclib_music_personal/smart/Nineties by title"),
              (Strings{"2.mp3", "3.mp3", "4.mp3"}));
    EXPECT_EQ(ListStreams("musiclib_music_personal/smart/Fresh"), (Strings{"6.mp3", "2.mp3"}));
    // Durations are n + 1 seconds.
    EXPECT_EQ(ListStreams("musiclib_music_personal/smart/Folder"),
              (Strings{"1.mp3", "2.mp3", "3.mp3"}));
    EXPECT_EQ(ListStreams("musiclib_music_personal/smart/Everything").size(), 10u);
}

TEST_F(PlaylistEdit, SharedSmartPlaylistIsReadFromTheSharedFile) {
    MakeRuleLibrary();
    WriteFile(kSharedSmartPlaylistFile, "[Rock]\ngenre=Rock\norder=year\n");
    EXPECT_EQ(ListStreams("musiclib_music_shared/smart/Rock", "listener"),
              (Strings{"5.mp3", "6.mp3", "7.mp3"}));
}

TEST_F(PlaylistEdit, SmartPlaylistWithABadStoredRuleSaysWhichRule) {
    MakeRuleLibrary();
    WriteFile(UserSmartPlaylistFile("admin"),
              "[Typo]\ngenere=Jazz\n[Years]\nyear_from=2000\nyear_to=1990\n[Path]\npath=../etc\n");
    for (const auto& [name, rule] : std::vector<std::pair<std::string, std::string>>{
             {"Typo", "genere"}, {"Years", "year_to"}, {"Path", "path"}}) {
        const CgiResult r =
            Read({{"action", "list"}, {"node", "musiclib_music_personal/smart/" + name}});
        ExpectRefused(r, "422", "rule_invalid");
        EXPECT_EQ(r.json["rule"].asString(), rule) << name;
        EXPECT_EQ(r.json["tracks"].size(), 0u);
    }
    ExpectRefused(Read({{"action", "list"}, {"node", "musiclib_music_personal/smart/Absent"}}),
                  "404", "node_gone");
}

TEST_F(PlaylistEdit, SmartSaveAddsASectionAndKeepsEveryOtherByte) {
    MakeRuleLibrary();
    const std::string before =
        "\xEF\xBB\xBF# my rules\r\n[Jazz Only]\r\ngenre = \"Jazz\"\r\n"
        "; a comment\r\n[Other]\nartist=x\n  \n[Last]\nlimit=5";
    WriteFile(UserSmartPlaylistFile("admin"), before);
    const CgiResult r = Change({{"action", "smartsave"},
                                {"category", "personal"},
                                {"name", "Rock Years"},
                                {"genre", "Rock"},
                                {"year_from", "2000"},
                                {"year_to", "2011"},
                                {"order", "year"}});
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_TRUE(r.json["success"].asBool()) << r.body;
    EXPECT_EQ(r.json["node"].asString(), "musiclib_music_personal/smart/Rock Years");
    EXPECT_EQ(ReadFile(UserSmartPlaylistFile("admin")),
              before + "\n[Rock Years]\ngenre=Rock\nyear_from=2000\nyear_to=2011\norder=year\n");
    EXPECT_EQ(ListStreams("musiclib_music_personal/smart/Rock Years"), (Strings{"5.mp3", "6.mp3"}));
}

TEST_F(PlaylistEdit, SmartSaveReplacesASectionInItsPlaceAndCanRenameIt) {
    MakeRuleLibrary();
    WriteFile(
        UserSmartPlaylistFile("admin"),
        "[A]\r\ngenre=Pop\r\n[Jazz Only]\ngenre=Jazz\n# kept with its section\n[B]\nlimit=1\n");
    const CgiResult r = Change({{"action", "smartsave"},
                                {"category", "personal"},
                                {"old", "Jazz Only"},
                                {"name", "Early Jazz"},
                                {"genre", "Jazz"},
                                {"year_to", "1991"}});
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_TRUE(r.json["success"].asBool()) << r.body;
    EXPECT_EQ(ReadFile(UserSmartPlaylistFile("admin")),
              "[A]\r\ngenre=Pop\r\n[Early Jazz]\ngenre=Jazz\nyear_to=1991\n[B]\nlimit=1\n");
    EXPECT_EQ(ListStreams("musiclib_music_personal/smart/Early Jazz"), (Strings{"1.mp3", "2.mp3"}));
    // The rules come back for the editor.
    const CgiResult get =
        Read({{"action", "smartget"}, {"node", "musiclib_music_personal/smart/Early Jazz"}});
    ASSERT_TRUE(get.jsonOk) << get.output;
    EXPECT_EQ(get.json["rules"]["genre"].asString(), "Jazz");
    EXPECT_EQ(get.json["rules"]["year_to"].asString(), "1991");
    EXPECT_EQ(get.json["name"].asString(), "Early Jazz");
}

TEST_F(PlaylistEdit, SmartSaveRefusesBadRulesAndNamesAndChangesNothing) {
    MakeRuleLibrary();
    WriteFile(UserSmartPlaylistFile("admin"), "[A]\ngenre=Pop\n[B]\nlimit=1\n");
    const FileSnapshot before = Snapshot();
    const std::vector<std::pair<Params, std::string>> bad = {
        {{{"year_from", "nineteen"}}, "year_from"},
        {{{"year_from", "2000"}, {"year_to", "1990"}}, "year_to"},
        {{{"path", "../../etc"}}, "path"},
        {{{"path", "/volume1/music"}}, "path"},
        {{{"order", "name; DROP TABLE track"}}, "order"},
        {{{"limit", "0"}}, "limit"},
        {{{"limit", "10001"}}, "limit"},
        {{{"added_within_days", "-3"}}, "added_within_days"},
        {{{"artist", "line\nbreak"}}, "artist"},
        {{{"genre", std::string(1025, 'x')}}, "genre"},
    };
    for (const auto& [rules, key] : bad) {
        Params params = {{"action", "smartsave"}, {"category", "personal"}, {"name", "New"}};
        params.insert(params.end(), rules.begin(), rules.end());
        const CgiResult r = Change(params);
        ExpectRefused(r, "400", "rule_invalid");
        EXPECT_EQ(r.json["rule"].asString(), key);
    }
    for (const std::string& name : Strings{"", "a/b", "..", "tab\there", " lead", "[x]",
                                           std::string(255, 'n'), std::string("bad\xff")}) {
        ExpectRefused(Change({{"action", "smartsave"}, {"category", "personal"}, {"name", name}}),
                      "400", "name_invalid");
    }
    ExpectRefused(Change({{"action", "smartsave"}, {"category", "personal"}, {"name", "B"}}), "409",
                  "name_taken");
    ExpectRefused(
        Change({{"action", "smartsave"}, {"category", "personal"}, {"old", "Z"}, {"name", "Z"}}),
        "404", "node_gone");
    ExpectRefused(Change({{"action", "smartsave"}, {"category", "elsewhere"}, {"name", "N"}}),
                  "400", "category_invalid");
    EXPECT_EQ(ChangedPaths(before, Snapshot()), Strings{});
}

TEST_F(PlaylistEdit, SmartDeleteRemovesOnlyItsSection) {
    WriteFile(UserSmartPlaylistFile("admin"), "[A]\ngenre=Pop\n[B]\nlimit=1\n[C]\n");
    const CgiResult r =
        Change({{"action", "smartdelete"}, {"node", "musiclib_music_personal/smart/B"}});
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_TRUE(r.json["success"].asBool()) << r.body;
    EXPECT_EQ(ReadFile(UserSmartPlaylistFile("admin")), "[A]\ngenre=Pop\n[C]\n");
}

TEST_F(PlaylistEdit, SharedSmartPlaylistsChangeOnlyWithTheSharedPlaylistRight) {
    WriteFile(kSharedSmartPlaylistFile, "[Shared]\ngenre=Pop\n");
    const FileSnapshot before = Snapshot();
    ExpectRefused(
        Change({{"action", "smartsave"}, {"category", "shared"}, {"name", "Mine"}}, "listener"),
        "403", "request_refused");
    ExpectRefused(
        Change({{"action", "smartdelete"}, {"node", "musiclib_music_shared/smart/Shared"}},
               "listener"),
        "403", "request_refused");
    EXPECT_EQ(ChangedPaths(before, Snapshot()), Strings{});
    const CgiResult r = Change(
        {{"action", "smartsave"}, {"category", "shared"}, {"name", "Mine"}, {"genre", "Rock"}});
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_TRUE(r.json["success"].asBool()) << r.body;
    EXPECT_EQ(ReadFile(kSharedSmartPlaylistFile), "[Shared]\ngenre=Pop\n[Mine]\ngenre=Rock\n");
}

// --- playlists -------------------------------------------------------------------------------

TEST_F(PlaylistEdit, PersonalPlaylistIsMadeFilledReorderedRenamedAndDeleted) {
    MakeGeneratedLibrary(10);
    const CgiResult made =
        Change({{"action", "plcreate"}, {"category", "personal"}, {"name", "Road Trip"}});
    ASSERT_TRUE(made.jsonOk) << made.output;
    EXPECT_TRUE(made.json["success"].asBool()) << made.body;
    const std::string node = "musiclib_music_personal/playlist/Road Trip";
    EXPECT_EQ(made.json["node"].asString(), node);
    EXPECT_EQ(ReadFile(PersonalPlaylistDir("admin") + "/Road Trip.m3u8"), "#EXTM3U\n");
    EXPECT_EQ(ListStreams(node), Strings{});

    const CgiResult added =
        Change({{"action", "pladd"}, {"node", node}, {"streams", "3.mp3,7.mp3,1.mp3"}});
    ASSERT_TRUE(added.jsonOk) << added.output;
    EXPECT_EQ(added.json["entries"].asInt(), 3) << added.body;
    EXPECT_EQ(ListStreams(node), (Strings{"3.mp3", "7.mp3", "1.mp3"}));
    EXPECT_EQ(ReadFile(PersonalPlaylistDir("admin") + "/Road Trip.m3u8"),
              "#EXTM3U\n#EXTINF:4,Artist 3 - Title 3\n" + GeneratedTrack(3).path +
                  "\n#EXTINF:8,Artist 7 - Title 7\n" + GeneratedTrack(7).path +
                  "\n#EXTINF:2,Artist 1 - Title 1\n" + GeneratedTrack(1).path + "\n");

    Change({{"action", "pladd"}, {"node", node}, {"streams", "9.mp3"}, {"position", "1"}});
    EXPECT_EQ(ListStreams(node), (Strings{"3.mp3", "9.mp3", "7.mp3", "1.mp3"}));
    Change({{"action", "plmove"}, {"node", node}, {"from", "3"}, {"to", "0"}});
    EXPECT_EQ(ListStreams(node), (Strings{"1.mp3", "3.mp3", "9.mp3", "7.mp3"}));
    Change({{"action", "plremove"}, {"node", node}, {"entries", "1,3"}});
    EXPECT_EQ(ListStreams(node), (Strings{"1.mp3", "9.mp3"}));

    const CgiResult renamed = Change({{"action", "plrename"}, {"node", node}, {"name", "Trip"}});
    ASSERT_TRUE(renamed.jsonOk) << renamed.output;
    EXPECT_EQ(renamed.json["node"].asString(), "musiclib_music_personal/playlist/Trip");
    EXPECT_FALSE(Exists(PersonalPlaylistDir("admin") + "/Road Trip.m3u8"));
    EXPECT_EQ(ListStreams("musiclib_music_personal/playlist/Trip"), (Strings{"1.mp3", "9.mp3"}));

    const CgiResult gone =
        Change({{"action", "pldelete"}, {"node", "musiclib_music_personal/playlist/Trip"}});
    ASSERT_TRUE(gone.jsonOk) << gone.output;
    EXPECT_TRUE(gone.json["success"].asBool());
    EXPECT_FALSE(Exists(PersonalPlaylistDir("admin") + "/Trip.m3u8"));
}

TEST_F(PlaylistEdit, ListedPlaylistRowsCarryTheirEntryNumber) {
    MakeGeneratedLibrary(5);
    WritePersonalPlaylistFile("admin", "Gaps.m3u",
                              "/volume1/music/gone.mp3\n" + GeneratedTrack(2).path + "\n" +
                                  GeneratedTrack(4).path + "\n");
    const CgiResult r =
        Read({{"action", "list"}, {"node", "musiclib_music_personal/playlist/Gaps"}});
    ASSERT_TRUE(r.jsonOk) << r.output;
    ASSERT_EQ(r.json["tracks"].size(), 2u);
    EXPECT_EQ(r.json["tracks"][0]["entry"].asInt(), 1);
    EXPECT_EQ(r.json["tracks"][1]["entry"].asInt(), 2);
    // Removing entry 1 keeps the entry the library does not hold.
    Change({{"action", "plremove"},
            {"node", "musiclib_music_personal/playlist/Gaps"},
            {"entries", "1"}});
    EXPECT_NE(
        ReadFile(PersonalPlaylistDir("admin") + "/Gaps.m3u").find("/volume1/music/gone.mp3\n"),
        std::string::npos);
    EXPECT_EQ(ListStreams("musiclib_music_personal/playlist/Gaps"), (Strings{"4.mp3"}));
}

TEST_F(PlaylistEdit, PlaylistsOfAnyListedNameCanBeChangedThoughNewNamesFollowTheRules) {
    MakeGeneratedLibrary(3);
    WritePersonalPlaylistFile("admin", "Best [2020] .M3U", "#EXTM3U\n");
    WriteFile(UserSmartPlaylistFile("admin"), "[[Mixed] Bag]\ngenre=Pop\n[Kept]\n");
    const std::string node = "musiclib_music_personal/playlist/Best [2020] ";
    const CgiResult added = Change({{"action", "pladd"}, {"node", node}, {"streams", "2.mp3"}});
    ASSERT_TRUE(added.jsonOk) << added.output;
    EXPECT_TRUE(added.json["success"].asBool()) << added.body;
    EXPECT_EQ(ListStreams(node), Strings{"2.mp3"});
    const CgiResult gone =
        Change({{"action", "smartdelete"}, {"node", "musiclib_music_personal/smart/[Mixed] Bag"}});
    EXPECT_TRUE(gone.json["success"].asBool()) << gone.output;
    EXPECT_EQ(ReadFile(UserSmartPlaylistFile("admin")), "[Kept]\n");
    ExpectRefused(Change({{"action", "plrename"}, {"node", node}, {"name", "Best [2021]"}}), "400",
                  "name_invalid");
}

TEST_F(PlaylistEdit, SharedPlaylistIsMadeAndChangedInLibraryDb) {
    MakeGeneratedLibrary(10, {{7, "Party Mix"}});
    const CgiResult made =
        Change({{"action", "plcreate"}, {"category", "shared"}, {"name", "Office"}});
    ASSERT_TRUE(made.jsonOk) << made.output;
    EXPECT_EQ(made.json["node"].asString(), "musiclib_music_shared/playlist/8") << made.body;
    const std::string node = "musiclib_music_shared/playlist/8";
    Change({{"action", "pladd"}, {"node", node}, {"streams", "5.mp3,6.mp3,2.mp3"}});
    Change({{"action", "plmove"}, {"node", node}, {"from", "0"}, {"to", "2"}});
    EXPECT_EQ(ListStreams(node), (Strings{"6.mp3", "2.mp3", "5.mp3"}));
    EXPECT_EQ(SqlColumn("SELECT position FROM playlist_entry WHERE playlist_id = 8 ORDER BY 1"),
              (Strings{"0", "1", "2"}));
    Change({{"action", "plremove"}, {"node", node}, {"entries", "1"}});
    EXPECT_EQ(ListStreams(node), (Strings{"6.mp3", "5.mp3"}));
    Change({{"action", "plrename"}, {"node", node}, {"name", "Office Day"}});
    EXPECT_EQ(SqlColumn("SELECT name FROM playlist ORDER BY id"),
              (Strings{"Party Mix", "Office Day"}));
    const CgiResult gone = Change({{"action", "pldelete"}, {"node", node}});
    EXPECT_TRUE(gone.json["success"].asBool()) << gone.body;
    EXPECT_EQ(SqlColumn("SELECT name FROM playlist"), (Strings{"Party Mix"}));
    EXPECT_EQ(SqlColumn("SELECT count(*) FROM playlist_entry WHERE playlist_id = 8"),
              (Strings{"0"}));
}

TEST_F(PlaylistEdit, AChangeByEntryNumberThatAnotherTabOvertookIsRefusedAndChangesNothing) {
    MakeGeneratedLibrary(6);
    for (const char* category : {"personal", "shared"}) {
        SCOPED_TRACE(category);
        const CgiResult made =
            Change({{"action", "plcreate"}, {"category", category}, {"name", "Shared View"}});
        ASSERT_TRUE(made.jsonOk) << made.output;
        const std::string node = made.json["node"].asString();
        Change({{"action", "pladd"}, {"node", node}, {"streams", "1.mp3,2.mp3,3.mp3"}});
        // The page listed 1, 2, 3; another tab then removed entry 0, so entry 1 now holds 3.
        Change({{"action", "plremove"}, {"node", node}, {"entries", "0"}, {"expect", "1.mp3"}});
        ASSERT_EQ(ListStreams(node), (Strings{"2.mp3", "3.mp3"}));
        ExpectRefused(
            Change({{"action", "plremove"}, {"node", node}, {"entries", "1"}, {"expect", "2.mp3"}}),
            "409", "playlist_changed");
        ExpectRefused(Change({{"action", "plmove"},
                              {"node", node},
                              {"from", "1"},
                              {"to", "0"},
                              {"expect", "2.mp3"}}),
                      "409", "playlist_changed");
        EXPECT_EQ(ListStreams(node), (Strings{"2.mp3", "3.mp3"}));
        // As the page sees it now, the same changes pass.
        Change({{"action", "plmove"},
                {"node", node},
                {"from", "1"},
                {"to", "0"},
                {"expect", "3.mp3"}});
        EXPECT_EQ(ListStreams(node), (Strings{"3.mp3", "2.mp3"}));
        // One expected track for each entry named, or the request is malformed.
        ExpectRefused(
            Change(
                {{"action", "plremove"}, {"node", node}, {"entries", "0,1"}, {"expect", "3.mp3"}}),
            "400", "position_invalid");
        EXPECT_EQ(ListStreams(node), (Strings{"3.mp3", "2.mp3"}));
    }
}

TEST_F(PlaylistEdit, SharedPlaylistChangeWaitsForAWriterInsteadOfFailing) {
    MakeGeneratedLibrary(3, {{1, "Mix"}});
    DatabaseWriterLock indexer(kLibraryDb, 800);
    ASSERT_TRUE(indexer.Locked());
    const CgiResult r = Change(
        {{"action", "pladd"}, {"node", "musiclib_music_shared/playlist/1"}, {"streams", "2.mp3"}});
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_TRUE(r.json["success"].asBool()) << r.body;
    EXPECT_GE(r.wallMs, 500);
}

TEST_F(PlaylistEdit, BadNamesPositionsAndTracksAreRefusedAndChangeNothing) {
    MakeGeneratedLibrary(5, {{3, "Mix"}});
    WritePersonalPlaylistFile("admin", "Mine.m3u8", "#EXTM3U\n" + GeneratedTrack(1).path + "\n");
    const FileSnapshot before = Snapshot();
    for (const std::string& name :
         Strings{"", "../x", "a/b", "ctl\x01", "del\x7f", std::string(255, 'n'), " spaced", "."}) {
        ExpectRefused(Change({{"action", "plcreate"}, {"category", "personal"}, {"name", name}}),
                      "400", "name_invalid");
        ExpectRefused(Change({{"action", "plcreate"}, {"category", "shared"}, {"name", name}}),
                      "400", "name_invalid");
    }
    ExpectRefused(Change({{"action", "plcreate"}, {"category", "personal"}, {"name", "Mine"}}),
                  "409", "name_taken");
    ExpectRefused(Change({{"action", "plcreate"}, {"category", "shared"}, {"name", "Mix"}}), "409",
                  "name_taken");
    const std::string node = "musiclib_music_personal/playlist/Mine";
    ExpectRefused(Change({{"action", "plremove"}, {"node", node}, {"entries", "1"}}), "400",
                  "position_invalid");
    ExpectRefused(Change({{"action", "plremove"}, {"node", node}, {"entries", "0,0"}}), "400",
                  "position_invalid");
    ExpectRefused(Change({{"action", "plmove"}, {"node", node}, {"from", "0"}, {"to", "5"}}), "400",
                  "position_invalid");
    ExpectRefused(Change({{"action", "plmove"}, {"node", node}, {"from", "-1"}, {"to", "0"}}),
                  "400", "position_invalid");
    ExpectRefused(
        Change({{"action", "pladd"}, {"node", node}, {"streams", "1.mp3"}, {"position", "2"}}),
        "400", "position_invalid");
    ExpectRefused(Change({{"action", "pladd"}, {"node", node}, {"streams", "2.mp3,99.mp3"}}), "400",
                  "track_unknown");
    ExpectRefused(Change({{"action", "pladd"}, {"node", node}, {"streams", "2.flac"}}), "400",
                  "track_unknown");
    ExpectRefused(Change({{"action", "pladd"}, {"node", node}, {"streams", ""}}), "400",
                  "track_unknown");
    ExpectRefused(Change({{"action", "plrename"}, {"node", node}, {"name", "../Mine"}}), "400",
                  "name_invalid");
    ExpectRefused(
        Change({{"action", "pldelete"}, {"node", "musiclib_music_personal/playlist/../Mine"}}),
        "404", "node_gone");
    ExpectRefused(Change({{"action", "pldelete"}, {"node", "musiclib_music_shared/playlist/99"}}),
                  "404", "node_gone");
    ExpectRefused(Change({{"action", "pladd"},
                          {"node", "musiclib_music_shared/playlist/3"},
                          {"streams", "1.mp3"},
                          {"position", "1"}}),
                  "400", "position_invalid");
    EXPECT_EQ(ChangedPaths(before, Snapshot()), Strings{});
}

TEST_F(PlaylistEdit, ChangesAreRefusedToAGetAHugeBodyAndAnotherSite) {
    MakeGeneratedLibrary(3);
    const FileSnapshot before = Snapshot();
    ExpectRefused(Read({{"action", "plcreate"}, {"category", "personal"}, {"name", "Via GET"}}),
                  "405", "method_not_allowed");
    CgiRequest huge = FormPostWithLength(
        "action=plcreate&category=personal&name=Huge&pad=" + std::string(300 * 1024, 'x'), "");
    huge.hasContentLength = false;
    huge.program = LibraryCgiProgram();
    ExpectRefused(RunCgi(huge), "413", "too_large");
    const CgiResult crossSite =
        Change({{"action", "plcreate"}, {"category", "personal"}, {"name", "Forged"}}, "admin",
               {{"HTTP_SEC_FETCH_SITE", "cross-site"}});
    EXPECT_NE(crossSite.Header("Status").find("401"), std::string::npos) << crossSite.output;
    EXPECT_EQ(crossSite.body, "");
    EXPECT_EQ(ChangedPaths(before, Snapshot()), Strings{});
}

TEST_F(PlaylistEdit, SharedPlaylistsChangeOnlyWithTheSharedPlaylistRight) {
    MakeGeneratedLibrary(3, {{3, "Mix"}});
    const FileSnapshot before = Snapshot();
    ExpectRefused(
        Change({{"action", "plcreate"}, {"category", "shared"}, {"name", "Mine"}}, "listener"),
        "403", "request_refused");
    ExpectRefused(Change({{"action", "pladd"},
                          {"node", "musiclib_music_shared/playlist/3"},
                          {"streams", "1.mp3"}},
                         "listener"),
                  "403", "request_refused");
    ExpectRefused(
        Change({{"action", "pldelete"}, {"node", "musiclib_music_shared/playlist/3"}}, "listener"),
        "403", "request_refused");
    EXPECT_EQ(ChangedPaths(before, Snapshot()), Strings{});
    // His own playlists he may make.
    const CgiResult mine =
        Change({{"action", "plcreate"}, {"category", "personal"}, {"name", "Mine"}}, "listener");
    EXPECT_TRUE(mine.json["success"].asBool()) << mine.output;
    EXPECT_TRUE(Exists(PersonalPlaylistDir("listener") + "/Mine.m3u8"));
}

}  // namespace
