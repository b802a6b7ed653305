// rs2 export: a window of a dataset, resampled to an output grid, written as
// a GeoTIFF band of rows by band of rows with the dataset's georeferencing;
// as the dataset's samples, or as backscatter (power or dB, noise removed,
// multilooked). Memory holds one band whatever the image size; the file
// appears under its name only once it is complete.

#include "tools/rs2/CalibrationCheck.hpp"
#include "tools/rs2/Commands.hpp"
#include "tools/rs2/DatasetChoice.hpp"
#include "tools/rs2/ExportDescription.hpp"
#include "tools/rs2/ExportGeoreferencing.hpp"
#include "tools/rs2/ExportPlan.hpp"
#include "tools/rs2/PartFile.hpp"
#include "tools/rs2/ProgressBar.hpp"

#include "host/GeoTiffWriter.hpp"
#include "host/Raster.hpp"

#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <cstring>
#include <map>
#include <stdexcept>

namespace {

// Rows are read and written in bands of about this size: large enough that
// a read's fixed cost does not show, small enough that the scratch the
// driver and the host allocate for each read stays in the allocator's heap
// and in the cache. With bands of 4 MiB the export took three to five times
// as long: that scratch went back to the system after every read and was
// faulted in again.
constexpr size_t kBandBytes = size_t{512} << 10;

// One band of rows of the grid, as read: real channels as floats, integer
// ones as 32-bit words. The buffer is allocated once and read into band
// after band.
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

    // Reads sourceRows window rows from sourceRow, resampled to rows grid
    // rows, into the band from its row atRow on.
    void Read(const host::Raster &raster, int32_t sourceRow, int32_t sourceRows,
              int32_t rows, int32_t atRow) {
        const host::Window window{plan.window.x, sourceRow, plan.window.width,
                                  sourceRows};
        const size_t first = valuesPerRow * static_cast<size_t>(atRow);
        const size_t count = valuesPerRow * static_cast<size_t>(rows);
        if (IsReal())
            raster.ReadReal32Into(window, plan.gridWidth, rows, plan.channels,
                                  reals.data() + first, count);
        else
            raster.ReadInt32Into(window, plan.gridWidth, rows, plan.channels,
                                 words.data() + first, count);
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
    const float *Reals() const { return reals.data(); }
    const int32_t *Words() const { return words.data(); }

    // A word packs in-phase (low half) and quadrature (high half); a complex
    // int16 sample of the file holds the two in that order, in native byte
    // order.
    void SplitComplexWords() {
        for (size_t i = 0; i < words.size(); ++i) {
            const auto word = static_cast<uint32_t>(words[i]);
            const int16_t pair[2] = {static_cast<int16_t>(word & 0xFFFFu),
                                     static_cast<int16_t>(word >> 16)};
            std::memcpy(&words[i], pair, sizeof pair);
        }
    }

  private:
    bool IsReal() const { return plan.ReadsReals(); }

    const ExportPlan &plan;
    size_t valuesPerRow;
    std::vector<float> reals;
    std::vector<int32_t> words;
};

// The window row grid row `row` samples: window.y + floor(row * h / bh),
// the host's nearest-neighbour rule.
int32_t SourceRow(const ExportPlan &plan, int32_t row) {
    return plan.window.y +
           static_cast<int32_t>(static_cast<int64_t>(row) * plan.window.height /
                                plan.gridHeight);
}

// Grid rows [firstRow, firstRow + rows) into band. Without vertical
// resampling they are one read of as many window rows; otherwise each grid
// row is its own one-row read, so that every row samples exactly the window
// row the host's rule names (a repeated row is copied, not read again).
void ReadBand(const host::Raster &raster, const ExportPlan &plan,
              int32_t firstRow, int32_t rows, BandBuffer &band) {
    if (plan.gridHeight == plan.window.height) {
        band.Read(raster, SourceRow(plan, firstRow), rows, rows, 0);
    } else {
        for (int32_t i = 0; i < rows; ++i) {
            const int32_t source = SourceRow(plan, firstRow + i);
            if (i > 0 && source == SourceRow(plan, firstRow + i - 1))
                band.CopyRow(i - 1, i);
            else
                band.Read(raster, source, 1, 1, i);
        }
    }
    RequireCompleteReads();
}

// Band height: whole rows of tiles of the file, about kBandBytes.
int32_t BandRows(const host::GeoTiffWriter &writer, int32_t height) {
    const auto tileRow = static_cast<size_t>(writer.RowsPerTileRow());
    const size_t rows = std::max<size_t>(1, kBandBytes / writer.RowBytes());
    const size_t whole = rows >= tileRow ? rows - rows % tileRow : rows;
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
        return "complex int16";
    }
    return "";
}

