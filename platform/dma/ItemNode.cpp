#include "ItemNode.h"

std::string ItemNode::getValueByKey(const std::string& key) const {
    if (key == "id")
        return id;
    if (key == "parentID")
        return parentID;
    if (key == "title")
        return title;
    if (key == "class")
        return upnpClass;
    if (key == "childCount")
        return childCount;
    if (key == "artist")
        return artist;
    if (key == "album")
        return album;
    if (key == "res")
        return res;
    return "";
}
