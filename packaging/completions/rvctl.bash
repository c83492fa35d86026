# Completion of rvctl for bash.

_rvctl_clients() {
  rvctl list --json 2>/dev/null | sed -n 's/^ *"client_id": "\([A-Za-z0-9._-]*\)",*$/\1/p'
}

_rvctl_accounts() {
  rvctl account list --json 2>/dev/null | sed -n 's/^ *"id": "\([A-Za-z0-9._-]*\)",*$/\1/p'
}

_rvctl() {
  local current=${COMP_WORDS[COMP_CWORD]} previous=${COMP_WORDS[COMP_CWORD - 1]}
  local commands="account request access explain list authorize revoke forget log preference agent"
  local command="" word words=""
  for word in "${COMP_WORDS[@]:1:COMP_CWORD-1}"; do
    [[ $word == -* ]] && continue
    case $command in
      "") command=$word ;;
      account | preference) command="$command $word" ;;
    esac
  done
  case $previous in
    --audience)
      mapfile -t COMPREPLY < <(compgen -W "everyone friends only_me" -- "$current")
      return
      ;;
    --client)
      mapfile -t COMPREPLY < <(compgen -W "$(_rvctl_clients)" -- "$current")
      return
      ;;
    --as | --app-id | --permissions | --token-fd | --credential-fd | --limit | --since | --until | --application | --language)
      return
      ;;
  esac
  case $command in
    "") words=$commands ;;
    account) words="add list remove" ;;
    preference) words="get set reset" ;;
    "account add") words="--json --token-fd" ;;
    "account remove") words="--json $(_rvctl_accounts)" ;;
    request) words="--json --as --app-id --permissions --audience" ;;
    access) words="--json --as --credential-fd" ;;
    explain) words="--json --app-id --permissions --audience --language --online $(_rvctl_clients)" ;;
    authorize | forget) words="--json $(_rvctl_clients)" ;;
    list) words="--json --pending" ;;
    revoke) words="--json --all $(_rvctl_clients)" ;;
    log) words="--json --client --since --until --limit" ;;
    "preference "*) words="--json --application TKFacebookIgnoreAccessRequests" ;;
    *) words="--json" ;;
  esac
  mapfile -t COMPREPLY < <(compgen -W "$words --help" -- "$current")
}

complete -F _rvctl rvctl
