#include "tests/mediad/MediadTestKit.h"

#include <arpa/inet.h>
#include <curl/curl.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <taglib/fileref.h>
#include <taglib/tag.h>
#include <taglib/tpropertymap.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <pugixml.hpp>
#include <sstream>
#include <thread>

#include "tests/harness/Fixtures.h"
#include "tests/harness/Network.h"

namespace harmona::test::mediad {
namespace {

std::string Quoted(const std::string& text) {
    return "'" + text + "'";  // the kit's own names never hold a single quote
}

void Run(const std::string& command) {
    if (std::system(command.c_str()) != 0)
        std::fprintf(stderr, "mediad test kit: command failed: %s\n", command.c_str());
}

size_t Collect(char* data, size_t size, size_t count, void* out) {
    static_cast<std::string*>(out)->append(data, size * count);
    return size * count;
}

std::string LocalName(const char* name) {
    const char* colon = std::strrchr(name, ':');
    return colon != nullptr ? colon + 1 : name;
}

pugi::xml_node FindLocal(pugi::xml_node node, const char* localName) {
    for (pugi::xml_node child : node.children()) {
        if (LocalName(child.name()) == localName)
            return child;
        if (pugi::xml_node found = FindLocal(child, localName))
            return found;
    }
    return {};
}

std::string Escape(const std::string& text) {
    std::string out;
    for (char c : text) {
        if (c == '&')
            out += "&amp;";
        else if (c == '<')
            out += "&lt;";
        else if (c == '>')
            out += "&gt;";
        else
            out += c;
    }
    return out;
}

std::string Post(const std::string& action, const std::string& arguments, long* status) {
    const std::string body =
        "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n"
        "<s:Envelope xmlns:s=\"http://schemas.xmlsoap.org/soap/envelope/\" "
        "s:encodingStyle=\"http://schemas.xmlsoap.org/soap/encoding/\"><s:Body><u:" +
        action + " xmlns:u=\"urn:schemas-upnp-org:service:ContentDirectory:1\">" + arguments +
        "</u:" + action + "></s:Body></s:Envelope>";
    std::string reply;
    CURL* curl = curl_easy_init();
    curl_slist* headers = nullptr;
    headers = curl_slist_append(headers, "Content-Type: text/xml; charset=\"utf-8\"");
    const std::string soapAction =
        "SOAPACTION: \"urn:schemas-upnp-org:service:ContentDirectory:1#" + action + "\"";
    headers = curl_slist_append(headers, soapAction.c_str());
    curl_easy_setopt(curl, CURLOPT_URL, kControlUrl);
    curl_easy_setopt(curl, CURLOPT_HTTPHEADER, headers);
    curl_easy_setopt(curl, CURLOPT_POSTFIELDS, body.c_str());
    curl_easy_setopt(curl, CURLOPT_WRITEFUNCTION, Collect);
    curl_easy_setopt(curl, CURLOPT_WRITEDATA, &reply);
    curl_easy_setopt(curl, CURLOPT_TIMEOUT, 30L);
    *status = 0;
    if (curl_easy_perform(curl) == CURLE_OK)
        curl_easy_getinfo(curl, CURLINFO_RESPONSE_CODE, status);
    curl_slist_free_all(headers);
    curl_easy_cleanup(curl);
    return reply;
}

long NumberOf(pugi::xml_node node) {
    return node ? std::atol(node.text().get()) : -1;
}

}  // namespace

void WriteTags(const std::string& path, const Tags& tags) {
    TagLib::FileRef file(path.c_str());
    if (file.isNull() || file.tag() == nullptr) {
        std::fprintf(stderr, "mediad test kit: TagLib cannot open %s\n", path.c_str());
        return;
    }
    TagLib::Tag* tag = file.tag();
    tag->setTitle(TagLib::String(tags.title, TagLib::String::UTF8));
    tag->setArtist(TagLib::String(tags.artist, TagLib::String::UTF8));
    tag->setAlbum(TagLib::String(tags.album, TagLib::String::UTF8));
    tag->setGenre(TagLib::String(tags.genre, TagLib::String::UTF8));
    tag->setYear(tags.year);
    tag->setTrack(tags.track);
    TagLib::PropertyMap properties = file.file()->properties();
    if (!tags.albumArtist.empty())
        properties.replace("ALBUMARTIST", TagLib::StringList(TagLib::String(tags.albumArtist,
                                                                            TagLib::String::UTF8)));
    if (tags.disc > 0)
        properties.replace("DISCNUMBER", TagLib::StringList(TagLib::String::number(tags.disc)));
    file.file()->setProperties(properties);
    file.save();
}

void MakeAudioFile(const std::string& path, const Tags& tags) {
    MakeDirs(path.substr(0, path.rfind('/')));
    Run("sox -q -n -r 8000 -c 1 " + Quoted(path) + " synth 0.3 sine 440");
    WriteTags(path, tags);
}

const std::map<std::string, Tags>& StandardShare() {
    static const std::map<std::string, Tags> share = {
        {"Rock/Alpha & Omega/01 First.flac",
         {"First <Song> & \"more\"", "Band A", "Alpha & Omega", "Band A", "Rock", 2001, 1, 1}},
        {"Rock/Alpha & Omega/02 Second.ogg",
         {"Second", "Band A feat. X", "Alpha & Omega", "Band A", "Rock", 2001, 2, 1}},
        {"Jazz/Blue/Late/03 Third.mp3", {"Third", "Trio", "Blue", "", "Jazz", 1999, 3, 0}},
        {"Jazz/Blue/04 Fourth.wav", {"Fourth", "Trio", "Blue", "", "Jazz", 1999, 4, 0}},
        {"loose.ogg", {"Zulu", "Solo", "", "", "Pop", 0, 0, 0}},
    };
    return share;
}

void MakeStandardShare() {
    for (const auto& [relative, tags] : StandardShare())
        MakeAudioFile(std::string(kShare) + "/" + relative, tags);
    WriteFile(std::string(kShare) + "/Jazz/notes.txt", "not audio\n");
}

IndexRun RunIndexer() {
    IndexRun run;
    FILE* pipe = popen(HARMONA_INDEX_PATH " 2>&1", "r");
    if (pipe == nullptr)
        return run;
    char buffer[4096];
    while (std::fgets(buffer, sizeof(buffer), pipe) != nullptr)
        run.output += buffer;
    const int status = pclose(pipe);
    run.exitStatus = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    std::istringstream words(run.output);
    std::string word;
    while (words >> word) {
        const std::size_t equals = word.find('=');
        if (equals != std::string::npos)
            run.counts[word.substr(0, equals)] = std::atol(word.c_str() + equals + 1);
    }
    return run;
}

void IndexStandardShare() {
    MakeStandardShare();
    const IndexRun run = RunIndexer();
    ASSERT_EQ(run.exitStatus, 0) << run.output;
}

void SetUpNetwork() {
    VethPair("hm0", "192.0.2.1", "hm1", "192.0.2.2");
}

bool ServerProcess::Start(const std::vector<std::string>& extraArgs, int readyMs) {
    std::vector<std::string> argv = {HARMONA_MEDIAD_PATH, "--interface", kInterface};
    argv.insert(argv.end(), extraArgs.begin(), extraArgs.end());
    service_ = Service::Start(argv, "/tmp/harmona-mediad.log");
    const pid_t pid = service_.pid();
    return service_.WaitUntilReady([pid] { return PidFileNames(kPidFile, pid); }, readyMs);
}

int ServerProcess::Stop() {
    if (!service_)
        return -1;
    const int status = service_.Stop(SIGTERM, 10000);
    return status >= 0 && WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

BrowseReply SoapBrowse(const std::string& objectId, const std::string& flag, unsigned start,
                       unsigned count, const std::string& sort) {
    BrowseReply reply;
    reply.raw = Post("Browse",
                     "<ObjectID>" + Escape(objectId) + "</ObjectID><BrowseFlag>" + flag +
                         "</BrowseFlag><Filter>*</Filter><StartingIndex>" + std::to_string(start) +
                         "</StartingIndex><RequestedCount>" + std::to_string(count) +
                         "</RequestedCount><SortCriteria>" + Escape(sort) + "</SortCriteria>",
                     &reply.httpStatus);
    pugi::xml_document envelope;
    if (!envelope.load_string(reply.raw.c_str()))
        return reply;
    if (pugi::xml_node error = FindLocal(envelope, "errorCode")) {
        reply.upnpError = std::atoi(error.text().get());
        return reply;
    }
    reply.numberReturned = NumberOf(FindLocal(envelope, "NumberReturned"));
    reply.totalMatches = NumberOf(FindLocal(envelope, "TotalMatches"));
    reply.updateId = NumberOf(FindLocal(envelope, "UpdateID"));
    pugi::xml_document didl;
    if (!didl.load_string(FindLocal(envelope, "Result").text().get()))
        return reply;
    for (pugi::xml_node object : didl.first_child().children()) {
        DidlEntry entry;
        entry.container = std::string(object.name()) == "container";
        entry.id = object.attribute("id").value();
        entry.parentId = object.attribute("parentID").value();
        entry.childCount =
            object.attribute("childCount") ? object.attribute("childCount").as_int() : -1;
        entry.title = object.child("dc:title").text().get();
        entry.upnpClass = object.child("upnp:class").text().get();
        entry.artist = object.child("upnp:artist").text().get();
        entry.album = object.child("upnp:album").text().get();
        entry.genre = object.child("upnp:genre").text().get();
        entry.res = object.child("res").text().get();
        entry.protocolInfo = object.child("res").attribute("protocolInfo").value();
        reply.entries.push_back(entry);
    }
    return reply;
}

std::string SoapSimpleAction(const std::string& action, const std::string& outArgument) {
    long status = 0;
    const std::string raw = Post(action, "", &status);
    pugi::xml_document envelope;
    if (status != 200 || !envelope.load_string(raw.c_str()))
        return "<failed>";
    pugi::xml_node out = FindLocal(envelope, outArgument.c_str());
    return out ? out.text().get() : "<missing>";
}

HttpReply HttpGet(const std::string& url, const std::string& range) {
    HttpReply reply;
    CURL* curl = curl_easy_init();
    curl_easy_setopt(curl, CURLOPT_URL, url.c_str());
    curl_easy_setopt(curl, CURLOPT_WRITEFUNCTION, Collect);
    curl_easy_setopt(curl, CURLOPT_WRITEDATA, &reply.body);
    curl_easy_setopt(curl, CURLOPT_HEADERFUNCTION, Collect);
    curl_easy_setopt(curl, CURLOPT_HEADERDATA, &reply.headers);
    curl_easy_setopt(curl, CURLOPT_TIMEOUT, 30L);
    if (!range.empty())
        curl_easy_setopt(curl, CURLOPT_RANGE, range.c_str());
    if (curl_easy_perform(curl) == CURLE_OK) {
        curl_easy_getinfo(curl, CURLINFO_RESPONSE_CODE, &reply.status);
        char* type = nullptr;
        curl_easy_getinfo(curl, CURLINFO_CONTENT_TYPE, &type);
        reply.contentType = type != nullptr ? type : "";
    }
    curl_easy_cleanup(curl);
    return reply;
}

std::string RawHttpExchange(const std::string& address, unsigned short port,
                            const std::string& request, int waitMs,
                            const std::string& sourceAddress) {
    const int s = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (s < 0)
        return "";
    if (!sourceAddress.empty()) {
        sockaddr_in local{};
        local.sin_family = AF_INET;
        inet_pton(AF_INET, sourceAddress.c_str(), &local.sin_addr);
        bind(s, reinterpret_cast<sockaddr*>(&local), sizeof(local));
    }
    sockaddr_in server{};
    server.sin_family = AF_INET;
    server.sin_port = htons(port);
    inet_pton(AF_INET, address.c_str(), &server.sin_addr);
    std::string answer;
    if (connect(s, reinterpret_cast<sockaddr*>(&server), sizeof(server)) == 0 &&
        send(s, request.data(), request.size(), MSG_NOSIGNAL) ==
            static_cast<ssize_t>(request.size())) {
        pollfd pfd{s, POLLIN, 0};
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(waitMs);
        while (std::chrono::steady_clock::now() < deadline) {
            const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
                deadline - std::chrono::steady_clock::now());
            if (poll(&pfd, 1, static_cast<int>(left.count()) + 1) <= 0)
                break;
            char buffer[4096];
            const ssize_t got = recv(s, buffer, sizeof(buffer), 0);
            if (got <= 0)
                break;
            answer.append(buffer, static_cast<std::size_t>(got));
            // One response is enough: its headers and as many body bytes as it announced.
            const std::size_t end = answer.find("\r\n\r\n");
            if (end == std::string::npos)
                continue;
            std::string head = answer.substr(0, end);
            std::transform(head.begin(), head.end(), head.begin(),
                           [](unsigned char c) { return std::tolower(c); });
            const std::size_t length = head.find("content-length:");
            if (length != std::string::npos &&
                answer.size() >= end + 4 + std::strtoul(head.c_str() + length + 15, nullptr, 10))
                break;
        }
    }
    close(s);
    return answer;
}

}  // namespace harmona::test::mediad
