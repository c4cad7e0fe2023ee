# Completion of kral for bash: what may stand in a place is the tool's own answer.
# Installed by packages; else: eval "$(kral completion bash)"

_kral() {
  local line=${COMP_LINE:0:COMP_POINT} word found first prefix
  local -a words=()
  read -ra words <<<"$line"
  [[ $line == *[[:space:]] ]] && words+=("")
  word=${words[-1]}
  COMPREPLY=()
  mapfile -t found < <("${words[0]}" __complete "${words[@]:1}" 2>/dev/null)
  for first in "${found[@]}"; do
    if [[ $first == ":files" ]]; then
      compopt -o filenames 2>/dev/null
      mapfile -t COMPREPLY < <(compgen -f -- "${COMP_WORDS[COMP_CWORD]#=}")
      return
    fi
    # Bash replaces what stands behind the last = and : of a word.
    prefix=${word%"${word##*[=:]}"}
    first=${first%%$'\t'*}
    # Quoted: words of a definition file may hold what a shell would run.
    printf -v first %q "${first#"$prefix"}"
    COMPREPLY+=("$first")
  done
  if [[ ${#COMPREPLY[@]} -eq 1 && ${COMPREPLY[0]} == *= ]]; then compopt -o nospace 2>/dev/null; fi
}
complete -F _kral kral
