# One warning list for every target of ours; warnings are errors.
function(rs2_apply_warnings target)
    target_compile_options(${target} PRIVATE
        -Wall -Wextra -Wshadow -Wmissing-declarations -Woverloaded-virtual
        -Werror=format-security -Werror)
endfunction()

if(SANITIZE)
    string(REPLACE "," ";" _sanitizers "${SANITIZE}")
    foreach(_s IN LISTS _sanitizers)
        add_compile_options(-fsanitize=${_s})
        add_link_options(-fsanitize=${_s})
    endforeach()
    add_compile_options(-fno-omit-frame-pointer -fno-sanitize-recover=all)
    add_link_options(-fno-sanitize-recover=all)
endif()

# GCC vectorizes at -O2 only loops whose trip count needs no remainder; the
# pixel loops (calibration, sample conversion) have arbitrary widths. The
# cheap cost model vectorizes them with a scalar remainder.
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
    add_compile_options(-fvect-cost-model=cheap)
endif()
