#!/usr/bin/env bash
# Builds a release and takes a sample animation through it: what is in it, its values, and a drawing of its curves.
. "$(dirname "${BASH_SOURCE[0]}")/scripts/common.sh"

sample=examples/samples/bouncing_ball.gltf
drawing=build/bouncing_ball.svg
motion=build/bouncing_ball_motion.svg
kfs=build/release/bin/kfs

install_packages
step "building the release"
configure release build/release || give_up
build build/release || give_up

step "what is in $sample"
"$kfs" info "$sample" || give_up
step "its values"
"$kfs" eval "$sample" || give_up
step "its curves"
"$kfs" plot "$sample" -o "$drawing" || give_up
step "its motion path"
"$kfs" plot --motion "$sample" --stream '*/translation' -o "$motion" || give_up

echo
echo "Built $kfs, read $sample, printed its values and drew its curves to $drawing and its motion path to $motion."
