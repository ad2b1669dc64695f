# Top-level commands. `make demo` runs the main job on the built-in simulated
# hardware; `make test` builds and runs every test. Both install the Debian
# packages they need when run as root.

BUILD      ?= build
ASAN_BUILD ?= build-asan
FUZZ_BUILD ?= build-fuzz
JOBS       ?= $(shell nproc 2>/dev/null || echo 2)
# Objects compiled in one checkout serve any other checkout on the machine
# (ccache, when installed, keys them by paths relative to the checkout).
export CCACHE_BASEDIR := $(CURDIR)
export CCACHE_NOHASHDIR := 1
# Seconds each fuzz target runs during `make test`.
FUZZ_SECONDS ?= 20

PACKAGES = cmake ninja-build g++ make libgtest-dev libgmock-dev libbenchmark-dev ccache \
           libcli11-dev nlohmann-json3-dev clang libclang-rt-dev \
           pybind11-dev python3-dev python3-pytest mypy

.PHONY: all deps configure build install demo test check test-asan fuzz clean

all: build

deps:
	@scripts/install-deps.sh $(PACKAGES)

$(BUILD)/build.ninja:
	cmake -S . -B $(BUILD) -G Ninja -DFAULTBOX_WERROR=ON

configure: deps $(BUILD)/build.ninja

build: configure
	cmake --build $(BUILD) -j $(JOBS)

# Installs the Python package faultbox where Debian's python3 finds it
# (below /usr/local), or below PREFIX: `make install PREFIX=/opt/faultbox`.
install: build
	cmake --install $(BUILD) $(if $(PREFIX),--prefix $(PREFIX))

demo: build
	@scripts/demo.sh $(BUILD)

# The quick loop: one build, all tests.
check: build
	ctest --test-dir $(BUILD) --output-on-failure -j $(JOBS)

# Everything CI runs: the tests, the tests again under the sanitizers, and a
# short run of every fuzz target.
test: check test-asan fuzz

test-asan: deps
	cmake -S . -B $(ASAN_BUILD) -G Ninja -DFAULTBOX_WERROR=ON -DFAULTBOX_SANITIZE=ON -DFAULTBOX_BENCH=OFF \
	  -DFAULTBOX_PYTHON=OFF -DCMAKE_BUILD_TYPE=Debug
	cmake --build $(ASAN_BUILD) -j $(JOBS)
	ASAN_OPTIONS=detect_leaks=1 UBSAN_OPTIONS=print_stacktrace=1 \
	  ctest --test-dir $(ASAN_BUILD) --output-on-failure -j $(JOBS)

fuzz: deps
	cmake -S . -B $(FUZZ_BUILD) -G Ninja -DFAULTBOX_FUZZ=ON -DFAULTBOX_TESTS=OFF -DFAULTBOX_BENCH=OFF -DFAULTBOX_PYTHON=OFF \
	  -DCMAKE_CXX_COMPILER=clang++ -DCMAKE_BUILD_TYPE=RelWithDebInfo
	cmake --build $(FUZZ_BUILD) -j $(JOBS)
	@scripts/run-fuzzers.sh $(FUZZ_BUILD) $(FUZZ_SECONDS)

clean:
	rm -rf $(BUILD) $(ASAN_BUILD) $(FUZZ_BUILD)
