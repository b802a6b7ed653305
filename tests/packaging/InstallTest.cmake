# Installs a build into a temporary prefix and checks that the install stands
# on its own: the installed rs2 finds its library and the driver module
# without help, and the example program builds against the install both
# through find_package(rs2) and through pkg-config, and reports what the
# tool reports. The temporary folder is removed on success and on failure.
#
#   cmake -DBUILD_DIR=... [-DCONFIG=Release] -DSOURCE_DIR=... -DLIBDIR=lib
#         -DVERSION=0.1.0 -DCXX_COMPILER=c++ -DPKG_CONFIG=pkg-config
#         -P InstallTest.cmake
cmake_minimum_required(VERSION 3.19) # string(JSON)

foreach(argument BUILD_DIR SOURCE_DIR LIBDIR VERSION CXX_COMPILER PKG_CONFIG)
    if(NOT ${argument})
        message(FATAL_ERROR "InstallTest.cmake needs -D${argument}=...")
    endif()
endforeach()

# Nothing may lead the installed programs back to the build tree.
unset(ENV{VXB_DRIVER_PATH})
unset(ENV{LD_LIBRARY_PATH})

execute_process(COMMAND mktemp -d OUTPUT_VARIABLE scratch
                OUTPUT_STRIP_TRAILING_WHITESPACE COMMAND_ERROR_IS_FATAL ANY)
set(prefix ${scratch}/prefix)
set(product ${scratch}/product)
set(example_source ${SOURCE_DIR}/examples/open_product)

function(fail text)
    file(REMOVE_RECURSE ${scratch})
    message(FATAL_ERROR "${text}")
endfunction()

# Runs a command that must succeed; its standard output goes to out_var.
function(run out_var)
    execute_process(COMMAND ${ARGN} RESULT_VARIABLE status
                    OUTPUT_VARIABLE out ERROR_VARIABLE err)
    if(NOT status EQUAL 0)
        string(REPLACE ";" " " command "${ARGN}")
        fail("${command}\nfailed (${status}):\n${err}${out}")
    endif()
    set(${out_var} "${out}" PARENT_SCOPE)
endfunction()

function(expect_contains text expected what)
    string(FIND "${text}" "${expected}" at)
    if(at EQUAL -1)
        fail("${what}: expected\n${expected}\nin\n${text}")
    endif()
endfunction()

