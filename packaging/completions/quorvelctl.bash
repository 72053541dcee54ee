# bash completion for quorvelctl, telvane-sim and quorvel-modem-bridge: the program itself says what can stand next.

_quorvelctl() {
  local program=${COMP_WORDS[0]} line current word i
  program=${program/#\~\//$HOME/}
  type -P -- "$program" >/dev/null || return
  # bash parts words at "=", the program does not.
  local -a words=()
  for ((i = 1; i <= COMP_CWORD; i++)); do
    word=${COMP_WORDS[i]}
    if ((${#words[@]})) && [[ $word == = || (${COMP_WORDS[i - 1]} == = && i -gt 1) ]]; then
      words[-1]+=$word
    else
      words+=("$word")
    fi
  done
  current=${COMP_WORDS[COMP_CWORD]}
  [[ $current == = ]] && current=
  # What is typed without its quotes, as the program would get it.
  for i in "${!words[@]}"; do
    word=${words[i]//[\"\']/}
    words[i]=${word//\\/}
  done
  COMPREPLY=()
  while IFS= read -r line; do
    case $line in
      :directory) compopt -o dirnames; return ;;
      :file) compopt -o default; return ;;
    esac
    word=${line%%$'\t'*}
    # A quote that is open goes on to quote the rest; without one the word is quoted where it needs to be.
    [[ $current == [\"\']* ]] || printf -v word %q "$word"
    COMPREPLY+=("$word")
  done < <("$program" __complete "${words[@]}" 2>/dev/null)
}

complete -F _quorvelctl quorvelctl telvane-sim quorvel-modem-bridge
