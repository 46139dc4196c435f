# Thin wrapper for people: make demo | test | bench | install
# (test-sanitize and fuzz are the reliability runs CI adds.)
BUILD ?= build
JOBS ?= 2
PREFIX ?= /usr/local
FUZZ_SECONDS ?= 60
DEMO_ARGS ?=

.PHONY: all deps configure build test test-sanitize fuzz bench demo install clean

all: build

deps:
	./scripts/install-deps.sh

configure: deps
	cmake -S . -B $(BUILD) -DCMAKE_BUILD_TYPE=RelWithDebInfo -DCMAKE_INSTALL_PREFIX=$(PREFIX)

build: configure
	cmake --build $(BUILD) -j$(JOBS)

test: build
	cd $(BUILD) && ctest --output-on-failure -j$(JOBS)

# The whole suite under AddressSanitizer and UndefinedBehaviorSanitizer, then the
# concurrency test under ThreadSanitizer (OpenCV is not instrumented: tests/tsan.supp keeps
# its own frames out of the reports). Neither build needs the command-line tool.
test-sanitize: deps
	cmake -S . -B $(BUILD)-asan -DCMAKE_BUILD_TYPE=Debug -DVIRADUVE_SANITIZERS=address,undefined \
	  -DVIRADUVE_BUILD_BENCH=OFF -DVIRADUVE_BUILD_TOOLS=OFF \
	  -DCMAKE_C_COMPILER=clang -DCMAKE_CXX_COMPILER=clang++
	cmake --build $(BUILD)-asan -j$(JOBS)
	cd $(BUILD)-asan && ASAN_OPTIONS=detect_leaks=1 UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 \
	  ctest --output-on-failure -j$(JOBS)
	cmake -S . -B $(BUILD)-tsan -DCMAKE_BUILD_TYPE=RelWithDebInfo -DVIRADUVE_SANITIZERS=thread \
	  -DVIRADUVE_BUILD_BENCH=OFF -DVIRADUVE_BUILD_TOOLS=OFF \
	  -DCMAKE_C_COMPILER=clang -DCMAKE_CXX_COMPILER=clang++
	cmake --build $(BUILD)-tsan -j$(JOBS) --target test_e2e
	cd $(BUILD)-tsan && TSAN_OPTIONS="halt_on_error=1 suppressions=$(CURDIR)/tests/tsan.supp" \
	  ./tests/test_e2e --gtest_filter='*Concurren*'

# Every fuzz target for FUZZ_SECONDS seconds, starting from the seed corpus.
fuzz: deps
	cmake -S . -B $(BUILD)-fuzz -DCMAKE_BUILD_TYPE=RelWithDebInfo -DVIRADUVE_BUILD_FUZZ=ON \
	  -DVIRADUVE_BUILD_TESTS=OFF -DVIRADUVE_BUILD_BENCH=OFF -DVIRADUVE_BUILD_TOOLS=OFF \
	  -DCMAKE_C_COMPILER=clang -DCMAKE_CXX_COMPILER=clang++
	cmake --build $(BUILD)-fuzz -j$(JOBS)
	./scripts/run-fuzzers.sh $(BUILD)-fuzz $(FUZZ_SECONDS)

# The first command for a new user: installs what is missing, builds the library and the
# command (not the test suite) and runs the demo. DEMO_ARGS="--real" uses the real gel.
demo: configure
	cmake --build $(BUILD) -j$(JOBS) --target viraduve_cli
	$(BUILD)/tools/cli/viraduve demo $(DEMO_ARGS)

bench: build
	$(BUILD)/bench/viraduve_bench > /dev/null

install: build
	cmake --install $(BUILD)

clean:
	rm -rf $(BUILD) $(BUILD)-asan $(BUILD)-tsan $(BUILD)-fuzz
