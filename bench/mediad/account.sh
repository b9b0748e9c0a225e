# The library's account ("harmona"), which harmona-mediad's serving process changes to and without
# which it does not start: added, when the system has none, to copies of the account files that
# only this mount namespace sees. Sourced by run.sh and memory.sh after /run is their own tmpfs.
library_account() {
    getent passwd harmona >/dev/null && return 0
    mkdir -p /run/bench-accounts
    cp /etc/passwd /etc/group /run/bench-accounts/
    echo "harmona:x:64980:64980:music library:/nonexistent:/usr/sbin/nologin" >>/run/bench-accounts/passwd
    echo "harmona:x:64980:" >>/run/bench-accounts/group
    mount --bind /run/bench-accounts/passwd /etc/passwd
    mount --bind /run/bench-accounts/group /etc/group
}
