// The random playlist: a uniform sample of distinct tracks without reading the whole track table.
//
// The track table's ids are its rowids, usually dense (1..N with a few holes). A random rowid in
// [min, max] hits an existing track with probability N / (max - min + 1); drawing rowids and
// keeping the hits that were not drawn before is a uniform sample without replacement, and each
// draw is one B-tree lookup, so the cost does not grow with the table. Only when the id range is
// small (read it whole, it is cheap) or the ids are very sparse (too many draws miss) is the whole
// table scanned, with a reservoir sample that keeps memory at `count` ids.
#include "platform/playlist/AudioFile.h"

#include <fcntl.h>
#include <pwd.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <syslog.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <optional>
#include <random>
#include <string>
#include <string_view>
#include <unordered_set>
#include <vector>

#include "common/io/FileDescriptor.h"
#include "common/io/ReplaceFile.h"
#include "common/util/CleanText.h"
#include "common/util/Utf8.h"
#include "platform/lib/sqlite/Database.h"
#include "platform/medialib/LibraryDatabase.h"
#include "platform/paths/PlatformPaths.h"

namespace harmona::playlist {
namespace {

using harmona::io::FileDescriptor;

// Artist and title are cut to this many bytes (on a UTF-8 boundary); nothing in the file is
// trusted, and a display text needs no more.
constexpr std::size_t kMaxTextBytes = 1024;
// A track whose path is longer than a path can be is left out.
constexpr std::size_t kMaxPathBytes = 4095;
// Id ranges up to this size (or up to 4 times the count) are read whole.
constexpr std::uint64_t kSmallSpan = 8192;
// Random draws per wanted track before the sampler gives up on the ids being dense enough.
constexpr std::uint64_t kDrawsPerTrack = 40;

struct Track {
    std::string path;
    std::string artist;
    std::string title;
    std::int64_t seconds = -1;  // -1: unknown, as extended M3U has it
};

using Generator = std::mt19937_64;

Generator SeededGenerator() {
    std::uint32_t words[8] = {};
    if (getrandom(words, sizeof words, GRND_NONBLOCK) != static_cast<ssize_t>(sizeof words)) {
        timespec now{};
        clock_gettime(CLOCK_MONOTONIC, &now);
        words[0] = static_cast<std::uint32_t>(now.tv_nsec);
        words[1] = static_cast<std::uint32_t>(now.tv_sec);
        words[2] = static_cast<std::uint32_t>(getpid());
    }
    std::seed_seq seed(std::begin(words), std::end(words));
    return Generator(seed);
}

// A path that a playlist line can hold: not empty, not too long, no NUL or line break.
bool IsWritablePath(std::string_view path) {
    return !path.empty() && path.size() <= kMaxPathBytes &&
           path.find_first_of(std::string_view("\0\r\n", 3)) == std::string_view::npos;
}

std::int64_t SecondsOf(const sqlite::Statement& row, int column) {
    const int type = row.ColumnType(column);
    if (type != SQLITE_INTEGER && type != SQLITE_FLOAT)
        return -1;
    const std::int64_t ms = row.ColumnInt64(column);
    if (ms < 0)
        return -1;
    return ms / 1000 + (ms % 1000 >= 500 ? 1 : 0);
}

enum class Fetch { found, absent, failed };

class TrackTable {
  public:
    explicit TrackTable(sqlite::Database& db)
        : db_(db),
          byRowid_(
              db.Prepare("SELECT path, artist, title, duration_ms FROM track WHERE rowid = ?1")) {}

    // The track query was prepared (the database holds a readable track table).
    explicit operator bool() const { return static_cast<bool>(byRowid_); }

    // The smallest and largest rowid; false when the table is empty or the query failed.
    bool RowidRange(std::int64_t& first, std::int64_t& last, bool& failed) {
        // Two single-aggregate subqueries: SQLite answers each from the B-tree's edge.
        sqlite::Statement range =
            db_.Prepare("SELECT (SELECT min(rowid) FROM track), (SELECT max(rowid) FROM track)");
        failed = !range || range.Step() != SQLITE_ROW;
        if (failed || range.ColumnType(0) != SQLITE_INTEGER ||
            range.ColumnType(1) != SQLITE_INTEGER)
            return false;
        first = range.ColumnInt64(0);
        last = range.ColumnInt64(1);
        return first <= last;
    }

