// Build tool: writes the UI text tables of every shipped language as one JSON object for the tree
// page, {"enu": {section: {key: text}}, "ger": ...}, read with the platform's own parser so that
// the page shows exactly the texts the CGI would look up (error replies name a section and a key).
//   harmona_web_texts OUTPUT.json TEXTDIR/enu TEXTDIR/ger ...
#include <json/value.h>
#include <json/writer.h>

#include <cstdio>
#include <fstream>
#include <string>

#include "platform/texts/LocalizedStringParser.h"

namespace {

std::string LanguageOf(const std::string& directory) {
    std::string path = directory;
    while (!path.empty() && path.back() == '/')
        path.pop_back();
    const auto slash = path.rfind('/');
    return slash == std::string::npos ? path : path.substr(slash + 1);
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 3) {
        std::fprintf(stderr, "usage: %s OUTPUT.json TEXTDIR...\n", argv[0]);
        return 2;
    }
    Json::Value all(Json::objectValue);
    for (int i = 2; i < argc; ++i) {
        Json::Value texts = VANU::ZET::LocalizedStringParser::ParseTexts(argv[i]);
        if (texts.empty()) {
            std::fprintf(stderr, "%s: no texts in %s\n", argv[0], argv[i]);
            return 1;
        }
        all[LanguageOf(argv[i])] = texts;
    }
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    builder["emitUTF8"] = true;
    std::ofstream out(argv[1], std::ios::binary | std::ios::trunc);
    out << Json::writeString(builder, all) << '\n';
    out.close();
    if (!out) {
        std::fprintf(stderr, "%s: cannot write %s\n", argv[0], argv[1]);
        return 1;
    }
    return 0;
}
