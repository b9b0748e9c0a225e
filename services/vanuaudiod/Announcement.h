// What one SSDP message (a NOTIFY or an answer to our M-SEARCH) says about a media server, and
// whether its description may be fetched: only from the address the datagram came from, and
// never from an address that would turn the daemon against the host itself or against many
// hosts at once.
#pragma once

#include <string>

namespace harmona::vanuaudiod {

enum class AnnouncementKind { alive, byebye, other };

struct Announcement {
    AnnouncementKind kind = AnnouncementKind::other;
    std::string udn;        // "uuid:..." from the USN
    std::string location;   // LOCATION (alive only)
    int maxAgeSeconds = 0;  // from CACHE-CONTROL; 0 when absent or unreadable
};

// Reads the header values of a message; kOther for anything that is not about a MediaServer
// device (any version) or lacks a usable USN. `typeHeader` is NT for a NOTIFY, ST for a search
// answer; `nts` is empty for a search answer (which means alive).
Announcement ReadAnnouncement(const char* typeHeader, const char* nts, const char* usn,
                              const char* location, const char* cacheControl);

// The network facts a location is judged against.
struct AnnouncerFacts {
    std::string sourceAddress;       // the datagram's source address
    bool linkLocalAllowed = false;   // the receiving interface has link-local addresses only
    std::string interfaceBroadcast;  // the receiving network's broadcast address, if IPv4
};

// Empty when the description at `location` may be fetched; else why not (for the log).
std::string RefuseLocation(const std::string& location, const AnnouncerFacts& facts);

}  // namespace harmona::vanuaudiod
