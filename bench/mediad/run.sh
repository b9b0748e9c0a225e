#!/usr/bin/env bash
# Benchmark of the indexer and the local media server: harmona-index over 10,000 tiny files (first run and unchanged re-run), and
# Browse of a container of BROWSE_TRACKS (default 100,000) tracks, whole, fetched as a client must
# (paged) and a page of 50, and BrowseMetadata of the root, against MiniDLNA and Gerbera serving the
# same files in the same run; then one track streamed from each, and each server's memory (its
# serving process's peak resident size, the Pss of all its processes before the first Browse and
# after the last, and each process's share of that) and the on-disk size of its database. Runs in a
# private mount and network namespace, with the library's account added there when the system has
# none (harmona-mediad does not serve without it).
#   bench/mediad/run.sh [BUILD_DIR]      (as root; needs sox, minidlna, gerbera, python3, curl)
set -euo pipefail
here=$(cd "$(dirname "$0")" && pwd)
build=$(cd "${1:-$here/../../build}" && pwd)
if [[ "${HARMONA_BENCH_INSIDE:-}" != 1 ]]; then
    exec env HARMONA_BENCH_INSIDE=1 unshare -m -n "$0" "$build"
fi
index_files=${INDEX_FILES:-10000}
browse_tracks=${BROWSE_TRACKS:-100000}
repeats=${REPEATS:-5}

# The test kit's shell side: the veth link and the bounded stop of the servers.
. "$here/../../tests/harness/stack.sh"
ip link set lo up
veth_pair hm0 192.0.2.1 hm1 192.0.2.2
mount --make-rprivate /
for d in /volume1 /run /tmp; do mkdir -p $d; mount -t tmpfs -o size=4g tmpfs $d; done
. "$here/namespace.sh"
library_account
private_packages
# MiniDLNA skips MP3 files under 8 KiB ("File too small"): 1.2 s at 44.1 kHz is about 10 KB.
sox -q -n -r 44100 -c 1 /tmp/template.mp3 synth 1.2 sine 440

seconds() { date +%s.%N; }
rate() { python3 -c "print('%.0f' % ($1 / ($3 - $2)))"; }

echo "== harmona-index, $index_files tiny files"
python3 "$here/make_share.py" /tmp/template.mp3 /volume1/music "$index_files" 100
t0=$(seconds); "$build/harmona-index"; t1=$(seconds)
"$build/harmona-index"; t2=$(seconds)
echo "first run:     $(rate "$index_files" "$t0" "$t1") files/s ($(python3 -c "print('%.2f' % ($t1-$t0))") s)"
echo "unchanged run: $(rate "$index_files" "$t1" "$t2") files/s ($(python3 -c "print('%.2f' % ($t2-$t1))") s)"

echo "== Browse of a container of $browse_tracks tracks"
rm -rf /volume1/music /var/packages/Harmona
python3 "$here/make_share.py" /tmp/template.mp3 /volume1/music "$browse_tracks" 1000
t0=$(seconds); "$build/harmona-index" >/dev/null; t1=$(seconds)
echo "harmona-index of $browse_tracks files: $(python3 -c "print('%.1f' % ($t1-$t0))") s"
"$build/harmona-mediad" --interface hm0 & mediad=$!
mkdir -p /tmp/minidlna
cat > /tmp/minidlna.conf <<CONF
media_dir=A,/volume1/music
db_dir=/tmp/minidlna
log_dir=/tmp/minidlna
network_interface=hm0
port=8200
inotify=no
friendly_name=bench
CONF
t0=$(seconds)
minidlnad -f /tmp/minidlna.conf -P /tmp/minidlna.pid -S -R >/tmp/minidlna/stdout.log 2>&1 & minidlna=$!
with_gerbera=${GERBERA:-1}  # GERBERA=0: MiniDLNA only (Gerbera 1.1 needs hours for 100,000 objects)
gerbera=
gerbera_start=$(seconds)
if [[ "$with_gerbera" == 1 ]]; then
    mkdir -p /tmp/gerbera
    gerbera -m /tmp/gerbera -f gerbera -e hm0 -p 49152 -a /volume1/music >/tmp/gerbera/stdout.log 2>&1 &
    gerbera=$!
fi
trap 'for p in $gerbera $minidlna $mediad; do stop_process "$p"; done' EXIT

