# The two commands of the README, `make demo` and `make test`, and the developers' others.
# Each installs what is missing (Debian 12), configures, builds and runs.
PRESET ?= release
BUILD  := build/$(PRESET)

.PHONY: all deps configure build test demo asan tsan fuzz bench package clean

all: build

deps:
	@scripts/install-deps

configure: deps
	@test -f $(BUILD)/build.ninja || cmake --preset $(PRESET)

build: configure
	@cmake --build --preset $(PRESET)

test: build
	@ctest --preset $(PRESET)

demo: configure
	@cmake --build --preset $(PRESET) --target kyn-assistant kyn-assistant-cli kyn-sim
	@scripts/demo $(BUILD)

bench: build
	@for b in $(BUILD)/bin/kyn_bench_*; do echo "== $$b"; $$b; done

asan:
	@$(MAKE) --no-print-directory test PRESET=asan

tsan:
	@$(MAKE) --no-print-directory test PRESET=tsan

fuzz: deps
	@test -f build/fuzz/build.ninja || cmake --preset fuzz
	@cmake --build --preset fuzz

# Debian packages in build/package/: kyn-assistant and kyn-assistant-dev.
package: deps
	@test -f build/package/build.ninja || cmake --preset package
	@cmake --build --preset package
	@cd build/package && cpack

clean:
	rm -rf build
