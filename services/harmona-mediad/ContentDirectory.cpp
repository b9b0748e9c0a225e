#include "ContentDirectory.h"

#include <sys/stat.h>

#include <algorithm>
#include <map>
#include <set>
#include <vector>

#include "DidlWriter.h"
#include "MediaFiles.h"
#include "ObjectIds.h"
#include "sqlite/Database.h"

namespace harmona::mediad {
namespace {

using sqlite::Database;
using sqlite::Statement;

constexpr int kBusyTimeoutMs = 5000;
constexpr int64_t kRandomCount = 100;
constexpr int64_t kLatestAlbumCount = 50;

// The album artist that groups albums: the album artist tag, else the track artist.
constexpr const char* kAlbumArtistSql =
    "COALESCE(NULLIF(album_artist, ''), NULLIF(artist, ''), '')";
constexpr const char* kTrackColumns =
    "id, path, title, artist, album, genre, track_no, duration_ms";

constexpr const char* kFolderClass = "object.container.storageFolder";
constexpr const char* kAlbumClass = "object.container.album.musicAlbum";
constexpr const char* kArtistClass = "object.container.person.musicArtist";
constexpr const char* kGenreClass = "object.container.genre.musicGenre";

struct Category {
    const char* id;
    const char* title;
};
constexpr Category kCategories[] = {
    {kAllMusicId, "All Music"},         {kFoldersId, "Folders"}, {kAlbumsId, "Albums"},
    {kAlbumArtistsId, "Album Artists"}, {kGenresId, "Genres"},   {kRandomId, "Random 100"},
    {kLatestAlbumsId, "Latest Albums"},
};

enum class SortOrder { Default, TitleAscending, TitleDescending };

bool ParseSortCriteria(const std::string& criteria, SortOrder* order) {
    *order = SortOrder::Default;
    std::size_t start = 0;
    while (start < criteria.size()) {
        std::size_t end = criteria.find(',', start);
        if (end == std::string::npos)
            end = criteria.size();
        std::string field = criteria.substr(start, end - start);
        start = end + 1;
        field.erase(0, field.find_first_not_of(" \t"));
        field.erase(field.find_last_not_of(" \t") + 1);
        if (field.empty())
            continue;
        bool descending = false;
        if (field[0] == '+' || field[0] == '-') {
            descending = field[0] == '-';
            field.erase(0, 1);
        }
        if (field != "dc:title")
            return false;
        if (*order == SortOrder::Default)
            *order = descending ? SortOrder::TitleDescending : SortOrder::TitleAscending;
    }
    return true;
}

// The ORDER BY of a query whose title column is `titleSql` (keyed further by `tieSql`).
std::string OrderBy(SortOrder order, const std::string& defaultOrder, const std::string& titleSql,
                    const std::string& tieSql) {
    switch (order) {
        case SortOrder::TitleAscending:
            return " ORDER BY " + titleSql + " COLLATE NOCASE ASC, " + tieSql + " ASC";
        case SortOrder::TitleDescending:
            return " ORDER BY " + titleSql + " COLLATE NOCASE DESC, " + tieSql + " DESC";
        case SortOrder::Default:
            break;
    }
    return defaultOrder.empty() ? std::string() : " ORDER BY " + defaultOrder;
}

std::string LimitOffset(uint32_t start, uint32_t count) {
    const long long limit = count == 0 ? -1 : static_cast<long long>(count);
    return " LIMIT " + std::to_string(limit) + " OFFSET " + std::to_string(start);
}

std::string LowerAscii(std::string text) {
    for (char& c : text) {
        if (c >= 'A' && c <= 'Z')
            c = static_cast<char>(c - 'A' + 'a');
    }
    return text;
}

class Library {
  public:
    Library(const std::string& dbPath, const std::string& share, const std::string& mediaBase)
        : share_(share), mediaBase_(mediaBase) {
        struct stat st {};
        // A missing database is an empty library, not an error: the indexer has not run yet.
        if (stat(dbPath.c_str(), &st) == 0) {
            db_ = Database::OpenReadOnly(dbPath.c_str(), kBusyTimeoutMs);
            opened_ = static_cast<bool>(db_);
        } else
            opened_ = true;
    }
    bool ok() const { return opened_; }

    int64_t Count(const std::string& sql, const std::vector<std::string>& binds) {
        Statement stmt = Prepare(sql, binds);
        return stmt && stmt.Step() == SQLITE_ROW ? stmt.ColumnInt64(0) : 0;
    }

