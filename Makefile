# The README's commands. Each target installs what it needs, configures,
# builds only what it runs, and runs it.
JOBS ?= $(shell nproc)
CMAKE_GEN := -G Ninja
PREFIX ?= /usr/local

.PHONY: all deps build test asan tsan coverage release clang bench bench-compare demo install install-check format format-check clean

all: build

deps:
	@scripts/install-deps

build/build.ninja: CMakeLists.txt | deps
	cmake -S . -B build $(CMAKE_GEN)

build: deps build/build.ninja
	cmake --build build -j $(JOBS)

# Build the test suites (and the vrender binary their end-to-end cases run),
# not the benchmarks, and run them.
test: deps build/build.ninja
	cmake --build build -j $(JOBS) --target all_tests vrender
	ctest --test-dir build --output-on-failure -j $(JOBS)

# AddressSanitizer and UndefinedBehaviorSanitizer over the whole suite.
asan: deps
	cmake -S . -B build-asan $(CMAKE_GEN) -DVR_SANITIZE="address;undefined" -DVR_BUILD_BENCH=OFF
	cmake --build build-asan -j $(JOBS) --target all_tests
	ASAN_OPTIONS=detect_leaks=1:abort_on_error=1 UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 \
	  ctest --test-dir build-asan --output-on-failure -j $(JOBS)

# ThreadSanitizer over the suites that run real threads.
tsan: deps
	cmake -S . -B build-tsan $(CMAKE_GEN) -DVR_SANITIZE=thread -DVR_BUILD_BENCH=OFF
	cmake --build build-tsan -j $(JOBS) --target threaded_tests
	TSAN_OPTIONS=halt_on_error=1:second_deadlock_stack=1 scripts/no-aslr \
	  ctest --test-dir build-tsan --output-on-failure -L threaded

# Line and branch coverage of host/, videorenderer/ and tools/ over the whole
# suite; the report is build-coverage/coverage/index.html.
COVERAGE_FILTERS := --filter '$(CURDIR)/host/' --filter '$(CURDIR)/videorenderer/' --filter '$(CURDIR)/tools/'
coverage:
	@scripts/install-deps coverage
	cmake -S . -B build-coverage $(CMAKE_GEN) -DCMAKE_BUILD_TYPE=Debug -DVR_COVERAGE=ON -DVR_BUILD_BENCH=OFF
	cmake --build build-coverage -j $(JOBS) --target all_tests vrender
	find build-coverage -name '*.gcda' -delete
	ctest --test-dir build-coverage --output-on-failure -j $(JOBS)
	mkdir -p build-coverage/coverage
	gcovr -r $(CURDIR) build-coverage $(COVERAGE_FILTERS) -j $(JOBS) \
	  --exclude-unreachable-branches --exclude-throw-branches \
	  --html-details build-coverage/coverage/index.html --print-summary

# Warning-free builds in the other configurations users build: Release with
# GCC, and everything once with Clang; each runs the suite.
release: deps
	cmake -S . -B build-release $(CMAKE_GEN) -DCMAKE_BUILD_TYPE=Release
	cmake --build build-release -j $(JOBS)
	ctest --test-dir build-release --output-on-failure -j $(JOBS)

clang: deps
	CC=clang-14 CXX=clang++-14 cmake -S . -B build-clang $(CMAKE_GEN)
	cmake --build build-clang -j $(JOBS)
	ctest --test-dir build-clang --output-on-failure -j $(JOBS)

# Build the command-line renderer and run its built-in demo (frames in out/demo/).
demo: deps build/build.ninja
	cmake --build build -j $(JOBS) --target vrender
	build/bin/vrender

# Build the benchmark programs (in the default RelWithDebInfo tree) and run them all.
bench: deps build/build.ninja
	cmake --build build -j $(JOBS)
	scripts/run-benchmarks build

# Whole source renders through vrender and ffmpeg on one clip, on one core and on
# all of them: wall and CPU time, peak memory and minor faults, with the ratios.
bench-compare: deps build/build.ninja
	scripts/install-bench-deps
	cmake --build build -j $(JOBS) --target vrender
	bench/compare/sources.sh
	CORES=$(JOBS) bench/compare/sources.sh
	bench/compare/jobs.sh

# Build the libraries and vrender (Release) and install them under $(PREFIX),
# with the headers, the CMake package and videorenderer.pc.
install: deps
	cmake -S . -B build-install $(CMAKE_GEN) -DCMAKE_BUILD_TYPE=Release -DVR_BUILD_TESTS=OFF \
	  -DVR_BUILD_BENCH=OFF -DCMAKE_INSTALL_PREFIX=$(PREFIX)
	cmake --build build-install -j $(JOBS)
	cmake --install build-install

# Install into a temporary prefix and build and run a program against it,
# through find_package and through pkg-config.
install-check: deps
	scripts/check-install build-install

format:
	git ls-files '*.h' '*.cpp' | xargs clang-format -i

format-check:
	git ls-files '*.h' '*.cpp' | xargs clang-format --dry-run --Werror

clean:
	rm -rf build build-asan build-tsan build-coverage build-release build-clang build-install
