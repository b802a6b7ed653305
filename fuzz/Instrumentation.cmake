# RS2_BUILD_FUZZERS builds the libFuzzer targets of fuzz/. Every target of
# the project is then compiled with coverage for libFuzzer and with the
# address and undefined-behaviour sanitizers, so that a fault anywhere on the
# path of an input is found; the fuzz targets alone link libFuzzer itself.
option(RS2_BUILD_FUZZERS "Build the libFuzzer targets of fuzz/ (needs clang)" OFF)

if(RS2_BUILD_FUZZERS)
    if(NOT CMAKE_CXX_COMPILER_ID MATCHES "Clang")
        message(FATAL_ERROR "RS2_BUILD_FUZZERS needs clang: configure with CC=clang CXX=clang++")
    endif()
    add_compile_options(-fsanitize=fuzzer-no-link,address,undefined
                        -fno-sanitize-recover=all -fno-omit-frame-pointer)
    add_link_options(-fsanitize=address,undefined -fno-sanitize-recover=all)
endif()
