#!/bin/sh
# Runs one test program of the AddressSanitizer build. LeakSanitizer's own
# stop-the-world tracer crashes now and then at exit ("Tracer caught signal
# 11"), after every test passed and before any leak is looked for (a known,
# rare fault of the sanitizer runtime, more frequent on a loaded machine, where
# it was seen twice in a row). Only then is the program run again, at most
# twice; any other failure, a leak report included, stands.
out=$(mktemp) || exit 1
tries=0
while :; do
    "$@" >"$out" 2>&1
    status=$?
    cat "$out"
    tries=$((tries + 1))
    if [ "$status" -eq 0 ] || [ "$tries" -ge 3 ] || ! grep -q "Tracer caught signal" "$out" ||
        ! grep -q "LeakSanitizer has encountered a fatal error" "$out" ||
        ! grep -q "^\[  PASSED  \]" "$out" || grep -q "^\[  FAILED  \]" "$out"; then
        break
    fi
    echo "lsan_retry: LeakSanitizer's tracer crashed at exit; running the program again"
done
rm -f "$out"
exit "$status"