    DidlObject TrackObject(const Statement& row, const std::string& parentId) const {
        DidlObject item;
        item.id = TrackId(row.ColumnInt64(0));
        item.parentId = parentId;
        const std::string path = std::string(row.ColumnText(1));
        item.title = std::string(row.ColumnText(2));
        item.artist = std::string(row.ColumnText(3));
        item.album = std::string(row.ColumnText(4));
        item.genre = std::string(row.ColumnText(5));
        item.trackNo = row.ColumnInt64(6);
        item.durationMs = row.ColumnInt64(7);
        item.upnpClass = kMusicTrackClass;
        item.mimeType = medialib::MimeTypeOfPath(path);
        const std::string extension = medialib::LowerExtension(path);
        item.resUrl = mediaBase_ + std::to_string(row.ColumnInt64(0));
        if (!extension.empty() && extension.size() <= 5 &&
            extension.find_first_not_of("abcdefghijklmnopqrstuvwxyz0123456789") ==
                std::string::npos)
            item.resUrl += "." + extension;
        return item;
    }

    std::vector<DidlObject> Tracks(const std::string& sql, const std::vector<std::string>& binds,
                                   const std::string& parentId) {
        std::vector<DidlObject> items;
        Statement stmt = Prepare(sql, binds);
        while (stmt && stmt.Step() == SQLITE_ROW)
            items.push_back(TrackObject(stmt, parentId));
        return items;
    }

    // Rows of (name, album artist or "", child count) turned into containers by `make`.
    template <typename Make>
    std::vector<DidlObject> Groups(const std::string& sql, const std::vector<std::string>& binds,
                                   Make make) {
        std::vector<DidlObject> containers;
        Statement stmt = Prepare(sql, binds);
        while (stmt && stmt.Step() == SQLITE_ROW)
            containers.push_back(make(stmt));
        return containers;
    }

    Statement Prepare(const std::string& sql, const std::vector<std::string>& binds) {
        if (!db_)
            return Statement();
        Statement stmt = db_.Prepare(sql.c_str());
        for (std::size_t i = 0; stmt && i < binds.size(); ++i)
            stmt.Bind(static_cast<int>(i + 1), binds[i]);
        return stmt;
    }

    const std::string& share() const { return share_; }

