// The stream name of a track (platform/medialib/StreamName.h) as every side uses it: the media
// server writes it into its res URLs, library.cgi hands it out and reads it back, and the web
// server passes only such names on to the media server (web/lighttpd.conf).
#define PCRE2_CODE_UNIT_WIDTH 8
#include <gtest/gtest.h>
#include <pcre2.h>

#include <algorithm>
#include <cctype>
#include <fstream>
#include <optional>
#include <sstream>
#include <string>
#include <vector>

#include <pugixml.hpp>

#include "platform/medialib/MediaFiles.h"
#include "platform/medialib/StreamName.h"
#include "platform/paths/PlatformPaths.h"
#include "services/harmona-mediad/ContentDirectory.h"
#include "src/webapi/TrackCatalog.h"
#include "tests/harness/PlaylistFixtures.h"

using namespace harmona;

namespace {

// Names around every edge of the rule, in both directions.
const std::vector<std::string> kNames = {
    "1.mp3",
    "0",
    "7",
    "42.flac",
    "42.aiff",
    "123456789012345678.mp3",
    "123456789012345678",
    "1234567890123456789.mp3",
    "1234567890123456789",
    "1.m4a",
    "1.ra",
    "1.a",
    "1.abcd",
    "1.abcde",
    "1.MP3",
    "1.Mp3",
    "1.",
    ".mp3",
    "",
    "a.mp3",
    "1a.mp3",
    "-1.mp3",
    "+1.mp3",
    " 1.mp3",
    "1.mp3 ",
    "1..mp3",
    "1.mp3.x",
    "1.mp-3",
    "1/2.mp3",
    "1.mp3/",
    "../1.mp3",
    "1.mp3\n",
    "1\n",
    "1.mp%33",
    "1.\xc3\xa9",
    "art/1.jpg",
    "1.jpg",
    "1.png",
    "0001.wav",
};

// The file of the audio share, read as the program reads it.
std::string ReadSourceFile(const std::string& relative) {
    std::ifstream file(std::string(HARMONA_SOURCE_DIR) + "/" + relative);
    std::stringstream text;
    text << file.rdbuf();
    return text.str();
}

// The line of web/lighttpd.conf that opens the block for the media route, and the pattern on it
// as lighttpd reads it (the text between the quotes, backslashes kept).
std::string LighttpdMediaPattern() {
    std::istringstream conf(ReadSourceFile("web/lighttpd.conf"));
    for (std::string line; std::getline(conf, line);) {
        const std::string opening = "$HTTP[\"url\"] =~ \"^/media/";
        if (line.rfind(opening, 0) != 0)
            continue;
        const std::size_t first = line.find('"', line.find("=~"));
        const std::size_t last = line.find('"', first + 1);
        return line.substr(first + 1, last - first - 1);
    }
    return {};
}

class LighttpdPattern {
  public:
    explicit LighttpdPattern(const std::string& pattern) {
        int error = 0;
        PCRE2_SIZE offset = 0;
        // lighttpd compiles its conditions with PCRE2 and no options.
        code_ = pcre2_compile(reinterpret_cast<PCRE2_SPTR>(pattern.c_str()), pattern.size(), 0,
                              &error, &offset, nullptr);
        if (code_ != nullptr)
            data_ = pcre2_match_data_create_from_pattern(code_, nullptr);
    }
    ~LighttpdPattern() {
        pcre2_match_data_free(data_);
        pcre2_code_free(code_);
    }
    explicit operator bool() const { return code_ != nullptr && data_ != nullptr; }
    bool Matches(const std::string& url) const {
        return pcre2_match(code_, reinterpret_cast<PCRE2_SPTR>(url.data()), url.size(), 0, 0, data_,
                           nullptr) >= 0;
    }

  private:
    pcre2_code* code_ = nullptr;
    pcre2_match_data* data_ = nullptr;
};

std::string Shown(const std::string& name) {
    std::string shown;
    for (unsigned char c : name)
        shown += c >= 0x20 && c < 0x7f ? std::string(1, static_cast<char>(c))
                                       : "\\x" + std::to_string(static_cast<int>(c));
    return "\"" + shown + "\"";
}

}  // namespace

