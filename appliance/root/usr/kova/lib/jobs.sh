# shellcheck shell=sh
# What /sbin/start and /sbin/stop share; sourced, never run. The head of /sbin/start says what a job is.

. /usr/kova/lib/kova.sh

jobs=/etc/kova/jobs
state=/run/kova/jobs

# parse_job JOB [KEY=VALUE...]: sets $job and $keys, the sorted KEY=VALUE texts joined by ","; false for bad usage
parse_job() {
    job=${1-}
    case $job in
    '' | *[!a-z0-9-]* | -*)
        echo "usage: ${0##*/} JOB [KEY=VALUE...]" >&2
        return 1
        ;;
    esac
    shift
    for key; do
        case ${key%%=*} in '' | PATH | *[!A-Z0-9_]* | [0-9]*) key= ;; esac
        case $key in *=*) ;; *) key= ;; esac
        case ${key#*=} in *[!A-Za-z0-9._:@%+-]*) key= ;; esac
        [ -n "$key" ] && continue
        echo "${0##*/}: a key is upper case, a value letters, digits and ._:@%+- (KEY=VALUE)" >&2
        return 1
    done
    keys=
    [ $# -eq 0 ] || keys=$(printf '%s\n' "$@" | sort | paste -s -d ,)
}

job_exists() {
    [ -f "$jobs/$job" ] && [ -x "$jobs/$job" ] || fail "unknown job $job"
}

# lock_instance: one start or stop of $job with $keys at a time; held as descriptor 9
lock_instance() {
    record=$state/$job${keys:+,$keys}
    mkdir -p "$state" && exec 9>"$state/.${record##*/}.lock" && flock 9 || fail "$job: cannot lock ${record##*/}"
}

# run_job VERB: the job's script with its keys and nothing else in its environment
run_job() (
    IFS=,
    set -f
    # shellcheck disable=SC2086 # split into KEY=VALUE
    exec env -i $keys PATH="$PATH" "$jobs/$job" "$1" 9>&-
)

# read_stat PID: sets $process_state, $process_session and $process_start; false when there is no such process
read_stat() {
    { read -r stat_line <"/proc/$1/stat"; } 2>/dev/null || return 1
    # the name before the last ")" may hold anything
    # shellcheck disable=SC2086 # split into fields
    set -- ${stat_line##*) }
    process_state=$1
    process_session=$4
    shift 19
    process_start=$1
}

# read_record: sets $leader, the leader of the instance's session, and $leader_start, which tells it from another
# process that was given the same number later
read_record() {
    { read -r leader leader_start <"$record"; } 2>/dev/null
}

# survivors: prints the living processes of the recorded instance
survivors() {
    read_record || return 0
    read_stat "$leader" && [ "$process_start" != "$leader_start" ] && return 0
    for process in /proc/[0-9]*; do
        process=${process#/proc/}
        read_stat "$process" || continue
        [ "$process_state" != Z ] || continue
        [ "$process_session" = "$leader" ] || [ "$process" = "$leader" ] || continue
        echo "$process"
    done
}

is_running() {
    read_record && read_stat "$leader" && [ "$process_start" = "$leader_start" ] && [ "$process_state" != Z ]
}

# gone_after SIGNAL TENTHS: signals what is left of the instance until nothing is, for at most that long
gone_after() {
    for _ in $(seq $(($2 * 4))); do
        processes=$(survivors)
        [ -n "$processes" ] || return 0
        for process in $processes; do kill "-$1" "$process" 2>/dev/null; done
        sleep 0.025
    done
    return 1
}

# end_processes: asks the leader, which may tidy up, then ends whatever is left of its session
end_processes() {
    is_running && kill -TERM "$leader" 2>/dev/null
    gone_after 0 10 || gone_after KILL 10 || fail "$job: a process of ${record##*/} does not end"
}
