// The entry. One handler, one request; Process's result is the exit status (1 served).
#include "platform/cgi/RequestMemory.h"
#include "src/handler/HarmonaHandler.h"

namespace {

int ServeTreeRequest() {
    HarmonaHandler handler;
    return handler.Process();
}

}  // namespace

int main(int /*argc*/, char** /*argv*/) {
    // Only what the readers' own bounds let slip through ends as a failed allocation. The reply is
    // printed last, from a finished tree through a fixed-size buffer, so a failed allocation comes
    // before any of it was written.
    return harmona::cgi::ServeWithinRequestMemory(ServeTreeRequest);
}
