# bash completion for lan-meter: options, files, and the letters that the word behind -t does not have yet.

_lan_meter_files() {
    # bash may or may not part words at colons, so what stands ahead of the last path of a list is put back here.
    local path=${1##*:} file
    while IFS= read -r file; do
        COMPREPLY+=("${1%"$path"}$file")
    done < <(compgen -f -- "$path")
    compopt -o filenames 2>/dev/null
}

# The word behind -t, and what of the option stands in the same word.
_lan_meter_letters() {
    local letters=cChelqQivWV i
    for ((i = 0; i < ${#letters}; i++)); do
        [[ $1 == *"${letters:i:1}"* ]] || COMPREPLY+=("$2$1${letters:i:1}")
    done
    compopt -o nospace 2>/dev/null
}

_lan_meter() {
    local short="-A -a -C -c -d -f -h -i -l -N -n -o -p -S -t -V"
    local long="--all --abs --cache --cfg --debug --help --pnic --port --switch --type --vm"
    local current=${COMP_WORDS[COMP_CWORD]} at=$((COMP_CWORD - 1))
    COMPREPLY=()
    # The colons and equals signs that bash made words of belong to the argument of the option ahead of them.
    [[ $current == [:=] ]] && current="" at=$COMP_CWORD
    while ((at > 1)) && [[ ${COMP_WORDS[at]} == [:=] ]]; do
        ((at--))
        [[ ${COMP_WORDS[at]} == -* ]] || ((at--))
    done
    case ${COMP_WORDS[at]} in
    -[oCc] | --cfg | --cache) _lan_meter_files "$current" ;;
    -t | --type) _lan_meter_letters "$current" "" ;;
    -[dinNpSV] | --debug | --pnic | --port | --switch | --vm) ;;
    *)
        case $current in
        -t?*) _lan_meter_letters "${current#-t}" -t ;;
        -*) mapfile -t COMPREPLY < <(compgen -W "$short $long" -- "$current") ;;
        esac
        ;;
    esac
}

complete -F _lan_meter lan-meter
