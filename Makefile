# Every target installs the Debian packages that it needs first (scripts/install-deps.sh), so that
# each works alone on a fresh machine.

JOBS ?= $(shell nproc)
PREFIX ?= /usr/local
SECONDS ?= 60
BUILD = scripts/build.sh

.DEFAULT_GOAL := help
.PHONY: help demo test test-asan test-tsan bench fuzz lint lint-product format install clean

help:
	@echo 'make demo                 build zpd, make sample applications and show the daemon at work'
	@echo 'make test                 build and run every test'
	@echo 'make test-asan            the tests under the address and undefined-behaviour sanitizers'
	@echo 'make test-tsan            the tests under the thread sanitizer'
	@echo 'make bench                print the table of measured ratios'
	@echo 'make fuzz SECONDS=60      run each fuzz target for that long'
	@echo 'make lint                 clang-format, include directions, clang-tidy'
	@echo 'make lint-product         the same, clang-tidy without tests, benchmarks and fuzz targets'
	@echo 'make format               let clang-format rewrite the sources'
	@echo 'make install DESTDIR=DIR  install below DIR$(PREFIX)  (PREFIX=$(PREFIX))'
	@echo 'make clean                remove build/'
	@echo 'Variables: JOBS=$(JOBS) (processes at a time)'

demo:
	scripts/install-deps.sh build demo
	JOBS=$(JOBS) $(BUILD) release programs
	scripts/demo.sh

test:
	scripts/install-deps.sh build test
	JOBS=$(JOBS) $(BUILD) release all
	JOBS=$(JOBS) scripts/run-tests.sh release

test-asan:
	scripts/install-deps.sh build test
	JOBS=$(JOBS) $(BUILD) asan all
	JOBS=$(JOBS) scripts/run-tests.sh asan

test-tsan:
	scripts/install-deps.sh build test
	JOBS=$(JOBS) $(BUILD) tsan all
	JOBS=$(JOBS) scripts/run-tests.sh tsan

bench:
	scripts/install-deps.sh build bench
	JOBS=$(JOBS) $(BUILD) release programs zpd-bench
	build/release/bin/zpd-bench

fuzz:
	scripts/install-deps.sh build fuzz
	JOBS=$(JOBS) $(BUILD) fuzz fuzz_targets
	JOBS=$(JOBS) scripts/fuzz.sh $(SECONDS)

lint:
	scripts/install-deps.sh build test bench lint
	JOBS=$(JOBS) scripts/lint.sh

lint-product:
	scripts/install-deps.sh build test bench lint
	JOBS=$(JOBS) scripts/lint.sh format includes tidy_product

format:
	scripts/install-deps.sh lint
	git ls-files -z '*.h' '*.cpp' | xargs -0 -r clang-format-19 -i

install:
	scripts/install-deps.sh build
	JOBS=$(JOBS) $(BUILD) release programs
	DESTDIR=$(DESTDIR) cmake --install build/release --prefix $(PREFIX)

clean:
	rm -rf build
