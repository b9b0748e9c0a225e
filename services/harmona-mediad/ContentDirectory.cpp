#include "services/harmona-mediad/ContentDirectory.h"

#include <fcntl.h>
#include <malloc.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <deque>
#include <vector>

#include "common/io/FileDescriptor.h"
#include "platform/lib/sqlite/Database.h"
#include "platform/medialib/MediaFiles.h"
#include "services/harmona-mediad/DidlWriter.h"
#include "services/harmona-mediad/LibraryView.h"
#include "services/harmona-mediad/ObjectIds.h"

namespace harmona::mediad {
namespace {

// A file request waits this long for an indexer that holds library.db locked.
constexpr int kLookUpBusyTimeoutMs = 3000;

enum class SortKey { title, artist, album, trackNumber, date };

struct SortField {
    SortKey key;
    bool descending;
};

struct SortProperty {
    const char* name;
    SortKey key;
};
constexpr SortProperty kSortProperties[] = {
    {"dc:title", SortKey::title},   {"upnp:artist", SortKey::artist},
    {"upnp:album", SortKey::album}, {"upnp:originalTrackNumber", SortKey::trackNumber},
    {"dc:date", SortKey::date},
};

std::string Trimmed(const std::string& text) {
    const std::size_t first = text.find_first_not_of(" \t\r\n");
    if (first == std::string::npos)
        return {};
    return text.substr(first, text.find_last_not_of(" \t\r\n") - first + 1);
}

// "+upnp:album,+upnp:originalTrackNumber" -> its fields; false when a property is not one of the
// sort capabilities.
bool ParseSortCriteria(const std::string& criteria, std::vector<SortField>* fields) {
    std::size_t start = 0;
    while (start < criteria.size()) {
        std::size_t end = criteria.find(',', start);
        if (end == std::string::npos)
            end = criteria.size();
        std::string field = Trimmed(criteria.substr(start, end - start));
        start = end + 1;
        if (field.empty())
            continue;
        bool descending = false;
        if (field[0] == '+' || field[0] == '-') {
            descending = field[0] == '-';
            field = Trimmed(field.substr(1));
        }
        const auto property = std::find_if(std::begin(kSortProperties), std::end(kSortProperties),
                                           [&](const SortProperty& p) { return field == p.name; });
        if (property == std::end(kSortProperties))
            return false;
        fields->push_back({property->key, descending});
    }
    return true;
}

// What a child is sorted by: tracks by their tags; albums by name, album artist and year; other
// containers by title alone (their artist, album, number and date are empty).
struct SortValues {
    std::string_view title, artist, album;
    int64_t trackNo = 0, year = 0;
};

SortValues ValuesOf(const LibraryView& view, const ViewChild& child) {
    if (child.track) {
        const ViewTrack& track = view.tracks()[child.index];
        const TrackNumbers numbers = view.Numbers(track);
        return {view.Text(track.title), view.Text(track.artist), view.AlbumOf(track),
                numbers.trackNo, numbers.year};
    }
    const ViewContainer& container = view.containers()[child.index];
    return {view.Text(container.title), view.Text(container.artist),
            container.album() ? view.Text(container.title) : std::string_view(), 0,
            view.YearOf(container)};
}

int CompareBy(SortKey key, const SortValues& a, const SortValues& b) {
    switch (key) {
        case SortKey::title:
            return CompareNoCase(a.title, b.title);
        case SortKey::artist:
            return CompareNoCase(a.artist, b.artist);
        case SortKey::album:
            return CompareNoCase(a.album, b.album);
        case SortKey::trackNumber:
            return a.trackNo == b.trackNo ? 0 : a.trackNo < b.trackNo ? -1 : 1;
        case SortKey::date:
            return a.year == b.year ? 0 : a.year < b.year ? -1 : 1;
    }
    return 0;
}

// The children in the requested order; equal ones keep the default order, so that the order is
// the same on every page of a listing.
std::vector<ViewChild> SortedChildren(const LibraryView& view, const ViewContainer& container,
                                      const std::vector<SortField>& fields) {
    std::vector<ViewChild> children(view.ChildrenOf(container),
                                    view.ChildrenOf(container) + container.childCount);
    if (fields.empty())
        return children;
    std::vector<SortValues> values(children.size());
    std::vector<uint32_t> order(children.size());
    for (uint32_t i = 0; i < children.size(); ++i) {
        values[i] = ValuesOf(view, children[i]);
        order[i] = i;
    }
    std::stable_sort(order.begin(), order.end(), [&](uint32_t a, uint32_t b) {
        for (const SortField& field : fields) {
            const int result = CompareBy(field.key, values[a], values[b]);
            if (result != 0)
                return field.descending ? result > 0 : result < 0;
        }
        return false;
    });
    std::vector<ViewChild> sorted;
    sorted.reserve(children.size());
    for (const uint32_t i : order)
        sorted.push_back(children[i]);
    return sorted;
}

void AppendTrackIn(std::string& out, const LibraryView& view, uint32_t container,
                   const ViewTrack& track, std::string_view mediaBase) {
    const std::string containerId(view.Text(view.containers()[container].id));
    const bool own = container == view.allMusic();
    const int64_t id = view.IdOf(track);
    AppendItemStart(out, TrackIdIn(containerId, id), containerId,
                    own ? std::string() : TrackId(id));
    view.AppendTrackBody(out, track, mediaBase);
    out += kItemEnd;
}

void AppendChild(std::string& out, const LibraryView& view, uint32_t container,
                 const ViewChild& child, std::string_view mediaBase) {
    if (child.track)
        AppendTrackIn(out, view, container, view.tracks()[child.index], mediaBase);
    else
        view.AppendContainerElement(out, child.index, mediaBase);
}

BrowseResult Error(int code, const char* text) {
    BrowseResult result;
    result.error = code;
    result.errorText = text;
    return result;
}

uint32_t ClampCount(std::size_t value) {
    return value > 0xffffffffULL ? 0xffffffffU : static_cast<uint32_t>(value);
}

// The track an item id names, with the container it is listed in; nullptr when the id names no
// item of this view.
const ViewTrack* FindItem(const LibraryView& view, const std::string& id, uint32_t* container) {
    const ObjectRef ref = ParseObjectId(id);
    if (ref.kind == ObjectKind::track) {
        *container = view.allMusic();
    } else if (ref.kind == ObjectKind::trackIn) {
        *container = view.ContainerIndex(ref.container);
    } else {
        return nullptr;
    }
    const ViewTrack* track = view.FindTrack(ref.trackId);
    return track != nullptr && view.Lists(*container, *track) ? track : nullptr;
}

BrowseResult Metadata(const LibraryView& view, const std::string& id, std::string_view mediaBase) {
    BrowseResult result;
    result.didl = kDidlBegin;
    if (const uint32_t container = view.ContainerIndex(id); container != kNoIndex) {
        view.AppendContainerElement(result.didl, container, mediaBase);
    } else {
        uint32_t listing = kNoIndex;
        const ViewTrack* track = FindItem(view, id, &listing);
        if (track == nullptr)
            return Error(kErrorNoSuchObject, "No such object");
        AppendTrackIn(result.didl, view, listing, *track, mediaBase);
    }
    result.didl += kDidlEnd;
    result.numberReturned = 1;
    result.totalMatches = 1;
    return result;
}

// `sorted`: the container's children in the requested order, nullptr for the default order.
BrowseResult Children(const LibraryView& view, const BrowseArgs& args,
                      const std::vector<ViewChild>* sorted, std::string_view mediaBase) {
    const uint32_t index = view.ContainerIndex(args.objectId);
    if (index == kNoIndex) {
        uint32_t listing = kNoIndex;
        return FindItem(view, args.objectId, &listing) != nullptr
                   ? Error(kErrorNoSuchContainer, "No such container")
                   : Error(kErrorNoSuchObject, "No such object");
    }
    const ViewContainer& container = view.containers()[index];
    const std::size_t total = container.childCount;
    const std::size_t first = std::min<std::size_t>(args.startingIndex, total);
    const std::size_t last = args.requestedCount == 0
                                 ? total
                                 : std::min<std::size_t>(total, first + args.requestedCount);
    BrowseResult result;
    result.didl.reserve(
        std::min(kMaxResultBytes, kDidlBegin.size() + kDidlEnd.size() + (last - first) * 640));
    result.didl = kDidlBegin;
    const ViewChild* children = sorted != nullptr ? sorted->data() : view.ChildrenOf(container);
    std::size_t end = first;
    while (end < last && end - first < kMaxResultObjects) {
        const std::size_t before = result.didl.size();
        AppendChild(result.didl, view, index, children[end], mediaBase);
        // An object that would take the reply past its byte budget is left for the next page,
        // unless it is the first.
        if (end > first && result.didl.size() + kDidlEnd.size() > kMaxResultBytes) {
            result.didl.resize(before);
            break;
        }
        ++end;
    }
    result.didl += kDidlEnd;
    result.numberReturned = ClampCount(end - first);
    result.totalMatches = ClampCount(total);
    return result;
}

// One text per distinct criteria: "+dc:title, -upnp:album" and "dc:title,-upnp:album" agree.
std::string SortKeyText(const std::vector<SortField>& sort) {
    std::string key;
    for (const SortField& field : sort) {
        key += static_cast<char>('a' + static_cast<int>(field.key));
        key += field.descending ? '-' : '+';
    }
    return key;
}

constexpr std::size_t kSortedListingsKept = 4;

}  // namespace

struct ContentDirectory::SortedListings {
    struct Entry {
        uint64_t viewSerial = 0;
        uint32_t container = 0;
        std::string key;
        std::shared_ptr<const std::vector<ViewChild>> children;
    };
    std::mutex mutex;
    std::deque<Entry> entries;  // the most recent first

