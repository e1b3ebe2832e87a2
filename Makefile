# Quick start: `make demo` and `make test` set up what is missing first.
BUILD      ?= build
JOBS       ?= $(shell nproc 2>/dev/null || echo 2)
NATIVE_DIR := $(BUILD)/native
WIN64_DIR  := $(BUILD)/win-x64
WIN32_DIR  := $(BUILD)/win-x86
FUZZ_DIR   := $(BUILD)/fuzz
FUZZ_SECONDS ?= 60

.PHONY: all setup native windows wintest test demo bench bench-com fuzz pictures clean

all: native

setup:
	@scripts/setup.sh native windows wine

native:
	@scripts/setup.sh native
	cmake -S . -B $(NATIVE_DIR) -DCMAKE_BUILD_TYPE=Debug -DKPX_SANITIZE=ON
	cmake --build $(NATIVE_DIR) -j $(JOBS)

windows:
	@scripts/setup.sh windows
	cmake -S . -B $(WIN64_DIR) -DCMAKE_TOOLCHAIN_FILE=cmake/mingw-x86_64.cmake -DCMAKE_BUILD_TYPE=Release
	cmake --build $(WIN64_DIR) -j $(JOBS)
	cmake -S . -B $(WIN32_DIR) -DCMAKE_TOOLCHAIN_FILE=cmake/mingw-i686.cmake -DCMAKE_BUILD_TYPE=Release
	cmake --build $(WIN32_DIR) -j $(JOBS)

# The Windows DLLs under Wine, driven through COM by the test host.
wintest: windows
	BUILD=$(BUILD) wintest/run.sh

test: setup native windows
	cd $(NATIVE_DIR) && ctest --output-on-failure -j $(JOBS)
	BUILD=$(BUILD) wintest/run.sh

demo: native
	$(NATIVE_DIR)/sim/kpx-sim examples/demo/model.json examples/demo/scenario.json --sandbox $(BUILD)/demo-sandbox
	@echo
	@echo "kpxdoctor on the demo's machine (the sandbox the run left):"
	$(NATIVE_DIR)/kpxdoctor --sandbox $(BUILD)/demo-sandbox

bench:
	@scripts/setup.sh native
	cmake -S . -B $(BUILD)/bench -DCMAKE_BUILD_TYPE=Release
	cmake --build $(BUILD)/bench -j $(JOBS) --target kpx-bench
	$(BUILD)/bench/bench/kpx-bench

# What COM costs: the host-call benchmarks natively and on the real DLL
# through IDispatch under Wine, x64 and x86, side by side.
bench-com:
	BUILD=$(BUILD) scripts/bench-com.sh

# libFuzzer with clang, the libraries instrumented as well as the targets;
# each target runs FUZZ_SECONDS, one after the other. `make fuzz
# FUZZ_TARGETS=vb_numbers` runs only the ones named.
fuzz:
	@scripts/setup.sh native
	CC=clang CXX=clang++ cmake -S . -B $(FUZZ_DIR) -DCMAKE_BUILD_TYPE=RelWithDebInfo -DKPX_FUZZ=ON
	cmake --build $(FUZZ_DIR) -j $(JOBS) --target fuzz-all
	FUZZ_SECONDS=$(FUZZ_SECONDS) scripts/fuzz.sh $(FUZZ_DIR) $(FUZZ_TARGETS)

# docs/pictures/: the add-in's dialogs as the real DLL shows them under Wine.
pictures:
	BUILD=$(BUILD) scripts/pictures.sh

clean:
	rm -rf $(BUILD)