TEST(StreamName, TheReaderTakesTheIdAndAnExtensionOfUpToTheLongestAudioType) {
    EXPECT_EQ(medialib::kMaxStreamExtensionLength, 4u);  // "flac", "aiff"
    const std::vector<std::string> taken = {"1.mp3",
                                            "0",
                                            "7",
                                            "42.flac",
                                            "42.aiff",
                                            "123456789012345678.mp3",
                                            "123456789012345678",
                                            "1.m4a",
                                            "1.ra",
                                            "1.a",
                                            "1.abcd",
                                            "1.jpg",
                                            "1.png",
                                            "0001.wav"};
    for (const std::string& name : kNames) {
        const bool expected = std::find(taken.begin(), taken.end(), name) != taken.end();
        EXPECT_EQ(medialib::ParseStreamName(name).has_value(), expected) << Shown(name);
    }
    const std::optional<medialib::StreamName> parsed = medialib::ParseStreamName("0042.flac");
    ASSERT_TRUE(parsed);
    EXPECT_EQ(parsed->trackId, 42);
    EXPECT_EQ(parsed->extension, "flac");
    EXPECT_EQ(medialib::ParseStreamName("9")->extension, "");
}

TEST(StreamName, EveryAudioTypeFitsTheRuleAndItsNameIsReadBack) {
    std::size_t longest = 0;
    for (const medialib::AudioType& type : medialib::kAudioTypes) {
        const std::string extension = type.extension;
        longest = std::max(longest, extension.size());
        for (const std::string& file :
             {"/volume1/music/a." + extension, "/volume1/music/B." + extension}) {
            std::string upper = file;
            for (std::size_t i = upper.rfind('.'); i < upper.size(); ++i)
                upper[i] = static_cast<char>(std::toupper(static_cast<unsigned char>(upper[i])));
            for (const std::string& path : {file, upper}) {
                const std::optional<std::string> name = medialib::StreamNameOf(31, path);
                ASSERT_TRUE(name) << path;
                EXPECT_EQ(*name, "31." + extension) << path;
                const std::optional<medialib::StreamName> parsed = medialib::ParseStreamName(*name);
                ASSERT_TRUE(parsed) << *name;
                EXPECT_EQ(parsed->trackId, 31);
                EXPECT_EQ(parsed->extension, medialib::StreamExtensionOf(path));
            }
        }
    }
    EXPECT_EQ(longest, medialib::kMaxStreamExtensionLength);
}

TEST(StreamName, AFileWhoseExtensionTheRuleRefusesIsNamedByItsIdAloneAndANegativeIdByNothing) {
    for (const char* path :
         {"/volume1/music/a.abcde", "/volume1/music/noext", "/volume1/music/a.b-c",
          "/volume1/music/a.\xc3\xa9", "/volume1/music/dir.mp3/file", "/volume1/music/a."}) {
        EXPECT_EQ(medialib::StreamNameOf(12, path), std::optional<std::string>("12")) << path;
        EXPECT_EQ(medialib::StreamExtensionOf(path), "") << path;
        EXPECT_TRUE(medialib::ParseStreamName(*medialib::StreamNameOf(12, path)));
    }
    EXPECT_EQ(medialib::StreamNameOf(-1, "/volume1/music/a.mp3"), std::nullopt);
    EXPECT_EQ(medialib::StreamNameOf(0, "/volume1/music/a.mp3"),
              std::optional<std::string>("0.mp3"));
}

TEST(StreamName, TheTrackIdOfAResUrlIsReadFromItsPathOnAnyHost) {
    EXPECT_EQ(medialib::TrackIdOfLocalResource("http://127.0.0.1:50003/media/4.mp3"), 4);
    EXPECT_EQ(medialib::TrackIdOfLocalResource("http://192.0.2.1:50003/media/4"), 4);
    for (const char* url : {"http://192.0.2.1:50003/elsewhere/1.mp3", "https://h/media/1.mp3",
                            "http://h/media/1.abcde", "http://h/media/art/1.jpg", "http://h/media/",
                            "http://h", "http:/h/media/1.mp3", "http://h/media/1.mp3?x=1"})
        EXPECT_EQ(medialib::TrackIdOfLocalResource(url), std::nullopt) << url;
}

