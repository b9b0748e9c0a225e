// The search index of library.db as the media server's live library keeps it: files added,
// re-tagged and removed while it watches the share are found by their new words, within its
// passes, and no longer by the old ones.
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <utime.h>

#include <unistd.h>

#include <chrono>
#include <condition_variable>
#include <ctime>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "services/harmona-mediad/LiveLibrary.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/mediad/MediadTestKit.h"

namespace harmona::test::mediad {
namespace {

using namespace std::chrono_literals;
using harmona::mediad::LiveLibrary;
using harmona::mediad::LiveLibraryOptions;

// How many tracks have words beginning with `word` (in title, artist, album or genre).
long long Matches(const std::string& word) {
    sqlite3* db = nullptr;
    long long count = -1;
    if (sqlite3_open_v2(kLibraryDb, &db, SQLITE_OPEN_READONLY, nullptr) == SQLITE_OK) {
        sqlite3_stmt* stmt = nullptr;
        const std::string match = "\"" + word + "\"*";
        if (sqlite3_prepare_v2(db, "SELECT COUNT(*) FROM track_search WHERE track_search MATCH ?1",
                               -1, &stmt, nullptr) == SQLITE_OK) {
            sqlite3_bind_text(stmt, 1, match.c_str(), -1, SQLITE_TRANSIENT);
            if (sqlite3_step(stmt) == SQLITE_ROW)
                count = sqlite3_column_int64(stmt, 0);
        }
        sqlite3_finalize(stmt);
    }
    sqlite3_close(db);
    return count;
}

class LiveSearchIndex : public ::testing::Test {
  protected:
    void SetUp() override {
        MakeStandardShare();
        LiveLibraryOptions options;
        options.sharePath = kShare;
        options.dbPath = kLibraryDb;
        options.quietPeriod = 200ms;
        options.onIndexed = [this](const harmona::index::IndexReport&) {
            std::lock_guard<std::mutex> lock(mutex_);
            ++passes_;
            passed_.notify_all();
        };
        live_ = std::make_unique<LiveLibrary>(options);
        std::string error;
        ASSERT_TRUE(live_->Start(error)) << error;
        ASSERT_TRUE(WaitForPasses(1));
    }
    void TearDown() override { live_->Stop(); }

    bool WaitForPasses(std::size_t count) {
        std::unique_lock<std::mutex> lock(mutex_);
        return passed_.wait_for(lock, 20s, [&] { return passes_ >= count; });
    }
    // Waits until `condition` holds after a pass (at most 20 s).
    template <typename Condition>
    bool AfterPasses(Condition condition) {
        const auto deadline = std::chrono::steady_clock::now() + 20s;
        while (std::chrono::steady_clock::now() < deadline) {
            if (condition())
                return true;
            std::this_thread::sleep_for(100ms);
        }
        return condition();
    }

    std::unique_ptr<LiveLibrary> live_;
    std::mutex mutex_;
    std::condition_variable passed_;
    std::size_t passes_ = 0;
};

TEST_F(LiveSearchIndex, FilesAddedChangedAndRemovedWhileWatchedAreFoundByTheirCurrentWords) {
    EXPECT_EQ(Matches("zul"), 1);
    EXPECT_EQ(Matches("trio"), 2);

    MakeAudioFile(std::string(kShare) + "/New/added.ogg",
                  {"Xylophone Morning", "Newcomer", "Fresh", "", "Pop"});
    ASSERT_TRUE(AfterPasses([] { return Matches("xylo") == 1; }));

    const std::string path = std::string(kShare) + "/loose.ogg";
    WriteTags(path, {"Quokka Song", "Solo", "", "", "Pop"});
    struct utimbuf later {
        time(nullptr) + 5, time(nullptr) + 5
    };
    utime(path.c_str(), &later);
    ASSERT_TRUE(AfterPasses([] { return Matches("quokka") == 1; }));
    EXPECT_EQ(Matches("zul"), 0);

    ASSERT_EQ(unlink((std::string(kShare) + "/Jazz/Blue/Late/03 Third.mp3").c_str()), 0);
    ASSERT_TRUE(AfterPasses([] { return Matches("trio") == 1; }));
    EXPECT_EQ(Matches("third"), 0);
}

}  // namespace
}  // namespace harmona::test::mediad
