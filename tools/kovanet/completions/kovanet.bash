# shellcheck shell=bash
# Completion of kovanet for bash: kovanet itself knows what fits.

_kovanet() {
    # bash parts words at ":" and the like; where no blank is between, they are one
    local rest=${COMP_LINE:0:COMP_POINT} words=() index word behind
    for ((index = 0; index <= COMP_CWORD; ++index)); do
        word=${COMP_WORDS[index]}
        behind=${rest#"${rest%%[![:space:]]*}"}
        if [[ ${#words[@]} -gt 0 && $behind == "$rest" ]]; then
            words[-1]+=$word
        else
            words+=("$word")
        fi
        rest=${behind#"$word"}
    done
    local whole=${words[-1]}
    if [[ ${words[-2]-} == --password-file ]]; then
        compopt -o filenames 2>/dev/null
        mapfile -t COMPREPLY < <(compgen -f -- "$whole")
        return
    fi
    mapfile -t COMPREPLY < <(kovanet --complete "${words[@]:1}" 2>/dev/null)
    COMPREPLY=("${COMPREPLY[@]#"${whole%"${whole##*[:=@]}"}"}") # what stands before the last ":" stays there
}
complete -F _kovanet kovanet
