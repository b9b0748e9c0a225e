// The rules of a smart playlist (platform/README.md, "Smart playlist rules"): the keys of one
// section of a smart playlist file, checked, and the one query of library.db that lists the
// tracks they select. Values from a file or a request are checked here once; the query binds every
// value as a parameter and never writes one into its text.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

namespace harmona::playlist {

// A smart playlist lists at most this many tracks, whatever its `limit` says.
inline constexpr std::int64_t kMaxSmartTracks = 10000;
// A text rule (artist, album, genre, title, path) holds at most this many bytes.
inline constexpr std::size_t kMaxRuleTextBytes = 1024;

// The rule keys, in the order a saved section lists them.
inline constexpr std::string_view kSmartRuleKeys[] = {
    "artist",       "album",        "genre", "title",
    "year_from",    "year_to",      "path",  "added_within_days",
    "duration_min", "duration_max", "limit", "order"};

struct SmartRules {
    std::optional<std::string> artist;  // equal, ASCII letter case ignored
    std::optional<std::string> album;
    std::optional<std::string> genre;
    std::optional<std::string> title;  // contained, ASCII letter case ignored
    std::optional<std::int64_t> yearFrom;
    std::optional<std::int64_t> yearTo;
    std::optional<std::string> path;  // a folder of the share, relative, without "." or ".."
    std::optional<std::int64_t> addedWithinDays;
    std::optional<std::int64_t> durationMin;  // seconds
    std::optional<std::int64_t> durationMax;
    std::optional<std::int64_t> limit;
    std::optional<std::string> order;
};

enum class RuleOutcome { ok, unknownKey, badValue };

// Sets the rule `key` of `rules` from `value` (already trimmed and unquoted as the conf reader
// gives it). An empty value clears the rule. `badValue`: the value is not one the key takes.
RuleOutcome SetSmartRule(SmartRules& rules, std::string_view key, std::string_view value);

// Checks the rules together (year_from not after year_to, duration_min not above duration_max).
// The key of the first rule at fault, or nullopt when they agree.
std::optional<std::string> ConflictingRule(const SmartRules& rules);

// The rules as `key=value` pairs in the order of kSmartRuleKeys (absent rules left out).
std::vector<std::pair<std::string, std::string>> SmartRulePairs(const SmartRules& rules);

enum class SmartReadStatus { ok, missing, invalid };

struct SmartSection {
    SmartReadStatus status = SmartReadStatus::missing;
    SmartRules rules;
    std::string badKey;  // for `invalid`: the key at fault
};

// The rules of the smart playlist `name` in the smart playlist file at `path` (every section of
// that name, read as the conf reader reads a section that occurs twice: the last value wins).
// `missing`: no such file or section; `invalid`: a key that is not a rule, or a bad value.
SmartSection ReadSmartSection(const char* path, std::string_view name);

// The query that lists the tracks the rules select: its text, with a `?` per value, and the
// values in order. `shareDir` is the audio share (no trailing "/"); `now` seconds since the epoch.
struct SmartQuery {
    std::string sql;  // SELECT id, path, title, artist, album, duration_ms FROM track ...
    std::vector<std::variant<std::int64_t, std::string>> values;
};
SmartQuery BuildSmartQuery(const SmartRules& rules, const std::string& shareDir, std::int64_t now);

}  // namespace harmona::playlist
