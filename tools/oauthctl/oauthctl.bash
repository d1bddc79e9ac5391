# Completion of oauthctl for bash: source it, or install it as
# /usr/share/bash-completion/completions/oauthctl. Made from the program's table of commands.
# shellcheck shell=bash

_oauthctl() {
  local current=${COMP_WORDS[COMP_CWORD]} path='' words='' files='' word
  COMPREPLY=()
  case ${COMP_WORDS[COMP_CWORD - 1]} in
    --client | --grace | --id | --last | --match | --name | --redirect-uri | --scope | --user) return ;;
  esac
  for word in "${COMP_WORDS[@]:1:COMP_CWORD-1}"; do
    case "$path $word" in
      ' backup' | ' check' | ' client' | ' code' | ' log' | ' restore' | ' status' | ' token' | 'client add' | 'client delete' | 'client disable' | 'client edit' | 'client enable' | 'client list' | 'client show' | 'code list' | 'code purge' | 'code revoke' | 'log clear' | 'token list' | 'token purge' | 'token revoke' | 'token show' | 'token verify')
        path=${path:+$path }$word
        ;;
    esac
  done
  case $path in
    '') words='backup check client code log restore status token --help --version' ;;
    'client') words='list show add edit enable disable delete --help' ;;
    'code') words='list revoke purge --help' ;;
    'token') words='list show verify revoke purge --help' ;;
    'status') words='--json --help' ;;
    'check') words='--json --help' ;;
    'backup') words='--without-tokens --help' files=yes ;;
    'restore') words='--without-tokens --yes --help' files=yes ;;
    'client list') words='--json --show-secrets --help' ;;
    'client show') words='--json --show-secrets --help' ;;
    'client add') words='--name --redirect-uri --scope --disabled --secret-from-stdin --json --help' ;;
    'client edit') words='--name --redirect-uri --scope --help' ;;
    'client enable') words='--help' ;;
    'client disable') words='--help' ;;
    'client delete') words='--with-tokens --yes --help' ;;
    'code list') words='--user --client --id --json --show-secrets --help' ;;
    'code revoke') words='--user --client --id --yes --help' ;;
    'code purge') words='--grace --dry-run --yes --help' ;;
    'token list') words='--user --client --id --json --show-secrets --help' ;;
    'token show') words='--json --show-secrets --help' ;;
    'token verify') words='--json --help' ;;
    'token revoke') words='--user --client --id --yes --help' ;;
    'token purge') words='--grace --dry-run --yes --help' ;;
    'log') words='clear --match --last --json --help' ;;
    'log clear') words='--yes --help' ;;
  esac
  mapfile -t COMPREPLY < <(compgen -W "$words" -- "$current")
  if [[ -n $files && $current != -* ]]; then
    compopt -o filenames 2>/dev/null
    mapfile -t COMPREPLY < <(compgen -f -- "$current")
  fi
}

complete -F _oauthctl oauthctl
