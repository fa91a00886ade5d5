#compdef twctl
# SPDX-License-Identifier: Apache-2.0
# Zsh completion for twctl(1). The candidates come from twctl itself, which looks nothing up for longer than this many seconds.
# Its texts are never expanded, because other users may have written them.
: ${_twctl_patience:=1}

_twctl() {
  local program=${(Q)words[1]} line tab=$'\t'
  (( $+commands[$program] )) || [[ -x $program ]] || program=twctl
  local -a answer=("${(@f)$("$program" __complete zsh $_twctl_patience "${(@Q)words[2,CURRENT-1]}" "${(Q)PREFIX}" 2>/dev/null)}")
  case $answer[1] in
    (files | recordings)
      compset -P '--*='
      if [[ $answer[1] == recordings ]]; then
        _files -g '*.jsonl'
      else
        _files
      fi
      ;;
    (command\ *)
      shift ${answer[1]#command } words
      (( CURRENT -= ${answer[1]#command } ))
      _normal
      ;;
    (words*)
      local -a candidates shown options
      [[ $answer[1] != 'words nospace' ]] || options=(-S '')
      for line in "${(@)answer[2,-1]}"; do
        candidates+=("${line%%$tab*}")
        if [[ $line == *$tab* ]]; then
          shown+=("${line%%$tab*}  -- ${line#*$tab}")
        else
          shown+=("$line")
        fi
      done
      (( $#candidates )) && compadd "${(@)options}" -l -d shown -a candidates
      ;;
  esac
}

# Loaded by the completion system, this file is the body of the function; read by hand, it only defines it.
if [[ $funcstack[1] == _twctl ]]; then
  _twctl "$@"
elif (( $+functions[compdef] )); then
  compdef _twctl twctl
fi
