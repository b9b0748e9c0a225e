#include "platform/dma/ItemNode.h"

namespace {

struct KeyField {
    const char* key;
    ItemNode::Field field;
};

constexpr KeyField kKeys[] = {
    {"id", ItemNode::Id},
    {"parentID", ItemNode::ParentId},
    {"title", ItemNode::Title},
    {"class", ItemNode::Class},
    {"childCount", ItemNode::ChildCount},
    {"artist", ItemNode::Artist},
    {"album", ItemNode::Album},
    {"res", ItemNode::Res},
    {"duration", ItemNode::Duration},
};

}  // namespace

std::string ItemNode::getValueByKey(const std::string& key) const {
    for (const KeyField& known : kKeys)
        if (key == known.key)
            return std::string(Get(known.field));
    return "";
}

std::string_view ItemNode::Get(Field field) const {
    const std::uint32_t begin = field == 0 ? 0 : ends_[field - 1];
    return std::string_view(values_).substr(begin, ends_[field] - begin);
}

void ItemNode::Assign(const std::array<std::string_view, kFieldCount>& values) {
    std::size_t total = 0;
    for (std::string_view value : values)
        total += value.size();
    values_.clear();
    values_.reserve(total);
    for (std::size_t i = 0; i < kFieldCount; ++i) {
        values_.append(values[i]);
        ends_[i] = static_cast<std::uint32_t>(values_.size());
    }
}
