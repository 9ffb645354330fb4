# The two commands of a new machine: `make` builds both architectures and runs the tour,
# `make test` runs both test suites. Both install what is missing first.
BUILD := build
# The scripts find the build tree (and its Wine prefix) through this.
export TESSEL_BUILD := $(abspath $(BUILD))
CMAKE_FLAGS := -DCMAKE_TOOLCHAIN_FILE=cmake/toolchain-i686-mingw.cmake -DCMAKE_BUILD_TYPE=Release
JOBS := $(shell nproc 2>/dev/null || echo 2)
MAKEFLAGS += --no-print-directory

# `make fuzz SECONDS=N`: the fuzz driver of the exports for N seconds with a fresh seed, then
# the native fuzz target of the stand-in's container reader (scripts/fuzz-native), if present.
SECONDS ?= 60

.PHONY: all setup configure build tour test bench dist repro fuzz fuzz-native soak mutants format clean

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

fuzz: build
	@status=0; scripts/testbed scripts/fuzz-exports --seconds $(SECONDS) || status=1; \
	if [ -x scripts/fuzz-native ]; then scripts/fuzz-native $(SECONDS) || status=1; fi; \
	exit $$status

# dist/: one zip per architecture and SHA256SUMS, beside the loose files.
dist: build
	@scripts/make-dist

# Two clean builds of this commit in two other folders must give the same bytes.
repro: setup
	@scripts/check-reproducible

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
