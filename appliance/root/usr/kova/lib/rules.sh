# shellcheck shell=sh
# What the tools with rules by interface share; sourced, never run. A file of rules has one rule per line, the interface
# first; empty lines and lines that begin with "#" are skipped. The kernel's rules hang on an interface and go with it:
# rc.network has them loaded when it starts one.

. /usr/kova/lib/kova.sh

# lock_rules: one change at a time; held as descriptor 9
lock_rules() {
    mkdir -p /run/kova && exec 9>"/run/kova/${0##*/}.lock" && flock 9 || fail "cannot lock the rules"
}

# rules_of FILE IF: prints the rules of an interface, without its name
rules_of() {
    [ -f "$1" ] || return 0
    while read -r interface rule || [ -n "$interface" ]; do
        [ "$interface" != "$2" ] || echo "$rule"
    done <"$1"
}

# rename_rules FILE OLD NEW: gives the rules of an interface to another; who may read them stays
rename_rules() {
    [ -n "$(rules_of "$1" "$2")" ] || return 0
    mode=$(stat -L -c %a "$1")
    # shellcheck disable=SC2094 # the file is replaced when it has been read
    while IFS= read -r line || [ -n "$line" ]; do
        read -r interface rule <<END
$line
END
        [ "$interface" != "$2" ] || line="$3 $rule"
        printf '%s\n' "$line"
    done <"$1" | replace_file "$1" && chmod "$mode" "$1" || fail "cannot write $1"
}

# load_each IF...: load of those that are there; the others have their rules loaded when they come
load_each() {
    status=0
    for name; do
        [ ! -e "/sys/class/net/$name" ] || load "$name" || status=1
    done
    return $status
}

# change FILE OLD NEW: the rules of an interface follow its new name, in the file and in the kernel
change() {
    is_ifname "$2" && is_ifname "$3" || fail "bad interface name \"$2\" or \"$3\"" || return
    lock_rules && rename_rules "$1" "$2" "$3" && load_each "$2" "$3"
}
