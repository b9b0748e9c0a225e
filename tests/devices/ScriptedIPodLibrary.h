// A scripted VANUIPodPlaylistGetAll, linked in place of the real one (which lives in a source unit
// of its own) by devices_scripted_ipod_tests: it yields keys that no real iPod can hold and
// failures after a list was built.
#pragma once

#include <string>
#include <utility>
#include <vector>

namespace harmona::test {

struct ScriptedIPod {
    int result = 0;                                            // what the call returns
    std::vector<std::pair<std::string, std::string>> records;  // name, key, in list order
    int calls = 0;                                             // how often it was called
};

// The script that the next calls follow.
ScriptedIPod& Script();

}  // namespace harmona::test
