#include "src/webapi/UserLanguage.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <optional>
#include <random>
#include <string>

#include "common/io/FileDescriptor.h"
#include "common/io/WriteAll.h"
#include "platform/conf/ConfFile.h"
#include "src/webapi/ApiError.h"

namespace harmona::webapi {

namespace {

inline constexpr std::array<std::string_view, 9> kSavable = {"enu", "ger", "fre", "spn", "ita",
                                                             "jpn", "chs", "cht", "def"};
inline constexpr std::string_view kNoChoice = "def";
inline constexpr std::string_view kLanguageKey = "language";

// The errors, with fixed line numbers that log readers match on.
constexpr ApiError kLanguageInvalid{kStatusBadRequest, kSystemSection, kSystemText, 601,
                                    "request_invalid"};
constexpr ApiError kLanguageUnwritable{kStatusServerError, kSystemSection, kSystemText, 602,
                                       "language_unwritable"};

// The user's saved choice as it stands in the file: "" when there is none (no file, no key, a
// value that is not one of the savable codes).
std::string SavedLanguage(const std::string& preferenceDir) {
    const std::string path = preferenceDir + "/" + kLanguageFileName;
    const std::optional<std::string> value =
        conf::LookupConf(path.c_str(), std::nullopt, kLanguageKey);
    return value && IsSavableLanguage(*value) ? *value : std::string();
}

// Writes `text` to a new file in the folder and renames it over the language file; the data and
// the rename are on disk when it returns true.
bool ReplaceLanguageFile(int dirFd, const std::string& text) {
    std::random_device seed;
    std::mt19937 random(seed());
    for (int attempt = 0; attempt < 16; ++attempt) {
        char temporary[64];
        std::snprintf(temporary, sizeof(temporary), ".%s.%08x", kLanguageFileName,
                      static_cast<unsigned>(random()));
        io::FileDescriptor file(
            openat(dirFd, temporary, O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0600));
        if (!file) {
            if (errno == EEXIST)
                continue;
            return false;
        }
        const bool written =
            io::WriteAll(file.Get(), text) && fsync(file.Get()) == 0 && file.Close();
        if (written && renameat(dirFd, temporary, dirFd, kLanguageFileName) == 0) {
            fsync(dirFd);
            return true;
        }
        unlinkat(dirFd, temporary, 0);
        return false;
    }
    return false;
}

// Saves the choice under an exclusive lock of the preference folder (made when missing).
bool SaveLanguage(const std::string& preferenceDir, std::string_view code) {
    if (mkdir(preferenceDir.c_str(), 0700) != 0 && errno != EEXIST)
        return false;
    io::FileDescriptor dir(
        open(preferenceDir.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!dir)
        return false;
    int locked;
    while ((locked = flock(dir.Get(), LOCK_EX)) != 0 && errno == EINTR) {
    }
    if (locked != 0)
        return false;
    return ReplaceLanguageFile(dir.Get(),
                               std::string(kLanguageKey) + "=" + std::string(code) + "\n");
}

int AnswerLanguage(ActionHandler& handler, WebMan& webMan) {
    const std::string tree = webMan.GetUILanguage();
    const std::string saved = SavedLanguage(webMan.GetPreferenceDir());
    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    reply["language"] = saved.empty() || saved == kNoChoice ? tree : saved;
    reply["tree"] = tree;
    reply["saved"] = saved;
    handler.PrintResponse(std::move(reply), kJsonReplyType);
    return 1;
}

}  // namespace

bool IsSavableLanguage(std::string_view code) {
    for (const std::string_view savable : kSavable)
        if (code == savable)
            return true;
    return false;
}

int ServeLanguageAction(ActionHandler& handler, WebMan& webMan) {
    if (!IsPostRequest())
        return AnswerLanguage(handler, webMan);
    const std::string code = webMan.In("language", "");
    if (!IsSavableLanguage(code))
        return AnswerError(handler, webMan, kLanguageInvalid);
    if (!SaveLanguage(webMan.GetPreferenceDir(), code)) {
        syslog(LOG_ERR, "language: cannot save the language of %s",
               webMan.GetLoginUserName().c_str());
        return AnswerError(handler, webMan, kLanguageUnwritable);
    }
    return AnswerLanguage(handler, webMan);
}

}  // namespace harmona::webapi
