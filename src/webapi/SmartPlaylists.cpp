// Smart playlists in library.cgi: the tracks their rules select (one bounded query of library.db
// with bound values), their rules for the page's editor, and their sections made, changed and
// removed in the user's or the shared smart playlist file.
#include <sys/stat.h>

#include <ctime>
#include <string>
#include <variant>

#include "platform/cgi/ApplicationRequest.h"
#include "platform/conf/ConfFile.h"
#include "platform/lib/sqlite/Database.h"
#include "platform/medialib/LibraryDatabase.h"
#include "platform/medialib/MediaFiles.h"
#include "platform/paths/PlatformPaths.h"
#include "platform/playlist/PlaylistWrite.h"
#include "platform/playlist/SmartRules.h"
#include "src/webapi/ApiError.h"
#include "src/webapi/LibraryApi.h"
#include "src/webapi/PlaylistEdit.h"

namespace harmona::webapi {
namespace {

enum ErrorLine : int {
    kNoSuchSmartLine = 301,
    kStoredRuleLine = 302,
    kRequestRuleLine = 303,
    kSmartNameLine = 304,
    kSmartNameTakenLine = 305,
    kSmartNotAllowedLine = 306,
    kSmartFileTooLargeLine = 307,
    kSmartWriteLine = 308,
    kSmartLibraryLine = 309,
    kSmartCategoryLine = 310,
};

inline constexpr std::string_view kPersonalSmartPrefix = "musiclib_music_personal/smart/";
inline constexpr std::string_view kSharedSmartPrefix = "musiclib_music_shared/smart/";
inline constexpr const char* kSmartFileName = "smart.playlist";
inline constexpr const char* kSharedSmartFolder = "/var/packages/Harmona/etc";

bool StartsWith(std::string_view text, std::string_view prefix) {
    return text.compare(0, prefix.size(), prefix) == 0;
}

struct SmartNode {
    bool shared = false;
    std::string name;
};

std::optional<SmartNode> ParseSmartNode(std::string_view node) {
    SmartNode parsed;
    if (StartsWith(node, kPersonalSmartPrefix)) {
        parsed.name = std::string(node.substr(kPersonalSmartPrefix.size()));
    } else if (StartsWith(node, kSharedSmartPrefix)) {
        parsed.shared = true;
        parsed.name = std::string(node.substr(kSharedSmartPrefix.size()));
    } else {
        return std::nullopt;
    }
    if (parsed.name.empty())
        return std::nullopt;
    return parsed;
}

// A name that can stand between the brackets of a section line: any that the enumerator lists
// (the rules of a new name apply to new names only).
bool IsSectionName(std::string_view name) {
    return !name.empty() && name.size() <= conf::kMaxLineBytes &&
           name.find_first_of(std::string_view("\r\n\0", 3)) == std::string_view::npos;
}

std::string NodeOf(bool shared, const std::string& name) {
    return std::string(shared ? kSharedSmartPrefix : kPersonalSmartPrefix) + name;
}

// The raw keys of a section (every section of that name; the last value wins).
class RawSection : public conf::ConfVisitor {
  public:
    explicit RawSection(std::string_view name) : name_(name) {}
    void Section(std::string_view name) override {
        inside_ = name == name_;
        found = found || inside_;
    }
    void Entry(std::string_view key, std::string_view value) override {
        if (inside_)
            rules[std::string(key)] = std::string(value);
    }
    bool found = false;
    Json::Value rules{Json::objectValue};

