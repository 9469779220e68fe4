#!/usr/bin/env bash
# format.sh: formats all C++ files of the tree. format.sh --check [file...]: names those that aren't formatted.
. "$(dirname "${BASH_SOURCE[0]}")/common.sh"

check=
if [ "${1:-}" = --check ]; then
    check=yes
    shift
fi

files=("$@")
if [ ${#files[@]} -eq 0 ]; then
    mapfile -t files < <(find . -path ./build -prune -o \( -name '*.h' -o -name '*.cpp' \) -print | sort)
fi
[ ${#files[@]} -eq 0 ] && exit 0

if [ -z "$check" ]; then
    printf '%s\0' "${files[@]}" | xargs -0 -n 16 -P "$jobs" clang-format -i || exit 1
    echo "${#files[@]} files formatted"
    exit 0
fi

# Runs in batches over both cores; a file that differs is named on a line of its own.
unformatted=$(printf '%s\0' "${files[@]}" |
    xargs -0 -n 1 -P "$jobs" sh -c 'clang-format "$0" | cmp -s - "$0" || echo "$0"' | sort)
if [ -n "$unformatted" ]; then
    echo "not formatted (scripts/format.sh mends it):"
    echo "$unformatted"
    exit 1
fi
echo "${#files[@]} files are formatted"