soap() {  # url object start count [flag]
    printf '<?xml version="1.0"?><s:Envelope xmlns:s="http://schemas.xmlsoap.org/soap/envelope/" s:encodingStyle="http://schemas.xmlsoap.org/soap/encoding/"><s:Body><u:Browse xmlns:u="urn:schemas-upnp-org:service:ContentDirectory:1"><ObjectID>%s</ObjectID><BrowseFlag>'"${5:-BrowseDirectChildren}"'</BrowseFlag><Filter>*</Filter><StartingIndex>%s</StartingIndex><RequestedCount>%s</RequestedCount><SortCriteria></SortCriteria></u:Browse></s:Body></s:Envelope>' "$2" "$3" "$4" |
    curl -s -m 120 -o /tmp/reply.xml -w '%{time_total}' -H 'Content-Type: text/xml; charset="utf-8"' \
        -H 'SOAPACTION: "urn:schemas-upnp-org:service:ContentDirectory:1#Browse"' --data-binary @- "$1"
}
total() { grep -o 'TotalMatches>[0-9]*' /tmp/reply.xml | grep -o '[0-9]*$' || echo 0; }
returned() { grep -o 'NumberReturned>[0-9]*' /tmp/reply.xml | grep -o '[0-9]*$' || echo 0; }

ours=http://127.0.0.1:50003/ContentDirectory/control
theirs=http://192.0.2.1:8200/ctl/ContentDir
# MiniDLNA's "All Music" is 1$4; wait for its scan (up to 15 minutes).
set +e
for _ in $(seq 1 900); do
    soap "$theirs" '1$4' 0 1 >/dev/null 2>&1 || true
    [[ "$(total)" == "$browse_tracks" ]] && break
    sleep 1
done
t1=$(seconds)
echo "MiniDLNA scan of $browse_tracks files: $(python3 -c "print('%.1f' % ($t1-$t0))") s (TotalMatches $(total))"
# Gerbera's ids are its own: its "All Audio" is found by title; wait for its import too.
gerbera_url=http://192.0.2.1:49152/upnp/control/cds
gerbera_all=""
for _ in $(seq 1 $((with_gerbera == 1 ? 1800 : 0))); do
    [[ -z "$gerbera_all" ]] && gerbera_all=$(python3 "$here/find_container.py" "$gerbera_url" Audio "All Audio" 2>/dev/null)
    if [[ -n "$gerbera_all" ]]; then
        soap "$gerbera_url" "$gerbera_all" 0 1 >/dev/null 2>&1 || true
        [[ "$(total)" == "$browse_tracks" ]] && break
    fi
    sleep 1
done
t2=$(seconds)
[[ "$with_gerbera" == 1 ]] && echo "Gerbera import of $browse_tracks files: $(python3 -c "print('%.1f' % ($t2-$gerbera_start))") s (All Audio $gerbera_all, TotalMatches $(total))"

# Memory of each server: the peak resident size (VmHWM) of its serving process, and the
# proportional set size (Pss, /proc/<pid>/smaps_rollup) of all its processes added up, which
# counts a page that processes share once between them.
procs_of() {  # pid -> the pid and all its descendants
    echo "$1"
    local child
    for child in $(pgrep -P "$1" || true); do procs_of "$child"; done
}
kib() { awk -v f="$1:" '$1 == f {print $2}' "$2" 2>/dev/null || true; }
memory_of() {  # label root_pid serving_pid
    local pss=0 hwm=0 count=0 each="" p v
    for p in $(procs_of "$2"); do
        v=$(kib Pss "/proc/$p/smaps_rollup"); pss=$((pss + ${v:-0}))
        if [[ "$p" == "$3" ]]; then each="$each serving ${v:-0}"
        elif [[ "$p" == "$2" ]]; then each="$each first ${v:-0}"
        else each="$each other ${v:-0}"; fi
        v=$(kib VmHWM "/proc/$p/status"); hwm=$((hwm + ${v:-0}))
        count=$((count + 1))
    done
    printf '%-34s serving process peak (VmHWM) %7s KiB; %s processes: Pss %7s KiB (each:%s), peaks added %7s KiB\n' \
        "$1" "$(kib VmHWM "/proc/$3/status")" "$count" "$pss" "$each" "$hwm"
}
# harmona-mediad's serving process is the supervisor's child that gave up root.
mediad_server=""
for p in $(pgrep -P "$mediad" || true); do
    [[ "$(awk '/^Uid:/ {print $2}' /proc/$p/status)" != 0 ]] && mediad_server=$p
done
memory_report() {  # when
    echo "-- memory $1"
    memory_of "harmona-mediad" "$mediad" "${mediad_server:-$mediad}"
    memory_of "MiniDLNA" "$minidlna" "$minidlna"
    [[ "$with_gerbera" == 1 ]] && memory_of "Gerbera" "$gerbera" "$gerbera"
    true
}
echo "-- database on disk"
printf '%-34s %s bytes (library.db)\n' "harmona-mediad" "$(du -cb /var/packages/Harmona/var/library.db* | tail -1 | cut -f1)"
printf '%-34s %s bytes (files.db and art cache)\n' "MiniDLNA" "$(du -sb /tmp/minidlna | cut -f1)"
[[ "$with_gerbera" == 1 ]] && printf '%-34s %s bytes\n' "Gerbera" "$(du -sb /tmp/gerbera | cut -f1)"
memory_report "before the first Browse"

