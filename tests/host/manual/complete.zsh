# SPDX-License-Identifier: Apache-2.0
# Prints what zsh lists as completions of a line: types the line into a zsh in a terminal of its own.
# Usage: zsh -f complete.zsh FILE LINE
zmodload zsh/zpty
zpty shell 'TERM=vt100 zsh -f -i'
zpty -w shell "PS1=; stty -echo columns 200 rows 1000
autoload -Uz compinit; compinit -D -u
zstyle ':completion:*' verbose no
_serialization_host() { source ${(q)1} }
compdef _serialization_host serialization_host
bindkey '^T' list-choices
LISTMAX=0
print BEG''IN"
zpty -r shell output '*BEGIN*'
zpty -w -n shell "$2"$'\C-t\C-u'
zpty -w shell "print E''ND"
zpty -r shell output '*END*'
# Without what moves the cursor, and its padding; columns are two blanks apart.
output=${output//$'\0'/}
print -r -- "$output" | sed 's/\x1b\[[0-9;]*[A-Za-z]/  /g; s/\r/\n/g; s/   */\n/g'
