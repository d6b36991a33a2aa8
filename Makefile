# The project's commands. Every target that builds first makes sure the Debian packages
# are there (`make deps`), so each one works on a fresh machine.
JOBS ?= $(shell nproc)
ASAN_DIR := build/asan
RELEASE_DIR := build/release
# The generator is chosen when a build folder is first configured (ninja arrives with the deps).
configure = cmake -S . -B $(1) -DCMAKE_EXPORT_COMPILE_COMMANDS=ON $(2) \
  $$([ -f $(1)/CMakeCache.txt ] || { command -v ninja >/dev/null && echo "-G Ninja"; })

.PHONY: deps build test bench demo format clean

deps:
	@deps/install

build: deps
	$(call configure,$(RELEASE_DIR),-DCMAKE_BUILD_TYPE=Release)
	cmake --build $(RELEASE_DIR) -j $(JOBS)

test: deps
	$(call configure,$(ASAN_DIR),-DCMAKE_BUILD_TYPE=Debug -DCORVEL_SANITIZE=ON)
	cmake --build $(ASAN_DIR) -j $(JOBS)
	cd $(ASAN_DIR) && ctest -j $(JOBS) --output-on-failure

bench: build
	@for b in $(RELEASE_DIR)/bench/bench_*; do \
	  [ -x "$$b" ] || continue; echo "== $$b"; "$$b" || exit 1; done

# The demo needs only the library and the program, not the test suites.
demo: deps
	$(call configure,$(RELEASE_DIR),-DCMAKE_BUILD_TYPE=Release)
	cmake --build $(RELEASE_DIR) -j $(JOBS) --target corvel
	$(RELEASE_DIR)/tools/corvel/corvel ocr tests/fixtures/ocr/sample.png

format:
	git ls-files '*.h' '*.cpp' | xargs clang-format -i

clean:
	rm -rf build
