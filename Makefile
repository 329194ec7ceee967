# The two commands a person needs: `make demo` and `make test`. Both install what is
# missing first, then build in build/.
BUILD_DIR ?= build
JOBS ?= $(shell nproc)
CMAKE_FLAGS ?=

.PHONY: deps configure build test sanitize tsan fuzz demo bench compare format clean

deps:
	@bash scripts/install-deps.sh

configure: deps
	@cmake -S . -B $(BUILD_DIR) $(CMAKE_FLAGS) >/dev/null

build: configure
	@cmake --build $(BUILD_DIR) -j $(JOBS)

test: build
	@cd $(BUILD_DIR) && ctest --output-on-failure -j $(JOBS)

# The whole suite under AddressSanitizer and UndefinedBehaviorSanitizer, in its own folder.
sanitize: deps
	@cmake -S . -B $(BUILD_DIR)-asan -DMCSIM_SANITIZE=address,undefined -DMCSIM_BUILD_BENCH=OFF $(CMAKE_FLAGS) >/dev/null
	@cmake --build $(BUILD_DIR)-asan -j $(JOBS)
	@cd $(BUILD_DIR)-asan && ctest --output-on-failure -j $(JOBS)

# The threaded tests under ThreadSanitizer, in their own folder; only the test executables
# that hold them are built.
tsan: deps
	@bash scripts/tsan.sh $(BUILD_DIR)-tsan $(JOBS) $(CMAKE_FLAGS)

# The libFuzzer targets (clang) for FUZZ_SECONDS seconds each, in build-fuzz.
FUZZ_SECONDS ?= 60
fuzz: deps
	@bash scripts/fuzz.sh $(FUZZ_SECONDS)

demo: build
	@bash scripts/demo.sh $(BUILD_DIR)

bench: build
	@bash bench/run.sh $(BUILD_DIR)

# mcsim beside its peers (SciPy, R fitdistrplus, NumPy/SciPy, OpenTURNS) on W-FIT-1 and
# W-SIM-1, one core, in a Release build of its own; installs the peers when missing.
compare: deps
	@bash bench/compare.sh $(BUILD_DIR)-release

format:
	@git ls-files '*.cpp' '*.h' | xargs clang-format -i

clean:
	@rm -rf $(BUILD_DIR)
