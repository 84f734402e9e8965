#!/bin/bash --norc
# What completion/lan-meter.bash offers for words as bash parts them, at blanks, colons and equals signs:
# `completion_test.sh BUILD-DIRECTORY`.
source "$(dirname "${BASH_SOURCE[0]}")/../completion/lan-meter.bash" || exit 1
meter=$(cd "$1" && pwd)/lan-meter || exit 1
directory=$(mktemp -d) && cd "$directory" && trap 'rm -rf "$directory"' EXIT
touch snap.0 snap.1 "my ports"
failed=0

# offers EXPECTED WORD...: the last word is the one to complete; offers are compared as a sorted list with commas.
offers() {
    local expected=$1 got
    COMP_WORDS=(lan-meter "${@:2}") COMP_CWORD=$(($# - 1)) COMPREPLY=()
    _lan_meter
    got=$(printf '%s\n' "${COMPREPLY[@]}" | LC_ALL=C sort | paste -sd,)
    [[ $got == "$expected" ]] || { echo "${*:2}: offers '$got', not '$expected'" && failed=1; }
}

offers vWC,vWQ,vWV,vWc,vWe,vWh,vWi,vWl,vWq -t vW
offers C,Q,V,W,c,e,h,i,l,q,v --type = ""
offers -tcCheqlQivWV -tcCheqlQivW
offers "" -A -t cChelqQivWV
offers "my ports,snap.0,snap.1" -C ""
offers snap.0,snap.1 -A -c snap.0 : sn
offers snap.0:snap.0,snap.0:snap.1 -c snap.0:s
offers "my ports,snap.0,snap.1" --cache = snap.0 :
offers snap.1 -o snap.1
for option in -d -i -n -N -p -S -V --debug --pnic --port --switch --vm; do
    offers "" "$option" s
done
offers --cache,--cfg --c
offers --abs,--all,--cache,--cfg,--debug,--help,--pnic,--port,--switch,--type,--vm -A --
offers "" sn
offers "" -- -A ""

# The program, in the build directory given, knows what is offered, and its usage text tells no more.
COMP_WORDS=(lan-meter -) COMP_CWORD=1 && _lan_meter
for option in "${COMPREPLY[@]}"; do
    "$meter" "$option" 1 -h 2>&1 >usage | grep . && echo "$option is no option of the program" && failed=1
done
for option in $(grep -oP '^\t -\K[A-Za-z]' usage); do
    [[ " ${COMPREPLY[*]} " == *" -$option "* ]] || { echo "-$option is not offered" && failed=1; }
done
for letter in $(grep -oP '^\t\t \K[A-Za-z](?= :)' usage); do
    COMP_WORDS=(lan-meter -t "") COMP_CWORD=2 && _lan_meter
    [[ " ${COMPREPLY[*]} " == *" $letter "* ]] || { echo "letter $letter is not offered" && failed=1; }
done
exit $failed
