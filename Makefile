# Front door: `make test` sets everything up and runs the tests; `make demo` shows the
# protocol at work. Any CMake preset works: `make test PRESET=asan`.
PRESET ?= default
PREFIX ?= /usr/local
BUILD_DIR := build/$(PRESET)
JOBS ?= $(shell nproc)

.PHONY: all build deps configure test demo install clean fuzz coverage tidy format format-check \
        abi-update bench

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

# --- Quality gates -----------------------------------------------------------------

# libFuzzer targets under ASan and UBSan (clang), each run for FUZZ_SECONDS from its
# seed corpus and regression inputs. See fuzz/run.sh for where a failing input goes.
FUZZ_SECONDS ?= 60
FUZZ_TARGETS := message_builders message_parser
fuzz:
	@scripts/install-deps.sh clang libclang-rt-14-dev
	cmake --preset fuzz
	cmake --build build/fuzz -j $(JOBS)
	fuzz/run.sh build/fuzz $(FUZZ_SECONDS) $(FUZZ_TARGETS)

# Line and branch coverage of src/ by the whole test suite (gcc, Debug); fails below
# COVERAGE_MIN_LINES percent of lines.
COVERAGE_MIN_LINES ?= 90
coverage:
	@scripts/install-deps.sh gcovr
	cmake --preset coverage
	cmake --build build/coverage -j $(JOBS)
	find build/coverage -name '*.gcda' -delete
	ctest --preset coverage -j $(JOBS)
	gcovr --root . --filter 'src/' -j $(JOBS) \
	    --exclude-throw-branches --exclude-unreachable-branches --sort-uncovered \
	    --txt - --html-details build/coverage/coverage.html --print-summary \
	    --fail-under-line $(COVERAGE_MIN_LINES) build/coverage

# clang-tidy (checks in .clang-tidy) over src/ and tools/, through the compile commands
# of the default preset; any finding fails.
tidy:
	@scripts/install-deps.sh clang-tidy
	cmake --preset default
	run-clang-tidy -quiet -j $(JOBS) -p build/default '$(CURDIR)/(src|tools)/.*\.cpp$$'

# clang-format over every C++ file of the tree: `format-check` reports, `format` fixes.
CXX_FILES = $(shell git ls-files --cached --others --exclude-standard -- '*.cpp' '*.h')
format-check:
	@scripts/install-deps.sh clang-format
	@echo "clang-format --dry-run --Werror: $(words $(CXX_FILES)) files"
	@clang-format --dry-run --Werror $(CXX_FILES)

format:
	@scripts/install-deps.sh clang-format
	clang-format -i $(CXX_FILES)

# Rewrites abi/*.symbols from the libraries of PRESET: after a deliberate change of
# what a library exports, commit the lists with the change.
abi-update: configure
	cmake --build $(BUILD_DIR) -j $(JOBS) --target zarlcore zarlutil
	for library in core util; do \
	    cmake -DNM=nm -DLIBRARY=$(BUILD_DIR)/src/$$library/libzarl$$library.so \
	          -DLIST=abi/libzarl$$library.symbols -DUPDATE=ON -P abi/CheckSymbols.cmake || exit 1; \
	done

# Benchmarks (Release build in build/bench): prints the table of every hot path against
# its baseline, writes it to build/bench/bench.json, draws docs/bench.png and puts both
# into README.md. Binds 127.0.0.1:23457, so never run it beside the tests.
bench:
	@scripts/install-deps.sh libbenchmark-dev libxml2-dev gnuplot-nox
	cmake --preset bench
	cmake --build --preset bench
	@echo "Running the benchmarks (about a minute; raw output in build/bench/raw.txt)"
	build/bench/bench/zarl-bench --benchmark_out=build/bench/raw.json \
	    --benchmark_out_format=json > build/bench/raw.txt
	python3 bench/report.py build/bench/raw.json

clean:
	rm -rf build
