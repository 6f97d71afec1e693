# Bash completion of zuv. What can come next is asked of the program itself, so it is that of its contract.
_zuv()
{
    local words
    words=("${COMP_WORDS[@]:1:COMP_CWORD}")
    # A ":" is a word of its own to bash; completion of class names with a prefix needs it glued.
    if declare -F _get_comp_words_by_ref >/dev/null; then
        local cur prev cword
        _get_comp_words_by_ref -n : cur prev words cword
        words=("${words[@]:1:cword}")
    fi
    mapfile -t COMPREPLY < <("${COMP_WORDS[0]}" complete-words "${words[@]}" 2>/dev/null)
    declare -F __ltrim_colon_completions >/dev/null && __ltrim_colon_completions "${words[-1]}"
}
complete -o default -F _zuv zuv