median() { sort -n | awk '{a[NR]=$1} END {print a[int((NR+1)/2)]}'; }
measure() {  # label url object start count [flag [repeats]]
    local times=() t
    for _ in $(seq 1 "${7:-$repeats}"); do t=$(soap "$2" "$3" "$4" "$5" "${6:-}"); times+=("$t"); done
    printf '%-34s median %6.3f s  (returned %s of %s, %s bytes)\n' "$1" \
        "$(printf '%s\n' "${times[@]}" | median)" "$(returned)" "$(total)" "$(stat -c %s /tmp/reply.xml)"
}
# The whole list as a client gets it: RequestedCount 0, then again from the next index while fewer
# than TotalMatches have arrived (as the browse library does; MiniDLNA cuts replies at 2 MiB).
fetch_all() {  # url object [page size, 0: as many as the server gives] -> seconds requests objects
    local got=0 requests=0 sum=0 t
    while :; do
        t=$(soap "$1" "$2" "$got" "${3:-0}"); requests=$((requests + 1))
        sum=$(awk -v a="$sum" -v b="$t" 'BEGIN {print a + b}')
        got=$((got + $(returned)))
        [[ "$(returned)" == 0 || "$got" -ge "$(total)" ]] && break
    done
    echo "$sum $requests $got"
}
measure_all() {  # label url object [page size [repeats]]
    local runs=() line
    for _ in $(seq 1 "${5:-$repeats}"); do line=$(fetch_all "$2" "$3" "${4:-0}"); runs+=("$line"); done
    local seconds objects
    seconds=$(printf '%s\n' "${runs[@]}" | awk '{print $1}' | median)
    objects=$(echo "${runs[0]}" | awk '{print $3}')
    printf '%-34s median %6.3f s  (%s requests, %s objects, %s us per object)\n' "$1" "$seconds" \
        "$(echo "${runs[0]}" | awk '{print $2}')" "$objects" \
        "$(python3 -c "print('%.2f' % ($seconds * 1e6 / max($objects, 1)))")"
}
measure "harmona-mediad whole list" "$ours" music_all 0 0
measure "MiniDLNA whole list (one reply)" "$theirs" '1$4' 0 0
# Gerbera 1.1 answers in milliseconds per object (RequestedCount 0 over thousands of objects runs
# past curl's 120 s): it is measured in pages only, one run of each of its rows.
measure_all "harmona-mediad all, paged" "$ours" music_all
measure_all "MiniDLNA all, paged" "$theirs" '1$4'
page=${PAGE_SIZE:-500}
measure_all "harmona-mediad all, pages of $page" "$ours" music_all "$page"
measure_all "MiniDLNA all, pages of $page" "$theirs" '1$4' "$page"
[[ "$with_gerbera" == 1 ]] && measure_all "Gerbera all, pages of $page" "$gerbera_url" "$gerbera_all" "$page" 1
half=$((browse_tracks / 2))
measure "harmona-mediad page of 50" "$ours" music_all "$half" 50
measure "MiniDLNA page of 50" "$theirs" '1$4' "$half" 50
[[ "$with_gerbera" == 1 ]] && measure "Gerbera page of 50" "$gerbera_url" "$gerbera_all" "$half" 50 "" 1
measure "harmona-mediad BrowseMetadata 0" "$ours" 0 0 0 BrowseMetadata
measure "MiniDLNA BrowseMetadata 0" "$theirs" 0 0 0 BrowseMetadata
[[ "$with_gerbera" == 1 ]] && measure "Gerbera BrowseMetadata 0" "$gerbera_url" 0 0 0 BrowseMetadata 1
# One track streamed whole from each (the first of a page of the list).
stream() {  # label url object
    soap "$2" "$3" 0 1 >/dev/null
    local res
    res=$(python3 - <<'PY'
import re, xml.etree.ElementTree as ET
body = open("/tmp/reply.xml", encoding="utf-8", errors="replace").read()
result = next((e.text for e in ET.fromstring(body).iter() if e.tag.endswith("Result")), "") or ""
found = re.search(r"<res[^>]*>([^<]+)</res>", result)
print(found.group(1).replace("&amp;", "&") if found else "")
PY
)
    printf '%-34s %s\n' "$1" "$(curl -s -m 60 -o /dev/null -w '%{http_code} %{size_download} bytes %{time_total} s' "$res")"
}
stream "harmona-mediad track streamed" "$ours" music_all
stream "MiniDLNA track streamed" "$theirs" '1$4'
memory_report "after the last Browse"
true