  private:
    Database db_;
    bool opened_ = false;
    std::string share_;
    std::string mediaBase_;
};

// --- The containers' children ---------------------------------------------------------------

struct Page {
    std::vector<DidlObject> objects;
    int64_t total = 0;
};

DidlObject MakeContainer(const std::string& id, const std::string& parentId,
                         const std::string& title, const char* upnpClass, int64_t childCount,
                         const std::string& artist = "") {
    DidlObject container;
    container.container = true;
    container.id = id;
    container.parentId = parentId;
    container.title = title;
    container.upnpClass = upnpClass;
    container.childCount = childCount;
    container.artist = artist;
    return container;
}

std::string WhereClause(const std::string& where) {
    return where.empty() ? std::string() : " WHERE " + where;
}

Page TrackPage(Library& lib, const std::string& where, const std::vector<std::string>& binds,
               const std::string& defaultOrder, const std::string& parentId, SortOrder order,
               uint32_t start, uint32_t count) {
    Page page;
    page.total = lib.Count("SELECT COUNT(*) FROM track" + WhereClause(where), binds);
    page.objects =
        lib.Tracks(std::string("SELECT ") + kTrackColumns + " FROM track" + WhereClause(where) +
                       OrderBy(order, defaultOrder, "title", "id") + LimitOffset(start, count),
                   binds, parentId);
    return page;
}

Page RandomPage(Library& lib, SortOrder order, uint32_t start, uint32_t count) {
    Page page = TrackPage(lib, "id IN (SELECT id FROM track ORDER BY random() LIMIT 100)", {},
                          "random()", kRandomId, order, start, count);
    page.total = std::min<int64_t>(page.total, kRandomCount);
    return page;
}

// Albums are grouped by (album, album artist); tracks without an album belong to none.
std::string AlbumSource(const std::string& extraWhere) {
    return std::string("(SELECT album, ") + kAlbumArtistSql +
           " AS aa, added FROM track WHERE album <> ''" + extraWhere + ")";
}

std::vector<DidlObject> AlbumRows(Library& lib, const std::string& sql,
                                  const std::vector<std::string>& binds,
                                  const std::string& parentId) {
    return lib.Groups(sql, binds, [&](const Statement& row) {
        const std::string album = std::string(row.ColumnText(0));
        const std::string albumArtist = std::string(row.ColumnText(1));
        return MakeContainer(AlbumId(albumArtist, album), parentId, album, kAlbumClass,
                             row.ColumnInt64(2), albumArtist);
    });
}

Page AlbumPage(Library& lib, const std::string& extraWhere, const std::vector<std::string>& binds,
               const std::string& parentId, SortOrder order, uint32_t start, uint32_t count) {
    const std::string source = AlbumSource(extraWhere);
    Page page;
    page.total =
        lib.Count("SELECT COUNT(*) FROM (SELECT 1 FROM " + source + " GROUP BY album, aa)", binds);
    page.objects = AlbumRows(lib,
                             "SELECT album, aa, COUNT(*) FROM " + source + " GROUP BY album, aa" +
                                 OrderBy(order, "album COLLATE NOCASE, aa", "album", "aa") +
                                 LimitOffset(start, count),
                             binds, parentId);
    return page;
}

Page LatestAlbumPage(Library& lib, SortOrder order, uint32_t start, uint32_t count) {
    const std::string source = AlbumSource("");
    const std::string latest =
        "SELECT album, aa, COUNT(*) AS n, MAX(added) AS latest FROM " + source +
        " GROUP BY album, aa ORDER BY latest DESC, album COLLATE NOCASE, aa LIMIT " +
        std::to_string(kLatestAlbumCount);
    Page page;
    page.total = lib.Count("SELECT COUNT(*) FROM (" + latest + ")", {});
    page.objects =
        AlbumRows(lib,
                  "SELECT album, aa, n FROM (" + latest + ")" +
                      OrderBy(order, "latest DESC, album COLLATE NOCASE, aa", "album", "aa") +
                      LimitOffset(start, count),
                  {}, kLatestAlbumsId);
    return page;
}

Page ArtistPage(Library& lib, SortOrder order, uint32_t start, uint32_t count) {
    const std::string source = std::string("(SELECT ") + kAlbumArtistSql +
                               " AS aa, album FROM track WHERE album <> '') WHERE aa <> ''";
    Page page;
    page.total = lib.Count("SELECT COUNT(DISTINCT aa) FROM " + source, {});
    page.objects = lib.Groups(
        "SELECT aa, COUNT(DISTINCT album) FROM " + source + " GROUP BY aa" +
            OrderBy(order, "aa COLLATE NOCASE, aa", "aa", "aa") + LimitOffset(start, count),
        {}, [](const Statement& row) {
            return MakeContainer(ArtistId(std::string(row.ColumnText(0))), kAlbumArtistsId,
                                 std::string(row.ColumnText(0)), kArtistClass, row.ColumnInt64(1));
        });
    return page;
}

Page GenrePage(Library& lib, SortOrder order, uint32_t start, uint32_t count) {
    Page page;
    page.total = lib.Count("SELECT COUNT(DISTINCT genre) FROM track WHERE genre <> ''", {});
    page.objects = lib.Groups("SELECT genre, COUNT(*) FROM track WHERE genre <> '' GROUP BY genre" +
                                  OrderBy(order, "genre COLLATE NOCASE, genre", "genre", "genre") +
                                  LimitOffset(start, count),
                              {}, [](const Statement& row) {
                                  return MakeContainer(GenreId(std::string(row.ColumnText(0))),
                                                       kGenresId, std::string(row.ColumnText(0)),
                                                       kGenreClass, row.ColumnInt64(1));
                              });
    return page;
}

void SortAndSlice(Page& page, SortOrder order, uint32_t start, uint32_t count) {
    if (order != SortOrder::Default) {
        std::vector<std::pair<std::string, std::size_t>> keys;
        for (std::size_t i = 0; i < page.objects.size(); ++i)
            keys.emplace_back(LowerAscii(page.objects[i].title), i);
        std::stable_sort(keys.begin(), keys.end(), [&](const auto& a, const auto& b) {
            return order == SortOrder::TitleAscending ? a.first < b.first : b.first < a.first;
        });
        std::vector<DidlObject> sorted;
        sorted.reserve(keys.size());
        for (const auto& key : keys)
            sorted.push_back(std::move(page.objects[key.second]));
        page.objects = std::move(sorted);
    }
    page.total = static_cast<int64_t>(page.objects.size());
    const std::size_t first = std::min<std::size_t>(start, page.objects.size());
    const std::size_t last =
        count == 0 ? page.objects.size() : std::min(page.objects.size(), first + count);
    page.objects = std::vector<DidlObject>(std::make_move_iterator(page.objects.begin() + first),
                                           std::make_move_iterator(page.objects.begin() + last));
}

// The share's folder `relative` ("" for the share itself): its subfolders (those that hold audio
// files somewhere below), then its own tracks, in path order.
Page FolderPage(Library& lib, const std::string& relative, const std::string& folderId,
                SortOrder order, uint32_t start, uint32_t count) {
    const std::string prefix = lib.share() + "/" + (relative.empty() ? "" : relative + "/");
    std::string upper = prefix;
    upper.back() = '0';  // the byte after "/": every path below the prefix sorts before it
    std::map<std::string, std::set<std::string>> subfolders;  // name -> names of its children
    Page page;
    std::vector<DidlObject> items;
    Statement stmt = lib.Prepare(std::string("SELECT ") + kTrackColumns +
                                     " FROM track WHERE path > ?1 AND path < ?2 ORDER BY path",
                                 {prefix, upper});
    while (stmt && stmt.Step() == SQLITE_ROW) {
        const std::string rest = std::string(stmt.ColumnText(1)).substr(prefix.size());
        const std::size_t slash = rest.find('/');
        if (slash == std::string::npos) {
            items.push_back(lib.TrackObject(stmt, folderId));
        } else if (slash > 0) {
            const std::string below = rest.substr(slash + 1);
            subfolders[rest.substr(0, slash)].insert(below.substr(0, below.find('/')));
        }
    }
    for (const auto& [name, children] : subfolders) {
        const std::string childPath = relative.empty() ? name : relative + "/" + name;
        page.objects.push_back(MakeContainer(FolderId(childPath), folderId, name, kFolderClass,
                                             static_cast<int64_t>(children.size())));
    }
    for (DidlObject& item : items)
        page.objects.push_back(std::move(item));
    SortAndSlice(page, order, start, count);
    return page;
}

Page CategoryPage(Library& lib, const std::string& category, SortOrder order, uint32_t start,
                  uint32_t count) {
    if (category == kAllMusicId)
        return TrackPage(lib, "", {}, "title COLLATE NOCASE, id", kAllMusicId, order, start, count);
    if (category == kFoldersId)
        return FolderPage(lib, "", kFoldersId, order, start, count);
    if (category == kAlbumsId)
        return AlbumPage(lib, "", {}, kAlbumsId, order, start, count);
    if (category == kAlbumArtistsId)
        return ArtistPage(lib, order, start, count);
    if (category == kGenresId)
        return GenrePage(lib, order, start, count);
    if (category == kRandomId)
        return RandomPage(lib, order, start, count);
    return LatestAlbumPage(lib, order, start, count);
}

Page RootPage(Library& lib, SortOrder order, uint32_t start, uint32_t count) {
    Page page;
    for (const Category& category : kCategories) {
        const int64_t children = CategoryPage(lib, category.id, SortOrder::Default, 0, 1).total;
        page.objects.push_back(
            MakeContainer(category.id, kRootId, category.title, kFolderClass, children));
    }
    SortAndSlice(page, order, start, count);
    return page;
}

Page ChildrenOf(Library& lib, const ObjectRef& ref, const std::string& id, SortOrder order,
                uint32_t start, uint32_t count) {
    switch (ref.kind) {
        case ObjectKind::Root:
            return RootPage(lib, order, start, count);
        case ObjectKind::Category:
            return CategoryPage(lib, ref.category, order, start, count);
        case ObjectKind::Folder:
            return FolderPage(lib, ref.folder, id, order, start, count);
        case ObjectKind::Album:
            return TrackPage(lib, std::string("album = ?1 AND ") + kAlbumArtistSql + " = ?2",
                             {ref.name, ref.albumArtist},
                             "disc_no, track_no, title COLLATE NOCASE, id", id, order, start,
                             count);
        case ObjectKind::Artist:
            return AlbumPage(lib, std::string(" AND ") + kAlbumArtistSql + " = ?1",
                             {ref.albumArtist}, id, order, start, count);
        case ObjectKind::Genre:
            return TrackPage(lib, "genre = ?1", {ref.name}, "title COLLATE NOCASE, id", id, order,
                             start, count);
        case ObjectKind::Track:
        case ObjectKind::Invalid:
            break;
    }
    return Page{};
}

// --- BrowseMetadata -----------------------------------------------------------------------------

bool MetadataOf(Library& lib, const ObjectRef& ref, const std::string& id, DidlObject* object) {
    if (ref.kind == ObjectKind::Track) {
        std::vector<DidlObject> tracks =
            lib.Tracks(std::string("SELECT ") + kTrackColumns + " FROM track WHERE id = ?1",
                       {std::to_string(ref.trackId)}, kAllMusicId);
        if (tracks.empty())
            return false;
        *object = std::move(tracks.front());
        return true;
    }
    const int64_t children = ChildrenOf(lib, ref, id, SortOrder::Default, 0, 1).total;
    switch (ref.kind) {
        case ObjectKind::Root:
            *object = MakeContainer(kRootId, "-1", "Music", kFolderClass, children);
            return true;
        case ObjectKind::Category:
            for (const Category& category : kCategories) {
                if (ref.category == category.id)
                    *object =
                        MakeContainer(category.id, kRootId, category.title, kFolderClass, children);
            }
            return true;
        case ObjectKind::Folder: {
            const std::size_t slash = ref.folder.rfind('/');
            const std::string parent =
                slash == std::string::npos ? kFoldersId : FolderId(ref.folder.substr(0, slash));
            const std::string name =
                slash == std::string::npos ? ref.folder : ref.folder.substr(slash + 1);
            *object = MakeContainer(id, parent, name, kFolderClass, children);
            return children > 0;
        }
        case ObjectKind::Album:
            *object =
                MakeContainer(id, kAlbumsId, ref.name, kAlbumClass, children, ref.albumArtist);
            return children > 0;
        case ObjectKind::Artist:
            *object = MakeContainer(id, kAlbumArtistsId, ref.albumArtist, kArtistClass, children);
            return children > 0;
        case ObjectKind::Genre:
            *object = MakeContainer(id, kGenresId, ref.name, kGenreClass, children);
            return children > 0;
        case ObjectKind::Track:
        case ObjectKind::Invalid:
            break;
    }
    return false;
}

BrowseResult Error(int code, const char* text) {
    BrowseResult result;
    result.error = code;
    result.errorText = text;
    return result;
}

uint32_t ClampCount(int64_t value) {
    return value < 0 ? 0 : value > 0xffffffffLL ? 0xffffffffU : static_cast<uint32_t>(value);
}

}  // namespace

ContentDirectory::ContentDirectory(std::string dbPath, std::string sharePath,
                                   std::string mediaBaseUrl)
    : dbPath_(std::move(dbPath)),
      sharePath_(std::move(sharePath)),
      mediaBaseUrl_(std::move(mediaBaseUrl)) {}

uint32_t ContentDirectory::SystemUpdateId() const {
    struct stat st {};
    if (stat(dbPath_.c_str(), &st) != 0)
        return 0;
    return static_cast<uint32_t>(st.st_mtime) & 0x7fffffffU;
}

BrowseResult ContentDirectory::Browse(const BrowseArgs& args) const {
    SortOrder order = SortOrder::Default;
    if (!ParseSortCriteria(args.sortCriteria, &order))
        return Error(kErrorUnsupportedSort, "Unsupported or invalid sort criteria");
    const ObjectRef ref = ParseObjectId(args.objectId);
    if (ref.kind == ObjectKind::Invalid)
        return Error(kErrorNoSuchObject, "No such object");
    Library lib(dbPath_, sharePath_, mediaBaseUrl_);
    if (!lib.ok())
        return Error(kErrorActionFailed, "The library database cannot be read");

    BrowseResult result;
    result.updateId = SystemUpdateId();
    if (args.metadata) {
        DidlObject object;
        if (!MetadataOf(lib, ref, args.objectId, &object))
            return Error(kErrorNoSuchObject, "No such object");
        result.didl = WriteDidl({object});
        result.numberReturned = 1;
        result.totalMatches = 1;
        return result;
    }
    if (ref.kind == ObjectKind::Track) {
        DidlObject track;
        return MetadataOf(lib, ref, args.objectId, &track)
                   ? Error(kErrorNoSuchContainer, "No such container")
                   : Error(kErrorNoSuchObject, "No such object");
    }
    Page page = ChildrenOf(lib, ref, args.objectId, order, args.startingIndex, args.requestedCount);
    const bool mayBeEmpty = ref.kind == ObjectKind::Root || ref.kind == ObjectKind::Category;
    if (page.total == 0 && !mayBeEmpty)
        return Error(kErrorNoSuchObject, "No such object");
    result.didl = WriteDidl(page.objects);
    result.numberReturned = ClampCount(static_cast<int64_t>(page.objects.size()));
    result.totalMatches = ClampCount(page.total);
    return result;
}

bool ContentDirectory::LookUpTrackFile(int64_t id, std::string* path) const {
    Library lib(dbPath_, sharePath_, mediaBaseUrl_);
    Statement stmt = lib.Prepare("SELECT path FROM track WHERE id = ?1", {std::to_string(id)});
    if (!stmt || stmt.Step() != SQLITE_ROW)
        return false;
    *path = std::string(stmt.ColumnText(0));
    return !path->empty();
}

}  // namespace harmona::mediad
