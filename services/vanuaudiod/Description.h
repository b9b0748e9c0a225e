// Reads a UPnP device description (UDA 1.0/1.1) for what command 16 lists: the media server
// device's friendly name and its ContentDirectory control URL made absolute.
#pragma once

#include <string>

#include "services/vanuaudiod/ServerList.h"

namespace harmona::vanuaudiod {

// Parses `xml`, fetched from `location`. The media server is the root device or the first
// embedded device whose deviceType is a MediaServer (preferring one whose UDN is `udn`); its
// ContentDirectory service's controlURL is resolved against URLBase when present, else against
// `location`. Fills friendlyName (cleaned and bounded), controlUrl and ip (the host of
// `location`); false when the document does not parse, has no usable ContentDirectory, or puts
// its control URL on another host than `location`'s.
bool ParseDeviceDescription(const std::string& xml, const std::string& location,
                            const std::string& udn, MediaServer& out);

// `relative` resolved against `base` (RFC 3986); empty when the result is not a usable absolute
// http URL (too long, control characters, quotes or spaces).
std::string ResolveUrl(const std::string& base, const std::string& relative);

// The host part of an http URL (IPv6 without brackets); empty when it is not one.
std::string HostOfUrl(const std::string& url);

}  // namespace harmona::vanuaudiod
