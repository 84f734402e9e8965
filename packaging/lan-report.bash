# bash completion for lan-report: commands and their options as its help tells them, sections and columns as "table
# --columns" does, and the ports, switches, NICs and machines of the first records of the files on the line.

_lan_report_run() {
    timeout 3 "$_lan_report_program" "$@" 2>/dev/null </dev/null
}

# Offers those lines of the input that begin with the word $2, of which bash takes $1 for words of their own. Names may
# hold blanks and anything else: they are quoted as the word is.
_lan_report_names() {
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

# A column of the ports in the first records of the files on the line; of uplinks ("true") or others ("false") alone
# where $2 says so. Standard input is not touched.
_lan_report_ports() {
    local word files=()
    for word in "${COMP_WORDS[@]:2}"; do
        word=${word//[\\\'\"]/}
        word=${word/#\~/$HOME}
        [[ -f $word ]] && files+=("$word")
    done
    ((${#files[@]} > 0)) || return
    _lan_report_run table --tsv -f "uplink,$1" -n 20000 "${files[@]}" |
        awk -F '\t' -v uplink="$2" 'NR > 1 && (uplink == "" || $1 == uplink) && !seen[$2]++ { print $2 }'
}

# Columns of the section on the line, behind those that the word has already.
_lan_report_columns() {
    local i section=ports head="" sign="" key
    for ((i = 1; i < COMP_CWORD; i++)); do
        case ${COMP_WORDS[i]} in -s | --section) section=${COMP_WORDS[i + 1]} ;; esac
        [[ ${COMP_WORDS[i]} == --section && $section == = ]] && section=${COMP_WORDS[i + 2]}
    done
    [[ $1 == *,* ]] && head=${1%,*},
    [[ $2 == *-* && ${1#"$head"} == -* ]] && sign=-
    while IFS= read -r key; do
        [[ ,$head == *",$key,"* ]] || printf '%s\n' "$head$sign$key"
    done < <(_lan_report_run table --columns -s "$section" --tsv | sed 1d | cut -f 2)
    compopt -o nospace 2>/dev/null
}

# What the argument of an option can be, by its name in the help.
_lan_report_argument() {
    case $1 in
    PORT) _lan_report_names "$2" "$3" < <(_lan_report_ports id "") ;;
    SWITCH) _lan_report_names "$2" "$3" < <(_lan_report_ports switch "") ;;
    NIC) _lan_report_names "$2" "$3" < <(_lan_report_ports name true) ;;
    VM) _lan_report_names "$2" "$3" < <(_lan_report_ports name false) ;;
    SECTION) _lan_report_names "" "$3" < <(_lan_report_run table --columns --tsv | sed 1d | cut -f 1 | uniq) ;;
    *KEY,...)
        _lan_report_names "" "$3" < <(_lan_report_columns "$3" "$1")
        compopt -o nospace 2>/dev/null
        ;;
    *\|*) _lan_report_names "" "$3" < <(tr '|' '\n' <<<"$1") ;;
    FILE | DIR*)
        mapfile -t COMPREPLY < <(compgen -f -- "$3")
        compopt -o filenames 2>/dev/null
        ;;
    esac
}

_lan_report() {
    local current=${COMP_WORDS[COMP_CWORD]} at=$((COMP_CWORD - 1)) ahead="" i command="" flags argument
    local _lan_report_program=${1/#\~/$HOME}
    COMPREPLY=()
    for ((i = 1; i < COMP_CWORD; i++)); do
        [[ ${COMP_WORDS[i]} == -* ]] || { command=${COMP_WORDS[i]} && break; }
    done
    if [[ -z $command ]]; then
        mapfile -t COMPREPLY < <(compgen -W "-h --help --version $(_lan_report_run -h |
            sed -nE '/^Subcommands/,$s/^  ([a-z]+)( .*)?$/\1/p')" -- "$current")
        return
    fi
    # The colons and equals signs that bash made words of belong to the argument of the option ahead of them.
    [[ $current == [:=] ]] && current="" at=$COMP_CWORD
    while ((at > 2)) && [[ ${COMP_WORDS[at]} == [:=] ]]; do
        ahead=${COMP_WORDS[at--]}$ahead
        [[ ${COMP_WORDS[at]} == -* ]] || ahead=${COMP_WORDS[at--]}$ahead
    done
    ahead=${ahead#=}
    ahead=${ahead//\\/}
    local options=()
    while read -r flags argument; do
        options+=("${flags//,/ }")
        if [[ -n $argument && ,$flags, == *",${COMP_WORDS[at]},"* ]]; then
            _lan_report_argument "$argument" "$ahead" "$current"
            return
        fi
    done < <(_lan_report_run "$command" -h | sed -nE 's/^  (-[^ ]+)( ([^ ]+))?.*/\1 \3/p')
    if [[ $current == -* ]]; then
        mapfile -t COMPREPLY < <(compgen -W "${options[*]}" -- "$current")
    else
        _lan_report_argument FILE "" "$current"
    fi
}

complete -F _lan_report lan-report
