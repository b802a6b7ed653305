#include "tools/rs2/PngWriter.hpp"

#include <png.h>
#include <zlib.h>

#include <cerrno>
#include <csetjmp>
#include <cstdio>
#include <cstring>
#include <memory>
#include <stdexcept>
#include <string>

namespace {

// libpng reports an error by calling its error function, which must not
// return; it jumps back to the setjmp of WriteRows. Only plain C state lives
// between the two, so the jump skips no destructor.
struct ErrorText {
    char text[256];
};

extern "C" void KeepPngError(png_structp png, png_const_charp message) {
    auto *error = static_cast<ErrorText *>(png_get_error_ptr(png));
    std::snprintf(error->text, sizeof error->text, "%s", message);
    png_longjmp(png, 1);
}

// Writes the whole PNG stream to file; returns false with error->text set
// when libpng fails (a write error included).
bool WriteRows(FILE *file, const Image8 &image, ErrorText *error) {
    png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, error,
                                              KeepPngError, nullptr);
    if (png == nullptr) {
        std::snprintf(error->text, sizeof error->text, "out of memory");
        return false;
    }
    png_infop info = png_create_info_struct(png);
    if (info == nullptr) {
        png_destroy_write_struct(&png, nullptr);
        std::snprintf(error->text, sizeof error->text, "out of memory");
        return false;
    }
    if (setjmp(png_jmpbuf(png))) {
        png_destroy_write_struct(&png, &info);
        return false;
    }
    png_init_io(png, file);
    // Radar speckle hardly compresses: the fastest level writes files a few
    // percent larger in a fraction of the time.
    png_set_compression_level(png, Z_BEST_SPEED);
    png_set_IHDR(png, info, static_cast<png_uint_32>(image.width),
                 static_cast<png_uint_32>(image.height), 8,
                 image.samplesPerPixel == 1 ? PNG_COLOR_TYPE_GRAY
                                            : PNG_COLOR_TYPE_RGB,
                 PNG_INTERLACE_NONE, PNG_COMPRESSION_TYPE_DEFAULT,
                 PNG_FILTER_TYPE_DEFAULT);
    png_write_info(png, info);
    const size_t rowBytes = static_cast<size_t>(image.width) *
                            static_cast<size_t>(image.samplesPerPixel);
    for (int32_t row = 0; row < image.height; ++row)
        png_write_row(png, image.samples.data() +
                               rowBytes * static_cast<size_t>(row));
    png_write_end(png, info);
    png_destroy_write_struct(&png, &info);
    return true;
}

struct FileCloser {
    void operator()(FILE *file) const { std::fclose(file); }
};

} // namespace

void WritePng(const std::string &path, const Image8 &image) {
    if (image.samplesPerPixel != 1 && image.samplesPerPixel != 3)
        throw std::invalid_argument("a PNG of " +
                                    std::to_string(image.samplesPerPixel) +
                                    " samples a pixel");
    std::unique_ptr<FILE, FileCloser> file(std::fopen(path.c_str(), "wb"));
    if (!file)
        throw std::runtime_error("cannot write " + path + ": " +
                                 std::strerror(errno));
    ErrorText error{};
    if (!WriteRows(file.get(), image, &error))
        throw std::runtime_error("cannot write " + path + ": " + error.text);
    // Data still buffered is written on closing, where a full disk shows.
    if (std::fclose(file.release()) != 0)
        throw std::runtime_error("cannot write " + path + ": " +
                                 std::strerror(errno));
}
