#!/usr/bin/env bash
# Writes the fuzz targets' starting corpora anew into fuzz/corpus/<target>/: the simulated card's
# replies from its demo SIM, message PDUs from the codec tests, and files written by the
# program's own writers (fuzz/make_corpora.cpp). Run it when a reply or a file format changes.
set -euo pipefail
source "$(dirname "${BASH_SOURCE[0]}")/fuzz_common.sh"

vqm_fuzz_build vqm-fuzz-corpora
rm -rf "$corpora"
"$build/fuzz/vqm-fuzz-corpora" "$corpora"
echo "$(find "$corpora" -type f | wc -l) inputs, $(find "$corpora" -type f -printf "%s\n" | awk "{s+=\$1} END {print s}") bytes in $corpora"
