# Completes the subcommands and options of vokmempool in bash, by the program's own help. Arguments
# are file names.
# Test: tests/tools/tools_test.py.
_vokmempool() {
  local help word=${COMP_WORDS[COMP_CWORD]}
  COMPREPLY=()
  if ((COMP_CWORD == 1)); then
    help=$("$1" --help | sed '1,/^Usage/d')
  elif [[ $word == -* ]]; then
    help=$("$1" "${COMP_WORDS[1]}" --help 2>/dev/null)
  fi
  # A word is at the start of its line, after its short form if it has one.
  help=$(sed -nE 's/^ +(-.,)?(--[a-z-]+|[a-z]+  ).*/\2/p' <<<"$help")
  mapfile -t COMPREPLY < <(compgen -W "$help" -- "$word")
}
complete -o default -F _vokmempool vokmempool
