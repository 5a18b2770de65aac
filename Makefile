# A short way to the presets of CMakePresets.json and to the scripts, where the work is done.

.PHONY: help setup build test run bench clean

help:
	@echo "make setup   install the Debian packages that are missing"
	@echo "make build   build the programs into build/release/bin/"
	@echo "make test    build and run all tests"
	@echo "make run     start the daemon and the PipeWire reporter, and print events as they come"
	@echo "make bench   build and run the benchmarks"
	@echo "make clean   remove build/"

setup:
	@scripts/setup.sh

build:
	@scripts/setup.sh run
	@scripts/build.sh release programs

test:
	@scripts/setup.sh run test
	@scripts/test.sh release

run:
	@scripts/run.sh

bench:
	@scripts/setup.sh run
	@scripts/bench.sh

clean:
	rm -rf build
