// The live library: files added, changed and removed in the share reach library.db, and so
// ContentDirectory's Browse and SystemUpdateID, within seconds, through inotify and the
// indexer's incremental pass; run over a share generated with sox and TagLib.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utime.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "services/harmona-mediad/ContentDirectory.h"
#include "services/harmona-mediad/LiveLibrary.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/harness/Sandbox.h"
#include "tests/mediad/DidlDocument.h"
#include "tests/mediad/DirectBrowse.h"
#include "tests/mediad/MediadTestKit.h"

namespace harmona::test::mediad {
namespace {

using harmona::mediad::ContentDirectory;
using harmona::mediad::LiveLibrary;
using harmona::mediad::LiveLibraryOptions;

// --- The table of watched folders ---------------------------------------------------------------

std::string FolderOf(int i) {
    return "/Artist " + std::to_string(i % 200) + "/Folder " + std::to_string(i / 200);
}

TEST(FolderWatches, EveryFolderIsFoundByItsWatchUntilItIsErasedThroughEveryRebuild) {
    harmona::mediad::FolderWatches watches;
    constexpr int kFolders = 5000;
    for (int wd = 1; wd <= kFolders; ++wd)
        watches.Set(wd, FolderOf(wd));
    watches.Set(kFolders + 10, "");  // the share itself
    watches.Set(7, "/moved here");   // a watch set again on a folder that moved
    EXPECT_EQ(watches.size(), static_cast<std::size_t>(kFolders + 1));
    std::string folder;
    ASSERT_TRUE(watches.Find(kFolders + 10, &folder));
    EXPECT_EQ(folder, "");
    ASSERT_TRUE(watches.Find(7, &folder));
    EXPECT_EQ(folder, "/moved here");
    EXPECT_FALSE(watches.Find(kFolders + 1, &folder));
    // Erased one by one from the middle out, far past the points where the table is rebuilt.
    for (int wd = kFolders / 2; wd >= 1; --wd) {
        if (wd != 7)
            watches.Erase(wd);
        watches.Erase(kFolders + 1 - wd);
        if (wd % 250 != 0)
            continue;
        for (int other = 1; other <= kFolders; ++other) {
            const bool erased = other != 7 && other >= wd && other <= kFolders + 1 - wd;
            ASSERT_EQ(watches.Find(other, &folder), !erased) << other;
            if (!erased) {
                ASSERT_EQ(folder, other == 7 ? "/moved here" : FolderOf(other)) << other;
            }
        }
    }
    EXPECT_EQ(watches.size(), 2u);
    ASSERT_TRUE(watches.Find(kFolders + 10, &folder));
    EXPECT_EQ(folder, "");
    watches.Erase(12345);  // never set: nothing happens
    watches.Set(kFolders + 3, "/new");
    ASSERT_TRUE(watches.Find(kFolders + 3, &folder));
    EXPECT_EQ(folder, "/new");
    EXPECT_EQ(watches.size(), 3u);
    watches.Clear();
    EXPECT_EQ(watches.size(), 0u);
    EXPECT_FALSE(watches.Find(7, &folder));
}

// A share of 20,000 folders of ordinary names: about 45 bytes a folder as allocated, room to grow
// included (a hash map of path strings took about 120 of the live library's heap).
TEST(FolderWatches, TwentyThousandFoldersTakeAtMostSixtyFourBytesEach) {
    harmona::mediad::FolderWatches watches;
    constexpr int kFolders = 20000;
    for (int wd = 1; wd <= kFolders; ++wd)
        watches.Set(wd, FolderOf(wd));
    EXPECT_EQ(watches.size(), static_cast<std::size_t>(kFolders));
    EXPECT_LE(watches.heldBytes(), 64u * kFolders);
}

using namespace std::chrono_literals;

// Every wait of these tests ends after this long: a change must show well within it.
constexpr auto kTimeLimit = 20s;

bool WaitUntil(const std::function<bool()>& condition) {
    const auto deadline = std::chrono::steady_clock::now() + kTimeLimit;
    while (std::chrono::steady_clock::now() < deadline) {
        if (condition())
            return true;
        std::this_thread::sleep_for(50ms);
    }
    return condition();
}

std::vector<std::string> AllTitles(const ContentDirectory& directory) {
    const DidlDocument document = ParseDidl(Browse(directory, "music_all").didl);
    std::vector<std::string> titles;
    for (const DidlObjectRecord& object : document.objects)
        titles.push_back(object.title);
    return titles;
}

bool HasTitle(const ContentDirectory& directory, const std::string& title) {
    for (const std::string& each : AllTitles(directory)) {
        if (each == title)
            return true;
    }
    return false;
}

class LiveShare : public ::testing::Test {
  protected:
    void SetUp() override { MakeStandardShare(); }

