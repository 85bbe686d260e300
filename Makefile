# Front door: `make test` sets everything up and runs the tests; `make demo` shows the
# protocol at work. Any CMake preset works: `make test PRESET=asan`.
PRESET ?= default
PREFIX ?= /usr/local
BUILD_DIR := build/$(PRESET)
JOBS ?= $(shell nproc)

.PHONY: all build deps configure test demo install clean

all: build

deps:
	@scripts/install-deps.sh

configure: deps
	cmake --preset $(PRESET) -DCMAKE_INSTALL_PREFIX=$(PREFIX)

build: configure
	cmake --build $(BUILD_DIR) -j $(JOBS)

test: build
	ctest --preset $(PRESET) -j $(JOBS)

# Builds only the zarl tool (and the libraries), then runs it through the protocol.
demo: configure
	cmake --build $(BUILD_DIR) -j $(JOBS) --target zarl
	@scripts/demo.sh $(BUILD_DIR)

install: build
	cmake --install $(BUILD_DIR) --prefix $(PREFIX)

clean:
	rm -rf build
