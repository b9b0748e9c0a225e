// One DIDL-Lite object (container or item) of a Browse result. Its values are read in one way,
// getValueByKey, and written by the parser (SoapBrowse.cpp) with Assign.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

class ItemNode {
  public:
    enum Field : unsigned char {
        Id,
        ParentId,
        Title,
        Class,
        ChildCount,
        Artist,
        Album,
        Res,
        Duration
    };
    static constexpr std::size_t kFieldCount = 9;

    // "id", "parentID", "title" (dc:title), "class" (upnp:class), "childCount", "artist"
    // (upnp:artist, else dc:creator), "album" (upnp:album), "res" (the first res URL), "duration"
    // (that res element's duration attribute, H+:MM:SS[.F+]); "" for a missing value or an unknown
    // key.
    std::string getValueByKey(const std::string& key) const;

    // Stores the nine values, in Field order, at once. A container of 100,000 objects keeps
    // 100,000 of these until its nodes are made: one block per object rather than nine strings
    // halves what they take.
    void Assign(const std::array<std::string_view, kFieldCount>& values);

    // The bytes of all nine values together.
    std::size_t TextBytes() const { return values_.size(); }

    bool isContainer = false;

  private:
    std::string_view Get(Field field) const;

    std::string values_;                             // the values one after another
    std::array<std::uint32_t, kFieldCount> ends_{};  // where each value ends in values_
};