    void StartLive(std::size_t maxWatches = 100000,
                   std::chrono::milliseconds unwatchedRescan = std::chrono::minutes(10),
                   std::chrono::milliseconds quietPeriod = 200ms) {
        LiveLibraryOptions options;
        options.sharePath = kShare;
        options.dbPath = kLibraryDb;
        options.quietPeriod = quietPeriod;
        options.maxDelay = std::max<std::chrono::milliseconds>(quietPeriod, 2s);
        options.maxWatches = maxWatches;
        options.unwatchedRescan = unwatchedRescan;
        options.onIndexed = [this](const index::IndexReport& report) {
            {
                std::lock_guard<std::mutex> lock(mutex_);
                reports_.push_back(report);
            }
            HoldWhileAsked();
        };
        live_ = std::make_unique<LiveLibrary>(options);
        std::string error;
        ASSERT_TRUE(live_->Start(error)) << error;
        // A pass is counted before its report is handed over: wait for the report itself.
        ASSERT_TRUE(WaitUntil([&] { return !Reports().empty(); }));
        ASSERT_TRUE(Reports().front().ok) << Reports().front().error;
        EXPECT_EQ(Reports().front().added, 5u);
    }

    // While `hold_` is set, a finished pass keeps the live library's thread here (up to the time
    // limit) until Release(): its inotify queue then fills up unread.
    void HoldWhileAsked() {
        std::unique_lock<std::mutex> lock(mutex_);
        if (!hold_)
            return;
        held_ = true;
        changed_.notify_all();
        changed_.wait_for(lock, kTimeLimit, [this] { return !hold_; });
    }
    bool WaitUntilHeld() {
        std::unique_lock<std::mutex> lock(mutex_);
        return changed_.wait_for(lock, kTimeLimit, [this] { return held_; });
    }
    void Release() {
        std::lock_guard<std::mutex> lock(mutex_);
        hold_ = false;
        changed_.notify_all();
    }

    std::vector<index::IndexReport> Reports() {
        std::lock_guard<std::mutex> lock(mutex_);
        return reports_;
    }

    void TearDown() override {
        Release();
        if (live_)
            live_->Stop();
    }

