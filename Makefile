# Everything that is done with this project has a name here; `make help` lists them. The work itself is CMake's, by the
# presets of CMakePresets.json, each in build/<preset>.

.DEFAULT_GOAL := help
.PHONY: help build build-all demo test check asan tsan tsan-clang clang debug arm64 coverage sweep kill-sweep error-sweep full-disk \
        farm-test power-loss simulate mutants recordings fuzz bench deb interface format clean packages check-packages fuzz-packages \
        deb-packages arm64-packages coverage-packages farm-packages

# Random scenarios of the simulation; empty: what the tests choose themselves.
SEEDS ?=
unexport SEEDS
PROCESSORS := $(shell nproc 2>/dev/null || echo 2)
CTEST := ctest --output-on-failure --no-tests=error --timeout 1800 -j $(PROCESSORS)
# What the build has written goes to the disk first: a test that flushes a file would wait for all of it.
FLUSH = sync -f build
WITH_SEEDS = $(if $(SEEDS),APPSYNC_SEEDS=$(SEEDS))
# $(call PRESET,name,targets): everything without targets.
PRESET = mkdir -p build && cmake --preset $(1) >build/$(1).configured && \
         cmake --build --preset $(1) $(if $(2),--target $(2))

help: ## this list
	@awk -F ':.*## ' '/^[a-z0-9-]+:.*## / {printf "make %-11s %s\n", $$1, $$2}' Makefile

build: packages ## the program and the plug-in, into build/release/bin
	@$(call PRESET,release,tsd ApplicationSync)

build-all: packages
	@$(call PRESET,release)

demo: build ## a whole life of a device, from the first sync to a restore, in a minute
	@rm -rf build/demo
	@examples/demo build/release/bin/tsd build/demo

test: build-all farm-packages ## all tests (SEEDS=N: that many random scenarios)
	@$(FLUSH)
	@cd build/release && $(WITH_SEEDS) $(CTEST)

check: check-packages ## format, sizes, includes, spelling, documents, interface, clang-tidy, thread safety, state, hardening
	@mkdir -p build
	@cmake --preset clang >build/clang.configured
	@.ci/check build/clang
	@cmake --build --preset clang
	@python3 tests/library_state.py build/clang/platform/*.a build/clang/plist/*.a build/clang/bin/libApplicationSync.so
	@$(call PRESET,release,tsd ApplicationSync platform plist)
	@python3 tests/hardened_files.py build/release/bin/tsd build/release/bin/libApplicationSync.so \
	  build/release/*/libapplicationsync-*.a

asan: packages ## all tests with the address and undefined-behaviour sanitizers
	@$(call PRESET,asan)
	@$(FLUSH)
	@cd build/asan && $(WITH_SEEDS) UBSAN_OPTIONS=print_stacktrace=1 \
	  LSAN_OPTIONS=suppressions=$(CURDIR)/.ci/leaks:print_suppressions=0 $(CTEST)

tsan: packages ## the threaded tests with the thread sanitizer
	@$(call PRESET,tsan,tsd ApplicationSync plugin_tests device_service_tests device_foundation_tests contract_tests)
	@.ci/threaded-tests build/tsan

tsan-clang: check-packages ## the same with clang's
	@$(call PRESET,tsan-clang,tsd ApplicationSync plugin_tests device_service_tests device_foundation_tests contract_tests)
	@.ci/threaded-tests build/tsan-clang

clang: check-packages ## a build with clang, whose thread-safety analysis may find nothing
	@$(call PRESET,clang)

debug: packages ## a build for a debugger
	@$(call PRESET,debug)

arm64: arm64-packages ## the plug-in, the lists and the device for the processor of the phones, tested under an emulator
	@$(call PRESET,arm64,ApplicationSync platform plist property_list_tests plugin_tests contract_tests)
	@.ci/arm64 build/arm64

coverage: coverage-packages ## how much of each folder the tests run, as a table, and every line as pages
	@$(call PRESET,coverage)
	@find build/coverage -name '*.gcda' -delete
	@$(FLUSH)
	@cd build/coverage && $(WITH_SEEDS) GCOV_ERROR_FILE=/dev/null $(CTEST)
	@.ci/coverage build/coverage

sweep: build-all ## every call of every scenario failed once, all of them
	@cd build/release && APPSYNC_SWEEP=all bin/plugin_tests --gtest_filter='*Sweep*' --gtest_brief=1

kill-sweep: build ## tsd killed before and after every step of what it does to a device, and again in the recovery
	@python3 tests/kill_sweep.py build/release/bin/tsd kill

error-sweep: build ## every step of what tsd does to a device failed in every way, once and for ever
	@python3 tests/kill_sweep.py build/release/bin/tsd error

full-disk: build ## the same on disks that really are full, page by page; needs the right to mount them
	@python3 tests/kill_sweep.py build/release/bin/tsd full

power-loss: build-all ## power lost after every step of a sync, a restore and an install by the store
	@cd build/release && APPSYNC_POWER_LOSS=all bin/power_loss_tests --gtest_brief=1

simulate: build-all ## random lives of a device against the model: make simulate SEEDS=10000
	@.ci/simulate build/release $(or $(SEEDS),10000)

mutants: packages ## faults planted in a copy of the sources, for the tests to find: COUNT=100 SEED=1 AREA=plugin
	@python3 tests/mutants.py build/mutants
	@python3 tests/random_mutants.py build/mutants --area $(or $(AREA),plugin) --count $(or $(COUNT),100) \
	  --seed $(or $(SEED),1)

farm-test: build-all farm-packages ## the farm of examples/farm on engines of its own: make farm-test SEEDS=10000
	@APPSYNC_FARM_SEEDS=$(or $(SEEDS),10000) python3 tests/farm_tests.py build/release/bin/tsd -v

recordings: packages ## the recordings that the tests replay, made anew; tells which ones the plug-in answers differently
	@$(call PRESET,release,tsd ApplicationSync plugin_tests exception_tests)
	@python3 tests/make_recordings.py build/release/bin/tsd tests/recordings

fuzz: fuzz-packages ## looks for inputs that break something: make fuzz RUNS=1000000 TARGETS=xml_list
	@$(call PRESET,fuzz,$(addprefix fuzz_,$(or $(TARGETS),$(notdir $(wildcard fuzz/seeds/*))) seeds))
	@.ci/fuzz build/fuzz $(or $(RUNS),20000) $(TARGETS)

bench: build-all ## the speed of everything against its goals, as a table
	@bench/table.py build/release/bin

deb: deb-packages ## Debian packages of the plug-in, its headers and the program, tried in build/package/root
	@$(call PRESET,package,tsd ApplicationSync platform plist written_by_program)
	@rm -rf build/package/packages
	@cd build/package && cpack -B packages >cpack.log || { cat cpack.log; exit 1; }
	@packaging/check build/package

interface: check-packages ## writes down anew what hosts are compiled against, for a raised pluginInterfaceVersion
	@.ci/interface write

format: check-packages ## puts every source file into the common format
	@git ls-files -z '*.h' '*.cpp' | xargs -0 clang-format -i

clean: ## removes everything that was built
	@rm -rf build

packages:
	@.ci/packages build

check-packages:
	@.ci/packages check

fuzz-packages:
	@.ci/packages fuzz

deb-packages:
	@.ci/packages deb

arm64-packages:
	@.ci/packages arm64

coverage-packages:
	@.ci/packages coverage

# Where they cannot be had, the test of the farm says what it leaves out.
farm-packages:
	@.ci/packages farm || echo "note: the farm is not tested here" >&2