    // The track with this rowid, when it has a path that a playlist can hold.
    Fetch Get(std::int64_t rowid, Track& track) {
        byRowid_.Reset();
        byRowid_.Bind(1, rowid);
        const int code = byRowid_.Step();
        if (code == SQLITE_DONE)
            return Fetch::absent;
        if (code != SQLITE_ROW)
            return Fetch::failed;
        if (byRowid_.ColumnType(0) != SQLITE_TEXT || !IsWritablePath(byRowid_.ColumnText(0)))
            return Fetch::absent;
        track.path.assign(byRowid_.ColumnText(0));
        // A playlist line cannot hold a line break: control bytes and DEL become spaces.
        track.artist = util::CleanText(util::CutUtf8(byRowid_.ColumnText(1), kMaxTextBytes),
                                       util::kSingleLine);
        track.title = util::CleanText(util::CutUtf8(byRowid_.ColumnText(2), kMaxTextBytes),
                                      util::kSingleLine);
        track.seconds = SecondsOf(byRowid_, 3);
        return Fetch::found;
    }

    // Reservoir sample (algorithm R) of `count` rowids of the tracks with a writable path, reading
    // the whole table once; false when the scan failed.
    bool SampleByScan(std::size_t count, Generator& random, std::vector<std::int64_t>& sample) {
        sample.clear();
        sqlite::Statement scan = db_.Prepare("SELECT rowid, path FROM track");
        if (!scan)
            return false;
        std::uint64_t seen = 0;
        int code;
        while ((code = scan.Step()) == SQLITE_ROW) {
            if (scan.ColumnType(1) != SQLITE_TEXT || !IsWritablePath(scan.ColumnText(1)))
                continue;
            const std::int64_t rowid = scan.ColumnInt64(0);
            ++seen;
            if (sample.size() < count) {
                sample.push_back(rowid);
            } else {
                const std::uint64_t slot =
                    std::uniform_int_distribution<std::uint64_t>(0, seen - 1)(random);
                if (slot < count)
                    sample[slot] = rowid;
            }
        }
        if (code != SQLITE_DONE)
            return false;
        // The reservoir's order is biased towards the table's order; the playlist's should not be.
        std::shuffle(sample.begin(), sample.end(), random);
        return true;
    }

