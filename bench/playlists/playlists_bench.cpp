// Playlist requests as a web server sees them: wall time and peak memory (VmHWM) of whole CGI
// processes (spawn, reply read to the end, exit), beside a trivial C CGI timed in the same run, in
// rounds that interleave the programs so that drift of the machine hits all alike.
//
// 1. "rerandom100" of the real audiotree.cgi over library.db files of 1,000, 100,000 and 1,000,000
//    tracks. Target: at 1,000,000 tracks within 2x its time at 1,000.
// 2. The playlist and smart playlist listings through the real "refresh" request with
//    10,000 personal playlist files, a personal smart playlist file of 10,000 playlists, and 10,000
//    shared playlists plus 10,000 shared smart playlists.
//
// Runs as root in a private mount namespace of its own, with tmpfs over /var/packages, /usr/vanu
// and /tmp holding the fixtures; nothing reaches the real machine but empty mount points.
#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <numeric>
#include <string>
#include <vector>

#include "bench/common/BenchProcess.h"
#include "platform/lib/sqlite/Database.h"
#include "platform/plugin/Plugin.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/Sandbox.h"

namespace {

[[noreturn]] void Die(const std::string& what) {
    std::fprintf(stderr, "bench_playlists: %s: %s\n", what.c_str(), std::strerror(errno));
    std::exit(2);
}

using harmona::test::MakeDirs;
using harmona::test::WriteFile;

constexpr const char* kLibraryDb = "/var/packages/Harmona/var/library.db";

void Exec(harmona::sqlite::Database& db, const char* sql) {
    if (db.Execute(sql) != SQLITE_OK) {
        std::fprintf(stderr, "bench_playlists: %s: %s\n", sql, db.Error().c_str());
        std::exit(2);
    }
}

// library.db with `tracks` tracks (ids 1..N) and `playlists` shared playlists, in the schema of
// (platform/README.md, "Music library database and random-100 playlist").
void MakeLibrary(long tracks, int playlists) {
    MakeDirs("/var/packages/Harmona/var");
    unlink(kLibraryDb);
    harmona::sqlite::Database db = harmona::sqlite::Database::Open(
        kLibraryDb, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, 5000);
    if (!db)
        Die("create " + std::string(kLibraryDb));
    Exec(db,
         "PRAGMA user_version = 1; PRAGMA journal_mode = OFF; PRAGMA synchronous = OFF;"
         "CREATE TABLE track (id INTEGER PRIMARY KEY, path TEXT NOT NULL UNIQUE, title TEXT,"
         " artist TEXT, album TEXT, album_artist TEXT, genre TEXT, year INTEGER, track_no INTEGER,"
         " disc_no INTEGER, duration_ms INTEGER, mtime INTEGER, added INTEGER);"
         "CREATE TABLE playlist (id INTEGER PRIMARY KEY CHECK (id BETWEEN 0 AND 4294967295),"
         " name TEXT NOT NULL);"
         "CREATE TABLE playlist_entry (playlist_id INTEGER NOT NULL REFERENCES playlist(id) ON"
         " DELETE CASCADE, position INTEGER NOT NULL, path TEXT NOT NULL,"
         " PRIMARY KEY (playlist_id, position));"
         "BEGIN");
    harmona::sqlite::Statement track = db.Prepare(
        "INSERT INTO track (id, path, title, artist, album, genre, duration_ms, added)"
        " VALUES (?1, ?2, ?3, ?4, ?5, 'Rock', ?6, 0)");
    for (long i = 1; i <= tracks; ++i) {
        const std::string artist = "Artist " + std::to_string(i % 997);
        track.Reset();
        track.Bind(1, std::int64_t{i});
        track.Bind(2, "/volume1/music/" + artist + "/Album " + std::to_string(i % 8191) +
                          "/Track " + std::to_string(i) + ".mp3");
        track.Bind(3, "Title " + std::to_string(i));
        track.Bind(4, artist);
        track.Bind(5, "Album " + std::to_string(i % 8191));
        track.Bind(6, std::int64_t{(i % 600 + 60) * 1000});
        if (track.Step() != SQLITE_DONE)
            Die("insert track");
    }
    harmona::sqlite::Statement playlist = db.Prepare("INSERT INTO playlist VALUES (?1, ?2)");
    for (int i = 0; i < playlists; ++i) {
        playlist.Reset();
        playlist.Bind(1, std::int64_t{i + 1});
        playlist.Bind(2, "Shared playlist " + std::to_string((i * 7919) % playlists));
        if (playlist.Step() != SQLITE_DONE)
            Die("insert playlist");
    }
    Exec(db, "COMMIT");
}

std::string SmartFile(int count, const char* prefix) {
    std::string text;
    for (int i = 0; i < count; ++i)
        text += "[" + std::string(prefix) + std::to_string((i * 7919) % count) +
                "]\nrule0=\"genre is Rock\"\n";
    return text;
}

struct Program {
    std::string label;
    std::string path;
    std::string query;
    std::string user;
    std::string expect;  // a text the reply must hold
    std::vector<double> ms;
    std::vector<double> maxRssKb;  // peak resident memory (VmHWM, KiB) of one traced run
};

std::vector<std::string> Environment(const Program& program) {
    return harmona::bench::CgiEnvironment(program.query, program.user);
}

// Runs one CGI process to its end; returns its wall time in ms and its output.
double RunOnce(const Program& program, std::string& output) {
    harmona::bench::ProcessRun run = harmona::bench::RunProcess(program.path, Environment(program));
    output = std::move(run.output);
    return run.wallMs;
}

using harmona::bench::Median;
using harmona::bench::Percentile;

// Runs `programs` in `runs` interleaved rounds (after a warm-up) and prints the figures.
void Measure(const std::string& title, std::vector<Program>& programs, int runs) {
    std::string output;
    for (Program& program : programs) {
        RunOnce(program, output);
        harmona::bench::RequireReplyHolds("bench_playlists", program.label, output, program.expect);
    }
    for (Program& program : programs)
        program.maxRssKb.push_back(
            harmona::bench::PeakMemoryKb(program.path, Environment(program)));
    const std::vector<std::vector<double>> times = harmona::bench::TimeInRotatedRounds(
        programs.size(), 5, runs, [&](std::size_t k) { return RunOnce(programs[k], output); });
    for (std::size_t k = 0; k < programs.size(); ++k)
        programs[k].ms = times[k];
    const double trivialMedian = Median(programs[0].ms);
    std::printf("\n%s (%d runs each)\n", title.c_str(), runs);
    std::printf("  %-46s %9s %9s %9s %9s %10s\n", "program", "median", "p90", "min", "x trivial",
                "peak mem");
    for (const Program& program : programs)
        std::printf("  %-46s %7.3fms %7.3fms %7.3fms %8.2fx %7.0f KiB\n", program.label.c_str(),
                    Median(program.ms), Percentile(program.ms, 0.9),
                    *std::min_element(program.ms.begin(), program.ms.end()),
                    Median(program.ms) / trivialMedian, Median(program.maxRssKb));
    std::fflush(stdout);
}

std::vector<long> ParseSizes(const char* text) {
    std::vector<long> sizes;
    for (const char* at = text; *at != '\0';) {
        char* end = nullptr;
        const long n = std::strtol(at, &end, 10);
        if (end == at || n < 1)
            Die("bad --sizes");
        sizes.push_back(n);
        at = *end == ',' ? end + 1 : end;
    }
    return sizes;
}

}  // namespace

