# SPDX-License-Identifier: BSD-2-Clause
# Bash completion for the programs: what --help of the command at hand lists. -*- sh -*-

_otrp() {
  local program=${COMP_WORDS[0]} current=${COMP_WORDS[COMP_CWORD]} word
  local -a before=("${COMP_WORDS[@]:1:COMP_CWORD-1}") commands=()
  COMPREPLY=()
  if [ "${COMP_WORDS[COMP_CWORD - 1]}" = --on ]; then
    mapfile -t COMPREPLY < <(compgen -W "all $(_otrp_names)" -- "$current")
    return
  fi
  # Only words that name commands go with --help; files and values stay out of it.
  for word in "${before[@]}"; do
    [ "$word" = -- ] && return
    [[ $word =~ ^[a-z][a-z-]*$ ]] && _otrp_lists "$word" "${commands[@]}" && commands+=("$word")
  done
  local listed
  listed=$("$program" "${commands[@]}" --help 2>/dev/null </dev/null | _otrp_words)
  [[ ${commands[*]} =~ ^device\ (list|rm)$ ]] && listed+=$'\n'$(_otrp_names)
  if [[ $current == -* ]]; then
    listed=$(grep -e ^- <<<"$listed")
  else
    listed=$(grep -v -e ^- <<<"$listed")
  fi
  mapfile -t COMPREPLY < <(compgen -W "$listed" -- "$current")
}

# The names of the inventory, of the home that the words before name.
_otrp_names() {
  local -a home=()
  local i
  for i in "${!before[@]}"; do
    [ "${before[i]}" = --home ] && home=(--home "${before[i + 1]}")
  done
  "$program" "${home[@]}" device list 2>/dev/null </dev/null | awk '{ print $1 }'
}

# _otrp_lists WORD COMMANDS...: does the help of these commands list WORD as a command of theirs?
_otrp_lists() {
  local word=$1
  shift
  "$program" "$@" --help 2>/dev/null </dev/null | _otrp_words | grep -qx -e "$word"
}

# The options and commands of a help text; messages are what MESSAGE can be.
_otrp_words() {
  awk '
    /^[A-Z][a-z]*:/ { part = $1; next }
    part == "Options:" && /^  -/ { gsub(",", " ", $1); print $1 }
    part == "Subcommands:" && /^  [a-z]/ { print $1 }
    part == "Positionals:" && /One of: / { listing = 1; sub(/.*One of: /, "") }
    part == "Positionals:" && listing {
      count = split($0, names, /[ ,]+/)
      for (i = 1; i <= count; ++i) if (names[i] ~ /^[a-z-]+$/) print names[i]
      listing = /,[ ]*$/
    }' | tr " " "\n"
}

complete -o default -F _otrp otrp-device otrp-fleet otrp-tsm
