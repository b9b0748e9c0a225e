#include "platform/radio/RadioStations.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "common/io/FileDescriptor.h"
#include "common/io/ReplaceFile.h"
#include "common/util/Number.h"
#include "common/util/Trim.h"
#include "common/util/Utf8.h"
#include "platform/conf/ConfFile.h"

namespace harmona::radio {

namespace {

bool StartsWithNoCase(std::string_view text, std::string_view prefix) {
    if (text.size() < prefix.size())
        return false;
    for (std::size_t i = 0; i < prefix.size(); ++i) {
        char c = text[i];
        if (c >= 'A' && c <= 'Z')
            c = static_cast<char>(c - 'A' + 'a');
        if (c != prefix[i])
            return false;
    }
    return true;
}

// Gathers the sections of the file as stations.
class StationReader : public conf::ConfVisitor {
  public:
    explicit StationReader(std::vector<Station>& stations) : stations_(stations) {}
    ~StationReader() override { Finish(); }

    void Section(std::string_view name) override {
        Finish();
        open_ = true;
        current_ = Station{};
        const std::optional<std::uint32_t> id = ParseStationId(name);
        valid_ = id.has_value();
        if (id)
            current_.id = *id;
    }

    void Entry(std::string_view key, std::string_view value) override {
        if (!open_)
            return;
        if (key == "name")
            current_.name = std::string(value);
        else if (key == "url")
            current_.url = std::string(value);
        else if (key == "favorite")
            current_.favorite = value == "1";
    }

    void Finish() {
        if (!open_)
            return;
        open_ = false;
        const std::optional<std::string> name = CleanStationName(current_.name);
        if (!valid_ || !name || *name != current_.name || !IsStationUrl(current_.url) ||
            stations_.size() >= kMaxStations)
            return;
        for (const Station& station : stations_)
            if (station.id == current_.id)
                return;  // the first section of an id counts
        stations_.push_back(std::move(current_));
    }

