# shellcheck shell=sh
# What the PPPoE client's scripts share; sourced, never run.
#
# The job "pppoe" is a process pppoe-connect, which dials with pppd. Its state, as long as the job is there:
#   interface  name of the connection's interface, while it has an address
#   ended      exit status of a pppoe-connect that has given up
#   was-up     there since it had one for the first time
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

# uptime: prints the seconds since the machine started
uptime() {
    read -r now _ </proc/uptime
    echo "${now%.*}"
}
