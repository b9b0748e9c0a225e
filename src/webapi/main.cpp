// The entry of webapi/library.cgi: one request, within the same memory bound as the tree CGI.
#include "platform/cgi/RequestMemory.h"
#include "src/webapi/LibraryApi.h"

namespace {

int ServeLibraryRequest() {
    harmona::webapi::LibraryApi api;
    return api.Process();
}

}  // namespace

int main(int /*argc*/, char** /*argv*/) {
    return harmona::cgi::ServeWithinRequestMemory(ServeLibraryRequest);
}
