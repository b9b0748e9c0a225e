#include "services/harmona-index/Indexer.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdio>
#include <ctime>
#include <functional>
#include <iterator>
#include <map>
#include <unordered_map>
#include <vector>

#include "common/io/DirectoryReader.h"
#include "platform/lib/sqlite/Database.h"
#include "platform/medialib/LibrarySchema.h"
#include "platform/medialib/MediaFiles.h"
#include "services/harmona-index/TagReader.h"

namespace harmona::index {
namespace {

using sqlite::Database;
using sqlite::Statement;

constexpr int kMaxFolderDepth = 64;
constexpr int kBusyTimeoutMs = 10000;

struct FoundFile {
    std::string path;
    int64_t mtime = 0;
    int64_t size = 0;
    std::string artPath;    // the folder's cover image, "" when it has none
    FileIdentity identity;  // the regular file the walk saw at `path`
};

struct KnownRow {
    int64_t mtime = 0;
    int64_t size = -1;  // -1: not recorded yet (a database of an older indexer)
    std::string artPath;
    bool seen = false;
};

void MakeParentDirs(const std::string& file) {
    for (std::size_t i = 1; i < file.size(); ++i) {
        if (file[i] == '/')
            mkdir(file.substr(0, i).c_str(), 0755);
    }
}

// Cover image names players and taggers write beside the tracks, best first; any letter case,
// extension .jpg, .jpeg or .png.
constexpr const char* kCoverNames[] = {"cover", "folder", "front", "albumart", "album"};
constexpr int kNoCover = 1000;

// The rank of `name` as a cover image (lower is better), kNoCover when it is none.
int CoverRank(const std::string& name) {
    const std::string extension = medialib::LowerExtension(name);
    if (extension != "jpg" && extension != "jpeg" && extension != "png")
        return kNoCover;
    std::string stem = name.substr(0, name.size() - extension.size() - 1);
    for (char& c : stem)
        c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    for (std::size_t i = 0; i < std::size(kCoverNames); ++i) {
        if (stem == kCoverNames[i])
            return static_cast<int>(i) * 2 + (extension == "png" ? 1 : 0);
    }
    return kNoCover;
}

// Depth-first walk that never follows a symbolic link and skips hidden names (".", "..",
// ".Trash", the "@eaDir"-style system folders start with "@" and are skipped too). Each audio
// file carries the cover image of its folder, if there is one.
void WalkFolder(io::FileDescriptor folder, const std::string& path, int depth,
                std::vector<FoundFile>& found) {
    io::DirectoryReader dir(std::move(folder));
    if (!dir)
        return;
    std::vector<FoundFile> here;
    std::string cover;
    int coverRank = kNoCover;
    while (const dirent* entry = dir.Next()) {
        const char* name = entry->d_name;
        if (name[0] == '.' || name[0] == '@')
            continue;
        struct stat st {};
        if (fstatat(dir.Fd(), name, &st, AT_SYMLINK_NOFOLLOW) != 0)
            continue;
        const std::string child = path + "/" + name;
        if (S_ISDIR(st.st_mode) && depth < kMaxFolderDepth) {
            io::FileDescriptor childFd(
                openat(dir.Fd(), name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
            if (childFd)
                WalkFolder(std::move(childFd), child, depth + 1, found);
        } else if (S_ISREG(st.st_mode) && medialib::IsIndexableAudioFile(child)) {
            here.push_back({child,
                            static_cast<int64_t>(st.st_mtime),
                            static_cast<int64_t>(st.st_size),
                            {},
                            {st.st_dev, st.st_ino}});
        } else if (S_ISREG(st.st_mode)) {
            const int rank = CoverRank(name);
            if (rank < coverRank || (rank == coverRank && rank < kNoCover && child < cover)) {
                coverRank = rank;
                cover = child;
            }
        }
    }
    for (FoundFile& file : here) {
        file.artPath = cover;
        found.push_back(std::move(file));
    }
}

std::unordered_map<std::string, KnownRow> LoadKnownRows(Database& db) {
    std::unordered_map<std::string, KnownRow> known;
    Statement stmt = db.Prepare("SELECT path, mtime, size, art_path FROM track");
    while (stmt && stmt.Step() == SQLITE_ROW) {
        const int64_t size = stmt.ColumnType(2) == SQLITE_NULL ? -1 : stmt.ColumnInt64(2);
        known[std::string(stmt.ColumnText(0))] =
            KnownRow{stmt.ColumnInt64(1), size, std::string(stmt.ColumnText(3)), false};
    }
    return known;
}

void BindOptionalText(Statement& stmt, int index, const std::string& text) {
    if (text.empty())
        stmt.BindNull(index);
    else
        stmt.Bind(index, text);
}

void BindOptionalNumber(Statement& stmt, int index, int64_t value) {
    if (value <= 0)
        stmt.BindNull(index);
    else
        stmt.Bind(index, value);
}

// Every write transaction also moves the library's update count, so that a reader never sees
// changed rows under the update count of before (the media server's SystemUpdateID).
bool CommitWithUpdate(Database& db) {
    if (!medialib::BumpLibraryUpdateCount(db)) {
        db.Execute("ROLLBACK");
        return false;
    }
    return db.Execute("COMMIT") == SQLITE_OK;
}

// Reads the batch's tags (outside any transaction: the slow part), then writes the batch in one.
bool WriteBatch(Database& db, Statement& upsert, const std::vector<const FoundFile*>& batch,
                IndexReport& report) {
    std::vector<TrackTags> tags;
    tags.reserve(batch.size());
    std::vector<bool> swapped(batch.size(), false);
    for (std::size_t i = 0; i < batch.size(); ++i) {
        const FoundFile* file = batch[i];
        bool changed = false;
        tags.push_back(ReadTrackTagsOf(file->path, file->identity, changed));
        ++report.tagReads;
        if (changed) {
            // Replaced (by a link, say) since the walk saw it: not indexed in this pass; the
            // next one sees what is there then.
            swapped[i] = true;
            syslog(LOG_WARNING, "file replaced while indexed, left for the next pass: %s",
                   file->path.c_str());
        } else if (tags.back().broken) {
            ++report.brokenTags;
            syslog(LOG_WARNING, "unreadable tags, indexed by file name: %s", file->path.c_str());
        }
    }
    const int64_t now = static_cast<int64_t>(std::time(nullptr));
    if (!(db.Execute("BEGIN IMMEDIATE") == SQLITE_OK))
        return false;
    for (std::size_t i = 0; i < batch.size(); ++i) {
        if (swapped[i])
            continue;
        const TrackTags& t = tags[i];
        upsert.Reset();
        upsert.Bind(1, batch[i]->path);
        upsert.Bind(2, t.title);
        BindOptionalText(upsert, 3, t.artist);
        BindOptionalText(upsert, 4, t.album);
        BindOptionalText(upsert, 5, t.albumArtist);
        BindOptionalText(upsert, 6, t.genre);
        BindOptionalNumber(upsert, 7, t.year);
        BindOptionalNumber(upsert, 8, t.trackNo);
        BindOptionalNumber(upsert, 9, t.discNo);
        BindOptionalNumber(upsert, 10, t.durationMs);
        upsert.Bind(11, batch[i]->mtime);
        upsert.Bind(12, now);
        upsert.Bind(13, batch[i]->size);
        BindOptionalText(upsert, 14, batch[i]->artPath);
        if (upsert.Step() != SQLITE_DONE) {
            db.Execute("ROLLBACK");
            return false;
        }
    }
    return CommitWithUpdate(db);
}

// Runs `writeRow(i)` for the rows 0 to `count` - 1 in write transactions of kIndexBatchSize rows,
// each committed with the update count. A failing row rolls its transaction back and ends the run.
bool WriteRowsInBatches(Database& db, std::size_t count,
                        const std::function<bool(std::size_t)>& writeRow) {
    for (std::size_t start = 0; start < count; start += kIndexBatchSize) {
        if (!(db.Execute("BEGIN IMMEDIATE") == SQLITE_OK))
            return false;
        for (std::size_t i = start; i < count && i < start + kIndexBatchSize; ++i) {
            if (!writeRow(i)) {
                db.Execute("ROLLBACK");
                return false;
            }
        }
        if (!CommitWithUpdate(db))
            return false;
    }
    return true;
}

// Rows whose file is unchanged but whose size was not recorded yet or whose folder's cover image
// changed: updated without reading a tag.
bool RefreshRows(Database& db, const std::vector<const FoundFile*>& files) {
    Statement refresh = db.Prepare("UPDATE track SET size = ?1, art_path = ?2 WHERE path = ?3");
    if (!refresh)
        return false;
    return WriteRowsInBatches(db, files.size(), [&](std::size_t i) {
        refresh.Reset();
        refresh.Bind(1, files[i]->size);
        BindOptionalText(refresh, 2, files[i]->artPath);
        refresh.Bind(3, files[i]->path);
        return refresh.Step() == SQLITE_DONE;
    });
}

// Rows whose file was renamed or moved: the new path and folder cover, the same id and tags.
bool MoveRows(Database& db, const std::vector<std::pair<std::string, const FoundFile*>>& moved) {
    Statement move = db.Prepare("UPDATE track SET path = ?1, art_path = ?2 WHERE path = ?3");
    if (!move)
        return false;
    return WriteRowsInBatches(db, moved.size(), [&](std::size_t i) {
        move.Reset();
        move.Bind(1, moved[i].second->path);
        BindOptionalText(move, 2, moved[i].second->artPath);
        move.Bind(3, moved[i].first);
        return move.Step() == SQLITE_DONE;
    });
}

bool RemoveRows(Database& db, const std::vector<std::string>& gone) {
    Statement remove = db.Prepare("DELETE FROM track WHERE path = ?1");
    if (!remove)
        return false;
    return WriteRowsInBatches(db, gone.size(), [&](std::size_t i) {
        remove.Reset();
        remove.Bind(1, gone[i]);
        return remove.Step() == SQLITE_DONE;
    });
}

IndexReport Fail(IndexReport report, const std::string& why) {
    report.ok = false;
    report.error = why;
    return report;
}

}  // namespace

IndexReport IndexShare(const std::string& share, const std::string& dbPath,
                       const std::atomic<bool>* stop) {
    const auto stopped = [stop] { return stop != nullptr && stop->load(); };
    IndexReport report;
    io::FileDescriptor shareFd(open(share.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!shareFd)
        return Fail(report, "the audio share " + share + " is not a readable folder");

    MakeParentDirs(dbPath);
    Database db =
        Database::Open(dbPath.c_str(), SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, kBusyTimeoutMs);
    if (!db) {
        return Fail(report, "cannot open " + dbPath + ": " + db.Error());
    }
    if (!medialib::EnsureLibrarySchema(db)) {
        return Fail(report, "cannot create the schema of " + dbPath + ": " + db.Error());
    }

    std::vector<FoundFile> found;
    WalkFolder(std::move(shareFd), share, 0, found);
    report.filesSeen = found.size();

    std::unordered_map<std::string, KnownRow> known = LoadKnownRows(db);
    std::vector<const FoundFile*> toRead;
    std::vector<const FoundFile*> toRefresh;
    std::vector<const FoundFile*> newFiles;
    for (const FoundFile& file : found) {
        auto row = known.find(file.path);
        if (row == known.end()) {
            newFiles.push_back(&file);
            continue;
        }
        row->second.seen = true;
        const KnownRow& stored = row->second;
        if (stored.mtime != file.mtime || (stored.size >= 0 && stored.size != file.size)) {
            toRead.push_back(&file);
            ++report.updated;
        } else if (stored.size < 0 || stored.artPath != file.artPath) {
            toRefresh.push_back(&file);
        }
    }

    // Renamed files and folders keep their rows (and ids, which queues, bookmarks and playlists
    // hold): a file new to the library whose size and mtime match those of exactly one row whose
    // file is gone, and no other new file's, is that row's file moved (a rename changes neither).
    std::map<std::pair<int64_t, int64_t>, std::vector<std::string>> goneByStamp;
    for (const auto& [path, row] : known) {
        if (!row.seen && row.size >= 0)
            goneByStamp[{row.mtime, row.size}].push_back(path);
    }
    std::map<std::pair<int64_t, int64_t>, int> newByStamp;
    for (const FoundFile* file : newFiles)
        ++newByStamp[{file->mtime, file->size}];
    std::vector<std::pair<std::string, const FoundFile*>> moved;
    for (const FoundFile* file : newFiles) {
        const std::pair<int64_t, int64_t> stamp{file->mtime, file->size};
        const auto candidates = goneByStamp.find(stamp);
        if (candidates != goneByStamp.end() && candidates->second.size() == 1 &&
            newByStamp[stamp] == 1) {
            known[candidates->second.front()].seen = true;
            moved.emplace_back(candidates->second.front(), file);
            continue;
        }
        toRead.push_back(file);
        ++report.added;
    }
    report.moved = moved.size();
    if (!MoveRows(db, moved))
        return Fail(report, "cannot record moved tracks: " + db.Error());

    // A re-read keeps the row's id and its "added" (the first time the file was seen).
    Statement upsert = db.Prepare(
        "INSERT INTO track (path, title, artist, album, album_artist, genre, year, track_no, "
        "disc_no, duration_ms, mtime, added, size, art_path) VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7, "
        "?8, ?9, ?10, ?11, ?12, ?13, ?14) ON CONFLICT(path) DO UPDATE SET title = excluded.title, "
        "artist = "
        "excluded.artist, album = excluded.album, album_artist = excluded.album_artist, genre = "
        "excluded.genre, year = excluded.year, track_no = excluded.track_no, disc_no = "
        "excluded.disc_no, duration_ms = excluded.duration_ms, mtime = excluded.mtime, size = "
        "excluded.size, art_path = excluded.art_path");
    if (!upsert)
        return Fail(report, "cannot prepare the track update: " + db.Error());
    for (std::size_t start = 0; start < toRead.size(); start += kIndexBatchSize) {
        if (stopped())
            return Fail(report, "stopped");
        const std::size_t end = std::min(toRead.size(), start + kIndexBatchSize);
        const std::vector<const FoundFile*> batch(toRead.begin() + start, toRead.begin() + end);
        if (!WriteBatch(db, upsert, batch, report))
            return Fail(report, "cannot write tracks: " + db.Error());
    }

    if (stopped())
        return Fail(report, "stopped");
    std::vector<std::string> gone;
    for (const auto& [path, row] : known) {
        if (!row.seen)
            gone.push_back(path);
    }
    report.removed = gone.size();
    if (!RemoveRows(db, gone))
        return Fail(report, "cannot remove tracks: " + db.Error());
    if (!RefreshRows(db, toRefresh))
        return Fail(report, "cannot update tracks: " + db.Error());
    // A first run over an empty share still gives the library an update count.
    if (medialib::LibraryUpdateCount(db) < 0 && !medialib::BumpLibraryUpdateCount(db))
        return Fail(report, "cannot record the library update: " + db.Error());
    report.ok = true;
    return report;
}

std::string FormatReport(const IndexReport& report) {
    char line[256];
    std::snprintf(line, sizeof(line),
                  "files=%zu added=%zu updated=%zu removed=%zu moved=%zu tagreads=%zu broken=%zu",
                  report.filesSeen, report.added, report.updated, report.removed, report.moved,
                  report.tagReads, report.brokenTags);
    return line;
}

}  // namespace harmona::index
