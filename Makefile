# SPDX-License-Identifier: Apache-2.0
# The front door. Scripts and CMake do the work; see CONTRIBUTING.md. Each target first installs the
# Debian packages that it needs (as root) or names them. A "##" is the target's line in "make help".

.PHONY: all demo test test-smp test-smp-more check bench bench-icount coverage asan ubsan lint tidy warnings package \
        install uninstall clean help
MAKEFLAGS += --no-print-directory
PROGRAMS = src/all platform/all tools/all

all: ## programs into build/bin, libraries into build/lib
	@scripts/install-deps build
	@scripts/build release $(PROGRAMS)

demo: all ## the main job on the example definitions; nothing of it stays on the machine
	@scripts/demo

test: ## the whole suite, against the system's yaml-cpp and against 0.6.3
	@scripts/install-deps build test
	@scripts/run-tests

test-smp: ## the machine tests on Debian's kernels 6.1 and 6.12 with 4 CPUs, in QEMU
	@scripts/install-deps build test smp
	@scripts/build --tests release
	@scripts/run-ctest build -C smp -L '^smp$$'

test-smp-more: ## the same machines: what takes minutes more
	@scripts/install-deps build test smp
	@scripts/build --tests release
	@scripts/run-ctest build -C smp -L '^smp-more$$'

check: test ## the same as "test"

lint: ## formatting, layout, includes, licences, scripts, manual pages, links, plain English
	@scripts/install-deps build test lint
	@scripts/lint

tidy: ## clang-tidy over the sources of the programs
	@scripts/install-deps build test lint
	@scripts/build --tests release $(PROGRAMS)
	@scripts/tidy

warnings: ## everything with g++ and clang++, warnings as errors
	@scripts/install-deps build test bench lint
	@scripts/check-warnings

asan ubsan: ## the whole suite with a sanitizer
	@scripts/install-deps build test
	@scripts/build --tests $@
	@scripts/run-ctest build/$@

coverage: ## the lines that the suite reaches; fails below 95 %
	@scripts/install-deps build test coverage
	@scripts/run-coverage

bench: ## speed and memory, against bare programs
	@scripts/install-deps build bench
	@scripts/build release $(PROGRAMS) bench_programs
	@scripts/run-bench

bench-icount: ## what commands cost in instructions, in a QEMU machine
	@scripts/install-deps build smp
	@scripts/build release $(PROGRAMS) icount_programs
	@scripts/run-bench-icount

package: ## Debian packages in build/package
	@scripts/install-deps build package
	@scripts/make-package

install: all ## everything below /usr/local, or PREFIX; DESTDIR as usual
	@DESTDIR="$(DESTDIR)" cmake --install build $(if $(PREFIX),--prefix "$(PREFIX)")

uninstall: all ## removes what "install" with the same PREFIX and DESTDIR has put there
	@DESTDIR="$(DESTDIR)" scripts/uninstall build "$(PREFIX)"

clean: ## removes the folder build
	@rm -rf build

help: ## this list
	@awk -F ':.*## ' '/^[a-z -]+:.*## / { printf "make %-13s %s\n", $$1, $$2 }' Makefile
