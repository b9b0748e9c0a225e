# What the benchmarks make their own in their private mount namespace, after /run is their own
# tmpfs. Sourced by run.sh and memory.sh.

# The library's account ("harmona"), which harmona-mediad's serving process changes to and without
# which it does not start: added, when the system has none, to copies of the account files that
# only this mount namespace sees.
library_account() {
    getent passwd harmona >/dev/null && return 0
    mkdir -p /run/bench-accounts
    cp /etc/passwd /etc/group /run/bench-accounts/
    echo "harmona:x:64980:64980:music library:/nonexistent:/usr/sbin/nologin" >>/run/bench-accounts/passwd
    echo "harmona:x:64980:" >>/run/bench-accounts/group
    mount --bind /run/bench-accounts/passwd /etc/passwd
    mount --bind /run/bench-accounts/group /etc/group
}

# An empty /var/packages of this namespace's own (where library.db lives): a folder of a tmpfs that
# is /var here, with every other entry of the system's /var bound back in. A tmpfs mounted on
# /var/packages itself is detached the moment a process outside removes that folder, and
# library.db is then the system's.
private_packages() {
    local entry name
    mkdir -p /run/bench-system-var
    mount --bind /var /run/bench-system-var
    mount -t tmpfs -o size=4g tmpfs /var
    for entry in /run/bench-system-var/*; do
        name=${entry##*/}
        [[ "$name" == packages ]] && continue
        if [[ -L "$entry" ]]; then
            cp -P "$entry" "/var/$name"
        elif [[ -d "$entry" ]]; then
            mkdir "/var/$name"
            mount --rbind "$entry" "/var/$name"
        else
            touch "/var/$name"
            mount --bind "$entry" "/var/$name"
        fi
    done
    mkdir -p /var/packages
}

# Where a process's Pss is (KiB), from /proc/<pid>/smaps: its heap (the [heap] mapping and anonymous
# mappings other than thread stacks, which hold the allocator's arenas and its mapped blocks), its
# stacks (the main thread's and the anonymous mappings below a guard page, as threads get them),
# the libraries and other files it maps, and the rest ([vdso] and the like).
pss_by_kind() {  # pid
    awk '
        /^[0-9a-f]+-[0-9a-f]+ / {
            split($1, range, "-"); perms = $2; name = $6
            if (name == "[heap]") kind = "heap"
            else if (name == "[stack]") kind = "stacks"
            else if (name ~ /^\//) kind = "files"
            else if (name == "") kind = (range[1] == guardEnd ? "stacks" : "heap")
            else kind = "other"
            if (perms == "---p" && name == "") guardEnd = range[2]; else guardEnd = ""
            next
        }
        /^Pss:/ { pss[kind] += $2 }
        END {
            printf "heap %d, stacks %d, files %d, other %d KiB\n", pss["heap"], pss["stacks"], pss["files"], pss["other"]
        }' "/proc/$1/smaps"
}
