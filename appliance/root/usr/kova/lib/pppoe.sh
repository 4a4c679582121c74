# shellcheck shell=sh
# What the PPPoE client's scripts share; sourced, never run.
#
# The job "pppoe" is a process pppoe-connect, which dials with pppd. Its state, as long as the job is there:
#   interface  name of the connection's interface, while it has an address
#   ended      exit status of a pppoe-connect that has given up
#   kept       there when a dial that fails is not the last one: since the connection was up for the first time, or from
#              the beginning of one that is meant to be up since the boot
#   log        what pppd said of the last dial
#   dns.info   DNS=ADDRESS..., the name servers that the other side told

. /usr/kova/lib/kova.sh

pppoe_state=/run/kova/pppoe
pppoe_cache=/tmp/kovapppoe.intf # the library's note of the interface

# connection_is_lost: forgets what the connection brought
connection_is_lost() {
    rm -f "$pppoe_state/interface" "$pppoe_cache"
    [ -e "$pppoe_state/dns.info" ] || return 0
    rm -f "$pppoe_state/dns.info"
    /usr/kova/lib/resolver-source 4
}

# connections: prints the pids of the processes that keep one up
connections() {
    for process in /proc/[0-9]*; do
        { read -r name <"$process/comm"; } 2>/dev/null && [ "$name" = pppoe-connect ] && echo "${process#/proc/}"
    done
}

# uptime: prints the seconds since the machine started
uptime() {
    read -r now _ </proc/uptime
    echo "${now%.*}"
}
