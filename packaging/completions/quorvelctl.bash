# bash completion for quorvelctl

_quorvelctl() {
  local current=${COMP_WORDS[COMP_CWORD]} previous=${COMP_WORDS[COMP_CWORD - 1]}
  local fields="sim-status iccid imsi firmware-version bootloader-version gid1 gid2 postponement"
  local words=() word skip=0 i
  for ((i = 1; i < COMP_CWORD; i++)); do
    word=${COMP_WORDS[i]}
    if ((skip)); then skip=0; continue; fi
    case $word in
      --root | --domain | --iccid | --imsi | --count) skip=1 ;;
      -*) ;;
      *) words+=("$word") ;;
    esac
  done
  case $previous in
    --root) COMPREPLY=($(compgen -d -- "$current")); return ;;
    --domain | --iccid | --imsi | --count) return ;;
  esac
  local choices=""
  case "${words[*]}" in
    "") choices="regulatory-images ark monitor preferences plist root log sim" ;;
    ark) choices="list get" ;;
    "ark list" | "ark get") [[ $current == -* ]] && choices="--domain" ;;
    preferences) choices="list get set delete" ;;
    "preferences "*) ((${#words[@]} == 2)) && choices="com.Orvane.quorveld" ;;
    plist) choices="show write" ;;
    "plist show" | "plist write") COMPREPLY=($(compgen -f -- "$current")); return ;;
    root) choices="create" ;;
    "root create") COMPREPLY=($(compgen -d -- "$current")); return ;;
    log) [[ $current == -* ]] && choices="--follow" ;;
    sim) choices="show set clear fail succeed notify insert eject" ;;
    "sim set" | "sim clear") choices=$fields ;;
    "sim fail" | "sim succeed") choices="${fields#sim-status } connection" ;;
    "sim notify") choices="sim-newly-inserted sim-status-changed phone-number-changed postponement-status-changed" ;;
    "sim insert") choices="--iccid --imsi" ;;
  esac
  [[ $current == -* ]] && choices+=" --json --root --help"
  COMPREPLY=($(compgen -W "$choices" -- "$current"))
}

complete -F _quorvelctl quorvelctl
