# evwatch: the two commands a user needs are `make demo` and `make test`.
#
#   make            install what is missing, build everything into build/
#   make test       ... and run the whole suite
#   make test SANITIZE=1        the same suite under AddressSanitizer + UBSan (build-asan/)
#   make test SANITIZE=thread   the same suite under ThreadSanitizer (build-tsan/)
#   make demo       run evwatch against its built-in camera simulator
#   make bench      build and run the benchmarks (installs OpenCV for the motion benchmark)
#   make lib        build only libeventdetector and libevhost (build-lib/)

# Sub-makes (CMake's build) say nothing of the directories they enter.
MAKEFLAGS += --no-print-directory

SANITIZE ?=
JOBS ?= $(shell nproc 2>/dev/null || echo 2)

ifeq ($(SANITIZE),)
  BUILD := build
  SAN :=
else ifeq ($(SANITIZE),thread)
  BUILD := build-tsan
  SAN := thread
else
  BUILD := build-asan
  SAN := address
endif

.PHONY: all deps configure build test demo bench lib install clean

all: build

deps:
	@scripts/install-deps.sh

# A sanitizer build is for the suite: it leaves the benchmarks out (make bench builds them).
configure: deps
	@cmake -S . -B $(BUILD) -DEVW_SANITIZE=$(SAN) $(if $(SAN),-DEVW_BUILD_BENCH=OFF) >/dev/null

build: configure
	@cmake --build $(BUILD) -j $(JOBS)

# Under AddressSanitizer, leaks inside third-party libraries that we cannot free are
# suppressed by name (tests/lsan.supp says which and why); the variable reaches the programs
# the tests start too.
test: build
	@cd $(BUILD) && $(if $(filter address,$(SAN)),LSAN_OPTIONS=suppressions=$(CURDIR)/tests/lsan.supp:print_suppressions=0) \
	  ctest --output-on-failure -j $(JOBS) --timeout 300

demo: configure
	@echo "make demo: building evwatch and camsim (the first time takes a few minutes) ..."
	@cmake --build $(BUILD) -j $(JOBS) --target evwatch > $(BUILD)/demo-build.log 2>&1 || \
	  { cat $(BUILD)/demo-build.log; exit 1; }
	@$(BUILD)/bin/evwatch demo $(if $(DURATION),--duration $(DURATION))

bench: build
	@scripts/install-deps.sh libopencv-core-dev libopencv-imgproc-dev libopencv-imgcodecs-dev || \
	  echo "make bench: no OpenCV; the motion benchmark runs without its OpenCV columns" >&2
	@cmake -S . -B $(BUILD) -DEVW_SANITIZE=$(SAN) -DEVW_BUILD_BENCH=ON >/dev/null
	@cmake --build $(BUILD) -j $(JOBS) --target bench_all
	@scripts/run-bench.sh $(BUILD)

lib: deps
	@cmake -S . -B build-lib -DEVW_LIBRARY_ONLY=ON >/dev/null
	@cmake --build build-lib -j $(JOBS) --target eventdetector evhost

# The prefix is given at configure time as well: the library folder (lib/<arch> for /usr)
# and the paths in the installed files follow it. Installs from the plain build only.
PREFIX ?= /usr/local
install: deps
	@cmake -S . -B build -DEVW_SANITIZE= -DCMAKE_INSTALL_PREFIX=$(PREFIX) >/dev/null
	@cmake --build build -j $(JOBS) --target eventdetector evhost evwatch camsim
	@DESTDIR="$(DESTDIR)" cmake --install build

clean:
	rm -rf build build-asan build-tsan build-lib
