// One DIDL-Lite object (container or item) of a Browse result (platform.md section 9).
#pragma once

#include <string>

class ItemNode {
  public:
    // "id", "parentID", "title" (dc:title), "class" (upnp:class), "childCount", "artist"
    // (upnp:artist, else dc:creator), "album" (upnp:album), "res" (the first res URL); "" for a
    // missing value or an unknown key.
    std::string getValueByKey(const std::string& key) const;

    bool isContainer = false;
    std::string id;
    std::string parentID;
    std::string title;
    std::string upnpClass;
    std::string childCount;
    std::string artist;
    std::string album;
    std::string res;
};