    std::shared_ptr<const std::vector<ViewChild>> Get(const LibraryView& view, uint32_t container,
                                                      const std::vector<SortField>& sort) {
        const std::string key = SortKeyText(sort);
        {
            std::lock_guard<std::mutex> lock(mutex);
            for (const Entry& entry : entries) {
                if (entry.viewSerial == view.serial() && entry.container == container &&
                    entry.key == key)
                    return entry.children;
            }
        }
        auto children = std::make_shared<const std::vector<ViewChild>>(
            SortedChildren(view, view.containers()[container], sort));
        std::lock_guard<std::mutex> lock(mutex);
        entries.push_front({view.serial(), container, key, children});
        if (entries.size() > kSortedListingsKept)
            entries.pop_back();
        return children;
    }
};

bool ContentDirectory::FileStamp::operator==(const FileStamp& other) const {
    return device == other.device && inode == other.inode && size == other.size &&
           modified.tv_sec == other.modified.tv_sec && modified.tv_nsec == other.modified.tv_nsec &&
           changeCounter == other.changeCounter;
}

ContentDirectory::ContentDirectory(std::string dbPath, std::string sharePath,
                                   std::string mediaBaseUrl)
    : dbPath_(std::move(dbPath)),
      sharePath_(std::move(sharePath)),
      mediaBaseUrl_(std::move(mediaBaseUrl)),
      sortedListings_(std::make_unique<SortedListings>()) {}

ContentDirectory::~ContentDirectory() = default;

// The file's identity and times, and SQLite's file change counter (a 4-byte big-endian number
// at offset 24 of the header, moved by every committed write), which tells two writes apart
// even within one tick of the file system's clock.
ContentDirectory::FileStamp ContentDirectory::StampOfDatabase() const {
    FileStamp stamp;
    const io::FileDescriptor fd(open(dbPath_.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY));
    if (!fd)
        return stamp;
    struct stat st {};
    unsigned char counter[4] = {};
    if (fstat(fd.Get(), &st) == 0) {
        stamp = FileStamp{st.st_dev, st.st_ino, st.st_size, st.st_mtim, 0};
        if (pread(fd.Get(), counter, sizeof counter, 24) == static_cast<ssize_t>(sizeof counter))
            stamp.changeCounter = (uint32_t(counter[0]) << 24) | (uint32_t(counter[1]) << 16) |
                                  (uint32_t(counter[2]) << 8) | counter[3];
    }
    return stamp;
}

std::shared_ptr<const LibraryView> ContentDirectory::CurrentView() const {
    const FileStamp now = StampOfDatabase();
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (loaded_ && now == stamp_)
            return view_;
    }
    std::unique_lock<std::mutex> loading(loadMutex_, std::try_to_lock);
    if (!loading.owns_lock()) {
        // Another thread is loading the new state: answer from the last one meanwhile, so that
        // no request waits for a load it did not start.
        {
            std::lock_guard<std::mutex> lock(mutex_);
            if (view_)
                return view_;
        }
        loading.lock();
    }
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (loaded_ && now == stamp_)
            return view_;
    }
    std::shared_ptr<const LibraryView> fresh = LibraryView::Load(dbPath_, sharePath_);
    if (!fresh)
        return nullptr;  // tried again on the next call
    // Only the thread that holds loadMutex_ changes view_ and loaded_: read here without mutex_,
    // so that requests answered from the last view meanwhile do not wait for the comparison.
    const bool changed = loaded_ && view_ && fresh->updateId() != view_->updateId();
    const std::string changedContainers =
        changed ? fresh->ChangedContainers(view_.get(), kMaxContainerUpdates) : std::string();
    std::shared_ptr<const LibraryView> before;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (changed)
            containerUpdateIds_ = changedContainers;
        before = std::move(view_);
        view_ = fresh;
        stamp_ = now;
        loaded_ = true;
    }
    // What the load read and the view before (unless a request still holds it) go back to the
    // system, not only to the allocator's free lists.
    before.reset();
    malloc_trim(0);
    return fresh;
}

