// rs2 export: a window of a dataset, resampled to an output grid, written as
// a GeoTIFF band of rows by band of rows with the dataset's georeferencing.
// Memory holds one band whatever the image size; the file appears under its
// name only once it is complete.

#include "tools/rs2/Commands.hpp"
#include "tools/rs2/DatasetChoice.hpp"
#include "tools/rs2/PartFile.hpp"
#include "tools/rs2/ProgressBar.hpp"

#include "host/GeoTiffWriter.hpp"
#include "host/Raster.hpp"
#include "host/RasterServices.hpp"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <stdexcept>

namespace {

// Rows are read and written in bands of about this size: large enough that
// a read's fixed cost does not show, small enough that the scratch the
// driver and the host allocate for each read stays in the allocator's heap
// and in the cache. With bands of 4 MiB the export took three to five times
// as long: that scratch went back to the system after every read and was
// faulted in again.
constexpr size_t kBandBytes = size_t{512} << 10;

struct ExportOptions {
    std::string name;
    std::string output;
    std::vector<int32_t> window;     // x y w h
    std::vector<int32_t> bufferSize; // bw bh
    std::vector<int32_t> channels;
};

// What is written: a window of the dataset, the grid it is resampled to,
// and the channels in the file's sample layout.
struct ExportPlan {
    host::Window window;
    int32_t width = 0; // output grid, pixels
    int32_t height = 0;
    std::vector<int32_t> channels;
    host::SampleType sampleType = host::SampleType::Float32;
};

// Real channels keep their layout; integer ones are written as int32, and
// complex integers as in-phase/quadrature int16 pairs.
host::SampleType SampleTypeOf(int32_t typeCode) {
    switch (typeCode) {
    case kChanFloat32:
        return host::SampleType::Float32;
    case kChanComplexFloat32:
        return host::SampleType::ComplexFloat32;
    case kChanComplexInt16:
        return host::SampleType::ComplexInt16;
    case kChanInt32:
    case kChanUInt16:
    case kChanInt16:
    case kChanUInt8:
    case kChanUInt32:
        return host::SampleType::Int32;
    default:
        throw std::runtime_error("channels of type " +
                                 std::to_string(typeCode) +
                                 " cannot be exported");
    }
}

std::vector<int32_t> CheckedChannels(const host::Raster &raster,
                                     const std::vector<int32_t> &chosen) {
    const std::vector<int32_t> channels = ChosenChannels(raster, chosen);
    const int32_t type = raster.ChannelType(channels.front());
    for (int32_t channel : channels)
        if (raster.ChannelType(channel) != type)
            throw CLI::ValidationError(
                "--channels", "channels " + std::to_string(channels.front()) +
                                  " and " + std::to_string(channel) +
                                  " have different types; export them "
                                  "separately");
    return channels;
}

ExportPlan PlanExport(const host::Raster &raster,
                      const ExportOptions &options) {
    ExportPlan plan;
    plan.window = {0, 0, raster.Width(), raster.Height()};
    if (!options.window.empty()) {
        const std::vector<int32_t> &w = options.window;
        plan.window = {w[0], w[1], w[2], w[3]};
        if (w[2] < 1 || w[3] < 1)
            throw CLI::ValidationError("--window",
                                       "width and height must be at least 1");
        if (w[0] < 0 || w[1] < 0 || w[2] > raster.Width() - w[0] ||
            w[3] > raster.Height() - w[1])
            throw std::runtime_error(
                "window " + std::to_string(w[0]) + " " + std::to_string(w[1]) +
                " " + std::to_string(w[2]) + " " + std::to_string(w[3]) +
                " does not lie within the " + std::to_string(raster.Width()) +
                " x " + std::to_string(raster.Height()) + " raster");
    }
    plan.width =
        options.bufferSize.empty() ? plan.window.width : options.bufferSize[0];
    plan.height =
        options.bufferSize.empty() ? plan.window.height : options.bufferSize[1];
    plan.channels = CheckedChannels(raster, options.channels);
    plan.sampleType = SampleTypeOf(raster.ChannelType(plan.channels.front()));
    return plan;
}

// The transform of the output grid: its origin at the window's corner, its
// steps scaled by the resampling (pixel-is-area positions, see ProjInfo_t).
std::array<double, 6> WindowTransform(const double *t, const ExportPlan &plan) {
    const double x = plan.window.x;
    const double y = plan.window.y;
    const double columnScale =
        static_cast<double>(plan.window.width) / plan.width;
    const double lineScale =
        static_cast<double>(plan.window.height) / plan.height;
    return {t[0] + x * t[1] + y * t[2], t[1] * columnScale, t[2] * lineScale,
            t[3] + x * t[4] + y * t[5], t[4] * columnScale, t[5] * lineScale};
}

// The dataset's ground control points in the file's system, at their
// positions in the output grid. Points that cannot be carried into that
// system are left out.
std::vector<host::TiePoint> OutputTiePoints(const host::GcpSet &gcps,
                                            const char *groundGeosys,
                                            const std::string &fileGeosys,
                                            const ExportPlan &plan) {
    const double columnScale =
        static_cast<double>(plan.width) / plan.window.width;
    const double lineScale =
        static_cast<double>(plan.height) / plan.window.height;
    const bool sameSystem = fileGeosys == groundGeosys;
    std::vector<host::TiePoint> ties;
    for (const host::GroundControlPoint &gcp : gcps.points) {
        double x = gcp.x;
        double y = gcp.y;
        if (!sameSystem && GCTPSimpleTransform(groundGeosys, gcp.x, gcp.y,
                                               fileGeosys.c_str(), &x, &y) != 0)
            continue;
        ties.push_back({(gcp.pixel - plan.window.x) * columnScale,
                        (gcp.line - plan.window.y) * lineScale, x, y, gcp.z});
    }
    return ties;
}

// A GeoTIFF holds one model system: a UTM or geographic dataset gives its
// transform, and its ground control points join it in that system; without
// a map transform the points alone georeference the file, in WGS 84.
host::GeoTiffGeoreferencing OutputGeoreferencing(const host::Raster &raster,
                                                 const ExportPlan &plan) {
    host::GeoTiffGeoreferencing geo;
    const ProjInfo_t projection = raster.Projection();
    char system[kGeosysTextSize] = {};
    const int32_t code = DecodeGeosys(projection.geosys, system);
    if (code == kGeosysUTM || code == kGeosysLong) {
        geo.geosys = system;
        geo.hasTransform = true;
        geo.transform = WindowTransform(projection.transform, plan);
    }
    const host::GcpSet gcps = raster.GroundControlPoints();
    char ground[kGeosysTextSize] = {};
    const int32_t groundCode = DecodeGeosys(gcps.groundGeosys.c_str(), ground);
    if (gcps.points.empty() ||
        (groundCode != kGeosysUTM && groundCode != kGeosysLong))
        return geo;
    if (geo.geosys.empty()) {
        char geographic[kGeosysTextSize] = {};
        DecodeGeosys("LONG D000", geographic);
        geo.geosys = geographic;
    }
    geo.tiePoints = OutputTiePoints(gcps, ground, geo.geosys, plan);
    if (!geo.hasTransform && geo.tiePoints.empty())
        geo.geosys.clear();
    return geo;
}

// One band of output rows, in the file's sample layout. Real channels are
// read as floats, integer ones as 32-bit words; complex integer words are
// rewritten in place as their in-phase and quadrature int16 halves. The
// buffer is allocated once and read into band after band.
class BandBuffer {
  public:
    BandBuffer(const ExportPlan &planIn, size_t rowValues, int32_t rows)
        : plan(planIn), valuesPerRow(rowValues) {
        const size_t values = rowValues * static_cast<size_t>(rows);
        if (IsReal())
            reals.resize(values);
        else
            words.resize(values);
    }

