#!/bin/sh
# Fails on any include in src/ that reaches up: each folder may include only
# itself and the folders before it in this order. Public headers (varnel/...)
# and system headers are below every folder.
set -eu
src=${1:?usage: check_layers.sh SRC_DIR}
order="errors xmlcheck util platform contracts settings readings session requests exports component capi com"

find "$src" -type f \( -name '*.h' -o -name '*.cpp' -o -name '*.c' \) | LC_ALL=C sort |
xargs awk -v order="$order" -v root="${src%/}/" '
BEGIN { n = split(order, names, " "); for (i = 1; i <= n; i++) rank[names[i]] = i }
FNR == 1 {
    rel = substr(FILENAME, length(root) + 1)
    own = rel; sub(/\/.*/, "", own)
    if (!(own in rank)) { printf "%s: folder %s is not in the layer order\n", FILENAME, own; bad = 1 }
}
/^[ \t]*#[ \t]*include[ \t]*"/ {
    inc = $0; sub(/^[^"]*"/, "", inc); sub(/".*/, "", inc)
    if (index(inc, "/") == 0) next
    folder = inc; sub(/\/.*/, "", folder)
    if (folder == "varnel") next
    if (!(folder in rank)) {
        printf "%s:%d: includes \"%s\" from %s/, which is not a layer\n", FILENAME, FNR, inc, folder; bad = 1
    } else if ((own in rank) && rank[folder] > rank[own]) {
        printf "%s:%d: includes \"%s\": %s/ is above %s/\n", FILENAME, FNR, inc, folder, own; bad = 1
    }
}
END {
    if (bad) { print "layering: upward includes found (order: " order ")"; exit 1 }
    print "layering: every include points down"
}'
