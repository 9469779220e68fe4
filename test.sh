#!/usr/bin/env bash
# Builds everything with the address and undefined-behaviour sanitizers and runs all tests. Arguments go to ctest.
. "$(dirname "${BASH_SOURCE[0]}")/scripts/common.sh"

export UBSAN_OPTIONS=print_stacktrace=1
log=build/asan.tests.log

install_packages
step "building the tests with sanitizers"
configure asan build/asan || give_up
build build/asan || give_up

step "running the tests"
run_tests build/asan "$log" "$@"
result=$?

echo
tests_line "$log"
exit $result
