#include "services/harmona-mediad/LibraryReader.h"

#include <sys/stat.h>

#include <algorithm>
#include <unordered_map>

#include "common/util/Utf8.h"
#include "platform/lib/sqlite/Database.h"
#include "platform/medialib/LibrarySchema.h"
#include "platform/medialib/MediaFiles.h"

namespace harmona::mediad {

using sqlite::Database;
using sqlite::Statement;

namespace {

constexpr int kBusyTimeoutMs = 5000;
// Values written before tags were cut when indexed are cut here too: no reply carries more.
constexpr std::size_t kMaxValueBytes = 1024;

TextRef Add(std::string& text, std::string_view value) {
    const TextRef ref{static_cast<uint32_t>(text.size()), static_cast<uint32_t>(value.size())};
    text += value;
    return ref;
}

TextRef Cut(std::string& text, std::string_view value) {
    return Add(text, util::CutUtf8(value, kMaxValueBytes));
}

// Artists, albums and genres repeat over many tracks: each distinct value (as cut) is kept once in
// the text, the rows refer to it.
class SharedValues {
  public:
    explicit SharedValues(std::string& text) : text_(text) {}
    TextRef Cut(std::string_view value) {
        const std::string_view cut = util::CutUtf8(value, kMaxValueBytes);
        if (cut.empty())
            return {};
        const auto found = refs_.find(std::string(cut));
        if (found != refs_.end())
            return found->second;
        const TextRef ref = Add(text_, cut);
        refs_.emplace(std::string(cut), ref);
        return ref;
    }

  private:
    std::string& text_;
    std::unordered_map<std::string, TextRef> refs_;
};

bool HasColumn(Database& db, const char* column) {
    Statement stmt = db.Prepare("PRAGMA table_info(track)");
    while (stmt && stmt.Step() == SQLITE_ROW) {
        if (stmt.ColumnText(1) == column)
            return true;
    }
    return false;
}

// Calls `visit` with every row's index and path in the order of the paths, as library.db's path
// index gives them: no path is kept.
bool VisitPathsInOrder(Database& db, const std::vector<LibraryRow>& rows,
                       const PathVisitor& visit) {
    Statement stmt = db.Prepare("SELECT id, path FROM track ORDER BY path");
    if (!stmt)
        return false;
    int step;
    while ((step = stmt.Step()) == SQLITE_ROW) {
        const int64_t id = stmt.ColumnInt64(0);
        const auto row = std::lower_bound(rows.begin(), rows.end(), id,
                                          [](const LibraryRow& r, int64_t x) { return r.id < x; });
        if (row != rows.end() && row->id == id)
            visit(static_cast<uint32_t>(row - rows.begin()), stmt.ColumnText(1));
    }
    return step == SQLITE_DONE;
}

}  // namespace

TrackArt ArtOfImagePath(std::string_view path) {
    return medialib::LowerExtension(std::string(path)) == "png" ? TrackArt::png : TrackArt::jpg;
}

bool ReadLibraryRows(const std::string& dbPath, LibraryRows& out, const PathVisitor& inPathOrder) {
    struct stat st {};
    if (stat(dbPath.c_str(), &st) != 0)
        return true;  // not indexed yet: an empty library
    Database db = Database::OpenReadOnly(dbPath.c_str(), kBusyTimeoutMs);
    if (!db || db.Execute("BEGIN") != SQLITE_OK)
        return false;
    const int64_t count = medialib::LibraryUpdateCount(db);
    // Without the indexer's count (an index written by hand), the file's time stands in.
    out.updateId = count >= 0 ? static_cast<uint32_t>(count & 0x7fffffff)
                              : static_cast<uint32_t>(st.st_mtime) & 0x7fffffffU;
    const std::string extra = std::string(HasColumn(db, "size") ? "size" : "NULL") + ", " +
                              (HasColumn(db, "art_path") ? "art_path" : "NULL");
    // The rows are counted first: a vector grown row by row holds its old block and one twice
    // as large at once while it moves them, the peak of a load. The text takes at most all of
    // their values; what the shared ones leave unused is never touched, so never resident.
    Statement rowCount = db.Prepare(
        "SELECT COUNT(*), SUM(LENGTH(CAST(title AS BLOB)) + "
        "LENGTH(CAST(artist AS BLOB)) + LENGTH(CAST(album AS BLOB)) + "
        "LENGTH(CAST(album_artist AS BLOB)) + LENGTH(CAST(genre AS BLOB))) FROM track");
    if (!rowCount || rowCount.Step() != SQLITE_ROW)
        return false;
    out.rows.reserve(static_cast<std::size_t>(std::max<int64_t>(0, rowCount.ColumnInt64(0))));
    out.text.reserve(static_cast<std::size_t>(std::max<int64_t>(0, rowCount.ColumnInt64(1))));
    Statement stmt = db.Prepare(
        "SELECT id, path, title, artist, album, album_artist, genre, year, track_no, disc_no, "
        "duration_ms, added, " +
        extra + " FROM track ORDER BY id");
    if (!stmt)
        return false;
    std::unordered_map<std::string, uint32_t> typeOf;  // lower-case extension -> type
    SharedValues shared(out.text);
    int step;
    while ((step = stmt.Step()) == SQLITE_ROW) {
        LibraryRow row;
        row.id = stmt.ColumnInt64(0);
        const std::string_view path = stmt.ColumnText(1);
        const std::string extension = medialib::LowerExtension(std::string(path));
        auto type = typeOf.find(extension);
        if (type == typeOf.end()) {
            out.typePaths.emplace_back(path);
            type = typeOf.emplace(extension, static_cast<uint32_t>(out.typePaths.size() - 1)).first;
        }
        row.fileType = type->second;
        row.title = Cut(out.text, stmt.ColumnText(2));
        row.artist = shared.Cut(stmt.ColumnText(3));
        row.album = shared.Cut(stmt.ColumnText(4));
        row.albumArtist = shared.Cut(stmt.ColumnText(5));
        row.genre = shared.Cut(stmt.ColumnText(6));
        row.year = stmt.ColumnInt64(7);
        row.trackNo = stmt.ColumnInt64(8);
        row.discNo = stmt.ColumnInt64(9);
        row.durationMs = stmt.ColumnInt64(10);
        row.added = stmt.ColumnInt64(11);
        row.size = stmt.ColumnType(12) == SQLITE_NULL ? -1 : stmt.ColumnInt64(12);
        const std::string_view artPath = stmt.ColumnText(13);
        if (!artPath.empty())
            row.art = ArtOfImagePath(artPath);
        out.rows.push_back(row);
    }
    // The rows are in the order of their ids: the paths' rows are found by id.
    return step == SQLITE_DONE && VisitPathsInOrder(db, out.rows, inPathOrder) &&
           db.Execute("COMMIT") == SQLITE_OK;
}

}  // namespace harmona::mediad
