# The shell side of the test kit: where the running system's programs listen and leave their
# marks, the network link of the UPnP services and the readiness waits. Sourced by
# scripts/system-inside (and through it by scripts/demo, the browser tests and the benchmarks); the
# C++ kit (tests/harness/Stack.h, Service.h) reads the NAME=value lines below and runs veth_pair,
# so that both sides start, wait for and stop the programs the same way.
# Keep the values plain NAME=value lines (no quoting, no expansion): the C++ kit reads them as text.

HARMONA_MEDIAD_PORT=50003
HARMONA_MEDIAD_PID_FILE=/run/vanu/service/3.pid
HARMONA_DAEMON_SOCKET=/tmp/vanuaudiod.sock
HARMONA_APP_DIR=/var/packages/Harmona/target/app
HARMONA_ETC_DIR=/var/packages/Harmona/etc
HARMONA_STACK_STATE=/run/harmona-web
HARMONA_STACK_LINK=hv0
HARMONA_STACK_LINK_PEER=hv1
HARMONA_LINK_ADDRESS=192.0.2.1
HARMONA_LINK_PEER_ADDRESS=192.0.2.2
HARMONA_DEFAULT_WEB_PORT=8080
# How long a start may take before the kit calls it failed, and how long a stop may take after
# SIGTERM before the kit sends SIGKILL (milliseconds).
HARMONA_READY_TIMEOUT_MS=10000
HARMONA_STOP_GRACE_MS=5000

# veth_pair A ADDRESS_A B ADDRESS_B: two veth ends, both in this network namespace, up, with
# ADDRESS_A/24 and ADDRESS_B/24, IPv6 off (its duplicate address detection would only delay the
# services), multicast routed through A and loopback multicast on. Packets between the two ends
# carry local source addresses, which the kernel must be told to accept. Nothing when A exists.
veth_pair() {
    local a=$1 address_a=$2 b=$3 address_b=$4 end
    if ip link show "$a" >/dev/null 2>&1; then
        return 0
    fi
    ip link add "$a" type veth peer name "$b"
    for end in "$a" "$b" all; do
        echo 1 >"/proc/sys/net/ipv4/conf/$end/accept_local"
        echo 0 >"/proc/sys/net/ipv4/conf/$end/rp_filter"
    done
    echo 1 >"/proc/sys/net/ipv6/conf/$a/disable_ipv6"
    echo 1 >"/proc/sys/net/ipv6/conf/$b/disable_ipv6"
    ip addr add "$address_a/24" dev "$a"
    ip addr add "$address_b/24" dev "$b"
    ip link set "$a" up
    ip link set "$b" up
    ip link set lo multicast on
    ip route add 239.0.0.0/8 dev "$a"
}

# wait_for WHAT TEST...: runs TEST every 0.1 s until it succeeds, up to HARMONA_READY_TIMEOUT_MS.
wait_for() {
    local what=$1 i
    shift
    for ((i = 0; i < HARMONA_READY_TIMEOUT_MS / 100; i++)); do
        if "$@"; then return 0; fi
        sleep 0.1
    done
    echo "$what did not come up within $((HARMONA_READY_TIMEOUT_MS / 1000)) s" >&2
    return 1
}

# listening PORT: something accepts TCP connections on 127.0.0.1:PORT.
listening() { (exec 3<>"/dev/tcp/127.0.0.1/$1") 2>/dev/null; }

# port_taken PORT: a listener holds PORT on 127.0.0.1 or on every address (either keeps a forwarder
# from binding 127.0.0.1:PORT).
port_taken() { [[ -n "$(ss -Hltn "( sport = :$1 )" 2>/dev/null)" ]]; }

# stop_process PID: SIGTERM, then SIGKILL after HARMONA_STOP_GRACE_MS; reaps it when it is a child.
stop_process() {
    local pid=$1 waited=0
    kill -TERM "$pid" 2>/dev/null || return 0
    while kill -0 "$pid" 2>/dev/null && ((waited < HARMONA_STOP_GRACE_MS / 100)); do
        sleep 0.1
        ((waited++)) || true
    done
    kill -KILL "$pid" 2>/dev/null || true
    wait "$pid" 2>/dev/null || true
}
