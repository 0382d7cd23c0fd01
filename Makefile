# Wraps CMake. `make test` installs what is missing, builds and runs the suite.
BUILD_DIR      ?= build
ASAN_BUILD_DIR ?= build-asan
BENCH_BUILD_DIR ?= build-bench
DOCS_BUILD_DIR := build-docs
FUZZ_BUILD_DIR ?= build-fuzz
FUZZ_SECONDS   ?= 60
FUZZ_CXX       ?= clang++
BUILD_TYPE     ?= RelWithDebInfo
JOBS           ?= $(shell nproc 2>/dev/null || echo 2)
WERROR         ?= OFF
PREFIX         ?= /usr/local

# Debian packages the build needs; the reference needs only its own, which
# `make docs` (or `make deps DOCS=1`) installs.
PACKAGES := cmake make g++ pkg-config rapidjson-dev libicu-dev libgtest-dev libbenchmark-dev libcli11-dev \
            libpugixml-dev libzip-dev python3 python3-docx
DOCS_PACKAGES := doxygen
# And those that fuzzing needs, installed only with FUZZ=1 (`make fuzz` asks).
FUZZ_PACKAGES := clang libfuzzer-14-dev libclang-rt-14-dev
ifeq ($(FUZZ),1)
PACKAGES += $(FUZZ_PACKAGES)
endif
# And those that the browser tests need, installed only with BROWSER=1
# (`make test-browser` asks): Debian's Chromium, a font for names in CJK
# scripts, and Node.js. npm comes with some Node.js builds; Debian's is added
# only where it is missing, then npm installs playwright-core from the lock file.
BROWSER_PACKAGES := chromium fonts-droid-fallback nodejs
ifeq ($(BROWSER),1)
PACKAGES += $(BROWSER_PACKAGES)
endif
FUZZ_TARGETS := FuzzJsonParse FuzzImport FuzzTextStream FuzzValidate FuzzNames FuzzWordRead

# The project version, shown in the reference.
VERSION := $(shell sed -n 's/^project.Styles VERSION \([0-9.]*\).*/\1/p' CMakeLists.txt)

CMAKE_FLAGS := -DCMAKE_BUILD_TYPE=$(BUILD_TYPE) -DSTYLES_WARNINGS_AS_ERRORS=$(WERROR)
BROWSER_TESTS ?= OFF

.PHONY: all deps docs-deps browser-deps configure build test test-asan test-browser test-ratio \
  mutate bench fuzz demo docs install format clean

all: build

# Installs the missing Debian packages: one apt-get update, then one install.
define install-missing
	@missing=""; \
	for p in $(1); do \
	  dpkg-query -W -f='$${Status}' $$p 2>/dev/null | grep -q "install ok installed" || missing="$$missing $$p"; \
	done; \
	if [ -n "$$missing" ]; then \
	  echo "Installing:$$missing"; \
	  apt-get update && DEBIAN_FRONTEND=noninteractive apt-get install -y --no-install-recommends $$missing; \
	else \
	  echo "All $(2) are installed."; \
	fi
endef

deps:
	$(call install-missing,$(PACKAGES) $(if $(DOCS),$(DOCS_PACKAGES)),build dependencies)
	$(if $(filter 1,$(BROWSER)),@$(MAKE) --no-print-directory browser-deps)

browser-deps:
	@command -v npm >/dev/null 2>&1 || { apt-get update && \
	  DEBIAN_FRONTEND=noninteractive apt-get install -y --no-install-recommends npm; }
	cd tests/browser && npm ci --no-audit --no-fund

docs-deps:
	$(call install-missing,$(DOCS_PACKAGES),documentation dependencies)

configure: deps
	cmake -S . -B $(BUILD_DIR) $(CMAKE_FLAGS) -DSTYLES_BROWSER_TESTS=$(BROWSER_TESTS)

build: configure
	cmake --build $(BUILD_DIR) -j $(JOBS)

test: build
	cd $(BUILD_DIR) && ctest --output-on-failure -j $(JOBS)

# The report pages opened in headless Chromium, with what that needs.
test-browser:
	$(MAKE) deps BROWSER=1
	cmake -S . -B $(BUILD_DIR) $(CMAKE_FLAGS) -DSTYLES_BROWSER_TESTS=ON
	cmake --build $(BUILD_DIR) -j $(JOBS) --target styles
	cd $(BUILD_DIR) && ctest --output-on-failure -L browser
	@echo "Browser tests ran: the styles report pages in headless Chromium"

# The whole suite under AddressSanitizer, LeakSanitizer and UBSan.
test-asan: deps
	cmake -S . -B $(ASAN_BUILD_DIR) -DCMAKE_BUILD_TYPE=Debug -DSTYLES_SANITIZE=ON \
	  -DSTYLES_WARNINGS_AS_ERRORS=$(WERROR)
	cmake --build $(ASAN_BUILD_DIR) -j $(JOBS)
	cd $(ASAN_BUILD_DIR) && ASAN_OPTIONS=detect_leaks=1:strict_string_checks=1 \
	  UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 ctest --output-on-failure -j $(JOBS)

# Test code as a share of the rest; fails above 0.38.
test-ratio:
	tools/test-ratio.sh