    // Reads sourceRows window rows from sourceRow, resampled to rows output
    // rows, into the band from output row atRow of the band on.
    void Read(const host::Raster &raster, int32_t sourceRow, int32_t sourceRows,
              int32_t rows, int32_t atRow) {
        const host::Window window{plan.window.x, sourceRow, plan.window.width,
                                  sourceRows};
        const size_t first = valuesPerRow * static_cast<size_t>(atRow);
        const size_t count = valuesPerRow * static_cast<size_t>(rows);
        if (IsReal())
            raster.ReadReal32Into(window, plan.width, rows, plan.channels,
                                  reals.data() + first, count);
        else
            raster.ReadInt32Into(window, plan.width, rows, plan.channels,
                                 words.data() + first, count);
        if (plan.sampleType == host::SampleType::ComplexInt16)
            SplitComplexWords(first, count);
    }

    void CopyRow(int32_t from, int32_t to) {
        const size_t source = valuesPerRow * static_cast<size_t>(from);
        const size_t target = valuesPerRow * static_cast<size_t>(to);
        if (IsReal())
            std::copy_n(reals.begin() + source, valuesPerRow,
                        reals.begin() + target);
        else
            std::copy_n(words.begin() + source, valuesPerRow,
                        words.begin() + target);
    }

    const void *Data() const {
        return IsReal() ? static_cast<const void *>(reals.data())
                        : static_cast<const void *>(words.data());
    }

  private:
    bool IsReal() const {
        return plan.sampleType == host::SampleType::Float32 ||
               plan.sampleType == host::SampleType::ComplexFloat32;
    }

    // A word packs in-phase (low half) and quadrature (high half); the file
    // wants the two int16 samples in that order, in native byte order.
    void SplitComplexWords(size_t first, size_t count) {
        for (size_t i = first; i < first + count; ++i) {
            const auto word = static_cast<uint32_t>(words[i]);
            const int16_t pair[2] = {static_cast<int16_t>(word & 0xFFFFu),
                                     static_cast<int16_t>(word >> 16)};
            std::memcpy(&words[i], pair, sizeof pair);
        }
    }

