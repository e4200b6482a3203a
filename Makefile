# The README's two commands are `make sim` and `make test`; the rest are
# for developers (sanitizer runs, the ladder picture) and CI.
BUILD ?= build
JOBS ?= $(shell nproc)
CMAKE_TYPE ?= RelWithDebInfo

.PHONY: deps build sim msc bench chaos test test32 asan tsan sanitizers fuzz fuzz-build fuzz-run coverage mutants clean

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

# The link against the pipe's own limit (docs/performance.md); one to two
# minutes. BENCH_ARGS=--quick for a few seconds.
bench: build
	$(BUILD)/vtsp-bench $(BENCH_ARGS)

# Random calls against the real engine with its invariants checked after
# every step (docs/reliability.md); a violation is shrunk to a scenario in
# build/chaos/. make chaos SECONDS=3600 for a long run, SEED=N to repeat one.
SECONDS ?= 60
chaos: build
	mkdir -p $(BUILD)/chaos
	$(BUILD)/vce-sim --chaos --seconds $(SECONDS) $(if $(SEED),--seed $(SEED)) $(if $(ACTORS),--actors $(ACTORS)) --out $(BUILD)/chaos

# The suite, then each fuzz target for a few seconds from its seeds.
test: build fuzz-build
	cd $(BUILD) && ctest --output-on-failure -j$(JOBS)
	@$(MAKE) --no-print-directory fuzz-run FUZZ_SECONDS=5

# The same suite built and run as 32-bit x86, the handsets' ABI, in
# build-i386/: natively, or through qemu-i386 where this kernel cannot run
# 32-bit programs (the configure step says which). The bytes it writes on
# the modem pipe, in the log and to the client are compared with the 64-bit
# build's.
BUILD32 ?= build-i386
test32: build
	@scripts/install-deps.sh --i386
	cmake -S . -B $(BUILD32) -DCMAKE_BUILD_TYPE=$(CMAKE_TYPE) \
	  -DCMAKE_TOOLCHAIN_FILE=$(CURDIR)/cmake/i386-linux-gnu.cmake -DQUELLBORN_REFERENCE_BUILD=$(CURDIR)/$(BUILD)
	cmake --build $(BUILD32) -j$(JOBS)
	cd $(BUILD32) && ctest --output-on-failure -j$(JOBS)
	@grep -h "^JVM-hosting tests not run" $(BUILD32)/Testing/Temporary/LastTest.log || true

asan: deps
	cmake -S . -B build-asan -DCMAKE_BUILD_TYPE=Debug -DQUELLBORN_ASAN=ON
	cmake --build build-asan -j$(JOBS)
	cd build-asan && ASAN_OPTIONS=detect_leaks=1:handle_segv=0 \
	  LSAN_OPTIONS=suppressions=$(CURDIR)/tests/jvm/lsan.supp \
	  UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 \
	  ctest --output-on-failure -j$(JOBS)
	ASAN_OPTIONS=detect_leaks=1:handle_segv=0 UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 \
	  scripts/chaos-run.sh build-asan

tsan: deps
	cmake -S . -B build-tsan -DCMAKE_BUILD_TYPE=Debug -DQUELLBORN_TSAN=ON
	cmake --build build-tsan -j$(JOBS)
	cd build-tsan && TSAN_OPTIONS=halt_on_error=1:second_deadlock_stack=1:suppressions=$(CURDIR)/tests/tsan.supp ctest --output-on-failure -j$(JOBS) -LE jvm
	TSAN_OPTIONS=halt_on_error=1:second_deadlock_stack=1:suppressions=$(CURDIR)/tests/tsan.supp \
	  scripts/chaos-run.sh build-tsan

sanitizers: asan tsan

# libFuzzer targets built with clang in their own directory; `make fuzz
# FUZZ_SECONDS=600` runs each for ten minutes.
FUZZ_BUILD ?= build-fuzz
FUZZ_SECONDS ?= 10

fuzz-build: deps
	cmake -S . -B $(FUZZ_BUILD) -DCMAKE_BUILD_TYPE=RelWithDebInfo -DCMAKE_C_COMPILER=clang \
	  -DCMAKE_CXX_COMPILER=clang++ -DQUELLBORN_FUZZ=ON -DQUELLBORN_TESTS=OFF
	cmake --build $(FUZZ_BUILD) -j$(JOBS) --target fuzz_records fuzz_transactions fuzz_zmf_events fuzz_mvd_events

fuzz-run:
	scripts/run-fuzz.sh $(FUZZ_BUILD) $(FUZZ_SECONDS)

fuzz: fuzz-build
	@$(MAKE) --no-print-directory fuzz-run

# Line and function coverage of the system's code (vtsp/, volte_engine/,
# mme_jni/) from the whole test suite: build-coverage/coverage/index.html,
# totals per directory printed at the end (needs lcov, installed here on
# first use).
COV = build-coverage
COV_DIRS = vtsp volte_engine mme_jni
coverage: deps
	@scripts/install-deps.sh lcov
	cmake -S . -B $(COV) -DCMAKE_BUILD_TYPE=Debug -DQUELLBORN_COVERAGE=ON
	cmake --build $(COV) -j$(JOBS)
	lcov --quiet --zerocounters --directory $(COV)
	lcov --quiet --capture --initial --directory $(COV) --output-file $(COV)/base.info
	cd $(COV) && ctest --output-on-failure -j$(JOBS)
	lcov --quiet --capture --directory $(COV) --output-file $(COV)/run.info
	lcov --quiet --add-tracefile $(COV)/base.info --add-tracefile $(COV)/run.info --output-file $(COV)/all.info
	lcov --quiet --extract $(COV)/all.info $(foreach d,$(COV_DIRS),'$(CURDIR)/$(d)/*') --output-file $(COV)/system.info
	rm -rf $(COV)/coverage
	genhtml --quiet --prefix $(CURDIR) --title "quellborn system code" --output-directory $(COV)/coverage $(COV)/system.info
	@for d in $(COV_DIRS); do \
	  lcov --quiet --extract $(COV)/system.info '$(CURDIR)/'$$d'/*' --output-file $(COV)/$$d.info; \
	  echo "== $$d/"; lcov --summary $(COV)/$$d.info 2>&1 | grep -E '^ *(lines|functions)'; \
	done
	@echo "== system total (vtsp/ volte_engine/ mme_jni/)"
	@lcov --summary $(COV)/system.info 2>&1 | grep -E '^ *(lines|functions)'
	@echo "report: $(COV)/coverage/index.html"

# Each fault of scripts/mutants.list applied alone, rebuilt and run against
# the suites that cover it (build-mutants/); MUTANTS=REGEX picks some by id or
# file. Not part of CI: about an hour on two cores.
mutants: deps
	scripts/mutants.sh build-mutants $(or $(MUTANTS),.)

clean:
	rm -rf build build-i386 build-asan build-tsan build-fuzz build-coverage build-mutants
