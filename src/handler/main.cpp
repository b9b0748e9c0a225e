// The entry. One handler, one request; Process's result is the exit status (1 served).
#include "HarmonaHandler.h"

int main(int /*argc*/, char** /*argv*/) {
    try {
        HarmonaHandler handler;
        return handler.Process();
    } catch (...) {
        // Nothing is handled here: the rethrow only guarantees that the handler was destroyed
        // before the exception leaves the program.
        throw;
    }
}
