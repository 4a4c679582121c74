# shellcheck shell=sh
# Helpers of the appliance's scripts; sourced, never run.

umask 022
PATH=/usr/sbin:/usr/bin:/sbin:/bin
LC_ALL=C
export PATH LC_ALL
carriage_return=$(printf '\r')

# fail TEXT...: tells the caller and the system log what went wrong; always false
fail() {
    echo "${0##*/}: $*" >&2
    logger -t "${0##*/}" -p daemon.err -- "$*" 2>/dev/null
    return 1
}

# key_value FILE KEY: prints the value of the first line that begins with KEY=, without CR and one pair of double
# quotes; false when the file or the key is not there
key_value() (
    [ -f "$1" ] || exit 1
    while IFS= read -r line || [ -n "$line" ]; do
        case $line in "$2="*) ;; *) continue ;; esac
        line=${line#"$2="}
        while [ "$line" != "${line%"$carriage_return"}" ]; do line=${line%"$carriage_return"}; done
        case $line in \"*\")
            line=${line#\"}
            line=${line%\"}
            ;;
        esac
        printf '%s\n' "$line"
        exit 0
    done <"$1"
    exit 1
)

# replace_file FILE: writes standard input to FILE, so that a reader finds the old file or the new one, whole
replace_file() {
    mkdir -p "${1%/*}" && replacement=$(mktemp "$1.XXXXXX") || return 1
    cat >"$replacement" && chmod 0644 "$replacement" && sync "$replacement" && mv -f "$replacement" "$1" && return
    rm -f "$replacement"
    return 1
}

# is_ifname NAME: whether the kernel could know an interface by this name, and a path or a command line can hold it
is_ifname() {
    case $1 in '' | . | .. | -* | */* | *[[:space:][:cntrl:]]* | ????????????????*) return 1 ;; esac
}

# is_ipv4 TEXT: whether a text is a dotted IPv4 address; leading zeros, which some programs read as octal, are not
is_ipv4() (
    case $1 in *[!0-9.]* | *.) exit 1 ;; esac
    IFS=.
    # shellcheck disable=SC2086 # split at the dots
    set -- $1
    [ $# -eq 4 ] || exit 1
    for part; do
        case $part in '' | ????* | 0?*) exit 1 ;; esac
        [ "$part" -le 255 ] || exit 1
    done
)

# ipv4_number ADDRESS: prints an address as a number
ipv4_number() (
    IFS=.
    # shellcheck disable=SC2086 # split at the dots
    set -- $1
    echo $((($1 << 24) | ($2 << 16) | ($3 << 8) | $4))
)

# same_subnet ADDRESS ADDRESS MASK: whether two addresses lie in one subnet
same_subnet() {
    [ $((($(ipv4_number "$1") ^ $(ipv4_number "$2")) & $(ipv4_number "$3"))) -eq 0 ]
}
