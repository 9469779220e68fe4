#!/usr/bin/env bash
# headers.sh <compiler> <include folder>: compiles each installed header alone, with nothing but that folder to include
# from. Prints the ones that don't compile.
set -u
export KFS_COMPILER=$1 KFS_INCLUDE=$2
cd "$KFS_INCLUDE" || exit 1

compile_alone()
{
    if ! printf '#include "%s"\n' "$1" |
        "$KFS_COMPILER" -std=c++20 -fsyntax-only -Wall -Wextra -Werror -I "$KFS_INCLUDE" -x c++ -; then
        echo "doesn't compile alone: $1"
        return 1
    fi
}
export -f compile_alone

count=$(find . -name '*.h' | wc -l)
if [ "$count" -eq 0 ]; then
    echo "no header in $KFS_INCLUDE"
    exit 1
fi
find . -name '*.h' | sed 's|^\./||' | sort | xargs -P "$(nproc)" -I {} bash -c 'compile_alone {}' || exit 1
echo "$count headers compile alone"
