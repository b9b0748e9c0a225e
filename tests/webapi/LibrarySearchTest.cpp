// The library's search index in library.db: made by the schema, kept in step by every write of
// the track table (whoever makes it), made once for a library that had none, and searched as the
// listening page's search box does.
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "platform/lib/sqlite/Database.h"
#include "platform/medialib/LibrarySchema.h"
#include "src/webapi/LibrarySearch.h"

namespace harmona::webapi {
namespace {

struct Song {
    std::string path, title, artist, album, albumArtist, genre;
};

class LibrarySearchIndex : public ::testing::Test {
  protected:
    void SetUp() override {
        db = sqlite::Database::Open(":memory:", SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, 1000);
        ASSERT_TRUE(db);
        ASSERT_TRUE(medialib::EnsureLibrarySchema(db));
    }

    void Add(const Song& song) {
        sqlite::Statement insert = db.Prepare(
            "INSERT INTO track (path, title, artist, album, album_artist, genre, duration_ms) "
            "VALUES (?1, ?2, ?3, NULLIF(?4, ''), NULLIF(?5, ''), ?6, 180400)");
        ASSERT_TRUE(insert);
        insert.Bind(1, song.path);
        insert.Bind(2, song.title);
        insert.Bind(3, song.artist);
        insert.Bind(4, song.album);
        insert.Bind(5, song.albumArtist);
        insert.Bind(6, song.genre);
        ASSERT_EQ(insert.Step(), SQLITE_DONE) << db.Error();
    }

    void AddStandardSongs() {
        Add({"/volume1/music/a.mp3", "Come Together", "The Beatles", "Abbey Road", "", "Rock"});
        Add({"/volume1/music/b.mp3", "Something", "The Beatles", "Abbey Road", "", "Rock"});
        Add({"/volume1/music/c.flac", "Beat It", "Michael Jackson", "Thriller", "", "Pop"});
        Add({"/volume1/music/d.ogg", "So What", "Miles Davis", "Kind of Blue", "", "Jazz"});
        Add({"/volume1/music/e.mp3", "Déjà Vu", "Guest Singer", "Sampler", "Various Artists",
             "Pop"});
        Add({"/volume1/music/f.mp3", "Loose", "Nobody", "", "", "Ambient"});
    }

    void Exec(const std::string& sql) { ASSERT_EQ(db.Execute(sql.c_str()), SQLITE_OK) << sql; }

    SearchResult Find(const std::string& text) {
        const SearchQuery query = ParseSearchQuery(text);
        EXPECT_EQ(query.status, SearchQueryStatus::ok) << text;
        SearchResult result;
        EXPECT_EQ(SearchLibrary(db, query.words, result), SearchStatus::ok) << text;
        return result;
    }

    std::vector<std::string> Titles(const std::string& text) {
        std::vector<std::string> titles;
        for (const Track& track : Find(text).tracks)
            titles.push_back(track.title);
        std::sort(titles.begin(), titles.end());
        return titles;
    }

    std::vector<std::string> Albums(const std::string& text) {
        std::vector<std::string> albums;
        for (const AlbumHit& album : Find(text).albums)
            albums.push_back(album.title + " / " + album.artist);
        return albums;
    }

    std::vector<std::string> Artists(const std::string& text) {
        std::vector<std::string> artists;
        for (const ArtistHit& artist : Find(text).artists)
            artists.push_back(artist.name);
        return artists;
    }

    // The full-text tables agree with the rows they index (SQLite's own check).
    void ExpectIndexIntact() {
        EXPECT_EQ(db.Execute("INSERT INTO track_search (track_search) VALUES ('integrity-check')"),
                  SQLITE_OK)
            << db.Error();
        EXPECT_EQ(db.Execute("INSERT INTO search_album_text (search_album_text) VALUES "
                             "('integrity-check')"),
                  SQLITE_OK)
            << db.Error();
    }