// Writes the grid's samples as they are read, band after band.
void WriteSamples(const host::Raster &raster, const ExportPlan &plan,
                  host::GeoTiffWriter &writer) {
    const int32_t bandRows = BandRows(writer, plan.height);
    BandBuffer band(plan, plan.gridWidth * plan.ReadValuesPerPixel(), bandRows);
    ProgressBar progress("export", plan.height);
    for (int32_t row = 0; row < plan.height; row += bandRows) {
        const int32_t rows = std::min(bandRows, plan.height - row);
        ReadBand(raster, plan, row, rows, band);
        if (plan.readType == host::SampleType::ComplexInt16)
            band.SplitComplexWords();
        writer.WriteRows(row, rows, band.Data());
        progress.Update(row + rows);
    }
}

// Output rows of a backscatter band: whole rows of tiles of the file when the
// grid rows they take fit kBandBytes, else fewer.
int32_t BackscatterBandRows(const host::GeoTiffWriter &writer,
                            const ExportPlan &plan) {
    const size_t gridRowBytes = static_cast<size_t>(plan.gridWidth) *
                                plan.ReadValuesPerPixel() * sizeof(float);
    const size_t fitting = std::max<size_t>(
        1, kBandBytes / (gridRowBytes * static_cast<size_t>(plan.looks.lines)));
    return std::min(BandRows(writer, plan.height),
                    static_cast<int32_t>(std::min<size_t>(
                        fitting, static_cast<size_t>(plan.height))));
}

// Writes backscatter: each band of grid rows becomes power, loses the noise,
// is multilooked and turned into dB as the plan says.
void WriteBackscatter(const host::Raster &raster, const ExportPlan &plan,
                      host::GeoTiffWriter &writer) {
    const int32_t bandRows = BackscatterBandRows(writer, plan);
    const int32_t gridBandRows = bandRows * plan.looks.lines;
    const size_t channels = plan.channels.size();
    BandBuffer band(plan, plan.gridWidth * plan.ReadValuesPerPixel(),
                    gridBandRows);
    std::vector<float> power(static_cast<size_t>(plan.gridWidth) * channels *
                             gridBandRows);
    std::vector<float> looked(static_cast<size_t>(plan.width) * channels *
                              bandRows);
    ProgressBar progress("export", plan.height);
    for (int32_t row = 0; row < plan.height; row += bandRows) {
        const int32_t rows = std::min(bandRows, plan.height - row);
        const int32_t gridRow = row * plan.looks.lines;
        const int32_t gridRows =
            std::min(rows * plan.looks.lines, plan.gridHeight - gridRow);
        ReadBand(raster, plan, gridRow, gridRows, band);
        const size_t pixels = static_cast<size_t>(plan.gridWidth) * gridRows;
        if (plan.ReadsReals())
            PowerFromReals(band.Reals(), pixels, channels, plan.powerRule,
                           power.data());
        else
            PowerFromWords(band.Words(), pixels, channels, plan.powerRule,
                           power.data());
        if (!plan.noise.empty())
            SubtractNoise(power.data(), plan.gridWidth, gridRows, channels,
                          plan.noise, plan.clamp);
        Multilook(power.data(), plan.gridWidth, gridRows, channels, plan.looks,
                  looked.data());
        const size_t values = static_cast<size_t>(plan.width) * channels * rows;
        if (plan.decibels)
            ToDecibels(looked.data(), values);
        writer.WriteRows(row, rows, looked.data());
        progress.Update(row + rows);
    }
}

// The --compress values, by the name each compression goes by.
std::map<std::string, host::GeoTiffCompression> CompressionNames() {
    std::map<std::string, host::GeoTiffCompression> names;
    for (const auto compression :
         {host::GeoTiffCompression::None, host::GeoTiffCompression::Deflate,
          host::GeoTiffCompression::Zstd, host::GeoTiffCompression::Lzw})
        names.emplace(host::CompressionName(compression), compression);
    return names;
}

