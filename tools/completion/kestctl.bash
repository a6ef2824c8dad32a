# SPDX-License-Identifier: Apache-2.0
# bash completion for kestctl: the program itself knows what may come next.
_kestctl() {
    # $1 is the command as typed, $2 the word up to the cursor.
    mapfile -t COMPREPLY < <("${1/#\~\//"$HOME"/}" --complete \
        "${COMP_WORDS[@]:1:COMP_CWORD-1}" "$2" 2>/dev/null)
}
complete -F _kestctl kestctl
