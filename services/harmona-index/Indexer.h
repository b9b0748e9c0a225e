// The library indexer: keeps the track table of library.db in step with the audio share.
#pragma once

#include <atomic>
#include <cstddef>
#include <string>

namespace harmona::index {

// What one run did; printed by harmona-index and read by the tests and the benchmark.
struct IndexReport {
    bool ok = false;
    std::string error;
    std::size_t filesSeen = 0;   // audio files found on the share
    std::size_t added = 0;       // new rows
    std::size_t updated = 0;     // rows re-read because the file's mtime changed
    std::size_t removed = 0;     // rows whose file is gone
    std::size_t moved = 0;       // rows whose file was renamed or moved (same id, new path)
    std::size_t tagReads = 0;    // files whose tags were read (added + updated)
    std::size_t brokenTags = 0;  // of those, files TagLib could not read (indexed by file name)
};

// Files whose tags are read and written per transaction.
inline constexpr std::size_t kIndexBatchSize = 500;

// Scans `share` (an absolute folder path, no trailing "/") and brings the track table of the
// database at `dbPath` in step: creates the database and its folder when missing. New files are
// added, files whose mtime changed are re-read (keeping their id and "added"), a file renamed or
// moved keeps its row (matched by size and mtime, when that match is unique), rows of files no
// longer on the share are removed; the playlist tables' rows are never touched. A share that is
// not a directory is an error and changes nothing (an unmounted volume must not empty the
// library). When `stop` becomes true the pass ends at its next batch (whatever was committed
// stays, the rest is picked up by the next pass) with ok false and error "stopped".
IndexReport IndexShare(const std::string& share, const std::string& dbPath,
                       const std::atomic<bool>* stop = nullptr);

// One line for the log and standard output: "files=N added=A updated=U removed=R moved=M
// tagreads=T broken=B".
std::string FormatReport(const IndexReport& report);

}  // namespace harmona::index
