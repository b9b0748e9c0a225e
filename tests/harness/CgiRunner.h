// Runs the real built CGI program the way a web server does: a CGI/1.1 environment, the request
// body on standard input, the reply read from standard output, the exit status, all within a time
// limit. Runs inside the sandbox (Sandbox.h), so the program sees the test's fixtures.
#pragma once

#include <json/json.h>

#include <map>
#include <string>
#include <utility>
#include <vector>

#include "tests/harness/Sandbox.h"

namespace harmona::test {

struct CgiRequest {
    std::string method = "GET";
    std::string queryString;
    std::string body;  // sent on standard input
    std::string contentType;
    // Unset: CONTENT_LENGTH is the body's size; set: sent as it stands (for lying clients).
    std::string contentLength;
    bool hasContentLength = false;
    std::string remoteUser = "admin";
    bool hasRemoteUser = true;
    std::string acceptLanguage;
    std::map<std::string, std::string> extraEnv;
    // Leave standard input open after the body, as a web server waiting for a slow client does.
    bool keepStdinOpen = false;
    // Parse the reply body as JSON into CgiResult::json (off for replies of hundreds of MiB).
    bool parseJson = true;
    int timeoutMs = 30000;
    std::string program;  // empty: the built audiotree.cgi; LibraryCgiProgram() for library.cgi
};

struct CgiResult {
    bool exited = false;    // ended by exit (not by a signal, not killed by the time limit)
    int exitStatus = -1;    // valid when exited
    int signal = 0;         // the signal that ended it, if any
    bool timedOut = false;  // killed because it outlived the request's time limit
    double wallMs = 0;
    // Peak resident memory (ru_maxrss, KiB). Linux counts the forked child's pages from before its
    // exec too, so this is an upper bound: the test process's own size at most is added.
    long peakRssKb = 0;
    std::string output;                                        // everything on standard output
    std::string errors;                                        // everything on standard error
    std::vector<std::pair<std::string, std::string>> headers;  // CGI header lines, in order
    std::string body;          // what follows the blank line ending the headers
    bool headerEnded = false;  // a blank line (CR LF CR LF or LF LF) ended the headers
    Json::Value json;          // the body parsed as JSON (null when it did not parse)
    bool jsonOk = false;
    std::vector<LogLine> log;  // lines sent to /dev/log while it ran

    std::string Header(const std::string& name) const;
    std::vector<std::string> LogMessages() const;
};

// Paths of the built CGI programs: audiotree.cgi (the tree) and library.cgi (the listening page's
// JSON API). Both run through RunCgi.
std::string CgiProgram();
std::string LibraryCgiProgram();

// Convenience: a GET request with the given query string for `user`.
CgiResult RunCgi(const CgiRequest& request);
CgiResult Get(const std::string& queryString, const std::string& user = "admin");
CgiResult Post(const std::string& body, const std::string& queryString = "",
               const std::string& user = "admin");

// Checks that the CGI ended by itself with status 0 and wrote nothing at all, not even a header.
void ExpectNoReply(const CgiResult& r);

// A POST of the form `body` whose CONTENT_LENGTH says `contentLength`, whether or not the body has
// that many bytes: for the requests of short, long and bogus lengths.
CgiRequest FormPostWithLength(const std::string& body, const std::string& contentLength);

// Builds a query string from name/value pairs, percent-encoding both.
std::string Query(const std::vector<std::pair<std::string, std::string>>& params);
std::string UrlEncode(const std::string& text);

// Parses JSON strictly (no comments, whole text).
bool ParseJson(const std::string& text, Json::Value& out);

}  // namespace harmona::test
