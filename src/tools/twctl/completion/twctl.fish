# SPDX-License-Identifier: Apache-2.0
# Fish completion for twctl(1). The candidates come from twctl itself, which looks nothing up for longer than this many seconds.
# Its texts are never expanded, because other users may have written them.
set -q __twctl_patience; or set -g __twctl_patience 1

function __twctl_complete
    set -l words (commandline -opc)
    set -l typed (commandline -ct)
    set -l word (string unescape -- $typed; or string replace -r '^[\'"]' '' -- $typed)
    set -l program $words[1]
    type -q -- $program; or set program twctl
    type -q -- $program; or return
    set -l answer ($program __complete fish $__twctl_patience $words[2..-1] "$word" 2>/dev/null)
    switch "$answer[1]"
        case files recordings
            set -l before (string match -r -- '^--[^=]*=' $typed)
            set -l found (__fish_complete_path (string replace -r -- '^--[^=]*=' '' $typed))
            if test "$answer[1]" = recordings
                set -l fitting (string match -r -- '^.*(?:/|\.jsonl)(?:\t.*)?$' $found)
                test (count $fitting) -gt 0; and set found $fitting
            end
            test (count $found) -gt 0; and printf '%s\n' "$before"$found
        case 'command *'
            set -l tokens $words $typed
            set -l at (math (string replace 'command ' '' -- $answer[1]) + 1)
            __fish_complete_subcommand --commandline $tokens[$at..-1]
        case 'words*'
            test (count $answer) -gt 1; and printf '%s\n' $answer[2..-1]
    end
end

complete -c twctl -f -a '(__twctl_complete)'
