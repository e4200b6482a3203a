# The README's two commands are `make sim` and `make test`; the rest are
# for developers (sanitizer runs, the ladder picture) and CI.
BUILD ?= build
JOBS ?= $(shell nproc)
CMAKE_TYPE ?= RelWithDebInfo

.PHONY: deps build sim msc test asan tsan sanitizers clean

deps:
	@scripts/install-deps.sh

build: deps
	cmake -S . -B $(BUILD) -DCMAKE_BUILD_TYPE=$(CMAKE_TYPE)
	cmake --build $(BUILD) -j$(JOBS)

sim: build
	$(BUILD)/vce-sim

# The built-in call as a ladder diagram: $(BUILD)/call.png (needs mscgen,
# installed here on first use).
msc: build
	@scripts/install-deps.sh mscgen
	$(BUILD)/vce-sim --msc $(BUILD)/call.msc > /dev/null
	mscgen -T png -o $(BUILD)/call.png $(BUILD)/call.msc
	@echo "ladder diagram: $(BUILD)/call.png"

test: build
	cd $(BUILD) && ctest --output-on-failure -j$(JOBS)

asan: deps
	cmake -S . -B build-asan -DCMAKE_BUILD_TYPE=Debug -DQUELLBORN_ASAN=ON
	cmake --build build-asan -j$(JOBS)
	cd build-asan && ASAN_OPTIONS=detect_leaks=1:handle_segv=0 \
	  LSAN_OPTIONS=suppressions=$(CURDIR)/tests/jvm/lsan.supp \
	  UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 \
	  ctest --output-on-failure -j$(JOBS)

tsan: deps
	cmake -S . -B build-tsan -DCMAKE_BUILD_TYPE=Debug -DQUELLBORN_TSAN=ON
	cmake --build build-tsan -j$(JOBS)
	cd build-tsan && TSAN_OPTIONS=halt_on_error=1:second_deadlock_stack=1:suppressions=$(CURDIR)/tests/tsan.supp ctest --output-on-failure -j$(JOBS) -LE jvm

sanitizers: asan tsan

clean:
	rm -rf build build-asan build-tsan