    sqlite::Database db;
};

using Names = std::vector<std::string>;

TEST_F(LibrarySearchIndex, AWordFindsTheTracksWhoseWordsBeginWithIt) {
    AddStandardSongs();
    EXPECT_EQ(Titles("beat"), (Names{"Beat It", "Come Together", "Something"}));
    EXPECT_EQ(Titles("BEATLES"), (Names{"Come Together", "Something"}));
    EXPECT_EQ(Titles("jazz"), Names{"So What"});  // the genre
    EXPECT_EQ(Titles("kind"), Names{"So What"});  // the album
    EXPECT_EQ(Titles("eatles"), Names{});         // a word's beginning, not its middle
    EXPECT_EQ(Titles("deja"), Names{"Déjà Vu"});  // accents ignored
    EXPECT_EQ(Titles("DÉJÀ"), Names{"Déjà Vu"});
    ExpectIndexIntact();
}

TEST_F(LibrarySearchIndex, SeveralWordsMustAllBeFound) {
    AddStandardSongs();
    EXPECT_EQ(Titles("beat abb"), (Names{"Come Together", "Something"}));
    EXPECT_EQ(Titles("the beatles some"), Names{"Something"});
    EXPECT_EQ(Titles("beat jackson thriller"), Names{"Beat It"});
    EXPECT_EQ(Titles("beat miles"), Names{});
}

TEST_F(LibrarySearchIndex, TracksComeInTheLibrarysOrderAlbumsAndArtistsByName) {
    Add({"/volume1/music/1.mp3", "Other", "Beat Club", "Club Mix", "", ""});
    Add({"/volume1/music/2.mp3", "Beat Goes On", "Someone", "Beats", "", ""});
    const SearchResult result = Find("beat");
    ASSERT_EQ(result.tracks.size(), 2u);
    EXPECT_EQ(result.tracks[0].title, "Other");
    EXPECT_EQ(result.tracks[1].title, "Beat Goes On");
    ASSERT_EQ(result.albums.size(), 2u);
    EXPECT_EQ(result.albums[0].title, "Beats");
    EXPECT_EQ(result.albums[1].title, "Club Mix");
}

TEST_F(LibrarySearchIndex, TrackHitsAreRowsThePagePlays) {
    AddStandardSongs();
    const SearchResult result = Find("something");
    ASSERT_EQ(result.tracks.size(), 1u);
    const Track& track = result.tracks[0];
    EXPECT_EQ(track.stream, std::to_string(track.id) + ".mp3");
    EXPECT_EQ(track.artist, "The Beatles");
    EXPECT_EQ(track.album, "Abbey Road");
    EXPECT_EQ(track.durationMs, 180400);
}

TEST_F(LibrarySearchIndex, AlbumsAreGroupedAsTheTreeListsThemWithTheirNodes) {
    AddStandardSongs();
    const SearchResult result = Find("abbey");
    ASSERT_EQ(result.albums.size(), 1u);
    EXPECT_EQ(result.albums[0].title, "Abbey Road");
    EXPECT_EQ(result.albums[0].artist, "The Beatles");
    EXPECT_EQ(result.albums[0].tracks, 2);
    EXPECT_EQ(result.albums[0].node, "musiclib_album:The%20Beatles/Abbey%20Road");
    // An album artist's name finds the album; a track's own artist under another album artist
    // does not make an artist.
    EXPECT_EQ(Albums("various"), Names{"Sampler / Various Artists"});
    EXPECT_EQ(Artists("guest"), Names{});
    EXPECT_EQ(Artists("vari"), Names{"Various Artists"});
    EXPECT_EQ(Find("various").artists.at(0).node, "musiclib_artist:Various%20Artists");
    // A track without an album belongs to no album and makes no artist.
    EXPECT_EQ(Albums("nobody"), Names{});
    EXPECT_EQ(Artists("nobody"), Names{});
    EXPECT_EQ(Titles("nobody"), Names{"Loose"});
}

TEST_F(LibrarySearchIndex, AlbumsAndArtistsComeInNameOrder) {
    Add({"/m/1.mp3", "x", "zed band", "Beta", "", ""});
    Add({"/m/2.mp3", "x", "Alpha Band", "alpha", "", ""});
    Add({"/m/3.mp3", "x", "mid band", "Gamma", "", ""});
    EXPECT_EQ(Albums("band"), (Names{"alpha / Alpha Band", "Beta / zed band", "Gamma / mid band"}));
    EXPECT_EQ(Artists("band"), (Names{"Alpha Band", "mid band", "zed band"}));
}

TEST_F(LibrarySearchIndex, ChangedTagsAreFoundByTheirNewWordsOnly) {
    AddStandardSongs();
    Exec(
        "UPDATE track SET title = 'Here Comes The Sun', album = 'Abbey Road (Remaster)' "
        "WHERE path = '/volume1/music/b.mp3'");
    EXPECT_EQ(Titles("something"), Names{});
    EXPECT_EQ(Titles("sun"), Names{"Here Comes The Sun"});
    EXPECT_EQ(Albums("abbey"),
              (Names{"Abbey Road / The Beatles", "Abbey Road (Remaster) / The Beatles"}));
    EXPECT_EQ(Find("abbey").albums.at(0).tracks, 1);
    // The indexer's upsert of a re-read file.
    Exec(
        "INSERT INTO track (path, title, artist, album) VALUES ('/volume1/music/a.mp3', "
        "'Come Together (Live)', 'Beatles Tribute', 'Live') ON CONFLICT (path) DO UPDATE SET "
        "title = excluded.title, artist = excluded.artist, album = excluded.album");
    EXPECT_EQ(Albums("abbey"), Names{"Abbey Road (Remaster) / The Beatles"});
    EXPECT_EQ(Titles("live"), Names{"Come Together (Live)"});
    EXPECT_EQ(Artists("beatles"), (Names{"Beatles Tribute", "The Beatles"}));
    ExpectIndexIntact();
}

TEST_F(LibrarySearchIndex, RemovedTracksAndTheirEmptiedAlbumsAreNoLongerFound) {
    AddStandardSongs();
    Exec("DELETE FROM track WHERE path = '/volume1/music/a.mp3'");
    EXPECT_EQ(Titles("beatles"), Names{"Something"});
    EXPECT_EQ(Find("abbey").albums.at(0).tracks, 1);
    Exec("DELETE FROM track WHERE path = '/volume1/music/b.mp3'");
    EXPECT_EQ(Titles("beatles"), Names{});
    EXPECT_EQ(Albums("abbey"), Names{});
    EXPECT_EQ(Artists("beatles"), Names{});
    ExpectIndexIntact();
}

TEST_F(LibrarySearchIndex, AMovedFileIsFoundUnderItsNewStreamName) {
    AddStandardSongs();
    Exec(
        "UPDATE track SET path = '/volume1/music/new/b.flac' WHERE path = "
        "'/volume1/music/b.mp3'");
    const SearchResult result = Find("something");
    ASSERT_EQ(result.tracks.size(), 1u);
    EXPECT_EQ(result.tracks[0].stream, std::to_string(result.tracks[0].id) + ".flac");
    ExpectIndexIntact();
}

TEST_F(LibrarySearchIndex, ALibraryWithoutTheIndexGetsItFilledOnceWithoutLosingARow) {
    AddStandardSongs();
    // A library of an indexer that had no search index.
    Exec(
        "DROP TRIGGER track_search_insert; DROP TRIGGER track_search_change; DROP TRIGGER "
        "track_search_delete; DROP TABLE track_search; DROP TABLE search_album_text; DROP "
        "TABLE search_album");
    SearchResult result;
    EXPECT_EQ(SearchLibrary(db, {"beat"}, result), SearchStatus::noIndex);
    ASSERT_TRUE(medialib::EnsureLibrarySchema(db));
    EXPECT_EQ(Titles("beat"), (Names{"Beat It", "Come Together", "Something"}));
    EXPECT_EQ(Albums("abbey"), Names{"Abbey Road / The Beatles"});
    EXPECT_EQ(Find("abbey").albums.at(0).tracks, 2);
    // Made again, the schema leaves the index as it is.
    ASSERT_TRUE(medialib::EnsureLibrarySchema(db));
    EXPECT_EQ(Find("abbey").albums.at(0).tracks, 2);
    ExpectIndexIntact();
}

TEST_F(LibrarySearchIndex, AnIndexWithoutItsTriggersIsMadeAgainFromTheTracks) {
    AddStandardSongs();
    Exec("DROP TRIGGER track_search_delete");
    Exec("DELETE FROM track WHERE path = '/volume1/music/c.flac'");  // not followed by the index
    ASSERT_TRUE(medialib::EnsureLibrarySchema(db));
    EXPECT_EQ(Titles("beat"), (Names{"Come Together", "Something"}));
    EXPECT_EQ(Albums("thriller"), Names{});
    ExpectIndexIntact();
}

TEST_F(LibrarySearchIndex, QuerySyntaxTypedByTheUserIsTextNeverSyntax) {
    AddStandardSongs();
    Add({"/m/near.mp3", "NEAR AND OR NOT", "Syntax", "Words", "", ""});
    for (const std::string text : {"\"",
                                   "\"\"",
                                   "*",
                                   "-",
                                   " - ",
                                   "beat*",
                                   "\"beat",
                                   "beat\"",
                                   "NEAR",
                                   "NEAR(beat",
                                   "AND",
                                   "OR",
                                   "NOT",
                                   "beat OR miles",
                                   "beat NOT abbey",
                                   "^beat",
                                   "{title}: beat",
                                   "title:beat",
                                   "(beat",
                                   "beat)",
                                   "+",
                                   "'",
                                   "--",
                                   "-beat",
                                   ":",
                                   "\\",
                                   "—",
                                   "…",
                                   "\xE2\x80\x9C",
                                   "%",
                                   "_",
                                   "beat -"}) {
        SCOPED_TRACE(text);
        const SearchQuery query = ParseSearchQuery(text);
        EXPECT_EQ(query.status, SearchQueryStatus::ok);
        SearchResult result;
        EXPECT_EQ(SearchLibrary(db, query.words, result), SearchStatus::ok) << db.Error();
    }
    // The words of syntax are words like any other.
    EXPECT_EQ(Titles("near"), Names{"NEAR AND OR NOT"});
    EXPECT_EQ(Titles("beat OR miles"), Names{});
    EXPECT_EQ(Titles("-beat"), (Names{"Beat It", "Come Together", "Something"}));
    EXPECT_EQ(Titles("beat*"), (Names{"Beat It", "Come Together", "Something"}));
    EXPECT_EQ(Titles("\"beat"), (Names{"Beat It", "Come Together", "Something"}));
    EXPECT_EQ(Titles("{title}: beat"), Names{});
    EXPECT_EQ(Titles("\"\""), Names{});
    EXPECT_EQ(Titles("-"), Names{});
}

TEST(LibrarySearchQuery, WordsAreSplitAtPunctuationAndWhiteSpace) {
    EXPECT_EQ(ParseSearchQuery("  The  beat\t").words, (std::vector<std::string>{"The", "beat"}));
    EXPECT_EQ(ParseSearchQuery("AC/DC \"live\"*").words,
              (std::vector<std::string>{"AC", "DC", "live"}));
    EXPECT_EQ(ParseSearchQuery("Déjà-vu").words, (std::vector<std::string>{"Déjà", "vu"}));
    EXPECT_EQ(ParseSearchQuery("東京").words, std::vector<std::string>{"東京"});
    EXPECT_TRUE(ParseSearchQuery("").words.empty());
    EXPECT_TRUE(ParseSearchQuery("\" * - ( )").words.empty());
    EXPECT_EQ(MatchExpression({"The", "beat"}), "\"The\"* \"beat\"*");
}

TEST(LibrarySearchQuery, LongQueriesManyWordsAndBrokenTextAreRefused) {
    EXPECT_EQ(ParseSearchQuery(std::string(kMaxSearchQueryBytes, 'a')).status,
              SearchQueryStatus::ok);
    EXPECT_EQ(ParseSearchQuery(std::string(kMaxSearchQueryBytes + 1, 'a')).status,
              SearchQueryStatus::tooLong);
    EXPECT_EQ(ParseSearchQuery("a b c d e f g h").status, SearchQueryStatus::ok);
    EXPECT_EQ(ParseSearchQuery("a b c d e f g h i").status, SearchQueryStatus::tooManyWords);
    EXPECT_EQ(ParseSearchQuery("beat \xC3\x28").status, SearchQueryStatus::notText);
    EXPECT_EQ(ParseSearchQuery("\xFF").status, SearchQueryStatus::notText);
}

TEST_F(LibrarySearchIndex, EachGroupIsBoundedAndSaysThatThereIsMore) {
    for (int i = 0; i < 80; ++i)
        Add({"/m/" + std::to_string(i) + ".mp3", "Song " + std::to_string(i),
             "Band " + std::to_string(i % 30), "Record " + std::to_string(i % 40), "", ""});
    SearchResult result = Find("song");
    EXPECT_EQ(result.tracks.size(), kMaxSearchTracks);
    EXPECT_TRUE(result.moreTracks);
    result = Find("record");
    EXPECT_EQ(result.albums.size(), kMaxSearchAlbums);
    EXPECT_TRUE(result.moreAlbums);
    result = Find("band");
    EXPECT_EQ(result.artists.size(), kMaxSearchArtists);
    EXPECT_TRUE(result.moreArtists);
    result = Find("song 7");
    // 7, 70 to 79, and 37, 47, 67 of band 7 or record 7
    EXPECT_EQ(result.tracks.size(), 14u);
    EXPECT_FALSE(result.moreTracks);
}

}  // namespace
}  // namespace harmona::webapi
