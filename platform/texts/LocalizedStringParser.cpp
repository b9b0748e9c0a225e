#include "platform/texts/LocalizedStringParser.h"

#include <syslog.h>

#include "platform/conf/ConfFile.h"

namespace VANU::ZET {
namespace {

class TextsVisitor : public harmona::conf::ConfVisitor {
  public:
    explicit TextsVisitor(Json::Value& texts) : texts_(texts) {}

    void Section(std::string_view name) override {
        section_ = &texts_[std::string(name)];
        if (!section_->isObject())
            *section_ = Json::Value(Json::objectValue);
    }
    // Keys before the first section belong to no section and have no place in the table.
    void Entry(std::string_view key, std::string_view value) override {
        if (section_ == nullptr)
            return;
        if (entries_ == kMaxTextEntries) {
            tooMany_ = true;
            return;
        }
        ++entries_;
        (*section_)[std::string(key)] = std::string(value);
    }

    bool TooMany() const { return tooMany_; }

  private:
    Json::Value& texts_;
    Json::Value* section_ = nullptr;
    std::size_t entries_ = 0;
    bool tooMany_ = false;
};

}  // namespace

Json::Value LocalizedStringParser::ParseTexts(std::string path) {
    Json::Value texts(Json::objectValue);
    TextsVisitor visitor(texts);
    const std::string file = path + "/strings";
    harmona::conf::ReadConf(file.c_str(), visitor);
    if (visitor.TooMany())
        syslog(LOG_ERR, "texts: %s holds more than %zu texts; the rest are ignored", file.c_str(),
               kMaxTextEntries);
    return texts;
}

}  // namespace VANU::ZET
