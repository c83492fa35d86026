# Completion of rvctl for fish.

function __rvctl_clients
    rvctl list --json 2>/dev/null | string replace -rf '^ *"client_id": "([A-Za-z0-9._-]*)",?$' '$1'
end

function __rvctl_accounts
    rvctl account list --json 2>/dev/null | string replace -rf '^ *"id": "([A-Za-z0-9._-]*)",?$' '$1'
end

set -l commands account request access explain list authorize revoke forget log preference agent
set -l none "not __fish_seen_subcommand_from $commands"

complete -c rvctl -f
complete -c rvctl -s h -l help -d 'Print help'
complete -c rvctl -n $none -a account -d 'Add, list and remove accounts'
complete -c rvctl -n $none -a request -d 'Ask for access, as an application does'
complete -c rvctl -n $none -a access -d 'Show what access an application holds'
complete -c rvctl -n $none -a explain -d 'Show what a request would come to, and why'
complete -c rvctl -n $none -a list -d 'List the applications that were granted or refused'
complete -c rvctl -n $none -a authorize -d 'Grant an application access, without asking'
complete -c rvctl -n $none -a revoke -d "Take an application's access away"
complete -c rvctl -n $none -a forget -d 'Forget a refusal, so that the user is asked again'
complete -c rvctl -n $none -a log -d 'Show what was asked for and decided'
complete -c rvctl -n $none -a preference -d 'Show, set and reset preferences'
complete -c rvctl -n $none -a agent -d 'Show alerts on this terminal and take the answers'

complete -c rvctl -n "__fish_seen_subcommand_from $commands" -l json -d 'Print JSON'

set -l account '__fish_seen_subcommand_from account; and not __fish_seen_subcommand_from add list remove'
complete -c rvctl -n $account -a 'add list remove'
complete -c rvctl -n '__fish_seen_subcommand_from account; and __fish_seen_subcommand_from add' -l token-fd -x -d 'Read the token from this descriptor'
complete -c rvctl -n '__fish_seen_subcommand_from account; and __fish_seen_subcommand_from remove' -a '(__rvctl_accounts)'

set -l preference '__fish_seen_subcommand_from preference; and not __fish_seen_subcommand_from get set reset'
complete -c rvctl -n $preference -a 'get set reset'
complete -c rvctl -n '__fish_seen_subcommand_from preference' -l application -x -d 'Whose preference'
complete -c rvctl -n '__fish_seen_subcommand_from preference; and __fish_seen_subcommand_from get set reset' -a TKFacebookIgnoreAccessRequests

complete -c rvctl -n '__fish_seen_subcommand_from request access' -l as -x -d 'The installed application that asks'
complete -c rvctl -n '__fish_seen_subcommand_from request explain' -l app-id -x -d 'The ID at Facebook'
complete -c rvctl -n '__fish_seen_subcommand_from request explain' -l permissions -x -d 'Names between commas'
complete -c rvctl -n '__fish_seen_subcommand_from request explain' -l audience -x -a 'everyone friends only_me' -d 'Who sees posts'
complete -c rvctl -n '__fish_seen_subcommand_from explain' -l language -x -d 'The language of the alert'
complete -c rvctl -n '__fish_seen_subcommand_from explain' -l online -d 'Have the server describe unknown permissions'
complete -c rvctl -n '__fish_seen_subcommand_from access' -l credential-fd -x -d 'Write its token to this descriptor'
complete -c rvctl -n '__fish_seen_subcommand_from explain authorize revoke forget' -a '(__rvctl_clients)'
complete -c rvctl -n "__fish_seen_subcommand_from list; and not __fish_seen_subcommand_from account" -l pending -d 'What the server has yet to be told'
complete -c rvctl -n '__fish_seen_subcommand_from revoke' -l all -d 'Of every application'
complete -c rvctl -n '__fish_seen_subcommand_from log' -l client -x -a '(__rvctl_clients)' -d 'Of this application alone'
complete -c rvctl -n '__fish_seen_subcommand_from log' -l since -x -d 'From this day or time on'
complete -c rvctl -n '__fish_seen_subcommand_from log' -l until -x -d 'Up to this day or time'
complete -c rvctl -n '__fish_seen_subcommand_from log' -l limit -x -d 'How many entries'