uint32_t ContentDirectory::SystemUpdateId() const {
    const std::shared_ptr<const LibraryView> view = CurrentView();
    return view ? view->updateId() : 0;
}

std::string ContentDirectory::ContainerUpdateIds() const {
    CurrentView();
    std::lock_guard<std::mutex> lock(mutex_);
    return containerUpdateIds_;
}

uint32_t ContentDirectory::LoadedSystemUpdateId() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return view_ ? view_->updateId() : 0;
}

std::string ContentDirectory::LoadedContainerUpdateIds() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return containerUpdateIds_;
}

BrowseResult ContentDirectory::Browse(const BrowseArgs& args) const {
    std::vector<SortField> sort;
    if (!ParseSortCriteria(args.sortCriteria, &sort))
        return Error(kErrorUnsupportedSort, "Unsupported or invalid sort criteria");
    const std::shared_ptr<const LibraryView> view = CurrentView();
    if (!view)
        return Error(kErrorActionFailed, "The library database cannot be read");
    const std::string_view mediaBase =
        args.mediaBaseUrl.empty() ? mediaBaseUrl_ : args.mediaBaseUrl;
    std::shared_ptr<const std::vector<ViewChild>> sorted;
    const uint32_t container = view->ContainerIndex(args.objectId);
    if (!args.metadata && !sort.empty() && container != kNoIndex)
        sorted = sortedListings_->Get(*view, container, sort);
    BrowseResult result = args.metadata ? Metadata(*view, args.objectId, mediaBase)
                                        : Children(*view, args, sorted.get(), mediaBase);
    if (result.error == 0)
        result.updateId = view->updateId();
    return result;
}

