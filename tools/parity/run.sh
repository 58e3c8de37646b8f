#!/bin/sh
# Installs the reference pipeline's modules into the cache (once) and runs
# the parity comparison on the package's sample photos.
#   tools/parity/run.sh [build dir]      (default build/default)
set -e
here=$(cd "$(dirname "$0")" && pwd)
root=$(cd "$here/../.." && pwd)
build=${1:-$root/build/default}
if [ -n "$LUMICOR_DEPS_CACHE" ]; then cache=$LUMICOR_DEPS_CACHE
elif [ -n "$HOME" ]; then cache=$HOME/.cache/lumicor
else cache=$build/_deps; fi
mods=$cache/parity-node
if [ ! -d "$mods/node_modules/@tensorflow/tfjs-backend-wasm" ]; then
  mkdir -p "$mods"
  cp "$here/package.json" "$mods/package.json"
  (cd "$mods" && npm install --silent --no-audit --no-fund)
fi
cmake --build "$build" --target oriel_dump
NODE_PATH=$mods/node_modules JPEG_JS=$cache/jpeg-js-0.4.4/package exec node "$here/run_parity.js" "$cache/face-api-1.7.15/package" \
  "$build/tools/parity/oriel_dump" "$cache"/face-samples-1.7.15/sample*.ppm
