# SPDX-License-Identifier: Apache-2.0
# Bash completion for twctl(1). The candidates come from twctl itself, which looks nothing up for longer than this many seconds.
# Its texts are never expanded, because other users may have written them.
_twctl_patience=1

_twctl() {
  # Readline takes words apart at "=" and ":". Here they are whole again, as they were typed.
  local program=$1 line=${COMP_LINE:0:COMP_POINT} words=() at gap word
  for ((at = 0; at <= COMP_CWORD; ++at)); do
    gap=${line%%[![:space:]]*}
    line=${line#"$gap"}
    word=${COMP_WORDS[at]}
    if ((at == COMP_CWORD)); then word=$line; fi
    line=${line#"$word"}
    if [ -n "$gap" ] || ((at == 0)); then words+=("$word"); else words[-1]+=$word; fi
  done
  type -P -- "$program" >/dev/null || program=twctl

  local answer=() typed=${words[-1]} candidate
  mapfile -t answer < <("$program" __complete bash "$_twctl_patience" "${words[@]:1}" 2>/dev/null)
  COMPREPLY=()
  # What is before the word that readline replaces.
  local before=${typed%"$2"}
  case ${answer[0]-} in
    files | recordings)
      compopt -o filenames 2>/dev/null
      if [ "${answer[0]}" = recordings ]; then
        mapfile -t COMPREPLY < <(compgen -d -- "$2"; compgen -f -X '!*.jsonl' -- "$2")
      fi
      [ ${#COMPREPLY[@]} -gt 0 ] || mapfile -t COMPREPLY < <(compgen -f -- "$2")
      ;;
    'command '*)
      at=${answer[0]#command }
      if declare -F _command_offset >/dev/null; then
        _command_offset "$at"
      elif ((at == ${#words[@]} - 1)); then
        compopt -o filenames 2>/dev/null
        mapfile -t COMPREPLY < <(compgen -c -f -- "$2" | sort -u)
      else
        compopt -o filenames 2>/dev/null
        mapfile -t COMPREPLY < <(compgen -f -- "$2")
      fi
      ;;
    words*)
      [ "${answer[0]}" != 'words nospace' ] || compopt -o nospace 2>/dev/null
      for candidate in "${answer[@]:1}"; do
        candidate=${candidate%%$'\t'*}
        # Within quotes readline adds no backslashes, so only words that need none can be offered.
        case $typed in
          *[\'\"]*) [[ $candidate != *[^A-Za-z0-9_./:@%+,=-]* ]] || continue ;;
          *) printf -v candidate %q "$candidate" ;;
        esac
        COMPREPLY+=("${candidate#"${before#[\'\"]}"}")
      done
      ;;
  esac
}

complete -F _twctl twctl
