# Thin entry points over CMake; see README.md.
BUILD ?= build
JOBS ?= 2
SAMPLE ?= sample/rs2_sgf_hh_hv/product.xml
RS2 = $(BUILD)/bin/rs2

FUZZ_BUILD ?= build-fuzz
FUZZ_SECONDS ?= 60

.PHONY: deps configure build test demo sanitize fuzz format-check format bench clean

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
	$(RS2) info $(SAMPLE)
	mkdir -p $(BUILD)/demo
	$(RS2) export $(SAMPLE) $(BUILD)/demo/sigma0_db.tif --calibration sigma --denoise --db
	$(RS2) quicklook $(SAMPLE) $(BUILD)/demo/quicklook.png --calibration sigma
	@echo
	@echo "The sample product: $(SAMPLE)"
	@echo "  Sigma Nought in dB, noise removed, georeferenced GeoTIFF: $(BUILD)/demo/sigma0_db.tif"
	@echo "  colour quicklook (HH, HV, HH): $(BUILD)/demo/quicklook.png"

sanitize: deps
	cmake -S . -B $(BUILD)-asan -DCMAKE_BUILD_TYPE=Debug -DSANITIZE=address,undefined -DRS2_BUILD_BENCHMARKS=OFF
	cmake --build $(BUILD)-asan -j $(JOBS)
	cd $(BUILD)-asan && ASAN_OPTIONS=detect_leaks=1 ctest --output-on-failure -j $(JOBS)

# libFuzzer targets (fuzz/): built with clang and the sanitizers, seeded from
# generated and real products, each run FUZZ_SECONDS seconds; findings go to
# $(FUZZ_BUILD)/artifacts/<target>/.
fuzz: deps
	CC=clang CXX=clang++ cmake -S . -B $(FUZZ_BUILD) -DCMAKE_BUILD_TYPE=RelWithDebInfo -DRS2_BUILD_FUZZERS=ON -DBUILD_TESTING=OFF -DRS2_BUILD_BENCHMARKS=OFF
	cmake --build $(FUZZ_BUILD) -j $(JOBS)
	bash fuzz/make-corpus $(FUZZ_BUILD)
	bash fuzz/run $(FUZZ_BUILD) $(FUZZ_SECONDS)

format-check:
	git ls-files '*.cpp' '*.hpp' | xargs clang-format --dry-run --Werror

format:
	git ls-files '*.cpp' '*.hpp' | xargs clang-format -i

bench: build
	bash bench/run $(BUILD)

clean:
	rm -rf $(BUILD) $(BUILD)-asan
