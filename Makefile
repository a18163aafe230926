# The README's commands. Each target installs what it needs, configures,
# builds only what it runs, and runs it.
JOBS ?= $(shell nproc)
CMAKE_GEN := -G Ninja
PREFIX ?= /usr/local

.PHONY: all deps build test asan tsan bench demo install install-check format format-check clean

all: build

deps:
	@scripts/install-deps

build/build.ninja: CMakeLists.txt | deps
	cmake -S . -B build $(CMAKE_GEN)

build: deps build/build.ninja
	cmake --build build -j $(JOBS)

# Build and run every test suite.
test: deps build/build.ninja
	cmake --build build -j $(JOBS)
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

# Build the command-line renderer and run its built-in demo (frames in out/demo/).
demo: deps build/build.ninja
	cmake --build build -j $(JOBS) --target vrender
	build/bin/vrender

# Build the benchmarks in the optimised tree and run them all.
bench: deps build/build.ninja
	cmake --build build -j $(JOBS)
	scripts/run-benchmarks build

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
	rm -rf build build-asan build-tsan
