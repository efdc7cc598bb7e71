#!/usr/bin/env bash
# Writes the fuzz targets' seed corpora anew into fuzz/corpus/<target>/: the simulated card's
# replies from its demo SIM, message PDUs from the codec tests, and files written by the
# program's own writers (fuzz/make_seeds.cpp). Run it when a reply or a file format changes.
set -euo pipefail
source "$(dirname "${BASH_SOURCE[0]}")/fuzz_common.sh"

vqm_fuzz_build vqm-fuzz-seeds
rm -rf "$seeds"
"$build/fuzz/vqm-fuzz-seeds" "$seeds"
echo "$(find "$seeds" -type f | wc -l) seeds, $(find "$seeds" -type f -printf "%s\n" | awk "{s+=\$1} END {print s}") bytes in $seeds"
