// The fixture of the music library tests: a user, and a text table of our own (so that the texts
// the tests expect are known here, whatever the shipped tables say).
#pragma once

#include <gtest/gtest.h>

#include <string>

#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"

namespace harmona::test {

inline void WriteLibraryTexts() {
    WriteFile(std::string(kTextsDir) + "enu/strings",
              "[common]\n"
              "class_music_allmusic=All Music\n"
              "class_music_userfile=Folders & Files\n"
              "class_music_album=Albums\n"
              "class_music_artist=Album Artists\n"
              "class_music_genre=Genres\n"
              "random_playlist=Random 100\n"
              "class_music_latestalbum=Recently Added\n");
}

inline void LibraryFixture() {
    WriteLibraryTexts();
    AddUser("admin", 1 | 4 | 8 | 16);
}

inline CgiResult GetTreeNode(const std::string& node) {
    return Get(Query({{"action", "gettreenode"}, {"node", node}}));
}

}  // namespace harmona::test
