# Thin entry points over CMake; see README.md.
BUILD ?= build
JOBS ?= 2
SAMPLE ?= sample/rs2_sgf_hh_hv/product.xml
RS2 = $(BUILD)/bin/rs2

.PHONY: deps configure build test demo sanitize format-check format bench clean

deps:
	bash .ci/install-deps

configure: deps
	cmake -S . -B $(BUILD) -DCMAKE_BUILD_TYPE=RelWithDebInfo

build: configure
	cmake --build $(BUILD) -j $(JOBS)

test: build
	cd $(BUILD) && ctest --output-on-failure -j $(JOBS)

demo: build
	$(RS2) --version
	$(RS2) driver
	$(RS2) info $(SAMPLE)
	mkdir -p $(BUILD)/demo
	$(RS2) export '$(SAMPLE)?c=sigma' $(BUILD)/demo/sigma0.tif
	@echo "Sigma Nought GeoTIFF of the sample product: $(BUILD)/demo/sigma0.tif"

sanitize: deps
	cmake -S . -B $(BUILD)-asan -DCMAKE_BUILD_TYPE=Debug -DSANITIZE=address,undefined -DRS2_BUILD_BENCHMARKS=OFF
	cmake --build $(BUILD)-asan -j $(JOBS)
	cd $(BUILD)-asan && ASAN_OPTIONS=detect_leaks=1 ctest --output-on-failure -j $(JOBS)

format-check:
	git ls-files '*.cpp' '*.hpp' | xargs clang-format --dry-run --Werror

format:
	git ls-files '*.cpp' '*.hpp' | xargs clang-format -i

bench: build
	bash bench/run $(BUILD)

clean:
	rm -rf $(BUILD) $(BUILD)-asan
