# The two commands of a new machine: `make` builds both architectures and runs the tour,
# `make test` runs both test suites. Both install what is missing first.
BUILD := build
# The scripts find the build tree (and its Wine prefix) through this.
export TESSEL_BUILD := $(abspath $(BUILD))
CMAKE_FLAGS := -DCMAKE_TOOLCHAIN_FILE=cmake/toolchain-i686-mingw.cmake -DCMAKE_BUILD_TYPE=Release
JOBS := $(shell nproc 2>/dev/null || echo 2)
MAKEFLAGS += --no-print-directory

.PHONY: all setup configure build tour test bench dist repro fuzz-native format clean

all: tour

setup:
	@scripts/setup

# The x86 tree builds the x64 one (build/x64) inside it. The Wine prefix is made once here,
# before the two trees' test discovery starts Wine at the same time.
configure: setup
	@test -f $(BUILD)/CMakeCache.txt || cmake -S . -B $(BUILD) $(CMAKE_FLAGS) >/dev/null
	@scripts/wine-prefix

build: configure
	@cmake --build $(BUILD) -j $(JOBS)

tour: build
	@scripts/testbed scripts/tour

# One ctest run over both trees' tests (the x64 ones are named x64.*), one summary.
test: build
	@scripts/testbed ctest --test-dir $(BUILD) --output-on-failure -j $(JOBS) --timeout 300

bench: build
	@scripts/testbed scripts/bench

# dist/: one zip per architecture and SHA256SUMS, beside the loose files.
dist: build
	@scripts/make-dist

# Two clean builds of this commit in two other folders must give the same bytes.
repro: setup
	@scripts/check-reproducible

# The stand-in's container reader under libFuzzer, natively: `make fuzz-native SECONDS=300`,
# with SEED=N to replay a run.
SECONDS ?= 60
fuzz-native: setup
	@scripts/fuzz-native $(SECONDS) $(if $(SEED),--seed $(SEED))

format:
	@clang-format -i $$(git ls-files '*.cpp' '*.h')

clean:
	rm -rf $(BUILD) dist
