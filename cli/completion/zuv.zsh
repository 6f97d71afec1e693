#compdef zuv
# zsh completion of zuv. What can come next is asked of the program itself, so it is that of its contract.
_zuv()
{
    local -a found
    found=(${(f)"$("${words[1]}" complete-words "${(@Q)words[2,CURRENT-1]}" "$PREFIX" 2>/dev/null)"})
    if (( ${#found} )); then
        compadd -- "${found[@]}"
    else
        _files
    fi
}
_zuv "$@"
