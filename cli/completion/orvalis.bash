# Completion for bash. The tool itself says which commands, options and values there are.
_orvalis() {
  local word=${COMP_WORDS[COMP_CWORD]} before=${COMP_WORDS[COMP_CWORD - 1]} names
  COMPREPLY=()
  if ((COMP_CWORD == 1)) || [[ ${COMP_WORDS[1]} == help ]]; then
    names=$("${COMP_WORDS[0]}" --help 2>/dev/null | sed -n '/^Subcommands:/,/^$/s/^  \([a-z]*\) .*/\1/p')
    ((COMP_CWORD == 1)) || names+=" input"
  elif [[ $word == -* ]]; then
    names=$("${COMP_WORDS[0]}" "${COMP_WORDS[1]}" --help 2>/dev/null |
      sed -n 's/^  \(-[a-z],\)\{0,1\}\(--[a-z-]*\).*/\2/p')
  elif [[ $before == -?* ]]; then
    # Refusing a wrong value, the tool names the right ones.
    names=$("${COMP_WORDS[0]}" "${COMP_WORDS[1]}" "$before=?" 2>&1 |
      sed -n 's/.* is none of //p' | tr -s ', ' '\n')
  fi
  # Without names, files.
  [[ $names ]] && mapfile -t COMPREPLY < <(compgen -W "$names" -- "$word")
}
complete -o bashdefault -o default -F _orvalis orvalis
