#!/usr/bin/env bash
# virtuals.sh <compiler> <include folder> [--update]: holds the order of the virtual functions of the exported classes in the
# installed headers against virtuals.txt beside this script, or writes that file. The compiler lists them: a function that
# moves, comes in between or goes breaks hosts that were built before, which no other test would see.
# `cmake --build <build> --target update-virtuals` is the short way to the second.
set -u -o pipefail
export LC_ALL=C
compiler=$1
include=$2
list=$(dirname "$0")/virtuals.txt

if ! "$compiler" --version | grep -q 'Free Software Foundation'; then
    echo "only gcc lists the virtual functions of a class: nothing was looked at"
    exit 0
fi
folder=$(mktemp -d) || exit 1
trap 'rm -rf "$folder"' EXIT
(cd "$include" && find . -name '*.h' | sort | sed 's/.*/#include "&"/') >"$folder/all.cpp"
"$compiler" -std=c++20 -I"$include" -fsyntax-only -fdump-lang-class="$folder/classes" "$folder/all.cpp" || exit 1

# What the small host makes of the templates is its own affair.
# A class, and its functions with those of its base in front. What is pure shows its name in the classes that derive.
found=$(awk '
    /^Vtable for (KFS|FX|Q|CKF|hearth)/ && !/kfshost::/ { inside = 1; print $3; next }
    inside && /^$/ { inside = 0 }
    inside && /^[0-9]+ / && !/\(& _ZTI/ && !/\)[-0-9]+$/ {
        sub(/^[0-9]+ +(\(int \(\*\)\(\.\.\.\)\))?/, "")
        sub(/.*::/, "")
        print "    " $0
    }' "$folder/classes")
[ -n "$found" ] || { echo "the compiler listed no class"; exit 1; }

if [ "${3:-}" = --update ]; then
    printf '%s\n' "$found" >"$list"
    echo "$(grep -c '^    ' "$list") virtual functions written"
    exit 0
fi
if ! difference=$(diff "$list" <(printf '%s\n' "$found")); then
    echo "The virtual functions changed (< as listed, > now):"
    grep '^[<>0-9]' <<<"$difference"
    echo "If that is meant: cmake --build <build> --target update-virtuals"
    exit 1
fi
echo "$(grep -c '^    ' "$list") virtual functions, as listed"