TEST(LighttpdMediaRoute, PassesExactlyTheNamesTheReaderTakes) {
    const std::string pattern = LighttpdMediaPattern();
    ASSERT_FALSE(pattern.empty()) << "no $HTTP[\"url\"] =~ \"^/media/...\" block in lighttpd.conf";
    const LighttpdPattern route(pattern);
    ASSERT_TRUE(route) << pattern;
    std::vector<std::string> names = kNames;
    for (const medialib::AudioType& type : medialib::kAudioTypes)
        names.push_back(*medialib::StreamNameOf(1234, std::string("x.") + type.extension));
    for (const std::string& name : names) {
        EXPECT_EQ(route.Matches(std::string(medialib::kMediaUrlPath) + name),
                  medialib::ParseStreamName(name).has_value())
            << Shown(name) << " against " << pattern;
    }
    EXPECT_FALSE(route.Matches("/media/art/1.jpg"));
    EXPECT_FALSE(route.Matches("/x/media/1.mp3"));
}

TEST(LighttpdMediaRoute, ProxiesToTheLocalMediaServersPort) {
    const std::string conf = ReadSourceFile("web/lighttpd.conf");
    const std::size_t block = conf.find("$HTTP[\"url\"] =~ \"^/media/");
    ASSERT_NE(block, std::string::npos);
    const std::string proxy = conf.substr(block, conf.find("\n}", block) - block);
    EXPECT_NE(proxy.find("\"host\" => \"127.0.0.1\""), std::string::npos) << proxy;
    EXPECT_NE(proxy.find("\"port\" => " + std::to_string(paths::kLocalMediaServerPort) + ")"),
              std::string::npos)
        << proxy;
}

// The media server's listing of the library and library.cgi's catalog over one library.db: every
// track gets a res URL, and library.cgi's reader finds in it the track and the same stream name
// that it hands out for that track.
TEST(StreamName, TheMediaServersResUrlsAreReadBackByLibraryCgi) {
    std::vector<test::TrackRow> tracks;
    std::int64_t id = 1;
    for (const medialib::AudioType& type : medialib::kAudioTypes) {
        test::TrackRow lower = test::GeneratedTrack(id);
        lower.path = "/volume1/music/Types/track " + std::to_string(id++) + "." + type.extension;
        tracks.push_back(lower);
        test::TrackRow upper = test::GeneratedTrack(id);
        std::string extension = type.extension;
        for (char& c : extension)
            c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
        upper.path = "/volume1/music/Types/TRACK " + std::to_string(id++) + "." + extension;
        tracks.push_back(upper);
    }
    test::MakeLibraryDb(tracks);

    const mediad::ContentDirectory directory(test::kLibraryDb, "/volume1/music",
                                             "http://192.0.2.1:50003/media/");
    mediad::BrowseArgs args;
    args.objectId = "music_all";
    const mediad::BrowseResult result = directory.Browse(args);
    ASSERT_EQ(result.error, 0) << result.errorText;
    pugi::xml_document didl;
    ASSERT_TRUE(didl.load_string(result.didl.c_str())) << result.didl;

    webapi::TrackCatalog catalog;
    ASSERT_TRUE(catalog.Open(test::kLibraryDb));
    std::size_t items = 0;
    for (const pugi::xml_node item : didl.child("DIDL-Lite").children("item")) {
        ++items;
        const std::string res = item.child("res").text().get();
        SCOPED_TRACE(res);
        const std::optional<std::int64_t> trackId = medialib::TrackIdOfLocalResource(res);
        ASSERT_TRUE(trackId);
        const std::optional<webapi::Track> track = catalog.ById(*trackId);
        ASSERT_TRUE(track);
        EXPECT_EQ(res, "http://192.0.2.1:50003/media/" + track->stream);
        EXPECT_TRUE(catalog.ByStreamId(track->stream));
    }
    EXPECT_EQ(items, tracks.size());
}
