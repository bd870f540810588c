# Completion for fish. The tool itself says which commands, options and values there are.
function __orvalis_commands
    orvalis --help 2>/dev/null | sed -n '/^Subcommands:/,/^$/s/^  \([a-z]*\) .*/\1/p'
end

function __orvalis_options
    set -l words (commandline -opc)
    orvalis $words[2] --help 2>/dev/null | sed -n 's/^  \(-[a-z],\)\{0,1\}\(--[a-z-]*\).*/\2/p'
end

function __orvalis_values
    set -l words (commandline -opc)
    string match -q -- '-?*' $words[-1]; or return
    # Refusing a wrong value, the tool names the right ones.
    orvalis $words[2] "$words[-1]=?" 2>&1 | sed -n 's/.* is none of //p' | tr -s ', ' '\n'
end

complete -c orvalis -n 'test (count (commandline -opc)) -eq 1' -f -a '(__orvalis_commands)'
complete -c orvalis -n '__fish_seen_subcommand_from help' -f -a '(__orvalis_commands; echo input)'
complete -c orvalis -n 'test (count (commandline -opc)) -gt 1; and string match -q -- "-*" (commandline -ct)' -a '(__orvalis_options)'
complete -c orvalis -n 'test (count (__orvalis_values)) -gt 0' -f -a '(__orvalis_values)'
