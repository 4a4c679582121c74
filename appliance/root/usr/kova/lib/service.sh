# shellcheck shell=sh
# What a service script is: status (exit 0: the daemon runs), reload (SIGHUP, without waiting; a daemon that does not run
# reads everything when it starts, so there is nothing to do). Sourced, never run.

. /usr/kova/lib/kova.sh

# running PID_FILE COMMAND: sets $pid to the daemon's pid, as long as it is the daemon's
running() {
    { read -r pid <"$1"; } 2>/dev/null || return 1
    case $pid in '' | *[!0-9]*) return 1 ;; esac
    tr '\0' ' ' 2>/dev/null <"/proc/$pid/cmdline" | grep -q "$2 "
}

# serve PID_FILE COMMAND VERB
serve() {
    case $3 in
    status) running "$1" "$2" ;;
    reload)
        running "$1" "$2" || return 0
        kill -HUP "$pid"
        ;;
    *)
        echo "usage: ${0##*/} status|reload" >&2
        return 2
        ;;
    esac
}
