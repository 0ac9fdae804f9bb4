# zyrd: build, test and run from a fresh Debian 12 machine.
BUILD_DIR ?= build
RUN_ROOT ?= $(CURDIR)/.run
CMAKE_FLAGS ?= -DCMAKE_BUILD_TYPE=RelWithDebInfo -DZYRD_WERROR=ON

.PHONY: all deps build test tsan run bench soak fuzz clean

all: build

deps:
	scripts/install-deps

$(BUILD_DIR)/build.ninja:
	cmake -S . -B $(BUILD_DIR) -G Ninja $(CMAKE_FLAGS)

build: deps $(BUILD_DIR)/build.ninja
	cmake --build $(BUILD_DIR)

test: build
	ctest --test-dir $(BUILD_DIR) --output-on-failure -j2
	scripts/run-fuzzers

# The unit and black-box tests again, built with the thread sanitizer in
# build-tsan/ (scripts/run-tsan); any report fails. CI runs it after `test`.
tsan: deps
	scripts/run-tsan

run: build
	scripts/run-local $(BUILD_DIR) $(RUN_ROOT)

bench: build
	bench/run-http-bench $(BUILD_DIR)
	bench/run-key-bench $(BUILD_DIR)

# Ten minutes of mixed calls at a bounded rate with the daemon's resident
# memory sampled (SOAK_SECONDS, SOAK_RATE, ... in bench/run-soak).
soak: build
	bench/run-soak $(BUILD_DIR)

fuzz: deps
	scripts/run-fuzzers --explore

clean:
	rm -rf $(BUILD_DIR) build-fuzz build-tsan $(RUN_ROOT)
