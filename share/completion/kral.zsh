#compdef kral
# Completion of kral for zsh: what may stand in a place is the tool's own answer.
# Installed by packages; else: source <(kral completion zsh)

_kral() {
  local line
  local -a found shown open
  found=("${(@f)$(${(Q)words[1]} __complete "${(@Q)words[2,CURRENT]}" 2>/dev/null)}")
  for line in $found; do
    if [[ $line == ":files" ]]; then
      _files
      return
    fi
    [[ -z $line ]] && continue
    if [[ ${line%%$'\t'*} == *= ]]; then
      open+=("${${line%%$'\t'*}//:/\\:}:${line#*$'\t'}")
    else
      shown+=("${${line%%$'\t'*}//:/\\:}:${line#*$'\t'}")
    fi
  done
  (( $#shown )) && _describe 'kral' shown
  (( $#open )) && _describe 'kral' open -S ''
}
if [[ $zsh_eval_context[-1] == loadautofunc ]]; then _kral "$@"; else compdef _kral kral; fi