# Plants single faults one at a time in a sanitizer build and reports which
# ones the suite catches (tens of minutes).
mutate: deps
	python3 tools/mutate.py

# The Google Benchmark programs, then the tracked figures as one table: the
# sheet's (BenchmarkStyleSheet's summary) and the styles command's on a
# generated 1M-style document (tools/bench-command.py).
bench: deps
	cmake -S . -B $(BENCH_BUILD_DIR) -DCMAKE_BUILD_TYPE=Release -DSTYLES_BUILD_BENCHMARKS=ON \
	  -DSTYLES_BUILD_TESTS=OFF
	cmake --build $(BENCH_BUILD_DIR) -j $(JOBS)
	for b in $(BENCH_BUILD_DIR)/benchmarks/Benchmark*; do \
	  [ "$${b##*/}" = BenchmarkStyleSheet ] || { [ -x "$$b" ] && "$$b"; } || exit 1; \
	done
	$(BENCH_BUILD_DIR)/benchmarks/BenchmarkStyleSheet
	python3 tools/bench-command.py $(BENCH_BUILD_DIR)

# Builds the libFuzzer targets with clang, ASan and UBSan at -O1, and runs each
# for FUZZ_SECONDS on a copy of its seed corpus; the document targets take
# inputs up to 64 KB, and their seeds hold one document of each size class. A crash, leak, sanitizer report,
# unit slower than 2 s or memory beyond 2 GB fails it; libFuzzer keeps the
# input in $(FUZZ_BUILD_DIR)/artifacts/.
fuzz:
	$(MAKE) deps FUZZ=1
	cmake -S . -B $(FUZZ_BUILD_DIR) -DCMAKE_CXX_COMPILER=$(FUZZ_CXX) -DCMAKE_BUILD_TYPE=Debug \
	  -DSTYLES_BUILD_FUZZERS=ON -DSTYLES_BUILD_TESTS=OFF -DSTYLES_BUILD_EXAMPLES=OFF \
	  -DSTYLES_BUILD_TOOLS=OFF -DSTYLES_INSTALL=OFF -DSTYLES_WARNINGS_AS_ERRORS=$(WERROR)
	cmake --build $(FUZZ_BUILD_DIR) -j $(JOBS)
	@for t in $(FUZZ_TARGETS); do \
	  mkdir -p $(FUZZ_BUILD_DIR)/corpus/$$t $(FUZZ_BUILD_DIR)/artifacts/$$t; \
	  dict=""; case $$t in FuzzJsonParse|FuzzImport|FuzzValidate) dict="-dict=fuzz/json.dict -max_len=65536";; \
	    FuzzWordRead) dict="-dict=fuzz/word.dict -max_len=65536";; esac; \
	  echo "== $$t for $(FUZZ_SECONDS) s"; \
	  UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 ASAN_OPTIONS=detect_leaks=1 \
	  $(FUZZ_BUILD_DIR)/fuzz/$$t $(FUZZ_BUILD_DIR)/corpus/$$t fuzz/corpus/$$t $$dict \
	    -max_total_time=$(FUZZ_SECONDS) -rss_limit_mb=2048 -timeout=2 -print_final_stats=1 \
	    -artifact_prefix=$(FUZZ_BUILD_DIR)/artifacts/$$t/ \
	    > $(FUZZ_BUILD_DIR)/$$t.log 2>&1; status=$$?; \
	  grep -E '^stat::number_of_executed_units|^Done' $(FUZZ_BUILD_DIR)/$$t.log; \
	  if [ $$status -ne 0 ]; then \
	    tail -n 60 $(FUZZ_BUILD_DIR)/$$t.log; \
	    echo "$$t failed; input kept in $(FUZZ_BUILD_DIR)/artifacts/$$t/"; exit 1; \
	  fi; \
	done

demo: build
	$(BUILD_DIR)/examples/WordProcessorDemo

# The API reference in $(DOCS_BUILD_DIR)/html/, from the public headers and
# docs/. Doxygen fails on any warning (an undocumented public member, a broken
# reference); a qualified name in backticks that links nowhere fails too.
docs: docs-deps
	rm -rf $(DOCS_BUILD_DIR)
	STYLES_VERSION=$(VERSION) doxygen docs/Doxyfile
	@if grep -o -E '<code>(Styles|Zel[A-Za-z]*|Json|SystemIO)::[^<]*</code>' \
	    $(DOCS_BUILD_DIR)/html/*.html | grep -v '^$(DOCS_BUILD_DIR)/html/index.html:'; then \
	  echo "docs: the names above link to nothing in the reference"; exit 1; \
	fi
	@echo "Reference: $(DOCS_BUILD_DIR)/html/index.html"

install: build
	cmake --install $(BUILD_DIR) --prefix $(PREFIX)

format:
	find Engines tests benchmarks examples fuzz -name '*.h' -o -name '*.cpp' | xargs clang-format -i

clean:
	rm -rf $(BUILD_DIR) $(ASAN_BUILD_DIR) build-mutate $(BENCH_BUILD_DIR) $(DOCS_BUILD_DIR) $(FUZZ_BUILD_DIR)
