# Completion of lumora-local(1) for fish.

complete -c lumora-local -n __fish_use_subcommand -f -a init -d 'Make a service'
complete -c lumora-local -n __fish_use_subcommand -f -a issue -d 'Issue a ticket for each artefact'
complete -c lumora-local -n __fish_use_subcommand -f -a revoke -d 'Replace issued tickets by revoked ones'
complete -c lumora-local -n __fish_use_subcommand -f -a list -d 'List the records'
complete -c lumora-local -n __fish_use_subcommand -f -a sample -d 'Write a sample of each kind of artefact'
complete -c lumora-local -n __fish_use_subcommand -f -a serve -d 'Answer lookups over HTTPS'
complete -c lumora-local -n __fish_use_subcommand -l version -d 'Print the version'
complete -c lumora-local -s h -l help -d 'Print the usage'

complete -c lumora-local -n '__fish_seen_subcommand_from init' -x -l host -a '(__fish_print_hostnames)' -d 'A name that the service goes by'
complete -c lumora-local -n '__fish_seen_subcommand_from init' -x -l port -d 'The port that clients are sent to'
complete -c lumora-local -n '__fish_seen_subcommand_from issue' -l asset -d 'Deliver by download'
complete -c lumora-local -n '__fish_seen_subcommand_from issue revoke list' -x -l environment -a 'production development' -d 'The set of records'
complete -c lumora-local -n '__fish_seen_subcommand_from list' -l json -d 'As one JSON document'
complete -c lumora-local -n '__fish_seen_subcommand_from serve' -x -l listen -d 'ADDRESS:PORT to listen on'
complete -c lumora-local -n '__fish_seen_subcommand_from serve' -r -l ready-file -d 'Gets the URL once it listens'
complete -c lumora-local -n '__fish_seen_subcommand_from serve' -l update-platform -d 'Let platform.json name this service'
