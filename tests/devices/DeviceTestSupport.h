// Shared set-up of the devices tests: a handler built in the test process for a logged-in user,
// and a text table whose sections are told apart (so that a text read from the wrong section
// shows).
#pragma once

#include <json/value.h>

#include <memory>
#include <string>

#include "src/handler/HarmonaHandler.h"

namespace harmona::test {

// The texts that DeviceTexts() writes, for the assertions.
inline constexpr const char* kRefreshButtonText = "Refresh the iPod";
inline constexpr const char* kNewStationText = "New station";
inline constexpr const char* kShoutcastText = "SHOUTcast";
inline constexpr const char* kRadioIoText = "RadioIO";
inline constexpr const char* kUserDefinedText = "User-defined stations";
inline constexpr const char* kFavoriteText = "Favourite stations";

// Writes the enu text table with the sections "player" and "radio" (each also holding the other's
// keys with a wrong text), and users.conf with "admin" (all permission bits, language enu).
void WriteDeviceFixture();

// A handler for REMOTE_USER "admin" as the CGI would construct it.
std::unique_ptr<HarmonaHandler> MakeHandler();

// The node's member as a string ("" when missing), and whether the member exists.
std::string Text(const Json::Value& node, const char* member);
bool Has(const Json::Value& node, const char* member);

}  // namespace harmona::test
