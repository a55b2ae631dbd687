# Entry points for people and CI; the work is done by CMake presets.
.PHONY: all setup build test asan tsan armhf bench clean run

all: build

setup:
	scripts/setup

build: setup
	cmake --preset default
	cmake --build --preset default

# The main job: the dev host serving the plug-in with the simulated device on
# 127.0.0.1:8080 until Ctrl-C.
run: build
	@echo 'Try, from another terminal:'
	@echo "  curl -s -H 'Content-Type: application/x-www-form-urlencoded; charset=UTF-8' --data-raw 'form_data=Function%3DEnumSystemExperts%26response_encoding%3DUTF-8%26' http://127.0.0.1:8080/qelsysapi/Server"
	@echo "  curl -s http://127.0.0.1:8080/qelsysapi/ItemBindings"
	@echo "  curl -s 'http://127.0.0.1:8080/qelsysapi/ItemDefs?items=Clock,Ethernet0&loc=de'"
	exec ./build/default/platform/webhost/qelwebhost --listen 127.0.0.1:8080

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
	for b in build/default/bench/*_bench; do echo "== $$b"; $$b || exit 1; done

clean:
	rm -rf build
