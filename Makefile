# The two set-up commands of the README, and a few conveniences.
#   make demo   builds and runs the viewer tool on its built-in sample
#   make test   builds everything and runs all tests
PRESET ?= release

.PHONY: demo test build deps asan clean

deps:
	@scripts/deps.sh

build: deps
	cmake --preset $(PRESET)
	cmake --build --preset $(PRESET)

test: build
	ctest --preset $(PRESET)

demo: build
	build/$(PRESET)/tools/anview/anview

asan:
	@scripts/deps.sh
	cmake --preset asan
	cmake --build --preset asan
	ctest --preset asan

clean:
	rm -rf build
