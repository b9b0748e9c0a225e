#include "platform/cgi/RequestMemory.h"

#include <sys/resource.h>
#include <syslog.h>

#include <new>

namespace harmona::cgi {

void LimitRequestMemory() {
#ifndef HARMONA_SANITIZE
    rlimit limit{};
    if (getrlimit(RLIMIT_AS, &limit) != 0)
        return;
    const rlim_t bound = static_cast<rlim_t>(kRequestMemoryBytes);
    if (limit.rlim_cur != RLIM_INFINITY && limit.rlim_cur <= bound)
        return;
    limit.rlim_cur = bound;
    setrlimit(RLIMIT_AS, &limit);
#endif
}

void LogRequestOutOfMemory() {
    syslog(LOG_ERR, "request: out of memory within its bound of %zu MiB; no reply",
           kRequestMemoryBytes >> 20);
}

int ServeWithinRequestMemory(int (*serve)()) {
    LimitRequestMemory();
    try {
        return serve();
    } catch (const std::bad_alloc&) {
        LogRequestOutOfMemory();
        return 0;
    }
}

}  // namespace harmona::cgi