  private:
    std::string_view name_;
    bool inside_ = false;
};

}  // namespace

bool IsSmartPlaylistAction(std::string_view action) {
    return action == "smartget" || action == "smartsave" || action == "smartdelete";
}

bool IsSmartPlaylistNode(std::string_view node) {
    return StartsWith(node, kPersonalSmartPrefix) || StartsWith(node, kSharedSmartPrefix);
}

int LibraryApi::ListSmartPlaylist(const std::string& node, Json::Value& reply) {
    const std::optional<SmartNode> smart = ParseSmartNode(node);
    if (!smart)
        return FailWith(kStatusNotFound, "node_gone", kNoSuchSmartLine, kNotFoundSection,
                        kNotFoundText);
    const std::string file = smart->shared ? std::string(paths::kSharedSmartPlaylists)
                                           : webMan.GetPreferenceDir() + paths::kPlaylistsFolder +
                                                 paths::kSmartPlaylistFile;
    const playlist::SmartSection section = playlist::ReadSmartSection(file.c_str(), smart->name);
    if (section.status == playlist::SmartReadStatus::missing)
        return FailWith(kStatusNotFound, "node_gone", kNoSuchSmartLine, kNotFoundSection,
                        kNotFoundText);
    if (section.status == playlist::SmartReadStatus::invalid)
        return FailWith(kStatusUnprocessable, "rule_invalid", kStoredRuleLine, nullptr, nullptr,
                        section.badKey);

    medialib::LibraryOpenResult library = medialib::OpenLibrary(paths::kLibraryDb);
    if (library.status != medialib::LibraryStatus::ok)
        return FailWith(kStatusUnavailable, "library_unavailable", kSmartLibraryLine,
                        kSystemSection, kSystemText);
    const playlist::SmartQuery query = playlist::BuildSmartQuery(
        section.rules, medialib::AudioSharePath(), static_cast<std::int64_t>(std::time(nullptr)));
    sqlite::Statement select = library.db.Prepare(query.sql);
    if (!select)
        return FailWith(kStatusUnavailable, "library_unavailable", kSmartLibraryLine,
                        kSystemSection, kSystemText);
    int index = 1;
    for (const auto& value : query.values) {
        if (const auto* number = std::get_if<std::int64_t>(&value))
            select.Bind(index++, *number);
        else
            select.Bind(index++, std::string_view(std::get<std::string>(value)));
    }
    std::vector<std::string> paths;
    int code;
    while ((code = select.Step()) == SQLITE_ROW)
        paths.emplace_back(select.ColumnText(1));
    if (code != SQLITE_DONE)
        return FailWith(kStatusUnavailable, "library_unavailable", kSmartLibraryLine,
                        kSystemSection, kSystemText);
    if (!OpenCatalog())
        return FailWith(kStatusUnavailable, "library_unavailable", kSmartLibraryLine,
                        kSystemSection, kSystemText);
    AppendPlaylistTracks(paths, reply);
    return 1;
}

int LibraryApi::EditSmartPlaylist(const std::string& action) {
    const bool mayChangeShared = (permission_ & cgi::kPermissionNewSharedPlaylist) != 0;
    if (action == "smartget") {
        const std::optional<SmartNode> smart = ParseSmartNode(webMan.In("node", ""));
        if (!smart)
            return FailWith(kStatusNotFound, "node_gone", kNoSuchSmartLine, kNotFoundSection,
                            kNotFoundText);
        const std::string file =
            smart->shared
                ? std::string(paths::kSharedSmartPlaylists)
                : webMan.GetPreferenceDir() + paths::kPlaylistsFolder + paths::kSmartPlaylistFile;
        RawSection section(smart->name);
        conf::ReadConf(file.c_str(), section);
        if (!section.found)
            return FailWith(kStatusNotFound, "node_gone", kNoSuchSmartLine, kNotFoundSection,
                            kNotFoundText);
        Json::Value reply(Json::objectValue);
        reply["success"] = true;
        reply["node"] = NodeOf(smart->shared, smart->name);
        reply["name"] = smart->name;
        reply["category"] = smart->shared ? "shared" : "personal";
        reply["rules"] = section.rules;
        reply["editable"] = !smart->shared || mayChangeShared;
        PrintResponse(std::move(reply), kJsonReplyType);
        return 1;
    }

    if (AdmitChange() == 0)
        return 0;
    bool shared = false;
    std::string name;
    std::optional<std::string> oldName;
    playlist::SmartRules rules;
    if (action == "smartsave") {
        const std::string category = webMan.In("category", "");
        if (category != "personal" && category != "shared")
            return FailWith(kStatusBadRequest, "category_invalid", kSmartCategoryLine);
        shared = category == "shared";
        name = webMan.In("name", "");
        if (!playlist::IsValidPlaylistName(name))
            return FailWith(kStatusBadRequest, "name_invalid", kSmartNameLine);
        if (const char* old = webMan.In("old", nullptr)) {
            if (!IsSectionName(old))
                return FailWith(kStatusNotFound, "node_gone", kNoSuchSmartLine, kNotFoundSection,
                                kNotFoundText);
            oldName = old;
        }
        for (std::string_view key : playlist::kSmartRuleKeys) {
            const char* value = webMan.In(std::string(key).c_str(), nullptr);
            if (value == nullptr)
                continue;
            if (playlist::SetSmartRule(rules, key, value) != playlist::RuleOutcome::ok)
                return FailWith(kStatusBadRequest, "rule_invalid", kRequestRuleLine, nullptr,
                                nullptr, std::string(key));
        }
        if (std::optional<std::string> key = playlist::ConflictingRule(rules))
            return FailWith(kStatusBadRequest, "rule_invalid", kRequestRuleLine, nullptr, nullptr,
                            *key);
    } else {  // smartdelete
        const std::optional<SmartNode> smart = ParseSmartNode(webMan.In("node", ""));
        if (!smart || !IsSectionName(smart->name))
            return FailWith(kStatusNotFound, "node_gone", kNoSuchSmartLine, kNotFoundSection,
                            kNotFoundText);
        shared = smart->shared;
        name = smart->name;
        oldName = smart->name;
    }
    if (shared && !mayChangeShared)
        return FailWith(kStatusForbidden, "request_refused", kSmartNotAllowedLine);

    std::string folder = kSharedSmartFolder;
    if (!shared) {
        mkdir(webMan.GetPreferenceDir().c_str(), 0755);
        folder = webMan.GetPreferenceDir() + paths::kPlaylistsFolder;
    }
    const io::FileDescriptor dir = playlist::LockFolder(folder, !shared);
    if (!dir)
        return FailWith(kStatusServerError, "write_failed", kSmartWriteLine, kSystemSection,
                        kSystemText);
    const playlist::SmartChange changed = playlist::ChangeSmartSection(
        dir.Get(), kSmartFileName, oldName, name, action == "smartsave" ? &rules : nullptr);
    switch (changed) {
        case playlist::SmartChange::ok:
            break;
        case playlist::SmartChange::missing:
            return FailWith(kStatusNotFound, "node_gone", kNoSuchSmartLine, kNotFoundSection,
                            kNotFoundText);
        case playlist::SmartChange::exists:
            return FailWith(kStatusConflict, "name_taken", kSmartNameTakenLine);
        case playlist::SmartChange::tooLarge:
            return FailWith(kStatusTooLarge, "too_large", kSmartFileTooLargeLine);
        case playlist::SmartChange::failed:
            return FailWith(kStatusServerError, "write_failed", kSmartWriteLine, kSystemSection,
                            kSystemText);
    }
    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    if (action == "smartsave")
        reply["node"] = NodeOf(shared, name);
    PrintResponse(std::move(reply), kJsonReplyType);
    return 1;
}

}  // namespace harmona::webapi
