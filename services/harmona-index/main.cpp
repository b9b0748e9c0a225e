// harmona-index: one scan of the audio share into library.db. Run it at start-up and
// whenever the share changed; it prints one summary line and exits 0, or 1 on failure.
#include <syslog.h>

#include <cstdio>
#include <cstring>

#include "platform/medialib/MediaFiles.h"
#include "platform/paths/PlatformPaths.h"
#include "services/harmona-index/Indexer.h"

int main(int argc, char** argv) {
    if (argc == 2 && std::strcmp(argv[1], "--help") == 0) {
        std::printf(
            "usage: harmona-index\n"
            "One scan of the audio share (audio_share_path of audio.conf, else %s) into the\n"
            "music library, %s. Prints one summary line and exits 0, or 1 on failure.\n"
            "Run it as the library's account (harmona), which owns the library; the media\n"
            "server keeps the library in step with the share on its own.\n",
            harmona::paths::kDefaultAudioShare, harmona::paths::kLibraryDb);
        return 0;
    }
    openlog("harmona-index", LOG_PID, LOG_DAEMON);
    const std::string share = harmona::medialib::AudioSharePath();
    const harmona::index::IndexReport report =
        harmona::index::IndexShare(share, harmona::paths::kLibraryDb);
    if (!report.ok) {
        syslog(LOG_ERR, "indexing %s failed: %s", share.c_str(), report.error.c_str());
        std::fprintf(stderr, "harmona-index: %s\n", report.error.c_str());
        return 1;
    }
    const std::string summary = harmona::index::FormatReport(report);
    syslog(LOG_INFO, "indexed %s: %s", share.c_str(), summary.c_str());
    std::printf("%s\n", summary.c_str());
    return 0;
}
