# Sourced by the commands at the root: where the tree is, what they share. They run from any folder.

set -u -o pipefail
root=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
cd "$root" || exit 1
jobs=$(nproc)
exec </dev/null

# step <what>: says what comes, and remembers it for the line that a failure ends in.
current_step=
step()
{
    current_step=$1
    echo "== $1"
}

# Ends the command with a plain line that says what went wrong, unless it has said so itself.
give_up()
{
    echo
    echo "${1:-$(basename "$0") failed: $current_step.}"
    exit 1
}

# install_packages: the Debian packages of packages.txt that are missing. Does nothing where all are present.
install_packages()
{
    local missing=() package sudo=()
    for package in $(sed 's/#.*//' packages.txt); do
        [ "$(dpkg-query -W -f '${db:Status-Status}' "$package" 2>/dev/null)" = installed ] || missing+=("$package")
    done
    [ ${#missing[@]} -eq 0 ] && return 0

    step "installing Debian packages: ${missing[*]}"
    if [ "$(id -u)" -ne 0 ]; then
        command -v sudo >/dev/null || give_up "Packages are missing and there is no sudo. As root: apt-get install ${missing[*]}"
        sudo=(sudo)
    fi
    "${sudo[@]}" apt-get update -q || echo "the package lists couldn't be refreshed; trying with those at hand"
    "${sudo[@]}" env DEBIAN_FRONTEND=noninteractive apt-get install -q -y --no-install-recommends "${missing[@]}" || give_up
}

# configure <preset> <build folder> [cmake argument...]
configure()
{
    local preset=$1 folder=$2 generator=()
    shift 2
    mkdir -p "$(dirname "$folder")"
    command -v ninja >/dev/null || generator=(-G "Unix Makefiles")
    cmake --preset "$preset" -B "$folder" "${generator[@]}" "$@" >"$folder.configure.log" 2>&1 && return 0
    cat "$folder.configure.log"
    return 1
}

# build <build folder> [target...]
build()
{
    local folder=$1
    shift
    local targets=()
    [ $# -gt 0 ] && targets=(--target "$@")
    cmake --build "$folder" --parallel "$jobs" "${targets[@]}"
}

# run_tests <build folder> <log> [ctest argument...]: runs ctest, keeps what it prints in the log too.
run_tests()
{
    local folder=$1 log=$2
    shift 2
    ctest --test-dir "$folder" --parallel 2 --output-on-failure --no-tests=error "$@" 2>&1 | tee "$log"
}

# The numbers of ctest's summary in a log: how many ran, failed, were skipped.
tests_total() { sed -nE 's/^[0-9]+% tests passed, [0-9]+ tests? failed out of ([0-9]+)$/\1/p' "$1" | tail -1; }
tests_failed() { sed -nE 's/^[0-9]+% tests passed, ([0-9]+) tests? failed out of [0-9]+$/\1/p' "$1" | tail -1; }
tests_skipped() { grep -cE '^ *[0-9]+/[0-9]+ Test .*\*\*\*Skipped' "$1"; }

# tests_line <log>: the summary as a sentence.
tests_line()
{
    local total failed skipped
    total=$(tests_total "$1") failed=$(tests_failed "$1") skipped=$(tests_skipped "$1")
    if [ -z "$total" ] || [ "$total" -eq 0 ]; then
        echo "No tests ran."
    elif [ "$failed" -ne 0 ]; then
        echo "$failed of $total tests failed."
    elif [ "$skipped" -ne 0 ]; then
        echo "All $((total - skipped)) tests that could run passed; $skipped skipped because something they need is absent."
    else
        echo "All $total tests passed."
    fi
}
