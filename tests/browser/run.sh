#!/usr/bin/env bash
# The browser test as CTest runs it: skipped (77) on a machine without node or chromium.
#   run.sh MAROSET
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")"
if ! command -v node >/dev/null; then
    echo "skipped: node is not installed"
    exit 77
fi
if [ ! -x "${CHROMIUM:-/usr/bin/chromium}" ]; then
    echo "skipped: chromium is not installed"
    exit 77
fi
if [ ! -d node_modules/playwright-core ]; then
    echo "tests/browser: its packages are missing; run 'npm ci' there (./run does)" >&2
    exit 1
fi
exec node page.test.mjs "$1"
