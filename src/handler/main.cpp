// The entry. One handler, one request; Process's result is the exit status (1 served).
#include <new>

#include "HarmonaHandler.h"
#include "RequestMemory.h"

int main(int /*argc*/, char** /*argv*/) {
    // Before anything is allocated: every request stays within its memory bound.
    harmona::cgi::LimitRequestMemory();
    try {
        HarmonaHandler handler;
        return handler.Process();
    } catch (const std::bad_alloc&) {
        // Only what the readers' own bounds let slip through lands here. The reply is printed
        // last, from a finished tree through a fixed-size buffer, so a failed allocation comes
        // before any of it was written.
        harmona::cgi::LogRequestOutOfMemory();
        return 0;
    } catch (...) {
        // Nothing else is handled here: the rethrow only guarantees that the handler was
        // destroyed before the exception leaves the program.
        throw;
    }
}
