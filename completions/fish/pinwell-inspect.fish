# Completion of pinwell-inspect(1) for fish.

complete -c pinwell-inspect -l json -d 'One JSON object a path'
complete -c pinwell-inspect -x -l color -a 'auto always never' -d 'Colour the text'
complete -c pinwell-inspect -s h -l help -d 'Print the usage'
complete -c pinwell-inspect -l version -d 'Print the version'
