# Entry points for people and CI; the work is done by CMake presets.
.PHONY: all setup build test asan tsan armhf bench clean

all: build

setup:
	scripts/setup

build: setup
	cmake --preset default
	cmake --build --preset default

# The README's test command: installs what is missing, builds, runs every test.
test: build
	ctest --preset default

asan: setup
	cmake --preset asan
	cmake --build --preset asan
	ctest --preset asan

tsan: setup
	cmake --preset tsan
	cmake --build --preset tsan
	ctest --preset tsan

armhf: setup
	cmake --preset armhf
	cmake --build --preset armhf
	ctest --preset armhf

bench: build
	./build/default/bench/foundation_bench

clean:
	rm -rf build
