# shellcheck shell=bash
# Completion of kovanet for bash: kovanet itself knows what fits.

_kovanet() {
    mapfile -t COMPREPLY < <(kovanet --complete "${COMP_WORDS[@]:1:COMP_CWORD}" 2>/dev/null)
}
complete -F _kovanet kovanet
