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
