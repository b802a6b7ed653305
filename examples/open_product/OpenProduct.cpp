// open_product: opens a radar product through the rs2 host library and
// prints what a program usually wants to know first: the raster size, the
// channels, the calibrations the product offers and a few pixels.
//
//   open_product NAME
//
// NAME is anything the host opens: a product folder, its product.xml, a
// calibrated view such as "folder?c=sigma", or a GeoTIFF file. The host loads
// the driver module by itself (from VXB_DRIVER_PATH when set, otherwise from
// next to libvxbhost), so the program needs no set-up of its own.
//
// Build with CMake (see CMakeLists.txt) or with pkg-config:
//   c++ -std=c++17 OpenProduct.cpp $(pkg-config --cflags --libs rs2-host)

#include "host/Raster.hpp"

#include <algorithm>
#include <exception>
#include <iostream>
#include <string>
#include <vector>

namespace {

// Side of the upper-left corner read as a taste of the pixels.
constexpr int32_t kCornerSide = 4;

void PrintChannels(const host::Raster &raster) {
    std::cout << "channels: " << raster.ChannelCount() << '\n';
    for (int32_t channel = 1; channel <= raster.ChannelCount(); ++channel)
        std::cout << "  " << channel << ": type " << raster.ChannelType(channel)
                  << ", " << raster.ChannelDescription(channel) << '\n';
}

// The calibrated views the product offers, as suffixes to append to its
// name (":Calibration Type:Sigma Nought" and so on); none for a GeoTIFF.
void PrintCalibrationTypes(const host::Raster &raster) {
    const std::vector<std::string> types = raster.CalibrationTypes();
    std::cout << "calibration types:";
    for (size_t i = 0; i < types.size(); ++i)
        std::cout << (i == 0 ? " " : ", ") << types[i];
    std::cout << '\n';
}

// Channel 1 of the upper-left corner as floats, one image line per output
// line. A complex channel gives two floats per pixel: in-phase, quadrature.
void PrintCorner(const host::Raster &raster) {
    const host::Window corner{0, 0, std::min(kCornerSide, raster.Width()),
                              std::min(kCornerSide, raster.Height())};
    if (corner.width <= 0 || corner.height <= 0 || raster.ChannelCount() < 1)
        return;
    const std::vector<float> values =
        raster.ReadReal32(corner, corner.width, corner.height, {1});
    const size_t perLine = values.size() / corner.height;
    std::cout << "corner " << corner.width << " x " << corner.height
              << " of channel 1:\n";
    for (size_t i = 0; i < values.size(); ++i)
        std::cout << values[i] << ((i + 1) % perLine == 0 ? '\n' : ' ');
}

} // namespace

int main(int argc, char **argv) {
    if (argc != 2) {
        std::cerr << "usage: " << argv[0] << " NAME\n";
        return 2;
    }
    try {
        // The raster closes itself when it goes out of scope.
        const host::Raster raster = host::OpenRaster(argv[1]);
        std::cout << "name: " << raster.Name() << '\n'
                  << "size: " << raster.Width() << " x " << raster.Height()
                  << '\n';
        PrintChannels(raster);
        PrintCalibrationTypes(raster);
        PrintCorner(raster);
    } catch (const host::Error &error) {
        std::cerr << argv[1] << ": " << error.what() << " (host error "
                  << error.Code() << ")\n";
        return 1;
    } catch (const std::exception &error) {
        std::cerr << argv[1] << ": " << error.what() << '\n';
        return 1;
    }
    return 0;
}
