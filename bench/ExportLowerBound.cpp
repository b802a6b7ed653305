// The least work a Sigma Nought export of a detected product can do: read
// the TIFF strips of each polarization with libtiff, apply
// (DN * DN + offset) / gain of the column, and write pixel-interleaved
// float32 strips with libtiff. No host, no driver, no georeferencing: the
// yardstick `rs2 export` is measured against (see README.md).
//
//   export_lower_bound LUT.xml OUT.tif IMAGE.tif [IMAGE.tif ...]
//
// The images are 16-bit unsigned, stripped, of one size. The gains and the
// offset are taken from the look-up table file by a plain text scan.

#include <tiffio.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

namespace {

// Output strips of the size `rs2 export` writes, for a like-for-like count
// of libtiff calls.
constexpr size_t kStripBytes = size_t{256} << 10;

struct TiffCloser {
    void operator()(TIFF *tiff) const { TIFFClose(tiff); }
};
using TiffKeeper = std::unique_ptr<TIFF, TiffCloser>;

struct LookupTable {
    float offset = 0.0f;
    std::vector<float> gains;
};

std::string ElementText(const std::string &text, const std::string &name) {
    const std::string open = "<" + name + ">";
    const size_t begin = text.find(open);
    const size_t end = text.find("</" + name + ">");
    if (begin == std::string::npos || end == std::string::npos || end < begin)
        return "";
    return text.substr(begin + open.size(), end - begin - open.size());
}

LookupTable ReadLookupTable(const std::string &path) {
    std::ifstream file(path);
    std::ostringstream content;
    content << file.rdbuf();
    const std::string text = content.str();
    LookupTable table;
    table.offset = std::strtof(ElementText(text, "offset").c_str(), nullptr);
    std::istringstream gains(ElementText(text, "gains"));
    for (float gain = 0.0f; gains >> gain;)
        table.gains.push_back(gain);
    return table;
}

[[noreturn]] void Fail(const std::string &what) {
    std::fprintf(stderr, "export_lower_bound: %s\n", what.c_str());
    std::exit(1);
}

} // namespace

int main(int argc, char **argv) {
    if (argc < 4)
        Fail("usage: export_lower_bound LUT.xml OUT.tif IMAGE.tif...");
    // The GeoTIFF tags of the inputs are unknown to plain libtiff, which
    // would warn about each of them.
    TIFFSetWarningHandler(nullptr);
    const LookupTable table = ReadLookupTable(argv[1]);
    std::vector<TiffKeeper> inputs;
    for (int i = 3; i < argc; ++i) {
        inputs.emplace_back(TIFFOpen(argv[i], "r"));
        if (!inputs.back())
            Fail(std::string("cannot open ") + argv[i]);
    }
    uint32_t width = 0, height = 0;
    TIFFGetField(inputs[0].get(), TIFFTAG_IMAGEWIDTH, &width);
    TIFFGetField(inputs[0].get(), TIFFTAG_IMAGELENGTH, &height);
    if (table.gains.size() < width)
        Fail("fewer gains than columns");
    const auto channels = static_cast<uint16_t>(inputs.size());

    TiffKeeper output(TIFFOpen(argv[2], "w"));
    if (!output)
        Fail(std::string("cannot create ") + argv[2]);
    TIFF *out = output.get();
    const size_t rowBytes = size_t{width} * channels * sizeof(float);
    const auto stripRows = static_cast<uint32_t>(
        std::clamp<size_t>(kStripBytes / rowBytes, 1, height));
    TIFFSetField(out, TIFFTAG_IMAGEWIDTH, width);
    TIFFSetField(out, TIFFTAG_IMAGELENGTH, height);
    TIFFSetField(out, TIFFTAG_SAMPLESPERPIXEL, channels);
    TIFFSetField(out, TIFFTAG_BITSPERSAMPLE, 32);
    TIFFSetField(out, TIFFTAG_SAMPLEFORMAT, SAMPLEFORMAT_IEEEFP);
    TIFFSetField(out, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG);
    TIFFSetField(out, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
    TIFFSetField(out, TIFFTAG_ROWSPERSTRIP, stripRows);
    const std::vector<uint16_t> extra(channels - 1u, EXTRASAMPLE_UNSPECIFIED);
    if (!extra.empty())
        TIFFSetField(out, TIFFTAG_EXTRASAMPLES,
                     static_cast<uint16_t>(extra.size()), extra.data());

    std::vector<uint16_t> line(width);
    std::vector<float> strip(size_t{width} * channels * stripRows);
    for (uint32_t first = 0; first < height; first += stripRows) {
        const uint32_t rows = std::min(stripRows, height - first);
        for (uint32_t r = 0; r < rows; ++r)
            for (uint16_t c = 0; c < channels; ++c) {
                if (TIFFReadScanline(inputs[c].get(), line.data(), first + r,
                                     0) != 1)
                    Fail("cannot read line " + std::to_string(first + r));
                float *row = strip.data() + size_t{r} * width * channels + c;
                for (uint32_t x = 0; x < width; ++x) {
                    const float dn = line[x];
                    row[size_t{x} * channels] =
                        (dn * dn + table.offset) / table.gains[x];
                }
            }
        const auto bytes = static_cast<tmsize_t>(rowBytes * rows);
        if (TIFFWriteEncodedStrip(out, first / stripRows, strip.data(),
                                  bytes) != bytes)
            Fail("cannot write line " + std::to_string(first));
    }
    if (TIFFFlush(out) != 1)
        Fail("cannot finish the file");
    return 0;
}
