// Smart playlist rules and the change of one section of a smart playlist file, on their own: what
// each key takes, the query the rules make (values bound, never in its text), and the bytes a
// changed file keeps.
#include <gtest/gtest.h>

#include <fcntl.h>

#include <algorithm>
#include <string>

#include "common/io/FileDescriptor.h"
#include "platform/playlist/PlaylistWrite.h"
#include "platform/playlist/SmartRules.h"
#include "tests/harness/Fixtures.h"

using namespace harmona;
using namespace harmona::test;

namespace {

playlist::RuleOutcome Set(std::string_view key, std::string_view value) {
    playlist::SmartRules rules;
    return playlist::SetSmartRule(rules, key, value);
}

TEST(SmartRules, EachKeyTakesOnlyItsValues) {
    using playlist::RuleOutcome;
    EXPECT_EQ(Set("genre", "Jazz"), RuleOutcome::ok);
    EXPECT_EQ(Set("genere", "Jazz"), RuleOutcome::unknownKey);
    EXPECT_EQ(Set("year_from", "1999"), RuleOutcome::ok);
    EXPECT_EQ(Set("year_from", "+1999"), RuleOutcome::badValue);
    EXPECT_EQ(Set("year_to", "10000"), RuleOutcome::badValue);
    EXPECT_EQ(Set("limit", "0"), RuleOutcome::badValue);
    EXPECT_EQ(Set("limit", "10000"), RuleOutcome::ok);
    EXPECT_EQ(Set("added_within_days", "36500"), RuleOutcome::ok);
    EXPECT_EQ(Set("added_within_days", "36501"), RuleOutcome::badValue);
    EXPECT_EQ(Set("path", "Jazz/Live/"), RuleOutcome::ok);
    for (const char* bad : {"/Jazz", "../x", "a/../b", "a//b", "./a", "a\tb"})
        EXPECT_EQ(Set("path", bad), RuleOutcome::badValue) << bad;
    EXPECT_EQ(Set("order", "random"), RuleOutcome::ok);
    EXPECT_EQ(Set("order", "random()"), RuleOutcome::badValue);
    EXPECT_EQ(Set("artist", std::string("\xc3\x28")), RuleOutcome::badValue);
    EXPECT_EQ(Set("artist", ""), RuleOutcome::ok);  // no rule
}

TEST(SmartRules, TheQueryBindsEveryValueAndNeverHoldsOne) {
    playlist::SmartRules rules;
    ASSERT_EQ(playlist::SetSmartRule(rules, "artist", "O'Brien\"; DROP TABLE track; --"),
              playlist::RuleOutcome::ok);
    ASSERT_EQ(playlist::SetSmartRule(rules, "path", "Rock/Live"), playlist::RuleOutcome::ok);
    ASSERT_EQ(playlist::SetSmartRule(rules, "limit", "20"), playlist::RuleOutcome::ok);
    ASSERT_EQ(playlist::SetSmartRule(rules, "order", "year"), playlist::RuleOutcome::ok);
    const playlist::SmartQuery query = playlist::BuildSmartQuery(rules, "/volume1/music", 1000);
    EXPECT_EQ(query.sql.find("O'Brien"), std::string::npos) << query.sql;
    EXPECT_EQ(query.sql.find("Rock"), std::string::npos) << query.sql;
    EXPECT_EQ(std::count(query.sql.begin(), query.sql.end(), '?'),
              static_cast<std::ptrdiff_t>(query.values.size()));
    ASSERT_EQ(query.values.size(), 4u);
    EXPECT_EQ(std::get<std::string>(query.values[1]), "/volume1/music/Rock/Live/");
    EXPECT_EQ(std::get<std::string>(query.values[2]), "/volume1/music/Rock/Live0");
    EXPECT_EQ(std::get<std::int64_t>(query.values[3]), 20);
    EXPECT_NE(query.sql.find("ORDER BY year"), std::string::npos);
}

TEST(SmartRules, WithoutALimitAtMostTenThousandTracksAreSelected) {
    const playlist::SmartQuery query = playlist::BuildSmartQuery({}, "/volume1/music", 0);
    ASSERT_EQ(query.values.size(), 1u);
    EXPECT_EQ(std::get<std::int64_t>(query.values[0]), playlist::kMaxSmartTracks);
}

TEST(SmartRules, ASectionChangedInPlaceKeepsEveryOtherByte) {
    MakeDirs("/usr/vanu/etc/preference/u/playlists");
    const std::string file = "/usr/vanu/etc/preference/u/playlists/smart.playlist";
    WriteFile(file,
              "\xEF\xBB\xBF; top\r\n[A]\r\ngenre=x\r\n[B]\nlimit=3\n#c\n[A]\nyear_from=1\n[C]");
    io::FileDescriptor dir = playlist::LockFolder("/usr/vanu/etc/preference/u/playlists", false);
    ASSERT_TRUE(dir);
    playlist::SmartRules rules;
    playlist::SetSmartRule(rules, "title", "\"quoted\"");
    EXPECT_EQ(playlist::ChangeSmartSection(dir.Get(), "smart.playlist", "A", "A2", &rules),
              playlist::SmartChange::ok);
    // Both sections named A go; the new one stands where the first was.
    EXPECT_EQ(ReadFile(file),
              "\xEF\xBB\xBF; top\r\n[A2]\ntitle=\"\"quoted\"\"\n[B]\nlimit=3\n#c\n[C]");
    EXPECT_EQ(playlist::ChangeSmartSection(dir.Get(), "smart.playlist", std::nullopt, "B", &rules),
              playlist::SmartChange::exists);
    EXPECT_EQ(playlist::ChangeSmartSection(dir.Get(), "smart.playlist", "Z", "Z", nullptr),
              playlist::SmartChange::missing);
    EXPECT_EQ(playlist::ChangeSmartSection(dir.Get(), "smart.playlist", std::nullopt, "D", &rules),
              playlist::SmartChange::ok);
    EXPECT_EQ(ReadFile(file),
              "\xEF\xBB\xBF; top\r\n[A2]\ntitle=\"\"quoted\"\"\n[B]\nlimit=3\n#c\n"
              "[C]\n[D]\ntitle=\"\"quoted\"\"\n");
    // The reader gets the value back as it was given.
    const playlist::SmartSection read = playlist::ReadSmartSection(file.c_str(), "D");
    ASSERT_EQ(read.status, playlist::SmartReadStatus::ok);
    EXPECT_EQ(read.rules.title.value_or(""), "\"quoted\"");
}

TEST(SmartRules, NewNamesFollowTheRulesOfAPlaylistName) {
    for (const char* good : {"Jazz", "Rock & Roll <Live>", "青い空", "a.b"})
        EXPECT_TRUE(playlist::IsValidPlaylistName(good)) << good;
    for (const std::string& bad :
         {std::string(), std::string("a/b"), std::string("."), std::string(".."), std::string(" a"),
          std::string("a "), std::string("[a]"), std::string("a\x1f"), std::string(255, 'x'),
          std::string("\xff")})
        EXPECT_FALSE(playlist::IsValidPlaylistName(bad)) << bad;
    EXPECT_TRUE(playlist::IsValidPlaylistName(std::string(254, 'x')));
}

}  // namespace
