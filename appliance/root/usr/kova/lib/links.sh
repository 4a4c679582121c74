# shellcheck shell=sh
# Bonds, bridges and VLANs from interface files to kernel and back; sourced by rc.network, never run. Each function works
# on one interface, says with fail what is wrong, and finds nothing to do where the kernel is as the file wants it.

net=/sys/class/net
vlan_table=/proc/net/vlan/config

is_bond() {
    [ -d "$net/$1/bonding" ]
}

is_bridge() {
    [ -d "$net/$1/bridge" ]
}

is_vlan() {
    [ -e "/proc/net/vlan/$1" ]
}

# may_make IS_KIND IF: whether the interface is of the kind or is not there; anything else by that name is left alone
may_make() {
    "$1" "$2" || [ ! -e "$net/$2" ] || fail "$2: there is an interface of another kind by this name"
}

# remove_link IS_KIND IF: what belonged to it is on its own again, VLANs above it are gone
remove_link() {
    [ -e "$net/$2" ] || return 0
    may_make "$1" "$2" || return
    ip link del dev "$2" || fail "$2: cannot delete the interface"
}

# runs_mode BOND NUMBER: whether a bond has members and works in this mode already
runs_mode() {
    is_bond "$1" && [ -s "$net/$1/bonding/slaves" ] && read -r _ mode <"$net/$1/bonding/mode" && [ "$mode" = "$2" ]
}

make_bond() {
    options=$(setting "$1" BONDING_OPTS)
    may_make is_bond "$1" || return
    mode=${options#*mode=}
    ! runs_mode "$1" "${mode%% *}" || return 0
    # without being told, the driver makes a bond0 of its own
    [ -e "$net/bonding_masters" ] || modprobe -q bonding max_bonds=0
    # a mode can only be changed as long as there are no members
    remove_link is_bond "$1" || return
    # shellcheck disable=SC2046 # words without blanks
    ip link add dev "$1" type bond $(printf '%s' "$options" | tr '=' ' ') || fail "$1: cannot make a bond with $options"
}

make_bridge() {
    may_make is_bridge "$1" || return
    is_bridge "$1" || ip link add dev "$1" type bridge || fail "$1: cannot make the bridge" || return
    primary=$(setting "$1" PRIMARY) && is_ifname "$primary" && [ -e "$net/$primary" ] || return 0
    # leases stay with the hardware address that the network knows
    read -r hardware <"$net/$primary/address" && ip link set dev "$1" address "$hardware"
}

# is_vlan_of IF ROW_DEVICE ID: whether the kernel has the VLAN so
is_vlan_of() {
    [ -e "$vlan_table" ] || return 1
    while IFS=' |' read -r vlan id row; do
        [ "$vlan,$id,$row" != "$1,$3,$2" ] || return 0
    done <"$vlan_table"
    return 1
}

make_vlan() {
    row_device=$(setting "$1" VLAN_ROW_DEVICE)
    vlan_id=$(setting "$1" VLAN_ID)
    is_ifname "$row_device" && [ -e "$net/$row_device" ] || fail "$1: no row device \"$row_device\"" || return
    # a leading zero is read as octal
    case $vlan_id in '' | *[!0-9]* | 0*) fail "$1: VLAN_ID \"$vlan_id\" is not a VLAN id" || return ;; esac
    may_make is_vlan "$1" || return
    if ! is_vlan_of "$1" "$row_device" "$vlan_id"; then
        remove_link is_vlan "$1" &&
            ip link add link "$row_device" name "$1" type vlan id "$vlan_id" || fail "$1: cannot make the VLAN" || return
    fi
    # a VLAN does not come up above what is down, nor carries more than that
    ip link set dev "$row_device" up && set_mtu "$row_device"
}

# join IF MASTER IS_KIND: the interface becomes a part of the bond or bridge, and is up
join() {
    [ ! -e "$net/$1/upper_$2" ] || return 0
    [ -e "$net/$1" ] || fail "$1: there is no such interface" || return
    is_ifname "$2" && "$3" "$2" || fail "$1: no bond or bridge \"$2\" to belong to" || return
    # a bond takes only what is down
    ip -batch - <<END || fail "$1: cannot become a part of $2"
addr flush dev $1
link set dev $1 down
link set dev $1 master $2
link set dev $1 up
END
}

# leave IF: a port of the virtual switch remains one, which only the switch can change
leave() {
    is_bond "$1/master" || is_bridge "$1/master" || return 0
    ip link set dev "$1" nomaster || fail "$1: cannot leave its bond or bridge"
}

# set_mtu IF: what is configured; an interface without a setting keeps what it has
set_mtu() {
    mtu=$(key_value /etc/kovainfo.conf "$1_mtu") || return 0
    read -r present <"$net/$1/mtu" && [ "$mtu" != "$present" ] || return 0
    ip link set dev "$1" mtu "$mtu" || fail "$1: cannot set the MTU \"$mtu\""
}
