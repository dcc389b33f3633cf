# The two commands a new machine needs: `make demo` and `make test`.
PRESET ?= release
JOBS ?= $(shell nproc)
PREFIX ?= /usr/local

.PHONY: deps build install test test-asan test-tsan test-arm64 fuzz demo bench format clean

deps:
	@scripts/setup-deps

build: deps
	@cmake --preset $(PRESET) >/dev/null
	@cmake --build --preset $(PRESET) -j $(JOBS)

# The library, its public headers, the kivimaging program, the CMake package
# and the pkg-config file, into PREFIX.
install: build
	@cmake --install build/$(PRESET) --prefix $(PREFIX)

test: build
	@ctest --preset $(PRESET) -j $(JOBS)

test-asan:
	@$(MAKE) --no-print-directory test PRESET=asan

# Only the suites with threads; ThreadSanitizer slows everything else for nothing.
test-tsan: deps
	@cmake --preset tsan >/dev/null
	@cmake --build --preset tsan -j $(JOBS)
	@ctest --preset tsan -j $(JOBS) -L threads

# The vector conversion suite cross-built for arm64 (NEON) and run under qemu.
test-arm64: deps
	@scripts/test-arm64

# A short libFuzzer run of the decoders (clang, ASan).
fuzz: deps
	@scripts/run-fuzz

demo: build
	@scripts/demo build/$(PRESET)

bench: build
	@scripts/run-benchmarks build/$(PRESET)

format:
	@git ls-files '*.c' '*.cpp' '*.h' | xargs clang-format -i

clean:
	rm -rf build
