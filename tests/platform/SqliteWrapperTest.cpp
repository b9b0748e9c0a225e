// The move-only SQLite wrapper of platform/lib/sqlite.
#include <gtest/gtest.h>

#include <utility>

#include "platform/lib/sqlite/Database.h"
#include "tests/harness/Fixtures.h"

using harmona::sqlite::Database;
using harmona::sqlite::Statement;

namespace {

TEST(SqliteWrapper, OpensRunsAndReadsBackBoundValues) {
    harmona::test::MakeDirs("/tmp/db");
    Database db = Database::Open("/tmp/db/x.db", SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, 100);
    ASSERT_TRUE(db) << db.Error();
    ASSERT_EQ(db.Execute("CREATE TABLE t (a INTEGER, b TEXT)"), SQLITE_OK);
    Statement insert = db.Prepare("INSERT INTO t VALUES (?1, ?2)");
    ASSERT_TRUE(insert);
    insert.Bind(1, std::int64_t{-5});
    insert.Bind(2, std::string_view("a\0b", 3));
    EXPECT_EQ(insert.Step(), SQLITE_DONE);
    insert.Reset();
    insert.Bind(1, std::int64_t{7});
    insert.BindNull(2);
    EXPECT_EQ(insert.Step(), SQLITE_DONE);

    Statement select = db.Prepare("SELECT a, b FROM t ORDER BY a");
    ASSERT_EQ(select.Step(), SQLITE_ROW);
    EXPECT_EQ(select.ColumnInt64(0), -5);
    EXPECT_EQ(select.ColumnText(1), std::string_view("a\0b", 3));
    ASSERT_EQ(select.Step(), SQLITE_ROW);
    EXPECT_EQ(select.ColumnType(1), SQLITE_NULL);
    EXPECT_EQ(select.ColumnText(1), "");
    EXPECT_EQ(select.Step(), SQLITE_DONE);
}

TEST(SqliteWrapper, FailuresGiveEmptyObjectsWithAReason) {
    Database missing = Database::OpenReadOnly("/tmp/no/such.db", 100);
    EXPECT_FALSE(missing);
    EXPECT_EQ(missing.Code(), SQLITE_CANTOPEN);
    EXPECT_FALSE(missing.Error().empty());

    Database db = Database::Open(":memory:", SQLITE_OPEN_READWRITE, 100);
    ASSERT_TRUE(db);
    Statement bad = db.Prepare("SELEKT 1");
    EXPECT_FALSE(bad);
    EXPECT_EQ(db.Code(), SQLITE_ERROR);
    EXPECT_NE(db.Error().find("syntax"), std::string::npos) << db.Error();
}

TEST(SqliteWrapper, MovingHandsOverOwnership) {
    Database db = Database::Open(":memory:", SQLITE_OPEN_READWRITE, 100);
    sqlite3* raw = db.Get();
    Database moved(std::move(db));
    EXPECT_FALSE(db);  // NOLINT(bugprone-use-after-move): the moved-from object is empty
    EXPECT_EQ(moved.Get(), raw);
    Statement one = moved.Prepare("SELECT 1");
    Statement other;
    other = std::move(one);
    EXPECT_FALSE(one);  // NOLINT(bugprone-use-after-move)
    ASSERT_EQ(other.Step(), SQLITE_ROW);
    EXPECT_EQ(other.ColumnInt64(0), 1);
    Database assigned;
    assigned = std::move(moved);
    EXPECT_EQ(assigned.Get(), raw);
}

TEST(SqliteWrapper, ReadOnlyConnectionCannotWrite) {
    harmona::test::MakeDirs("/tmp/db");
    {
        Database db =
            Database::Open("/tmp/db/r.db", SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, 100);
        ASSERT_EQ(db.Execute("CREATE TABLE t (a)"), SQLITE_OK);
    }
    Database db = Database::OpenReadOnly("/tmp/db/r.db", 100);
    ASSERT_TRUE(db);
    EXPECT_EQ(db.Execute("INSERT INTO t VALUES (1)"), SQLITE_READONLY);
}

}  // namespace
