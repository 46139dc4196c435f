# Thin wrapper for people: make demo | test | bench | install
BUILD ?= build
JOBS ?= 2
PREFIX ?= /usr/local

.PHONY: all deps configure build test bench demo install clean

all: build

deps:
	./scripts/install-deps.sh

configure: deps
	cmake -S . -B $(BUILD) -DCMAKE_BUILD_TYPE=RelWithDebInfo -DCMAKE_INSTALL_PREFIX=$(PREFIX)

build: configure
	cmake --build $(BUILD) -j$(JOBS)

test: build
	cd $(BUILD) && ctest --output-on-failure -j$(JOBS)

bench: build
	$(BUILD)/bench/viraduve_bench

install: build
	cmake --install $(BUILD)

clean:
	rm -rf $(BUILD)