// The track's row, read from library.db itself: the file-serving side needs the path as the
// index has it now, and the tree does not keep paths (memory).
bool ContentDirectory::LookUpTrack(int64_t id, TrackFile* file) const {
    sqlite::Database db = sqlite::Database::OpenReadOnly(dbPath_.c_str(), kLookUpBusyTimeoutMs);
    sqlite::Statement row =
        db ? db.Prepare("SELECT path, size FROM track WHERE id = ?1") : sqlite::Statement();
    if (!row || row.Bind(1, id) != SQLITE_OK || row.Step() != SQLITE_ROW)
        return false;
    file->path = std::string(row.ColumnText(0));
    file->size = row.ColumnType(1) == SQLITE_INTEGER ? row.ColumnInt64(1) : -1;
    if (file->path.empty())
        return false;
    file->mimeType = medialib::MimeTypeOfPath(file->path);
    file->contentFeatures = medialib::DlnaContentFeatures(file->path);
    return true;
}

bool ContentDirectory::LookUpArtFile(int64_t id, std::string* path) const {
    sqlite::Database db = sqlite::Database::OpenReadOnly(dbPath_.c_str(), kLookUpBusyTimeoutMs);
    // An index of an older indexer has no art_path column: then no track has art.
    sqlite::Statement row =
        db ? db.Prepare("SELECT art_path FROM track WHERE id = ?1") : sqlite::Statement();
    if (!row || row.Bind(1, id) != SQLITE_OK || row.Step() != SQLITE_ROW)
        return false;
    *path = std::string(row.ColumnText(0));
    return !path->empty();
}

}  // namespace harmona::mediad
