#include "platform/playlist/SmartRules.h"

#include <algorithm>
#include <utility>

#include "common/util/Number.h"
#include "common/util/Utf8.h"
#include "platform/conf/ConfFile.h"

namespace harmona::playlist {
namespace {

// Bounds of the numeric rules.
constexpr std::int64_t kMaxYear = 9999;
constexpr std::int64_t kMaxDays = 36500;
constexpr std::int64_t kMaxDurationSeconds = 100 * 3600;

// The orders a smart playlist may ask for and the ORDER BY of each (fixed texts: the value never
// reaches the query).
struct OrderChoice {
    std::string_view name;
    const char* orderBy;
};
constexpr OrderChoice kOrders[] = {
    {"artist", "artist COLLATE NOCASE, album COLLATE NOCASE, disc_no, track_no, path"},
    {"album", "album COLLATE NOCASE, disc_no, track_no, path"},
    {"title", "title COLLATE NOCASE, path"},
    {"year", "year, artist COLLATE NOCASE, album COLLATE NOCASE, disc_no, track_no, path"},
    {"added", "added DESC, path"},
    {"random", "random()"},
    {"path", "path"},
};

bool HasControlByte(std::string_view text) {
    return std::any_of(text.begin(), text.end(), [](char c) {
        const auto byte = static_cast<unsigned char>(c);
        return byte < 0x20 || byte == 0x7f;
    });
}

bool CleanText(std::string_view value) {
    return value.size() <= kMaxRuleTextBytes && util::IsValidUtf8(value) && !HasControlByte(value);
}

bool Number(std::string_view value, std::int64_t low, std::int64_t high, std::int64_t& number) {
    return util::ParseDecimalDigits(value, number) && number >= low && number <= high;
}

// A folder of the share as a relative path: parts separated by single "/", none "." or "..".
bool ShareFolder(std::string_view value) {
    if (!CleanText(value) || value.front() == '/')
        return false;
    while (!value.empty() && value.back() == '/')
        value.remove_suffix(1);
    std::size_t start = 0;
    while (start <= value.size()) {
        const std::size_t slash = std::min(value.find('/', start), value.size());
        const std::string_view part = value.substr(start, slash - start);
        if (part.empty() || part == "." || part == "..")
            return false;
        start = slash + 1;
    }
    return true;
}

RuleOutcome SetText(std::optional<std::string>& rule, std::string_view value) {
    if (!CleanText(value))
        return RuleOutcome::badValue;
    rule = std::string(value);
    return RuleOutcome::ok;
}

RuleOutcome SetNumber(std::optional<std::int64_t>& rule, std::string_view value, std::int64_t low,
                      std::int64_t high) {
    std::int64_t number = 0;
    if (!Number(value, low, high, number))
        return RuleOutcome::badValue;
    rule = number;
    return RuleOutcome::ok;
}

class SectionReader : public conf::ConfVisitor {
  public:
    explicit SectionReader(std::string_view name) : name_(name) {}
    void Section(std::string_view name) override {
        inside_ = name == name_;
        found_ = found_ || inside_;
    }
    void Entry(std::string_view key, std::string_view value) override {
        if (!inside_ || !result_.badKey.empty())
            return;
        if (SetSmartRule(result_.rules, key, value) != RuleOutcome::ok)
            result_.badKey = std::string(key);
    }
    SmartSection Finish() {
        if (!found_) {
            result_.status = SmartReadStatus::missing;
            return std::move(result_);
        }
        if (result_.badKey.empty()) {
            if (std::optional<std::string> key = ConflictingRule(result_.rules))
                result_.badKey = *key;
        }
        result_.status = result_.badKey.empty() ? SmartReadStatus::ok : SmartReadStatus::invalid;
        return std::move(result_);
    }

