# Every dependency comes from the system (Debian packages); nothing is downloaded.
find_package(PkgConfig REQUIRED)
find_package(Threads REQUIRED)
find_package(XercesC REQUIRED)
find_package(Boost 1.71 REQUIRED)
find_package(TIFF REQUIRED)
find_package(PROJ REQUIRED CONFIG)
find_package(Eigen3 REQUIRED NO_MODULE)
find_package(uriparser REQUIRED CONFIG)
# libgeotiff ships neither a CMake package nor a pkg-config file on Debian.
find_path(GEOTIFF_INCLUDE_DIR geotiffio.h PATH_SUFFIXES geotiff)
find_library(GEOTIFF_LIBRARY NAMES geotiff)
if(NOT GEOTIFF_INCLUDE_DIR OR NOT GEOTIFF_LIBRARY)
    message(FATAL_ERROR "libgeotiff not found (Debian package libgeotiff-dev)")
endif()
add_library(GeoTIFF::GeoTIFF UNKNOWN IMPORTED)
set_target_properties(GeoTIFF::GeoTIFF PROPERTIES
    IMPORTED_LOCATION "${GEOTIFF_LIBRARY}"
    INTERFACE_INCLUDE_DIRECTORIES "${GEOTIFF_INCLUDE_DIR}")
find_package(PNG REQUIRED)
find_package(nlohmann_json REQUIRED)
find_package(CLI11 REQUIRED)