  private:
    sqlite::Database& db_;
    sqlite::Statement byRowid_;
};

enum class Draw { complete, tooSparse, failed };

// Draws random rowids in [first, last] until `count` distinct tracks were found, or the number of
// draws shows that the ids are too sparse for it.
Draw DrawByRowid(TrackTable& table, std::int64_t first, std::int64_t last, std::size_t count,
                 Generator& random, std::vector<Track>& tracks) {
    std::uniform_int_distribution<std::int64_t> pick(first, last);
    std::unordered_set<std::int64_t> drawn;
    const std::uint64_t maxDraws = kDrawsPerTrack * count + 64;
    Track track;
    for (std::uint64_t draws = 0; draws < maxDraws && tracks.size() < count; ++draws) {
        const std::int64_t rowid = pick(random);
        if (!drawn.insert(rowid).second)
            continue;
        const Fetch fetched = table.Get(rowid, track);
        if (fetched == Fetch::failed)
            return Draw::failed;
        if (fetched == Fetch::found)
            tracks.push_back(std::move(track));
    }
    return tracks.size() == count ? Draw::complete : Draw::tooSparse;
}

bool DrawByScan(TrackTable& table, std::size_t count, Generator& random,
                std::vector<Track>& tracks) {
    std::vector<std::int64_t> rowids;
    if (!table.SampleByScan(count, random, rowids))
        return false;
    tracks.clear();
    Track track;
    for (std::int64_t rowid : rowids) {
        const Fetch fetched = table.Get(rowid, track);
        if (fetched == Fetch::failed)
            return false;
        if (fetched == Fetch::found)
            tracks.push_back(std::move(track));
    }
    return true;
}

// The random tracks; false when the database could not be read (an empty result is not a failure).
bool DrawTracks(sqlite::Database& db, std::size_t count, std::vector<Track>& tracks) {
    TrackTable table(db);
    if (!table)
        return false;
    std::int64_t first = 0;
    std::int64_t last = 0;
    bool failed = false;
    if (!table.RowidRange(first, last, failed))
        return !failed;

    Generator random = SeededGenerator();
    // Unsigned arithmetic: the span of the widest rowid range wraps to 0, read as "huge".
    const std::uint64_t span =
        static_cast<std::uint64_t>(last) - static_cast<std::uint64_t>(first) + 1;
    const bool small = span != 0 && (span <= kSmallSpan || span / 4 <= count);
    if (!small) {
        const Draw drawn = DrawByRowid(table, first, last, count, random, tracks);
        if (drawn != Draw::tooSparse)
            return drawn == Draw::complete;
    }
    return DrawByScan(table, count, random, tracks);
}

std::string M3uText(const std::vector<Track>& tracks) {
    std::string text = "#EXTM3U\n";
    for (const Track& track : tracks) {
        text += "#EXTINF:";
        text += std::to_string(track.seconds);
        text += ',';
        text += track.artist;
        text += " - ";
        text += track.title;
        text += '\n';
        text += track.path;
        text += '\n';
    }
    return text;
}

// The name of the user `uid`, or "?" when the system does not know it.
std::string UserNameOf(uid_t uid) {
    passwd entry{};
    passwd* found = nullptr;
    char buffer[1024];
    if (getpwuid_r(uid, &entry, buffer, sizeof buffer, &found) == 0 && found != nullptr)
        return found->pw_name;
    return "?";
}

// A file (or link) at `path` that another user owns is not ours to replace: in the shared,
// sticky temporary folder the rename would be refused anyway, and taking over another user's file
// elsewhere is never wanted. Whether it was planted or left by mistake, the administrator learns
// here whose it is, so that he can remove it. True when `base` is absent or ours.
bool MayReplace(int dirFd, const std::string& path, const std::string& base) {
    struct stat st {};
    if (fstatat(dirFd, base.c_str(), &st, AT_SYMLINK_NOFOLLOW) != 0 || st.st_uid == geteuid())
        return true;
    syslog(LOG_ERR, "random playlist: cannot replace %s: it belongs to user %s (uid %u)",
           path.c_str(), UserNameOf(st.st_uid).c_str(), static_cast<unsigned>(st.st_uid));
    return false;
}

// Writes `text` to a new file in the folder of `path` and renames it over `path`. Both names are
// taken relative to one open descriptor of that folder, so nothing lands anywhere else.
bool ReplaceFile(const char* path, const std::string& text) {
    const std::string full(path);
    const std::size_t slash = full.rfind('/');
    const std::string folder =
        slash == std::string::npos ? "." : (slash == 0 ? "/" : full.substr(0, slash));
    const std::string base = slash == std::string::npos ? full : full.substr(slash + 1);
    if (base.empty() || base == "." || base == "..")
        return false;

    FileDescriptor dir(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (dir.Get() < 0 || !MayReplace(dir.Get(), full, base))
        return false;
    // The temporary file's name is one no random playlist can have (those begin with "==").
    const std::string temporaryPrefix = ".tmp-" + base + "-";
    if (io::ReplaceFileAt(dir.Get(), base.c_str(), text, temporaryPrefix) == io::ReplaceOutcome::ok)
        return true;
    // Another user's file put there since the test above: say whose, as above.
    if (errno == EPERM || errno == EACCES)
        MayReplace(dir.Get(), full, base);
    return false;
}

}  // namespace

int CreateRandomPlaylist(const char* databasePath, const char* path, int count) {
    if (path == nullptr || count < 1)
        return 0;
    medialib::LibraryOpenResult opened = medialib::OpenLibrary(databasePath);
    if (opened.status != medialib::LibraryStatus::ok)
        return 0;
    std::vector<Track> tracks;
    if (!DrawTracks(opened.db, static_cast<std::size_t>(count), tracks) || tracks.empty())
        return 0;
    return ReplaceFile(path, M3uText(tracks)) ? 1 : 0;
}

}  // namespace harmona::playlist

int AudioFile::PlaylistRandomCreate(const char* path, int count) {
    return harmona::playlist::CreateRandomPlaylist(harmona::paths::kLibraryDb, path, count);
}