  private:
    std::vector<Station>& stations_;
    Station current_;
    bool open_ = false;
    bool valid_ = false;
};

std::string FilePath(const std::string& preferenceDir) {
    return preferenceDir + "/" + kStationsFileName;
}

// Writes `text` to a new file in the directory and renames it over the stations file; the data and
// the rename are on disk when it returns true.
bool ReplaceStationsFile(int dirFd, const std::string& text) {
    return io::ReplaceFileAt(dirFd, kStationsFileName, text,
                             std::string(".") + kStationsFileName + ".") == io::ReplaceOutcome::ok;
}

// Runs `change` on the stations under an exclusive lock of the preference directory (made when
// missing) and writes the result when it says so.
template <typename Change>
ChangeOutcome ChangeStations(const std::string& preferenceDir, Change change) {
    if (mkdir(preferenceDir.c_str(), 0700) != 0 && errno != EEXIST)
        return ChangeOutcome::unwritable;
    io::FileDescriptor dir(
        open(preferenceDir.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!dir)
        return ChangeOutcome::unwritable;
    int locked;
    while ((locked = flock(dir.Get(), LOCK_EX)) != 0 && errno == EINTR) {
    }
    if (locked != 0)
        return ChangeOutcome::unwritable;
    StationList list = ReadStations(preferenceDir);
    if (list.status != ReadStatus::ok)
        return ChangeOutcome::unwritable;
    const ChangeOutcome outcome = change(list.stations);
    if (outcome != ChangeOutcome::ok)
        return outcome;
    return ReplaceStationsFile(dir.Get(), FormatStations(list.stations))
               ? ChangeOutcome::ok
               : ChangeOutcome::unwritable;
}

}  // namespace

StationList ReadStations(const std::string& preferenceDir) {
    StationList list;
    conf::ReadResult result;
    {
        StationReader reader(list.stations);
        result = conf::ReadConf(FilePath(preferenceDir).c_str(), reader);
    }
    if (result == conf::ReadResult::unreadable) {
        list.stations.clear();
        return list;
    }
    list.status = ReadStatus::ok;
    return list;
}

std::optional<std::string> CleanStationName(std::string_view name) {
    const std::string_view trimmed = util::Trim(name);
    if (trimmed.empty() || trimmed.size() > kMaxNameBytes || !util::IsValidUtf8(trimmed))
        return std::nullopt;
    for (std::size_t i = 0; i < trimmed.size();) {
        const std::size_t length = util::Utf8SequenceLength(trimmed, i);
        if (length == 0)
            return std::nullopt;
        const char32_t c = util::DecodeUtf8(trimmed, i, length);
        if (c < 0x20 || (c >= 0x7f && c <= 0x9f) || c == 0x2028 || c == 0x2029)
            return std::nullopt;
        i += length;
    }
    return std::string(trimmed);
}

bool IsStationUrl(std::string_view url) {
    if (url.size() > kMaxUrlBytes)
        return false;
    std::size_t hostStart;
    if (StartsWithNoCase(url, "http://"))
        hostStart = 7;
    else if (StartsWithNoCase(url, "https://"))
        hostStart = 8;
    else
        return false;
    for (const char c : url) {
        const auto byte = static_cast<unsigned char>(c);
        if (byte <= 0x20 || byte >= 0x7f)
            return false;
        if (std::string_view("\"<>\\^`{|}").find(c) != std::string_view::npos)
            return false;
    }
    const std::size_t hostEnd = url.find_first_of("/?#", hostStart);
    const std::string_view authority =
        url.substr(hostStart, hostEnd == std::string_view::npos ? std::string_view::npos
                                                                : hostEnd - hostStart);
    if (authority.find('@') != std::string_view::npos)
        return false;
    // A host: something before an optional ":port".
    const std::size_t colon = authority.rfind(':');
    const bool bracketed = !authority.empty() && authority[0] == '[';
    const std::string_view host =
        (colon != std::string_view::npos && (!bracketed || colon > authority.find(']')))
            ? authority.substr(0, colon)
            : authority;
    if (host.empty() || host == "[]")
        return false;
    if (colon != std::string_view::npos && host.size() != authority.size()) {
        const std::string_view port = authority.substr(colon + 1);
        std::int64_t number = 0;
        if (port.size() > 5 || !util::ParseDecimalDigits(port, number) || number < 1 ||
            number > 65535)
            return false;
    }
    return true;
}

std::optional<std::uint32_t> ParseStationId(std::string_view text) {
    std::int64_t value = 0;
    if (text.empty() || text.size() > kMaxIdDigits || !util::ParseDecimalDigits(text, value) ||
        value == 0)
        return std::nullopt;
    return static_cast<std::uint32_t>(value);
}

std::string FormatStations(const std::vector<Station>& stations) {
    std::string text = "# Internet radio stations of this user, kept by the audio application.\n";
    for (const Station& station : stations) {
        text += "\n[" + std::to_string(station.id) + "]\n";
        // Quoted, so that the reader keeps the value exactly (it removes one enclosing pair).
        text += "name=\"" + station.name + "\"\n";
        text += "url=\"" + station.url + "\"\n";
        text += std::string("favorite=") + (station.favorite ? "1" : "0") + "\n";
    }
    return text;
}

ChangeOutcome AddStation(const std::string& preferenceDir, const std::string& name,
                         const std::string& url, Station& added) {
    return ChangeStations(preferenceDir, [&](std::vector<Station>& stations) {
        if (stations.size() >= kMaxStations)
            return ChangeOutcome::full;
        std::uint32_t next = 1;
        for (const Station& station : stations)
            if (station.id >= next)
                next = station.id + 1;
        if (next > 999999999u)
            return ChangeOutcome::full;
        added = Station{next, name, url, false};
        stations.push_back(added);
        return ChangeOutcome::ok;
    });
}

ChangeOutcome RemoveStation(const std::string& preferenceDir, std::uint32_t id) {
    return ChangeStations(preferenceDir, [&](std::vector<Station>& stations) {
        for (auto it = stations.begin(); it != stations.end(); ++it) {
            if (it->id == id) {
                stations.erase(it);
                return ChangeOutcome::ok;
            }
        }
        return ChangeOutcome::notFound;
    });
}

ChangeOutcome SetFavorite(const std::string& preferenceDir, std::uint32_t id, bool favorite) {
    return ChangeStations(preferenceDir, [&](std::vector<Station>& stations) {
        for (Station& station : stations) {
            if (station.id == id) {
                station.favorite = favorite;
                return ChangeOutcome::ok;
            }
        }
        return ChangeOutcome::notFound;
    });
}

}  // namespace harmona::radio
