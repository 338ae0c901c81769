#!/usr/bin/env bash
# Installs what is missing, builds the varnel command and runs the main job:
# the readings of the simulated type-7 meter, as an XML datalog on standard output.
set -euo pipefail
cd "$(dirname "$0")/.."
bash scripts/build.sh varnel_cli vantrix32
exec build/bin/varnel readings