    ContentDirectory directory_{kLibraryDb, kShare, "http://127.0.0.1:50003/media/"};
    std::unique_ptr<LiveLibrary> live_;
    std::mutex mutex_;
    std::condition_variable changed_;
    bool hold_ = false, held_ = false;
    std::vector<index::IndexReport> reports_;
};

// A line "Name:   value kB" of this process's /proc/self/status, in KiB; -1 when there is none.
long OwnStatusKiB(const std::string& name) {
    FILE* status = std::fopen("/proc/self/status", "r");
    if (status == nullptr)
        return -1;
    char line[256];
    long value = -1;
    while (std::fgets(line, sizeof line, status) != nullptr) {
        if (std::strncmp(line, name.c_str(), name.size()) == 0 && line[name.size()] == ':')
            value = std::atol(line + name.size() + 1);
    }
    std::fclose(status);
    return value;
}

// What a pass over a large share held (every file found and every row of library.db) goes back
// to the system when the pass ends: the live library's process sleeps between passes, often for
// days. Measured in a child process of its own: after its first pass (over the five files of the
// share, which sets up what every pass shares), 20,000 files are added, and after the pass that
// indexes them (about 10 MiB at its peak) the anonymous resident memory (the heap; not the
// libraries' pages, which other processes share) is within a fixed margin of where it was before.
// Kept by the allocator instead, 4 to 6 MiB stayed.
constexpr int kManyFiles = 20000;
constexpr long kPassMarginKiB = 2 * 1024;

// One small audio file linked under kManyFiles names in 20 folders: the indexer reads each.
bool LinkManyFiles() {
    const std::string first = std::string(kShare) + "/loose.ogg";
    for (int i = 0; i < kManyFiles; ++i) {
        const std::string folder = std::string(kShare) + "/Many/" + std::to_string(i / 1000);
        if (i % 1000 == 0 && mkdir(folder.c_str(), 0755) != 0 && errno != EEXIST)
            return false;
        const std::string name =
            folder + "/A File Name Of Ordinary Length " + std::to_string(i) + ".ogg";
        if (link(first.c_str(), name.c_str()) != 0)
            return false;
    }
    return true;
}

// In the child: {anonymous KiB after the first pass, after the pass of the many files, the peak
// resident size, the files that pass added}; -1 for what did not happen.
void MeasureTwoPasses(long (&figures)[4]) {
    LiveLibraryOptions options;
    options.sharePath = kShare;
    options.dbPath = kLibraryDb;
    options.quietPeriod = 500ms;
    options.maxDelay = std::chrono::minutes(1);
    std::mutex mutex;
    std::condition_variable done;
    std::size_t passes = 0;
    options.onIndexed = [&](const index::IndexReport& report) {
        std::lock_guard<std::mutex> lock(mutex);
        ++passes;
        if (passes == 1) {
            figures[0] = OwnStatusKiB("RssAnon");
        } else if (report.added > 0 && figures[3] < 0) {
            figures[1] = OwnStatusKiB("RssAnon");
            figures[2] = OwnStatusKiB("VmHWM");
            figures[3] = static_cast<long>(report.added);
        }
        done.notify_all();
    };
    LiveLibrary live(options);
    std::string error;
    if (live.Start(error)) {
        std::unique_lock<std::mutex> lock(mutex);
        if (done.wait_for(lock, kTimeLimit, [&] { return passes >= 1; })) {
            lock.unlock();
            const bool linked = LinkManyFiles();
            lock.lock();
            if (linked)
                done.wait_for(lock, std::chrono::minutes(5), [&] { return figures[3] >= 0; });
        }
    }
    live.Stop();
}

TEST_F(LiveShare, APassOverTwentyThousandFilesGivesItsMemoryBackWhenItEnds) {
    MakeDirs(std::string(kShare) + "/Many");
    int fds[2];
    ASSERT_EQ(pipe(fds), 0);
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
        close(fds[0]);
        long figures[4] = {-1, -1, -1, -1};
        MeasureTwoPasses(figures);
        const bool written = write(fds[1], figures, sizeof figures) == sizeof figures;
        _exit(written ? 0 : 1);
    }
    close(fds[1]);
    long figures[4] = {-1, -1, -1, -1};
    const bool read = ::read(fds[0], figures, sizeof figures) == sizeof figures;
    close(fds[0]);
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    ASSERT_TRUE(read);
    const long before = figures[0], after = figures[1], peak = figures[2];
    std::printf(
        "live library process: anonymous %ld KiB after the first pass, %ld KiB after the pass of "
        "%d files; peak resident size %ld KiB\n",
        before, after, kManyFiles, peak);
    EXPECT_EQ(figures[3], kManyFiles);
    ASSERT_GT(before, 0);
    ASSERT_GT(after, 0);
#ifndef HARMONA_SANITIZE
    // AddressSanitizer's allocator keeps freed blocks in quarantine and never trims: the bound
    // holds for the real allocator only.
    EXPECT_LE(after, before + kPassMarginKiB)
        << "anonymous resident memory " << before << " KiB before the pass, " << after
        << " KiB after it";
#endif
}

TEST_F(LiveShare, AFileAddedInANewFolderIsBrowsableWithinSeconds) {
    ASSERT_NO_FATAL_FAILURE(StartLive());
    const uint32_t before = directory_.SystemUpdateId();
    EXPECT_EQ(AllTitles(directory_).size(), 5u);
    MakeAudioFile(std::string(kShare) + "/New/Deeper/Still/added.ogg",
                  {"Added Later", "Newcomer", "Fresh", "", "Pop"});
    ASSERT_TRUE(WaitUntil([&] { return HasTitle(directory_, "Added Later"); }));
    EXPECT_GT(directory_.SystemUpdateId(), before);
    EXPECT_GE(live_->watchedFolders(), 3u);  // the new folders are watched too

    // A file in the newly watched folder is found as well.
    MakeAudioFile(std::string(kShare) + "/New/Deeper/Still/second.ogg",
                  {"Second Newcomer", "Newcomer", "Fresh", "", "Pop"});
    ASSERT_TRUE(WaitUntil([&] { return HasTitle(directory_, "Second Newcomer"); }));
}

TEST_F(LiveShare, AFolderMovedIntoTheShareIsIndexedWhole) {
    ASSERT_NO_FATAL_FAILURE(StartLive());
    // Made in a hidden folder of the share (neither indexed nor watched), then moved in at once.
    const std::string staging = std::string(kShare) + "/.incoming/Album";
    MakeAudioFile(staging + "/one.ogg", {"Moved One", "Mover", "Moved", "", "Pop"});
    MakeAudioFile(staging + "/CD2/two.ogg", {"Moved Two", "Mover", "Moved", "", "Pop"});
    ASSERT_EQ(rename(staging.c_str(), (std::string(kShare) + "/Moved Album").c_str()), 0)
        << std::strerror(errno);
    ASSERT_TRUE(WaitUntil(
        [&] { return HasTitle(directory_, "Moved One") && HasTitle(directory_, "Moved Two"); }));
}

TEST_F(LiveShare, AChangedFileShowsItsNewTags) {
    ASSERT_NO_FATAL_FAILURE(StartLive());
    const uint32_t before = directory_.SystemUpdateId();
    const std::string path = std::string(kShare) + "/loose.ogg";
    WriteTags(path, {"Zulu Retitled", "Solo", "", "", "Pop"});
    struct utimbuf later {
        time(nullptr) + 5, time(nullptr) + 5
    };
    utime(path.c_str(), &later);
    ASSERT_TRUE(WaitUntil([&] { return HasTitle(directory_, "Zulu Retitled"); }));
    EXPECT_FALSE(HasTitle(directory_, "Zulu"));
    EXPECT_GT(directory_.SystemUpdateId(), before);
}

TEST_F(LiveShare, ARemovedFileLeavesEveryContainer) {
    ASSERT_NO_FATAL_FAILURE(StartLive());
    const uint32_t before = directory_.SystemUpdateId();
    ASSERT_EQ(unlink((std::string(kShare) + "/Jazz/Blue/Late/03 Third.mp3").c_str()), 0);
    ASSERT_TRUE(WaitUntil([&] { return !HasTitle(directory_, "Third"); }));
    EXPECT_EQ(AllTitles(directory_).size(), 4u);
    EXPECT_GT(directory_.SystemUpdateId(), before);
    EXPECT_EQ(Browse(directory_, "folder:Jazz/Blue/Late").error,
              harmona::mediad::kErrorNoSuchObject);
}

TEST_F(LiveShare, APassOverAnUnchangedShareReadsNoTagAndKeepsTheUpdateId) {
    ASSERT_NO_FATAL_FAILURE(StartLive());
    const uint32_t before = directory_.SystemUpdateId();
    // A file that is no audio makes the share change, but no track.
    WriteFile(std::string(kShare) + "/Rock/readme.txt", "liner notes\n");
    ASSERT_TRUE(WaitUntil([&] { return Reports().size() >= 2; }));
    const std::vector<index::IndexReport> reports = Reports();
    ASSERT_GE(reports.size(), 2u);
    EXPECT_TRUE(reports[1].ok);
    EXPECT_EQ(reports[1].tagReads, 0u);
    EXPECT_EQ(reports[1].filesSeen, 5u);
    EXPECT_EQ(directory_.SystemUpdateId(), before);
}

TEST_F(LiveShare, BeyondTheWatchLimitAPeriodicRescanStillFindsNewFiles) {
    // The share's own folder only, and events alone would wait ten minutes: only the periodic
    // rescan can find the new file in time.
    ASSERT_NO_FATAL_FAILURE(StartLive(1, 500ms, std::chrono::minutes(10)));
    EXPECT_EQ(live_->watchedFolders(), 1u);
    MakeAudioFile(std::string(kShare) + "/Jazz/Blue/Late/unwatched.ogg",
                  {"Found By Rescan", "Trio", "Blue", "", "Jazz"});
    ASSERT_TRUE(WaitUntil([&] { return HasTitle(directory_, "Found By Rescan"); }));
    EXPECT_EQ(live_->watchedFolders(), 1u);
    int limitLines = 0;
    for (const LogLine& line : TakeLogLines(200)) {
        if (line.message.find("live library: watching 1 folders, the most allowed") == 0)
            ++limitLines;
    }
    EXPECT_EQ(limitLines, 1) << "the limit is logged once";
}

long MaxQueuedEvents() {
    FILE* file = std::fopen("/proc/sys/fs/inotify/max_queued_events", "r");
    long value = -1;
    if (file != nullptr) {
        if (std::fscanf(file, "%ld", &value) != 1)
            value = -1;
        std::fclose(file);
    }
    return value;
}

TEST_F(LiveShare, AnOverflowedEventQueueRewatchesAndRescansTheShare) {
    const long queue = MaxQueuedEvents();
    if (queue <= 0 || queue > 200000)
        GTEST_SKIP() << "fs.inotify.max_queued_events is " << queue;
    ASSERT_NO_FATAL_FAILURE(StartLive());
    {
        std::lock_guard<std::mutex> lock(mutex_);
        hold_ = true;
    }
    WriteFile(std::string(kShare) + "/Jazz/trigger.txt", "start a pass\n");
    ASSERT_TRUE(WaitUntilHeld());
    // More events than the kernel queues while nobody reads them...
    for (long i = 0; i < queue + 100; ++i)
        WriteFile(std::string(kShare) + "/Jazz/flood-" + std::to_string(i), "");
    // ...so the new folder's own event is lost: only the rescan after the overflow finds it.
    MakeAudioFile(std::string(kShare) + "/Late Arrival/first.ogg",
                  {"Arrived In The Flood", "Late", "Flood", "", "Pop"});
    Release();
    ASSERT_TRUE(WaitUntil([&] { return HasTitle(directory_, "Arrived In The Flood"); }));
    int overflowLines = 0;
    for (const LogLine& line : TakeLogLines(200)) {
        if (line.message.find("live library: event queue overflowed") == 0)
            ++overflowLines;
    }
    EXPECT_GE(overflowLines, 1);
    // The folder is watched from then on.
    MakeAudioFile(std::string(kShare) + "/Late Arrival/second.ogg",
                  {"Arrived After", "Late", "Flood", "", "Pop"});
    ASSERT_TRUE(WaitUntil([&] { return HasTitle(directory_, "Arrived After"); }));
}

TEST_F(LiveShare, StopEndsTheThreadAndLaterChangesWaitForTheNextStart) {
    ASSERT_NO_FATAL_FAILURE(StartLive());
    const auto start = std::chrono::steady_clock::now();
    live_->Stop();
    EXPECT_LT(std::chrono::steady_clock::now() - start, kTimeLimit);
    EXPECT_EQ(live_->watchedFolders(), 0u);
    const std::size_t passes = live_->passes();
    MakeAudioFile(std::string(kShare) + "/after-stop.ogg", {"After Stop", "", "", "", ""});
    std::this_thread::sleep_for(1s);
    EXPECT_EQ(live_->passes(), passes);
    EXPECT_FALSE(HasTitle(directory_, "After Stop"));
}

}  // namespace
}  // namespace harmona::test::mediad
