#!/bin/sh
# Runs one test program of the AddressSanitizer build. LeakSanitizer's own
# stop-the-world tracer crashes now and then at exit ("Tracer caught signal
# 11"), after every test passed and before any leak is looked for (a known,
# rare fault of the sanitizer runtime). Only then is the program run once
# more; any other failure, a leak report included, stands.
out=$(mktemp) || exit 1
"$@" >"$out" 2>&1
status=$?
cat "$out"
if [ "$status" -ne 0 ] && grep -q "Tracer caught signal" "$out" &&
    grep -q "LeakSanitizer has encountered a fatal error" "$out" &&
    grep -q "^\[  PASSED  \]" "$out" && ! grep -q "^\[  FAILED  \]" "$out"; then
    echo "lsan_retry: LeakSanitizer's tracer crashed at exit; running the program once more"
    "$@"
    status=$?
fi
rm -f "$out"
exit "$status"
