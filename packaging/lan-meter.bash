# bash completion for lan-meter: options, files, the letters that the word behind -t does not have yet, and what
# "lan-meter -l" tells of this host: ports, switches, physical NICs and virtual machines.

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

# One column of "lan-meter -l": its number among the parts of a line, and the types of ports that count.
_lan_meter_list() {
    local line pattern='^([0-9-]+) +([0-9]+) +[0-9]+ (.*[^ ]) +[0-9a-f]{2}(:[0-9a-f]{2}){5} +(.*)$'
    while IFS= read -r line; do
        [[ $line =~ $pattern && ${BASH_REMATCH[2]} == $3 ]] && printf '%s\n' "${BASH_REMATCH[$2]}"
    done < <(timeout 3 "${1/#\~/$HOME}" -l 2>/dev/null) | sort -u
}

# Offers those lines of the input that begin with the word $2, of which bash takes $1 for words of their own. Names may
# hold blanks and anything else: they are quoted as the word is.
_lan_meter_names() {
    local word=$2 name quote=""
    case $word in
    [\'\"]*) quote=${word:0:1} word=${word:1} ;;
    *) word=${word//\\/} ;;
    esac
    while IFS= read -r name; do
        [[ -n $name && $name == "$1$word"* ]] || continue
        name=${name#"$1"}
        case $quote in
        \') name=\'${name//\'/\'\\\'\'} ;;
        \") name=\"$(sed 's/[\\"$`]/\\&/g' <<<"$name") ;;
        *) [[ $name == *[!A-Za-z0-9,./_+-]* ]] && printf -v name %q "$name" ;;
        esac
        COMPREPLY+=("$name")
    done
}

_lan_meter() {
    local short="-A -a -C -c -d -f -h -i -l -N -n -o -p -S -t -V"
    local long="--all --abs --cache --cfg --debug --help --pnic --port --switch --type --vm"
    local current=${COMP_WORDS[COMP_CWORD]} at=$((COMP_CWORD - 1)) ahead=""
    COMPREPLY=()
    # The colons and equals signs that bash made words of belong to the argument of the option ahead of them.
    [[ $current == [:=] ]] && current="" at=$COMP_CWORD
    while ((at > 1)) && [[ ${COMP_WORDS[at]} == [:=] ]]; do
        ahead=${COMP_WORDS[at--]}$ahead
        [[ ${COMP_WORDS[at]} == -* ]] || ahead=${COMP_WORDS[at--]}$ahead
    done
    ahead=${ahead#=}
    ahead=${ahead//\\/}
    case ${COMP_WORDS[at]} in
    -[oCc] | --cfg | --cache) _lan_meter_files "$current" ;;
    -t | --type) _lan_meter_letters "$current" "" ;;
    -p | --port) _lan_meter_names "$ahead" "$current" < <(_lan_meter_list "$1" 1 '*') ;;
    -S | --switch) _lan_meter_names "$ahead" "$current" < <(_lan_meter_list "$1" 3 '*') ;;
    -N | --pnic) _lan_meter_names "$ahead" "$current" < <(_lan_meter_list "$1" 5 4) ;;
    -V | --vm) _lan_meter_names "$ahead" "$current" < <(_lan_meter_list "$1" 5 5) ;;
    -[din] | --debug) ;;
    *)
        case $current in
        -t?*) _lan_meter_letters "${current#-t}" -t ;;
        -*) mapfile -t COMPREPLY < <(compgen -W "$short $long" -- "$current") ;;
        esac
        ;;
    esac
}

complete -F _lan_meter lan-meter