    const ExportPlan &plan;
    size_t valuesPerRow;
    std::vector<float> reals;
    std::vector<int32_t> words;
};

// The window row output row `row` samples: window.y + floor(row * h / bh),
// the host's nearest-neighbour rule.
int32_t SourceRow(const ExportPlan &plan, int32_t row) {
    return plan.window.y +
           static_cast<int32_t>(static_cast<int64_t>(row) * plan.window.height /
                                plan.height);
}

// Output rows [firstRow, firstRow + rows) into band. Without vertical
// resampling they are one read of as many window rows; otherwise each output
// row is its own one-row read, so that every row samples exactly the window
// row the host's rule names (a repeated row is copied, not read again).
void ReadBand(const host::Raster &raster, const ExportPlan &plan,
              int32_t firstRow, int32_t rows, BandBuffer &band) {
    if (plan.height == plan.window.height) {
        band.Read(raster, SourceRow(plan, firstRow), rows, rows, 0);
        return;
    }
    for (int32_t i = 0; i < rows; ++i) {
        const int32_t source = SourceRow(plan, firstRow + i);
        if (i > 0 && source == SourceRow(plan, firstRow + i - 1))
            band.CopyRow(i - 1, i);
        else
            band.Read(raster, source, 1, 1, i);
    }
}

// Band height: whole strips of the file, about kBandBytes.
int32_t BandRows(const host::GeoTiffWriter &writer, int32_t height) {
    const auto strip = static_cast<size_t>(writer.RowsPerStrip());
    const size_t rows = std::max<size_t>(1, kBandBytes / writer.RowBytes());
    const size_t whole = rows >= strip ? rows - rows % strip : rows;
    return static_cast<int32_t>(
        std::min<size_t>(whole, static_cast<size_t>(height)));
}

const char *SampleTypeName(host::SampleType type) {
    switch (type) {
    case host::SampleType::Float32:
        return "float32";
    case host::SampleType::ComplexFloat32:
        return "complex float32";
    case host::SampleType::Int32:
        return "int32";
    case host::SampleType::ComplexInt16:
        return "int16 I/Q pairs";
    }
    return "";
}

void RunExport(const ExportOptions &options) {
    host::Raster raster = host::OpenRaster(options.name);
    const ExportPlan plan = PlanExport(raster, options);
    const host::GeoTiffGeoreferencing geo = OutputGeoreferencing(raster, plan);
    PartFile part(options.output);
    {
        host::GeoTiffWriter writer(part.Path(), plan.width, plan.height,
                                   static_cast<int32_t>(plan.channels.size()),
                                   plan.sampleType);
        writer.SetGeoreferencing(geo);
        const int32_t bandRows = BandRows(writer, plan.height);
        // Every sample type takes four bytes a value (a float, a word, or
        // an int16 pair).
        BandBuffer band(plan, writer.RowBytes() / 4, bandRows);
        ProgressBar progress("export", plan.height);
        for (int32_t row = 0; row < plan.height; row += bandRows) {
            const int32_t rows = std::min(bandRows, plan.height - row);
            ReadBand(raster, plan, row, rows, band);
            writer.WriteRows(row, rows, band.Data());
            progress.Update(row + rows);
        }
        writer.Close();
    }
    part.Commit();
    std::printf("%s: %d x %d pixels, %zu channel(s) of %s\n",
                options.output.c_str(), plan.width, plan.height,
                plan.channels.size(), SampleTypeName(plan.sampleType));
}

} // namespace

void AddExportCommand(CLI::App &app) {
    static ExportOptions options;
    CLI::App *command = app.add_subcommand(
        "export",
        "Write the channels as a GeoTIFF in the dataset's sample type, with "
        "its georeferencing (UTM transform and ground control points, or "
        "ground control points in WGS 84)");
    command->add_option("NAME", options.name, "dataset name")->required();
    command->add_option("OUT", options.output, "GeoTIFF file to write")
        ->required();
    command->add_option("--window", options.window, "X Y W H (default: all)")
        ->expected(4);
    command
        ->add_option("--size", options.bufferSize,
                     "BW BH: output size (nearest neighbour)")
        ->expected(2)
        ->check(CLI::PositiveNumber);
    command->add_option("--channels", options.channels, "e.g. 1,2")
        ->delimiter(',');
    command->footer(
        "Complex channels are written as complex float32 when calibrated, as "
        "in-phase/quadrature int16 pairs when raw. The file is written as "
        "OUT.part-XXXXXX beside OUT and renamed when complete.\n"
        "Example: rs2 export 'dir/product.xml?c=sigma' sigma0.tif");
    command->callback([] { RunExport(options); });
}
