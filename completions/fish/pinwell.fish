# Completion of pinwell(1) for fish.

complete -c pinwell -n __fish_use_subcommand -f -a staple -d 'Fetch a ticket and attach it'
complete -c pinwell -n __fish_use_subcommand -f -a validate -d 'Check the ticket that is attached'
complete -c pinwell -n 'not __fish_use_subcommand' -s q -l quiet -d 'Print nothing'
complete -c pinwell -n 'not __fish_use_subcommand' -s v -l verbose -d 'Print diagnostics'
complete -c pinwell -n 'not __fish_use_subcommand' -l help -d 'Print the usage'