void RunExport(ExportOptions options) {
    options.name = NameWithCalibration(options.name, options.calibration);
    // What the target is can be told before the dataset is opened; whether
    // it is one of the dataset's files only after.
    RequireReplaceableTarget(options.output, {});
    host::Raster raster = OpenDataset(options.name);
    PartFile part(options.output, DatasetFiles(raster));
    RequirePixels(raster, "export");
    RequireAppliedCalibration(raster);
    ForgetOpenWarnings();
    const ExportPlan plan = PlanExport(raster, options);
    const host::GeoTiffGeoreferencing geo = OutputGeoreferencing(raster, plan);
    {
        host::GeoTiffWriter writer(part.Path(), plan.width, plan.height,
                                   static_cast<int32_t>(plan.channels.size()),
                                   plan.sampleType,
                                   CompressionNames().at(options.compression));
        writer.SetGeoreferencing(geo);
        writer.SetDescription(DescribeExport(raster, plan));
        if (plan.backscatter)
            WriteBackscatter(raster, plan, writer);
        else
            WriteSamples(raster, plan, writer);
        writer.Close();
    }
    part.Commit();
    std::printf("%s: %d x %d pixels, %zu channel(s) of %s%s\n",
                options.output.c_str(), plan.width, plan.height,
                plan.channels.size(), SampleTypeName(plan.sampleType),
                plan.decibels ? " (dB)" : "");
}

} // namespace

void AddExportCommand(CLI::App &app) {
    static ExportOptions options;
    CLI::App *command = app.add_subcommand(
        "export",
        "Write the channels as a GeoTIFF with the dataset's georeferencing "
        "(UTM transform and ground control points, or ground control points "
        "in WGS 84): as the dataset's samples, or as backscatter power or dB");
    command->add_option("NAME", options.name, "dataset name")->required();
    command->add_option("OUT", options.output, "GeoTIFF file to write")
        ->required();
    AddCalibrationOption(command, options.calibration);
    command->add_option("--window", options.window, "X Y W H (default: all)")
        ->expected(4);
    command
        ->add_option("--size", options.bufferSize,
                     "BW BH: output size (nearest neighbour)")
        ->expected(2)
        ->check(PositivePixels());
    command->add_option("--channels", options.channels, "e.g. 1,2")
        ->delimiter(',');
    command->add_flag("--db", options.decibels,
                      "write 10*log10 of the power; zero and negative power "
                      "(possible after --denoise) become NaN");
    command->add_flag("--denoise", options.denoise,
                      "subtract the noise-equivalent backscatter product.xml "
                      "gives for the chosen calibration");
    command->add_flag("--clamp", options.clamp,
                      "with --denoise: set negative power to 0");
    command->add_option("--looks", options.looks,
                        "AxR: mean power of blocks of A lines by R columns");
    command
        ->add_option("--compress", options.compression,
                     "none (default), deflate, zstd or lzw")
        ->check(CLI::IsMember(CompressionNames()));
    command->footer(
        "Samples: complex channels are written as complex float32 when "
        "calibrated, as complex int16 when raw; detected "
        "channels as float32 (calibrated) or int32 (raw).\n"
        "Backscatter (--db, --denoise, --looks): one float32 value of power "
        "per channel and pixel. Power is the calibrated value of a detected "
        "channel, the square of a raw detected one (amplitude), |I+jQ|^2 of "
        "a complex one. --denoise subtracts, column by column, the noise "
        "power of the product's referenceNoiseLevel for the chosen "
        "calibration: its dB levels, given every stepSize columns from "
        "pixelFirstNoiseValue, interpolated linearly in dB and held at the "
        "end values beyond them; it needs a calibration. Negative results "
        "are kept (unbiased means) unless --clamp sets them to 0. --looks "
        "averages power over A lines by R columns (edge blocks over the "
        "samples they hold) and scales the georeferencing to match. The "
        "steps apply in this order: power, noise, looks, dB.\n"
        "Files are tiled (512 x 512). --compress deflate|zstd|lzw compresses "
        "them without loss, integers with the horizontal predictor and real "
        "floats with the floating-point one; none keeps writing fastest.\n"
        "Each band is named by its channel's polarization; the GDAL metadata "
        "tag holds the product id and type, satellite, beam mode, first-line "
        "time, pass direction, calibration and units (DN, DN^2, linear, dB), "
        "and with --db the nodata value is nan.\n"
        "The file is written as OUT.part-XXXXXX beside OUT and renamed when "
        "complete; nothing is left behind on failure or interruption. An "
        "existing OUT is replaced only when it is a regular file with write "
        "permission (for root: any write bit in its mode) and none of the "
        "dataset's own files; a symbolic link is refused, not followed. A "
        "channel whose image file is missing or unreadable fails the export "
        "rather than be written as zeros, and a calibration that was asked "
        "for and cannot be applied (its table missing or unreadable) fails "
        "it rather than be written as raw values.\n"
        "Examples:\n"
        "  rs2 export 'dir/product.xml?c=sigma' sigma0.tif\n"
        "  rs2 export dir sigma0_db.tif --calibration sigma --denoise --db\n"
        "  rs2 export dir looked.tif --calibration gamma --looks 4x2 --db\n"
        "  rs2 export dir slc.tif --compress zstd");
    command->callback([] { RunExport(options); });
}
