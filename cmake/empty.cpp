// Keeps the shared library target non-empty before the bindings exist.
