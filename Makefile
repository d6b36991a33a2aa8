# The project's commands. Every target that builds first makes sure the Debian packages
# are there (`make deps`), so each one works on a fresh machine.
JOBS ?= $(shell nproc)
ASAN_DIR := build/asan
RELEASE_DIR := build/release
FUZZ_DIR := build/fuzz
TSAN_DIR := build/tsan
FUZZ_SECONDS ?= 60
# `make tsan` runs every suite; CI narrows it with these (ctest regex, build targets).
TSAN_TESTS ?= .
TSAN_TARGETS ?= all
# Tests that hold the engine's time to a ratio are left out under ThreadSanitizer: it
# slows the engine's fixed costs (page preparation, start-up) many times over, so such a
# ratio says nothing there; races are what this build is for.
TSAN_SKIP ?= RecognitionStopsWhenCancelledOrPastItsDeadline
# The generator is chosen when a build folder is first configured (ninja arrives with the deps).
configure = cmake -S . -B $(1) -DCMAKE_EXPORT_COMPILE_COMMANDS=ON $(2) \
  $$([ -f $(1)/CMakeCache.txt ] || { command -v ninja >/dev/null && echo "-G Ninja"; })

.PHONY: deps build test fuzz tsan bench demo format clean

deps:
	@deps/install

build: deps
	$(call configure,$(RELEASE_DIR),-DCMAKE_BUILD_TYPE=Release)
	cmake --build $(RELEASE_DIR) -j $(JOBS)

test: deps
	$(call configure,$(ASAN_DIR),-DCMAKE_BUILD_TYPE=Debug -DCORVEL_SANITIZE=ON)
	cmake --build $(ASAN_DIR) -j $(JOBS)
	cd $(ASAN_DIR) && ctest -j $(JOBS) --output-on-failure

# The libFuzzer harnesses of tests/fuzz, built with clang, ASan and UBSan, each run for
# FUZZ_SECONDS from its committed seeds (see tests/fuzz/run).
fuzz: deps
	CC=clang CXX=clang++ $(call configure,$(FUZZ_DIR),-DCMAKE_BUILD_TYPE=RelWithDebInfo \
	  -DCORVEL_SANITIZE=ON -DCORVEL_FUZZ=ON -DCORVEL_BUILD_TESTS=OFF -DCORVEL_BUILD_BENCH=OFF)
	cmake --build $(FUZZ_DIR) -j $(JOBS) --target fuzzers
	tests/fuzz/run $(FUZZ_DIR)/tests/fuzz $(FUZZ_SECONDS)

# The test suites under ThreadSanitizer.
tsan: deps
	$(call configure,$(TSAN_DIR),-DCMAKE_BUILD_TYPE=Debug -DCORVEL_TSAN=ON -DCORVEL_BUILD_BENCH=OFF)
	cmake --build $(TSAN_DIR) -j $(JOBS) --target $(TSAN_TARGETS)
	cd $(TSAN_DIR) && TSAN_OPTIONS="halt_on_error=1 second_deadlock_stack=1" \
	  ctest -j $(JOBS) --output-on-failure -R '$(TSAN_TESTS)' -E '$(TSAN_SKIP)'

bench: build
	@for b in $(RELEASE_DIR)/bench/bench_*; do \
	  [ -x "$$b" ] || continue; echo "== $$b"; "$$b" || exit 1; done
	@echo "== bench/python_paths.py"
	PYTHONPATH=$(RELEASE_DIR)/python /usr/bin/python3 bench/python_paths.py \
	  --corvel $(RELEASE_DIR)/tools/corvel/corvel

# The demo needs only the library and the program, not the test suites.
demo: deps
	$(call configure,$(RELEASE_DIR),-DCMAKE_BUILD_TYPE=Release)
	cmake --build $(RELEASE_DIR) -j $(JOBS) --target corvel
	$(RELEASE_DIR)/tools/corvel/corvel ocr tests/fixtures/ocr/sample.png

format:
	git ls-files '*.h' '*.cpp' | xargs clang-format -i

clean:
	rm -rf build
