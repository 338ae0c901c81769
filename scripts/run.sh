#!/usr/bin/env bash
# Installs what is missing, builds Varnel and runs the main job against the simulated meter.
set -euo pipefail
cd "$(dirname "$0")/.."
bash scripts/build.sh
exec build/bin/varnel readings
