# Installation of the host library, its public headers, the driver module and
# the rs2 tool, with a CMake package (find_package(rs2) giving rs2::vxbhost)
# and a pkg-config file (rs2-host). Included once every target exists.

include(CMakePackageConfigHelpers)

set(RS2_INSTALL_CMAKEDIR ${CMAKE_INSTALL_LIBDIR}/cmake/rs2)
# Programs include "host/Raster.hpp" with this folder on their include path.
set(RS2_INSTALL_INCLUDEDIR ${CMAKE_INSTALL_INCLUDEDIR}/rs2)

# The headers an application or a driver module compiles against: the
# application API, the raster services and driver table, and what they
# include. None of them reaches into a third-party header, so the package
# declares no dependency. The readers and writers behind the services stay
# inside the library.
set(RS2_PUBLIC_HEADERS
    host/Raster.hpp
    host/Ephemeris.hpp
    host/ModelSegments.hpp
    host/ProjectionServices.hpp
    host/RasterServices.hpp
    host/DriverTable.hpp
    host/HostMemory.hpp
    host/StringLists.hpp
    host/ErrorReports.hpp
    host/Exception.hpp
    host/TextServices.hpp
    host/Visibility.hpp
)
list(TRANSFORM RS2_PUBLIC_HEADERS PREPEND ${PROJECT_SOURCE_DIR}/)
install(FILES ${RS2_PUBLIC_HEADERS}
        DESTINATION ${RS2_INSTALL_INCLUDEDIR}/host)

# Installed programs and modules find their libraries relative to themselves,
# so that an install into any prefix runs without LD_LIBRARY_PATH.
file(RELATIVE_PATH RS2_BIN_TO_LIB /${CMAKE_INSTALL_BINDIR}
     /${CMAKE_INSTALL_LIBDIR})
set_target_properties(rs2 PROPERTIES INSTALL_RPATH "$ORIGIN/${RS2_BIN_TO_LIB}")
set_target_properties(rs2driver PROPERTIES INSTALL_RPATH "$ORIGIN")

# Before 1.0 a new minor version may change the interface, so the soname
# and the package version both carry major.minor.
set_target_properties(vxbhost PROPERTIES
    VERSION ${PROJECT_VERSION}
    SOVERSION ${PROJECT_VERSION_MAJOR}.${PROJECT_VERSION_MINOR})
install(TARGETS vxbhost EXPORT rs2Targets
        LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
        INCLUDES DESTINATION ${RS2_INSTALL_INCLUDEDIR})
install(EXPORT rs2Targets
        NAMESPACE rs2::
        DESTINATION ${RS2_INSTALL_CMAKEDIR})

configure_package_config_file(
    ${CMAKE_CURRENT_LIST_DIR}/rs2Config.cmake.in
    ${PROJECT_BINARY_DIR}/rs2Config.cmake
    INSTALL_DESTINATION ${RS2_INSTALL_CMAKEDIR})
write_basic_package_version_file(
    ${PROJECT_BINARY_DIR}/rs2ConfigVersion.cmake
    COMPATIBILITY SameMinorVersion)
install(FILES ${PROJECT_BINARY_DIR}/rs2Config.cmake
              ${PROJECT_BINARY_DIR}/rs2ConfigVersion.cmake
        DESTINATION ${RS2_INSTALL_CMAKEDIR})

# The .pc file names its prefix relative to its own folder, so it stays right
# when the install is moved or made with `cmake --install --prefix`.
file(RELATIVE_PATH RS2_PC_TO_PREFIX /${CMAKE_INSTALL_LIBDIR}/pkgconfig /)
string(REGEX REPLACE "/$" "" RS2_PC_TO_PREFIX "${RS2_PC_TO_PREFIX}")
configure_file(${CMAKE_CURRENT_LIST_DIR}/rs2-host.pc.in
               ${PROJECT_BINARY_DIR}/rs2-host.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/rs2-host.pc
        DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
