# The commands of the README.
# Each installs what is missing (Debian 12), configures, builds and runs.
PRESET ?= release
BUILD  := build/$(PRESET)

.PHONY: all deps configure build test asan tsan fuzz clean

all: build

deps:
	@scripts/install-deps

configure: deps
	@test -f $(BUILD)/build.ninja || cmake --preset $(PRESET)

build: configure
	@cmake --build --preset $(PRESET)

test: build
	@ctest --preset $(PRESET)

asan:
	@$(MAKE) --no-print-directory test PRESET=asan

tsan:
	@$(MAKE) --no-print-directory test PRESET=tsan

fuzz: deps
	@test -f build/fuzz/build.ninja || cmake --preset fuzz
	@cmake --build --preset fuzz

clean:
	rm -rf build