# Every installed header must compile with only the install on the include
# path: its own includes are installed headers or standard ones, never a
# third-party header the package does not declare.
function(check_public_headers include_dir cflags)
    file(GLOB headers RELATIVE ${include_dir} ${include_dir}/host/*.hpp)
    if(NOT headers)
        fail("no headers installed in ${include_dir}/host")
    endif()
    set(all "")
    foreach(header IN LISTS headers)
        file(STRINGS ${include_dir}/${header} includes
             REGEX "^#include [<\"]")
        foreach(line IN LISTS includes)
            if(line MATCHES "^#include \"(.+)\"")
                if(NOT EXISTS ${include_dir}/${CMAKE_MATCH_1})
                    fail("${header} includes ${CMAKE_MATCH_1}, not installed")
                endif()
            elseif(line MATCHES "^#include <(.*[./].*)>")
                fail("${header} includes the non-standard ${CMAKE_MATCH_1}")
            endif()
        endforeach()
        string(APPEND all "#include \"${header}\"\n")
    endforeach()
    file(WRITE ${scratch}/AllHeaders.cpp "${all}")
    run(ignored ${CXX_COMPILER} -std=c++17 -fsyntax-only ${cflags}
        ${scratch}/AllHeaders.cpp)
endfunction()

# The example's report must agree with what the installed tool says about
# the same product.
function(check_report report)
    run(info ${prefix}/bin/rs2 info ${product} --json)
    string(JSON width GET "${info}" width)
    string(JSON height GET "${info}" height)
    string(JSON channels LENGTH "${info}" channels)
    expect_contains("${report}" "size: ${width} x ${height}\n" "size")
    expect_contains("${report}" "channels: ${channels}\n" "channels")

    string(JSON count LENGTH "${info}" calibration_types)
    if(count EQUAL 0)
        fail("the sample product offers no calibration types:\n${info}")
    endif()
    set(types "")
    math(EXPR last "${count} - 1")
    foreach(i RANGE ${last})
        string(JSON type GET "${info}" calibration_types ${i})
        list(APPEND types "${type}")
    endforeach()
    list(JOIN types ", " types)
    expect_contains("${report}" "calibration types: ${types}\n"
                    "calibration types")

    # The example reads at most 4 x 4 pixels of the upper-left corner.
    set(columns 4)
    set(lines 4)
    if(width LESS columns)
        set(columns ${width})
    endif()
    if(height LESS lines)
        set(lines ${height})
    endif()
    run(pixels ${prefix}/bin/rs2 read ${product} --window 0 0 ${columns}
        ${lines} --channels 1 --real)
    expect_contains("${report}"
                    "corner ${columns} x ${lines} of channel 1:\n${pixels}"
                    "corner pixels")
endfunction()

# CTest names the configuration only when given one (-C).
if(CONFIG)
    set(config_option --config ${CONFIG})
endif()
run(ignored ${CMAKE_COMMAND} --install ${BUILD_DIR} ${config_option}
    --prefix ${prefix})

# The installed tool runs from the prefix and loads the installed driver.
run(version ${prefix}/bin/rs2 --version)
expect_contains("${version}" "${VERSION}" "rs2 --version")
run(driver ${prefix}/bin/rs2 driver)
if(NOT driver MATCHES "driver module: ([^\n]+)")
    fail("rs2 driver names no module:\n${driver}")
endif()
file(REAL_PATH ${CMAKE_MATCH_1} loaded)
file(REAL_PATH ${prefix}/${LIBDIR}/rs2driver.so installed)
if(NOT loaded STREQUAL installed)
    fail("the installed rs2 loaded ${loaded}, not ${installed}")
endif()
run(ignored ${prefix}/bin/rs2 sample ${product})

# The example through find_package(rs2), in a fresh build tree.
# A sanitized build installs sanitized libraries, which only programs built
# with the same sanitizers can load.
set(sanitize_flags "")
if(SANITIZE)
    string(REPLACE "," ";" sanitizers "${SANITIZE}")
    foreach(sanitizer IN LISTS sanitizers)
        list(APPEND sanitize_flags -fsanitize=${sanitizer})
    endforeach()
endif()
string(REPLACE ";" " " sanitize_text "${sanitize_flags}")
run(ignored ${CMAKE_COMMAND} -S ${example_source} -B ${scratch}/example
    -DCMAKE_PREFIX_PATH=${prefix} -DCMAKE_CXX_COMPILER=${CXX_COMPILER}
    -DCMAKE_BUILD_TYPE=Release "-DCMAKE_CXX_FLAGS=${sanitize_text}"
    "-DCMAKE_EXE_LINKER_FLAGS=${sanitize_text}")
file(STRINGS ${scratch}/example/CMakeCache.txt found REGEX "^rs2_DIR:")
expect_contains("${found}" "=${prefix}/${LIBDIR}/cmake/rs2" "rs2_DIR")
run(ignored ${CMAKE_COMMAND} --build ${scratch}/example)
run(report ${scratch}/example/open_product ${product})
check_report("${report}")

# The same program compiled with the flags of the installed .pc file.
set(ENV{PKG_CONFIG_PATH} ${prefix}/${LIBDIR}/pkgconfig)
run(cflags ${PKG_CONFIG} --cflags rs2-host)
run(libs ${PKG_CONFIG} --libs rs2-host)
separate_arguments(cflags UNIX_COMMAND "${cflags}")
separate_arguments(libs UNIX_COMMAND "${libs}")
run(ignored ${CXX_COMPILER} -std=c++17 ${sanitize_flags} ${cflags}
    ${example_source}/OpenProduct.cpp ${libs} -Wl,-rpath,${prefix}/${LIBDIR}
    -o ${scratch}/open_product_pc)
run(report_pc ${scratch}/open_product_pc ${product})
if(NOT report_pc STREQUAL report)
    fail("pkg-config build reports\n${report_pc}\nCMake build reports\n${report}")
endif()

check_public_headers(${prefix}/include/rs2 "${cflags}")

file(REMOVE_RECURSE ${scratch})
