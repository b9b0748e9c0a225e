// The schema of library.db (PRAGMA user_version = 1; platform/README.md, "Music library database
// and random-100 playlist"): the music library index and the shared playlists, plus the indexes
// the media server's queries use.
#pragma once

#include <cstdint>

#include "platform/lib/sqlite/Database.h"

namespace harmona::medialib {

inline constexpr int kLibrarySchemaVersion = 1;

// Creates whatever of the schema is missing (tables, indexes, user_version) in one transaction;
// rows already there, the playlist tables' included, are never touched. The search index
// (platform/README.md, "Search index": full-text tables and the triggers that keep them in step
// with the track table) is made anew and filled from the track table when any part of it is
// missing. False on failure, or when
// the file carries a user_version other than 0 or 1.
bool EnsureLibrarySchema(sqlite::Database& db);

// The library's update count: table library_update holds one row whose id grows by one with every
// indexer transaction that changed the track table (in that transaction), so that readers (the
// media server's SystemUpdateID) learn of a change without comparing rows and never see changed
// rows under the count of before. -1 when the table is missing or empty.
int64_t LibraryUpdateCount(sqlite::Database& db);
// Adds one to the update count (the first becomes 1); run it inside the writer's transaction.
bool BumpLibraryUpdateCount(sqlite::Database& db);

}  // namespace harmona::medialib