int main(int argc, char** argv) {
    int runs = 100;
    int lists = 10000;
    std::vector<long> sizes = {1000, 100000, 1000000};
    for (int i = 1; i + 1 < argc; i += 2) {
        if (std::strcmp(argv[i], "--runs") == 0)
            runs = std::max(1, std::atoi(argv[i + 1]));
        else if (std::strcmp(argv[i], "--lists") == 0)
            lists = std::max(1, std::atoi(argv[i + 1]));
        else if (std::strcmp(argv[i], "--sizes") == 0)
            sizes = ParseSizes(argv[i + 1]);
    }
    const std::string dir = harmona::plugin::ProgramDirectory();
    // The private mount and network namespaces of the tests, with tmpfs over the fixed roots.
    harmona::test::EnterSandbox();
    WriteFile(
        "/var/packages/Harmona/etc/users.conf",
        "[admin]\npermission=29\nlanguage=enu\n[alice]\npermission=29\n[bob]\npermission=29\n");
    WriteFile("/var/packages/Harmona/target/app/texts/enu/strings",
              "[player]\nrefresh_btn_title=Refresh\n[playlist]\nnewplaylist=\"New Playlist\"\n"
              "error_create_random100=\"Could not create the random playlist.\"\n");

    const std::string trivial = dir + "bench_trivial_cgi";
    const std::string cgi = dir + "audiotree.cgi";
    const std::string ok = "{\"success\":true}";

    std::vector<double> randomMedians;
    for (long size : sizes) {
        const auto start = std::chrono::steady_clock::now();
        MakeLibrary(size, 0);
        std::printf(
            "\n[library.db with %ld tracks written in %.1f s]\n", size,
            std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count());
        std::vector<Program> programs = {
            {"trivial C CGI", trivial, "", "admin", ok, {}, {}},
            {"audiotree.cgi rerandom100, " + std::to_string(size) + " tracks",
             cgi,
             "action=rerandom100",
             "admin",
             ok,
             {},
             {}}};
        Measure("Random-100 over " + std::to_string(size) + " tracks", programs, runs);
        randomMedians.push_back(Median(programs[1].ms));
    }
    if (randomMedians.size() > 1)
        std::printf("\nRandom-100 median at %ld tracks / at %ld tracks: %.2fx (target <= 2x)\n",
                    sizes.back(), sizes.front(), randomMedians.back() / randomMedians.front());

    // The listings: alice has `lists` playlist files, bob a smart playlist file of `lists`
    // playlists; the shared category has `lists` playlists and `lists` smart playlists.
    MakeLibrary(1000, lists);
    for (int i = 0; i < lists; ++i)
        WriteFile("/usr/vanu/etc/preference/alice/playlists/Playlist " +
                      std::to_string((i * 7919) % lists) + ".m3u",
                  "#EXTM3U\n");
    WriteFile("/usr/vanu/etc/preference/bob/playlists/smart.playlist", SmartFile(lists, "Smart "));
    WriteFile("/var/packages/Harmona/etc/smart.playlist", SmartFile(lists, "Shared smart "));
    const std::string n = std::to_string(lists);
    std::vector<Program> listings = {
        {"trivial C CGI", trivial, "", "admin", ok, {}, {}},
        {"refresh personal, " + n + " playlist files",
         cgi,
         "action=refresh&target=personal",
         "alice",
         "musiclib_music_personal/playlist/Playlist " + std::to_string(lists - 1),
         {},
         {}},
        {"refresh personal, " + n + " smart playlists",
         cgi,
         "action=refresh&target=personal",
         "bob",
         "musiclib_music_personal/smart/Smart " + std::to_string(lists - 1),
         {},
         {}},
        {"refresh shared, " + n + " + " + n + " smart",
         cgi,
         "action=refresh&target=shared",
         "admin",
         "musiclib_music_shared/smart/Shared smart " + std::to_string(lists - 1),
         {},
         {}}};
    Measure("Playlist listings through the real refresh request", listings, runs);
    return 0;
}
