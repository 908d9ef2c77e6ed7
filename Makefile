# SPDX-License-Identifier: Apache-2.0
# The front door. Everything that is done here is done by a script or by CMake; see CONTRIBUTING.md.
# What a target needs of the system is installed first (root) or named (anybody else).

.PHONY: all demo test bench bench-icount coverage asan ubsan lint package install clean
MAKEFLAGS += --no-print-directory
PROGRAMS = src/all platform/all tools/all

# Programs into build/bin, libraries into build/lib.
all:
	@scripts/install-deps build
	@scripts/build release $(PROGRAMS)

# The main job on the example definitions; nothing of it stays on the machine.
demo: all
	@scripts/demo

# The whole suite, against the system's yaml-cpp and against 0.6.3.
test:
	@scripts/install-deps build test
	@scripts/run-tests

bench:
	@scripts/install-deps build bench
	@scripts/build release $(PROGRAMS) bench_programs
	@scripts/run-bench

# What commands cost in instructions, whatever this machine is busy with.
bench-icount:
	@scripts/install-deps build smp
	@scripts/build release $(PROGRAMS) icount_programs
	@scripts/run-bench-icount

coverage:
	@scripts/install-deps build test coverage
	@scripts/run-coverage

asan ubsan:
	@scripts/install-deps build test
	@scripts/build --tests $@
	@scripts/run-ctest build/$@

lint:
	@scripts/install-deps build test lint
	@scripts/build --tests release tests/all all
	@scripts/lint

package:
	@scripts/install-deps build package
	@scripts/build package $(PROGRAMS)
	@cd build/package && cpack -G DEB >cpack.log || { cat cpack.log; exit 1; }
	@ls build/package/*.deb

# DESTDIR and PREFIX as usual.
install: all
	@DESTDIR="$(DESTDIR)" cmake --install build $(if $(PREFIX),--prefix "$(PREFIX)")

clean:
	@rm -rf build
