#include "platform/cgi/UILanguage.h"

#include <strings.h>

#include <algorithm>
#include <cstdlib>
#include <vector>

#include "common/util/Trim.h"

namespace harmona::cgi {
namespace {

struct LanguageTag {
    const char* tag;
    const char* code;
};

// The platform's language codes and the tags that map to them; the longest matching tag wins, so
// "zh-TW" is not read as "zh".
constexpr LanguageTag kTags[] = {
    {"en", "enu"},      {"de", "ger"},      {"fr", "fre"}, {"it", "ita"},    {"es", "spn"},
    {"ja", "jpn"},      {"da", "dan"},      {"nb", "nor"}, {"nn", "nor"},    {"no", "nor"},
    {"sv", "sve"},      {"nl", "nld"},      {"ru", "rus"}, {"pl", "plk"},    {"pt-BR", "ptb"},
    {"pt", "ptg"},      {"hu", "hun"},      {"tr", "trk"}, {"cs", "csy"},    {"zh-CN", "chs"},
    {"zh-SG", "chs"},   {"zh-Hans", "chs"}, {"zh", "chs"}, {"zh-TW", "cht"}, {"zh-HK", "cht"},
    {"zh-Hant", "cht"}, {"ko", "krn"},      {"th", "tha"},
};

constexpr const char* kCodes[] = {"enu", "ger", "fre", "ita", "spn", "jpn", "dan",
                                  "nor", "sve", "nld", "rus", "plk", "ptb", "ptg",
                                  "hun", "trk", "csy", "chs", "cht", "krn", "tha"};

bool EqualsIgnoreCase(std::string_view a, std::string_view b) {
    return a.size() == b.size() && strncasecmp(a.data(), b.data(), a.size()) == 0;
}

// `prefix` equals `tag` or is a whole-subtag prefix of it ("zh-Hant" of "zh-Hant-TW").
bool IsSubtagPrefix(std::string_view prefix, std::string_view tag) {
    if (tag.size() < prefix.size() || !EqualsIgnoreCase(prefix, tag.substr(0, prefix.size())))
        return false;
    return tag.size() == prefix.size() || tag[prefix.size()] == '-';
}

const char* CodeOfTag(std::string_view tag) {
    const char* best = nullptr;
    std::size_t bestLength = 0;
    for (const LanguageTag& entry : kTags) {
        const std::string_view candidate(entry.tag);
        if (IsSubtagPrefix(candidate, tag) && candidate.size() > bestLength) {
            best = entry.code;
            bestLength = candidate.size();
        }
    }
    return best;
}

// The q-value of one language range's parameters; 1 when absent, -1 when malformed.
double QValue(std::string_view params) {
    double q = 1.0;
    while (!params.empty()) {
        const std::size_t semi = params.find(';');
        const std::string_view param = util::Trim(params.substr(0, semi));
        params = semi == std::string_view::npos ? std::string_view() : params.substr(semi + 1);
        if (param.size() < 2 || (param[0] != 'q' && param[0] != 'Q') || param[1] != '=')
            continue;
        const std::string value(param.substr(2));
        char* end = nullptr;
        q = std::strtod(value.c_str(), &end);
        if (end == value.c_str() || *end != '\0' || q < 0 || q > 1)
            return -1;
    }
    return q;
}

}  // namespace

bool IsLanguageCode(std::string_view code) {
    return std::any_of(std::begin(kCodes), std::end(kCodes),
                       [&](const char* known) { return code == known; });
}

std::string LanguageFromAcceptLanguage(std::string_view header) {
    struct Candidate {
        const char* code;
        double q;
    };
    std::vector<Candidate> candidates;
    while (!header.empty()) {
        const std::size_t comma = header.find(',');
        const std::string_view range = header.substr(0, comma);
        header = comma == std::string_view::npos ? std::string_view() : header.substr(comma + 1);
        const std::size_t semi = range.find(';');
        const std::string_view tag = util::Trim(range.substr(0, semi));
        const double q = semi == std::string_view::npos ? 1.0 : QValue(range.substr(semi + 1));
        if (tag.empty() || q <= 0)
            continue;  // q=0 means "not acceptable"
        if (const char* code = CodeOfTag(tag))
            candidates.push_back({code, q});
    }
    std::stable_sort(candidates.begin(), candidates.end(),
                     [](const Candidate& a, const Candidate& b) { return a.q > b.q; });
    return candidates.empty() ? std::string() : candidates.front().code;
}

}  // namespace harmona::cgi
