#!/usr/bin/env bash
# exports.sh <libkfs.so> [--update]: holds the exported symbols of the library against exports.txt beside this script,
# or writes that file. `cmake --build <build> --target update-exports` is the short way to the second.
#
# The list has the functions, data, vtables and typeinfo that a host links against. Weak functions, such as the inline
# members of an exported class, come and go with the compiler's inlining and aren't in it, but even they must carry one
# of our names.
set -u -o pipefail
export LC_ALL=C
library=$1
list=$(dirname "$0")/exports.txt

symbols=$(nm --dynamic --defined-only --demangle "$library" | sed -E 's/^[0-9a-f]+ //') || exit 1

ours='((typeinfo|typeinfo name|vtable|VTT|construction vtable) for |(non-virtual|virtual|covariant return) thunk to |guard variable for )?(KFS_|FX_|Get_VX)'
operators='operator[^(]*\((KFS_|FX_)'
strangers=$(sed -E 's/^[A-Za-z] //' <<<"$symbols" | grep -vE "^($ours|$operators|\$)" | sort -u)
if [ -n "$strangers" ]; then
    echo "exported, but not ours to export:"
    echo "$strangers"
    exit 1
fi

names=$(grep -E '^[TDBRVu] ' <<<"$symbols" | sed -E 's/^[A-Za-z] //' | sort -u)
if [ "${2:-}" = --update ]; then
    printf '%s\n' "$names" >"$list"
    echo "$(wc -l <"$list") exported symbols written"
    exit 0
fi
if ! difference=$(diff "$list" <(printf '%s\n' "$names")); then
    echo "The exported symbols changed (< no longer exported, > new):"
    grep '^[<>]' <<<"$difference"
    echo "If that is meant: cmake --build <build> --target update-exports"
    exit 1
fi
echo "$(wc -l <"$list") exported symbols, as listed"
