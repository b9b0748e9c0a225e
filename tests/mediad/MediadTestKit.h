// The test kit of the indexer and media server tests: a generated audio share (sox makes the
// files, TagLib writes their tags), the real harmona-index and harmona-mediad run as child
// processes through the one kit (tests/harness/Service.h; the server serves 127.0.0.1 by itself;
// tests of the LAN side add a network of two veth ends in the test's namespace, Network.h), and an
// independent ContentDirectory client (a hand-written SOAP body over libcurl, the reply read with
// pugixml).
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "tests/harness/Service.h"

namespace harmona::test::mediad {

inline constexpr const char* kShare = "/volume1/music";
inline constexpr const char* kControlUrl = "http://127.0.0.1:50003/ContentDirectory/control";
inline constexpr const char* kPidFile = "/run/vanu/service/3.pid";
inline constexpr const char* kInterface = "hm0";

struct Tags {
    std::string title, artist, album, albumArtist, genre;
    unsigned year = 0, track = 0, disc = 0;
};

// A short tone in the format of the path's extension (sox), then the tags (TagLib).
void MakeAudioFile(const std::string& path, const Tags& tags);
// Writes the tags into an existing file with TagLib.
void WriteTags(const std::string& path, const Tags& tags);

// The generated share: relative path -> tags.
const std::map<std::string, Tags>& StandardShare();
void MakeStandardShare();

struct IndexRun {
    int exitStatus = -1;
    std::string output;
    std::map<std::string, long> counts;  // files, added, updated, removed, tagreads, broken
};
IndexRun RunIndexer();
// The standard share indexed by the real harmona-index: the start of the tests that talk to a
// running server. A fatal test failure, with the indexer's output, when the indexer fails.
void IndexStandardShare();

// Two veth ends, hm0 (192.0.2.1, where the server runs) and hm1 (192.0.2.2), up, IPv6 off (its
// duplicate address detection would only delay the test), multicast routed through hm0, and
// packets between the two ends accepted although both addresses are local.
void SetUpNetwork();

// harmona-mediad as a child (its output in /tmp/harmona-mediad.log); Start waits until the pid
// file names it (up to `readyMs`, 10 s unless given: the first load of a large library takes
// longer on a busy machine).
class ServerProcess {
  public:
    ~ServerProcess() { Stop(); }
    // `extraArgs` follow the kit's own (--interface).
    bool Start(const std::vector<std::string>& extraArgs = {}, int readyMs = 10000);
    // SIGTERM and wait (up to 10 s, then SIGKILL); the exit status, or -1.
    int Stop();
    pid_t pid() const { return service_.pid(); }

  private:
    Service service_;
};

struct DidlEntry {
    bool container = false;
    std::string id, parentId, title, upnpClass, artist, album, genre, res, protocolInfo;
    long childCount = -1;
};

struct BrowseReply {
    long httpStatus = 0;
    int upnpError = 0;  // from a SOAP fault
    std::vector<DidlEntry> entries;
    long numberReturned = -1, totalMatches = -1, updateId = -1;
    std::string raw;
};

BrowseReply SoapBrowse(const std::string& objectId,
                       const std::string& flag = "BrowseDirectChildren", unsigned start = 0,
                       unsigned count = 0, const std::string& sort = "");
// Any action of ContentDirectory without arguments; the out argument's text.
std::string SoapSimpleAction(const std::string& action, const std::string& outArgument);

struct HttpReply {
    long status = 0;
    std::string contentType;
    std::string headers;  // the response's header lines, as received
    std::string body;
};
HttpReply HttpGet(const std::string& url, const std::string& range = "");

// Sends `request` as it stands over TCP to address:port and returns what came back before the
// peer closed or `waitMs` passed ("" when nobody listens).
std::string RawHttpExchange(const std::string& address, unsigned short port,
                            const std::string& request, int waitMs = 3000,
                            const std::string& sourceAddress = "");

}  // namespace harmona::test::mediad
