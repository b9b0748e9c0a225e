#!/usr/bin/env bash
# The media server's resident size over repeated whole-list fetches: library.db with TRACKS tracks
# written directly (the indexer's schema, no audio files), harmona-mediad on it, then PASSES passes
# of the whole "music_all" list fetched as a client must (RequestedCount 0, then on from the next
# index) and again in pages of PAGE_SIZE. Prints the server process's VmRSS and its peak (VmHWM)
# after each pass, and glibc's malloc_stats (in use against held from the system) at the start and
# end when gdb is there; then the same after a library change (one title changed), whose load
# holds the old tree beside the new one for a moment. Runs in a private mount and network namespace.
#   bench/mediad/memory.sh [BUILD_DIR]      (as root; needs python3, curl; gdb for malloc_stats)
set -euo pipefail
here=$(cd "$(dirname "$0")" && pwd)
build=$(cd "${1:-$here/../../build}" && pwd)
if [[ "${HARMONA_BENCH_INSIDE:-}" != 1 ]]; then
    exec env HARMONA_BENCH_INSIDE=1 unshare -m -n "$0" "$build"
fi
tracks=${TRACKS:-100000}
passes=${PASSES:-10}
page=${PAGE_SIZE:-500}

. "$here/../../tests/harness/stack.sh"
ip link set lo up
mount --make-rprivate /
for d in /volume1 /run /tmp; do mkdir -p $d; mount -t tmpfs -o size=4g tmpfs $d; done
. "$here/namespace.sh"
library_account
private_packages
mkdir -p /volume1/music

echo "== library.db of $tracks tracks"
"$build/harmona-index" >/dev/null  # an empty share: the schema as the indexer writes it
# No share folder: the live library would otherwise drop the tracks, whose files do not exist.
rmdir /volume1/music
python3 - "$tracks" <<'PY'
import sqlite3, sys
n = int(sys.argv[1])
db = sqlite3.connect("/var/packages/Harmona/var/library.db")
rows = []
for i in range(n):
    artist = "Artist %d" % (i % 2000)
    album = "Album %d-%d" % (i % 2000, (i // 2000) % 5)
    title = "A Song Title Of Ordinary Length %d" % i
    rows.append(("/volume1/music/%s/%s/%d %s.mp3" % (artist, album, i, title), title, artist,
                 album, artist, "Genre %d" % (i % 25), 1950 + i % 75, (i // 10000) % 20 + 1,
                 180000 + i % 120000, 1700000000 + i, 4000000 + i % 1000000))
db.executemany("INSERT INTO track (path, title, artist, album, album_artist, genre, year, "
               "track_no, disc_no, duration_ms, mtime, added, size) "
               "VALUES (?, ?, ?, ?, ?, ?, ?, ?, 1, ?, 0, ?, ?)", rows)
db.execute("INSERT INTO library_update (id) SELECT COALESCE(MAX(id), 0) + 1 FROM library_update")
db.commit()
PY

"$build/harmona-mediad" >/tmp/mediad.log 2>&1 &
mediad=$!
trap 'stop_process "$mediad"' EXIT
# The pid file is written once the server serves 127.0.0.1, after its first load (a minute or more
# at 1,000,000 tracks on a busy machine).
for _ in $(seq 1 6000); do [[ -s /run/vanu/service/3.pid ]] && break; sleep 0.1; done
[[ -s /run/vanu/service/3.pid ]] || { echo "the server did not come up"; exit 1; }
server=""
for p in $(pgrep -P "$mediad"); do
    [[ "$(awk '/^Uid:/ {print $2}' /proc/$p/status)" != 0 ]] && server=$p
done
[[ -n "$server" ]] || { echo "no server process"; exit 1; }
rss() { awk '/^VmRSS:/ {print $2}' /proc/$server/status; }
hwm() { awk '/^VmHWM:/ {print $2}' /proc/$server/status; }
malloc_stats() {  # glibc prints it on the server's standard error (/tmp/mediad.log)
    command -v gdb >/dev/null || return 0
    gdb -p "$server" -batch -ex 'call (void) malloc_stats()' >/dev/null 2>&1 || true
    sleep 0.2
    echo "-- malloc_stats ($1):"
    grep -A2 '^Total (incl. mmap)' /tmp/mediad.log | tail -3
}

url=http://127.0.0.1:50003/ContentDirectory/control
soap() {  # start count
    printf '<?xml version="1.0"?><s:Envelope xmlns:s="http://schemas.xmlsoap.org/soap/envelope/" s:encodingStyle="http://schemas.xmlsoap.org/soap/encoding/"><s:Body><u:Browse xmlns:u="urn:schemas-upnp-org:service:ContentDirectory:1"><ObjectID>music_all</ObjectID><BrowseFlag>BrowseDirectChildren</BrowseFlag><Filter>*</Filter><StartingIndex>%s</StartingIndex><RequestedCount>%s</RequestedCount><SortCriteria></SortCriteria></u:Browse></s:Body></s:Envelope>' "$1" "$2" |
    curl -s -m 300 -o /tmp/reply.xml -H 'Content-Type: text/xml; charset="utf-8"' \
        -H 'SOAPACTION: "urn:schemas-upnp-org:service:ContentDirectory:1#Browse"' --data-binary @- "$url"
}
fetch_all() {  # page size (0: as many as the server gives) -> requests
    local got=0 requests=0 returned
    while :; do
        soap "$got" "$1"; requests=$((requests + 1))
        returned=$(grep -o 'NumberReturned>[0-9]*' /tmp/reply.xml | grep -o '[0-9]*$' || echo 0)
        got=$((got + returned))
        [[ "$returned" == 0 || "$got" -ge "$tracks" ]] && break
    done
    echo "$requests"
}

echo "server pid $server, VmRSS at start $(rss) KiB (peak $(hwm) KiB)"
for p in $mediad $(pgrep -P "$mediad"); do
    echo "-- Pss of process $p ($(tr '\0' ' ' </proc/$p/cmdline | cut -c1-40)): $(awk '/^Pss:/ {print $2}' /proc/$p/smaps_rollup) KiB; $(pss_by_kind "$p")"
done
malloc_stats start
for pass in $(seq 1 "$passes"); do
    whole=$(fetch_all 0)
    paged=$(fetch_all "$page")
    total=$(grep -o 'TotalMatches>[0-9]*' /tmp/reply.xml | grep -o '[0-9]*$' || echo 0)
    echo "pass $pass: $whole + $paged requests (TotalMatches $total), VmRSS $(rss) KiB, peak (VmHWM) $(hwm) KiB"
    [[ -s /tmp/reply.xml ]] || { echo "no reply; the server's output:"; tail -5 /tmp/mediad.log; }
done
malloc_stats end

# A library change: one title changed and the update count moved, as the indexer does; the next
# request loads the changed library while the old tree is still held, then gives the old one back.
python3 - <<'PY'
import sqlite3
db = sqlite3.connect("/var/packages/Harmona/var/library.db")
db.execute("UPDATE track SET title = title || ' (changed)' WHERE id = (SELECT MIN(id) FROM track)")
db.execute("INSERT INTO library_update (id) SELECT COALESCE(MAX(id), 0) + 1 FROM library_update")
db.commit()
PY
before=$(hwm)
soap 0 50
echo "after a library change and a page of 50 (TotalMatches $(grep -o 'TotalMatches>[0-9]*' /tmp/reply.xml | grep -o '[0-9]*$' || echo 0)): VmRSS $(rss) KiB, peak (VmHWM) $(hwm) KiB (before the change $before KiB)"
