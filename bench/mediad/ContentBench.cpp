// The media server's content without the network: ContentDirectory called directly over a
// generated library.db of 100,000 and of 200,000 tracks. Each figure is the median of several
// runs, beside the raw SQLite query that reads the same rows in the same run (the floor any
// server over this index starts from).
//   build/content_bench [tracks ...]      (default: 100000 200000)
#include <malloc.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <string>
#include <vector>

#include "platform/lib/sqlite/Database.h"
#include "platform/medialib/LibrarySchema.h"
#include "services/harmona-mediad/ContentDirectory.h"
#include "tests/mediad/DirectBrowse.h"

namespace {

using harmona::mediad::BrowseResult;
using harmona::mediad::ContentDirectory;
using harmona::test::mediad::Browse;
using Clock = std::chrono::steady_clock;

constexpr const char* kShare = "/volume1/music";
constexpr const char* kMediaBase = "http://127.0.0.1:50003/media/";

// A library shaped like a large real one: 2,000 artists with 5 albums each of up to 20 tracks
// (then repeating), 25 genres, years 1950 to 2024, titles of ordinary length.
bool MakeLibrary(const std::string& path, int tracks) {
    unlink(path.c_str());
    harmona::sqlite::Database db = harmona::sqlite::Database::Open(
        path.c_str(), SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, 1000);
    if (!db || !harmona::medialib::EnsureLibrarySchema(db) || db.Execute("BEGIN") != SQLITE_OK)
        return false;
    harmona::sqlite::Statement insert = db.Prepare(
        "INSERT INTO track (path, title, artist, album, album_artist, genre, year, track_no, "
        "disc_no, duration_ms, mtime, added, size) VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, 1, "
        "?9, 0, ?10, ?11)");
    for (int i = 0; i < tracks; ++i) {
        const int artist = i % 2000;
        const int album = (i / 2000) % 5;
        const int number = (i / 10000) % 20 + 1;
        const std::string artistName = "Artist " + std::to_string(artist);
        const std::string albumName =
            "Album " + std::to_string(artist) + "-" + std::to_string(album);
        const std::string title = "A Song Title Of Ordinary Length " + std::to_string(i);
        insert.Reset();
        insert.Bind(1, std::string(kShare) + "/" + artistName + "/" + albumName + "/" +
                           std::to_string(i) + " " + title + ".mp3");
        insert.Bind(2, title);
        insert.Bind(3, artistName);
        insert.Bind(4, albumName);
        insert.Bind(5, artistName);
        insert.Bind(6, "Genre " + std::to_string(i % 25));
        insert.Bind(7, static_cast<int64_t>(1950 + i % 75));
        insert.Bind(8, static_cast<int64_t>(number));
        insert.Bind(9, static_cast<int64_t>(180000 + i % 120000));
        insert.Bind(10, static_cast<int64_t>(1700000000 + i));
        insert.Bind(11, static_cast<int64_t>(4000000 + i % 1000000));
        if (insert.Step() != SQLITE_DONE)
            return false;
    }
    return harmona::medialib::BumpLibraryUpdateCount(db) && db.Execute("COMMIT") == SQLITE_OK;
}

double Milliseconds(Clock::duration duration) {
    return std::chrono::duration<double, std::milli>(duration).count();
}

// The median wall time of `runs` calls, in milliseconds.
double Median(int runs, const std::function<void()>& call) {
    std::vector<double> times;
    for (int i = 0; i < runs; ++i) {
        const Clock::time_point start = Clock::now();
        call();
        times.push_back(Milliseconds(Clock::now() - start));
    }
    std::sort(times.begin(), times.end());
    return times[times.size() / 2];
}

// The floor: the rows a listing of `limit` tracks needs, read with SQLite and nothing else.
double RawQuery(const std::string& dbPath, int limit, int runs) {
    return Median(runs, [&] {
        sqlite3* db = nullptr;
        sqlite3_open_v2(dbPath.c_str(), &db, SQLITE_OPEN_READONLY, nullptr);
        sqlite3_stmt* stmt = nullptr;
        const std::string sql =
            "SELECT id, path, title, artist, album, genre, track_no, duration_ms, size FROM "
            "track ORDER BY title COLLATE NOCASE, id LIMIT " +
            std::to_string(limit);
        sqlite3_prepare_v2(db, sql.c_str(), -1, &stmt, nullptr);
        std::size_t bytes = 0;
        while (sqlite3_step(stmt) == SQLITE_ROW) {
            for (int column = 0; column < 9; ++column)
                bytes += static_cast<std::size_t>(sqlite3_column_bytes(stmt, column));
        }
        sqlite3_finalize(stmt);
        sqlite3_close(db);
        if (bytes == 0)
            std::fprintf(stderr, "content bench: the raw query read nothing\n");
    });
}

long ResidentKiB() {
    std::ifstream status("/proc/self/status");
    std::string line;
    while (std::getline(status, line)) {
        if (line.rfind("VmRSS:", 0) == 0)
            return std::atol(line.c_str() + 6);
    }
    return -1;
}

void Row(const char* measure, double ms, double baseline, const std::string& note = "") {
    std::printf("| %-52s | %10.3f ms | %8.3f x | %s\n", measure, ms, ms / baseline, note.c_str());
}

bool RunSize(const std::string& dir, int tracks) {
    const std::string dbPath = dir + "/library-" + std::to_string(tracks) + ".db";
    if (!MakeLibrary(dbPath, tracks)) {
        std::fprintf(stderr, "content bench: cannot write %s\n", dbPath.c_str());
        return false;
    }
    const double raw = RawQuery(dbPath, tracks, 5);
    const double rawPage = RawQuery(dbPath, 50, 51);
    std::printf(
        "\n%d tracks (baseline: the raw SQLite query of the listed rows, %.3f ms for "
        "all, %.3f ms for 50)\n",
        tracks, raw, rawPage);
    std::printf("| %-52s | %13s | %10s |\n", "measure", "median", "vs raw");

    malloc_trim(0);
    const long before = ResidentKiB();
    ContentDirectory directory(dbPath, kShare, kMediaBase);
    const Clock::time_point start = Clock::now();
    const BrowseResult first = Browse(directory, "0", true);
    const double load = Milliseconds(Clock::now() - start);
    malloc_trim(0);
    const long after = ResidentKiB();
    if (first.error != 0) {
        std::fprintf(stderr, "content bench: Browse failed: %d\n", first.error);
        return false;
    }
    Row("tree load after a library change (once)", load, raw,
        "the tree holds " + std::to_string((after - before) / 1024) + " MiB");
    Row("BrowseMetadata \"0\"", Median(1001, [&] { Browse(directory, "0", true); }), rawPage);
    // The whole container as a client must fetch it: paging on from NumberReturned while fewer
    // than TotalMatches came (a reply stops near kMaxResultBytes).
    std::size_t bytes = 0, requests = 0;
    uint32_t returned = 0;
    const auto fetchAll = [&](const std::string& sort) {
        bytes = requests = 0;
        returned = 0;
        for (;;) {
            const BrowseResult page = Browse(directory, "music_all", false, returned, 0, sort);
            ++requests;
            bytes += page.didl.size();
            returned += page.numberReturned;
            if (page.error != 0 || page.numberReturned == 0 || returned >= page.totalMatches)
                break;
        }
    };
    const double whole = Median(5, [&] { fetchAll(""); });
    Row("all of \"music_all\", paged as a client must", whole, raw,
        std::to_string(returned) + " objects in " + std::to_string(requests) + " requests, " +
            std::to_string(bytes / (1024 * 1024)) + " MiB DIDL-Lite");
    Row("  the same sorted +upnp:album,+upnp:originalTrackNumber",
        Median(5, [&] { fetchAll("+upnp:album,+upnp:originalTrackNumber"); }), raw);
    Row("a page of 50 from index 50,000",
        Median(51, [&] { Browse(directory, "music_all", false, 50000, 50); }), rawPage);
    Row("a page of 50 of \"random\"",
        Median(51, [&] { Browse(directory, "random", false, 0, 50); }), rawPage);
    Row("BrowseDirectChildren \"music_album\", all",
        Median(5, [&] { Browse(directory, "music_album", false); }), raw);
    unlink(dbPath.c_str());
    return true;
}

}  // namespace

int main(int argc, char** argv) {
    std::vector<int> sizes;
    for (int i = 1; i < argc; ++i)
        sizes.push_back(std::atoi(argv[i]));
    if (sizes.empty())
        sizes = {100000, 200000};
    char dir[] = "/tmp/harmona-content-bench-XXXXXX";
    if (mkdtemp(dir) == nullptr) {
        std::perror("mkdtemp");
        return 1;
    }
    bool ok = true;
    for (const int tracks : sizes) {
        if (tracks > 0)
            ok = RunSize(dir, tracks) && ok;
    }
    rmdir(dir);
    return ok ? 0 : 1;
}
