// What loading a library holds at its peak: the library view made from library.db in a child
// process of its own, its peak resident size (VmHWM, reset just before the load) compared between
// two libraries that differ only in the length of their file names. The paths are not part of the
// view: a load that keeps them while it builds peaks higher by about their size.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <malloc.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>

#include "platform/lib/sqlite/Database.h"
#include "platform/medialib/LibrarySchema.h"
#include "services/harmona-mediad/LibraryView.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/mediad/MediadTestKit.h"

namespace harmona::test::mediad {
namespace {

constexpr int kTracks = 50000;
// File names of 240 bytes (within a file system's 255) against 12: about 11 MiB of paths more.
constexpr std::size_t kLongName = 240;
constexpr std::size_t kShortName = 12;

// library.db at `dbPath` with kTracks tracks of ordinary tags in 500 album folders, each file name
// `nameBytes` long (numbered, padded with "x"; at least 12).
void WriteLibrary(const std::string& dbPath, std::size_t nameBytes) {
    unlink(dbPath.c_str());
    sqlite::Database db =
        sqlite::Database::Open(dbPath.c_str(), SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, 1000);
    ASSERT_TRUE(db);
    ASSERT_TRUE(medialib::EnsureLibrarySchema(db));
    ASSERT_EQ(db.Execute("BEGIN"), SQLITE_OK);
    sqlite::Statement insert = db.Prepare(
        "INSERT INTO track (path, title, artist, album, album_artist, genre, year, track_no, "
        "disc_no, duration_ms, mtime, added, size) VALUES (?1, ?2, ?3, ?4, ?3, ?5, 1999, ?6, 1, "
        "200000, 0, ?7, 4000000)");
    ASSERT_TRUE(insert);
    for (int i = 0; i < kTracks; ++i) {
        const std::string artist = "Artist " + std::to_string(i % 100);
        const std::string album = "Album " + std::to_string(i % 500);
        std::string name = std::to_string(i);
        name += std::string(nameBytes - name.size() - 4, 'x') + ".mp3";
        insert.Reset();
        insert.Bind(1, std::string(kShare) + "/" + artist + "/" + album + "/" + name);
        insert.Bind(2, "A Song Title Of Ordinary Length " + std::to_string(i));
        insert.Bind(3, artist);
        insert.Bind(4, album);
        insert.Bind(5, "Genre " + std::to_string(i % 25));
        insert.Bind(6, static_cast<int64_t>(i % 20 + 1));
        insert.Bind(7, static_cast<int64_t>(1700000000 + i));
        ASSERT_EQ(insert.Step(), SQLITE_DONE) << db.Error();
    }
    ASSERT_TRUE(medialib::BumpLibraryUpdateCount(db));
    ASSERT_EQ(db.Execute("COMMIT"), SQLITE_OK);
}

long OwnPeakKiB() {
    FILE* status = std::fopen("/proc/self/status", "r");
    if (status == nullptr)
        return -1;
    char line[256];
    long value = -1;
    while (std::fgets(line, sizeof line, status) != nullptr) {
        if (std::strncmp(line, "VmHWM:", 6) == 0)
            value = std::atol(line + 6);
    }
    std::fclose(status);
    return value;
}

// The peak resident size of a child process that loads the view of `dbPath` (its tracks counted
// as a check), from a peak reset just before; -1 when it could not be measured.
long PeakOfALoad(const std::string& dbPath, std::size_t& tracks) {
    int fds[2];
    if (pipe(fds) != 0)
        return -1;
    const pid_t child = fork();
    if (child < 0)
        return -1;
    if (child == 0) {
        close(fds[0]);
        long figures[2] = {-1, -1};
        const int refs = open("/proc/self/clear_refs", O_WRONLY | O_CLOEXEC);
        // "5" resets the peak resident size to the present one.
        if (refs >= 0 && write(refs, "5", 1) == 1) {
            const auto view = harmona::mediad::LibraryView::Load(dbPath, kShare);
            if (view) {
                figures[0] = OwnPeakKiB();
                figures[1] = static_cast<long>(view->tracks().size());
            }
        }
        const bool written = write(fds[1], figures, sizeof figures) == sizeof figures;
        _exit(written ? 0 : 1);
    }
    close(fds[1]);
    long figures[2] = {-1, -1};
    const bool read = ::read(fds[0], figures, sizeof figures) == sizeof figures;
    close(fds[0]);
    int status = 0;
    waitpid(child, &status, 0);
    tracks = static_cast<std::size_t>(figures[1]);
    return read ? figures[0] : -1;
}

TEST(LibraryLoadMemory, LongFileNamesAddAlmostNothingToTheLoadsPeak) {
    MakeDirs("/var/packages/Harmona/var");
    const std::string shortNames = "/var/packages/Harmona/var/short.db";
    const std::string longNames = "/var/packages/Harmona/var/long.db";
    ASSERT_NO_FATAL_FAILURE(WriteLibrary(shortNames, kShortName));
    ASSERT_NO_FATAL_FAILURE(WriteLibrary(longNames, kLongName));
    std::size_t shortTracks = 0, longTracks = 0;
    const long shortPeak = PeakOfALoad(shortNames, shortTracks);
    const long longPeak = PeakOfALoad(longNames, longTracks);
    std::printf("peak of a load of %d tracks: %ld KiB with %zu-byte file names, %ld KiB with %zu\n",
                kTracks, shortPeak, kShortName, longPeak, kLongName);
    ASSERT_GT(shortPeak, 0);
    ASSERT_GT(longPeak, 0);
    EXPECT_EQ(shortTracks, static_cast<std::size_t>(kTracks));
    EXPECT_EQ(longTracks, static_cast<std::size_t>(kTracks));
    // The paths differ by about 11 MiB; a load that keeps them peaks that much higher.
    const long pathsKiB = static_cast<long>((kLongName - kShortName) * kTracks / 1024);
#ifndef HARMONA_SANITIZE
    // AddressSanitizer's redzones and quarantine make the sanitizer build's peaks another matter.
    EXPECT_LE(longPeak - shortPeak, pathsKiB / 8)
        << "long file names raised the load's peak by " << longPeak - shortPeak << " KiB";
#else
    (void)pathsKiB;
#endif
}

// The heap a loaded view holds (bytes in use after the load less before it, the view kept), in a
// child process of its own; -1 when it could not be measured.
long HeapOfAView(const std::string& dbPath) {
    int fds[2];
    if (pipe(fds) != 0)
        return -1;
    const pid_t child = fork();
    if (child < 0)
        return -1;
    if (child == 0) {
        close(fds[0]);
        const auto inUse = [] {
            const struct mallinfo2 info = mallinfo2();
            return static_cast<long>(info.uordblks + info.hblkhd);
        };
        const long before = inUse();
        const auto view = harmona::mediad::LibraryView::Load(dbPath, kShare);
        const long held = view && view->tracks().size() == kTracks ? inUse() - before : -1;
        const bool written = write(fds[1], &held, sizeof held) == sizeof held;
        _exit(written ? 0 : 1);
    }
    close(fds[1]);
    long held = -1;
    const bool read = ::read(fds[0], &held, sizeof held) == sizeof held;
    close(fds[0]);
    int status = 0;
    waitpid(child, &status, 0);
    return read ? held : -1;
}

// 50,000 tracks of titles of about 38 bytes in 500 albums: a track's numbers and references, its
// title, its places in the listings (all music, its folder, album, artist's album and genre) and
// its share of the containers. 168 bytes a track when every number was kept 64 bits wide.
TEST(LibraryLoadMemory, TheLoadedViewHoldsAtMostAHundredAndTwentyEightBytesATrack) {
#ifdef HARMONA_SANITIZE
    GTEST_SKIP() << "the heap in use is glibc's figure; AddressSanitizer's allocator gives none";
#endif
    MakeDirs("/var/packages/Harmona/var");
    const std::string dbPath = "/var/packages/Harmona/var/view.db";
    ASSERT_NO_FATAL_FAILURE(WriteLibrary(dbPath, kShortName));
    const long held = HeapOfAView(dbPath);
    std::printf("the view of %d tracks holds %ld bytes of heap (%ld a track)\n", kTracks, held,
                held / kTracks);
    ASSERT_GT(held, 0);
    EXPECT_LE(held, 128L * kTracks);
}

}  // namespace
}  // namespace harmona::test::mediad
