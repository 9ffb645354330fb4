# The two commands of a new machine: `make` builds and runs the tour, `make test` runs the
# test suite. Both install what is missing first.
BUILD := build
# The scripts find the build tree (and its Wine prefix) through this.
export TESSEL_BUILD := $(abspath $(BUILD))
CMAKE_FLAGS := -DCMAKE_TOOLCHAIN_FILE=cmake/toolchain-i686-mingw.cmake -DCMAKE_BUILD_TYPE=Release
JOBS := $(shell nproc 2>/dev/null || echo 2)
MAKEFLAGS += --no-print-directory

# `make fuzz SECONDS=N`: the fuzz driver of the exports for N seconds with a fresh seed, then
# the native fuzz target of the stand-in's container reader (scripts/fuzz-native), if present.
SECONDS ?= 60

.PHONY: all setup configure build tour test bench fuzz fuzz-native soak mutants format clean

all: tour

setup:
	@scripts/setup

configure: setup
	@test -f $(BUILD)/CMakeCache.txt || cmake -S . -B $(BUILD) $(CMAKE_FLAGS) >/dev/null

build: configure
	@cmake --build $(BUILD) -j $(JOBS)

tour: build
	@scripts/testbed scripts/tour

test: build
	@scripts/testbed ctest --test-dir $(BUILD) --output-on-failure -j $(JOBS) --timeout 300

bench: build
	@scripts/testbed scripts/bench

fuzz: build
	@status=0; scripts/testbed scripts/fuzz-exports --seconds $(SECONDS) || status=1; \
	if [ -x scripts/fuzz-native ]; then scripts/fuzz-native $(SECONDS) || status=1; fi; \
	exit $$status

# The stand-in's container reader under libFuzzer, natively: `make fuzz-native SECONDS=300`,
# with SEED=N to replay a run.
fuzz-native: setup
	@scripts/fuzz-native $(SECONDS) $(if $(SEED),--seed $(SEED))

# Long loops of every family and thread churn, with leak figures (not part of `make test`).
soak: build
	@scripts/testbed scripts/soak

# Plants each fault of scripts/mutants.list in a copy under $(BUILD)/mutants and runs the
# tests that should see it; not part of `make test` (about twenty minutes).
mutants: setup
	@scripts/mutants

format:
	@clang-format -i $$(git ls-files '*.cpp' '*.h')

clean:
	rm -rf $(BUILD) dist
