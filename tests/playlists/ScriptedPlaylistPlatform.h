// The script of ScriptedPlaylistPlatform.cpp: what the replaced listing calls answer.
#pragma once

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

namespace harmona::test {

struct ScriptedList {
    int result = 0;
    std::vector<std::pair<std::uint32_t, std::string>> records;
};

struct ScriptedPlatform {
    ScriptedList personal;
    ScriptedList shared;
    int smartResult = 1;
    std::string personalPrefDir;               // what the listing was asked for
    std::vector<std::string> smartCategories;  // the categories the smart listing was called with
};

ScriptedPlatform& Scripted();

}  // namespace harmona::test