  private:
    std::string_view name_;
    bool inside_ = false;
    bool found_ = false;
    SmartSection result_;
};

void AddNumber(std::vector<std::pair<std::string, std::string>>& pairs, const char* key,
               const std::optional<std::int64_t>& value) {
    if (value)
        pairs.emplace_back(key, std::to_string(*value));
}
void AddText(std::vector<std::pair<std::string, std::string>>& pairs, const char* key,
             const std::optional<std::string>& value) {
    if (value)
        pairs.emplace_back(key, *value);
}

}  // namespace

RuleOutcome SetSmartRule(SmartRules& rules, std::string_view key, std::string_view value) {
    if (std::find(std::begin(kSmartRuleKeys), std::end(kSmartRuleKeys), key) ==
        std::end(kSmartRuleKeys))
        return RuleOutcome::unknownKey;
    if (value.empty()) {
        if (key == "artist")
            rules.artist.reset();
        else if (key == "album")
            rules.album.reset();
        else if (key == "genre")
            rules.genre.reset();
        else if (key == "title")
            rules.title.reset();
        else if (key == "year_from")
            rules.yearFrom.reset();
        else if (key == "year_to")
            rules.yearTo.reset();
        else if (key == "path")
            rules.path.reset();
        else if (key == "added_within_days")
            rules.addedWithinDays.reset();
        else if (key == "duration_min")
            rules.durationMin.reset();
        else if (key == "duration_max")
            rules.durationMax.reset();
        else if (key == "limit")
            rules.limit.reset();
        else if (key == "order")
            rules.order.reset();
        return RuleOutcome::ok;
    }
    if (key == "artist")
        return SetText(rules.artist, value);
    if (key == "album")
        return SetText(rules.album, value);
    if (key == "genre")
        return SetText(rules.genre, value);
    if (key == "title")
        return SetText(rules.title, value);
    if (key == "year_from")
        return SetNumber(rules.yearFrom, value, 0, kMaxYear);
    if (key == "year_to")
        return SetNumber(rules.yearTo, value, 0, kMaxYear);
    if (key == "added_within_days")
        return SetNumber(rules.addedWithinDays, value, 1, kMaxDays);
    if (key == "duration_min")
        return SetNumber(rules.durationMin, value, 0, kMaxDurationSeconds);
    if (key == "duration_max")
        return SetNumber(rules.durationMax, value, 0, kMaxDurationSeconds);
    if (key == "limit")
        return SetNumber(rules.limit, value, 1, kMaxSmartTracks);
    if (key == "path") {
        if (!ShareFolder(value))
            return RuleOutcome::badValue;
        std::string folder(value);
        while (folder.back() == '/')
            folder.pop_back();
        rules.path = std::move(folder);
        return RuleOutcome::ok;
    }
    // order
    for (const OrderChoice& choice : kOrders) {
        if (choice.name == value) {
            rules.order = std::string(value);
            return RuleOutcome::ok;
        }
    }
    return RuleOutcome::badValue;
}

std::optional<std::string> ConflictingRule(const SmartRules& rules) {
    if (rules.yearFrom && rules.yearTo && *rules.yearFrom > *rules.yearTo)
        return std::string("year_to");
    if (rules.durationMin && rules.durationMax && *rules.durationMin > *rules.durationMax)
        return std::string("duration_max");
    return std::nullopt;
}

std::vector<std::pair<std::string, std::string>> SmartRulePairs(const SmartRules& rules) {
    std::vector<std::pair<std::string, std::string>> pairs;
    AddText(pairs, "artist", rules.artist);
    AddText(pairs, "album", rules.album);
    AddText(pairs, "genre", rules.genre);
    AddText(pairs, "title", rules.title);
    AddNumber(pairs, "year_from", rules.yearFrom);
    AddNumber(pairs, "year_to", rules.yearTo);
    AddText(pairs, "path", rules.path);
    AddNumber(pairs, "added_within_days", rules.addedWithinDays);
    AddNumber(pairs, "duration_min", rules.durationMin);
    AddNumber(pairs, "duration_max", rules.durationMax);
    AddNumber(pairs, "limit", rules.limit);
    AddText(pairs, "order", rules.order);
    return pairs;
}

SmartSection ReadSmartSection(const char* path, std::string_view name) {
    SectionReader reader(name);
    const conf::ReadResult read = conf::ReadConf(path, reader);
    if (read != conf::ReadResult::ok) {
        SmartSection none;
        none.status = SmartReadStatus::missing;
        return none;
    }
    return reader.Finish();
}

SmartQuery BuildSmartQuery(const SmartRules& rules, const std::string& shareDir, std::int64_t now) {
    SmartQuery query;
    query.sql = "SELECT id, path, title, artist, album, duration_ms FROM track WHERE 1";
    auto where = [&](const char* condition, auto value) {
        query.sql += " AND ";
        query.sql += condition;
        query.values.emplace_back(value);
    };
    if (rules.artist)
        where("artist = ? COLLATE NOCASE", *rules.artist);
    if (rules.album)
        where("album = ? COLLATE NOCASE", *rules.album);
    if (rules.genre)
        where("genre = ? COLLATE NOCASE", *rules.genre);
    if (rules.title)
        where("instr(lower(title), lower(?)) > 0", *rules.title);
    if (rules.yearFrom)
        where("year >= ?", *rules.yearFrom);
    if (rules.yearTo)
        where("year <= ?", *rules.yearTo);
    if (rules.path) {
        // Every path below the folder sorts between "<folder>/" and "<folder>0" ('0' follows '/').
        const std::string low = shareDir + "/" + *rules.path + "/";
        std::string high = low;
        high.back() = '0';
        where("path >= ?", low);
        where("path < ?", high);
    }
    if (rules.addedWithinDays)
        where("added >= ?", now - *rules.addedWithinDays * 86400);
    if (rules.durationMin)
        where("duration_ms >= ?", *rules.durationMin * 1000);
    if (rules.durationMax)
        where("duration_ms <= ?", *rules.durationMax * 1000);
    const char* orderBy = "path";
    if (rules.order) {
        for (const OrderChoice& choice : kOrders) {
            if (choice.name == *rules.order)
                orderBy = choice.orderBy;
        }
    }
    query.sql += " ORDER BY ";
    query.sql += orderBy;
    query.sql += " LIMIT ?";
    query.values.emplace_back(rules.limit ? std::min(*rules.limit, kMaxSmartTracks)
                                          : kMaxSmartTracks);
    return query;
}

}  // namespace harmona::playlist
