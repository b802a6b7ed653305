// rs2 quicklook: a small PNG of a dataset, for a first look at a scene. The
// whole raster is read decimated (nearest neighbour) to the preview size,
// band of preview rows by band, so that only the rows shown are read and
// memory holds the preview, never the raster. Power is shown in dB, each
// colour stretched on its own between robust percentiles (DecibelStretch).

#include "tools/rs2/Backscatter.hpp"
#include "tools/rs2/CalibrationCheck.hpp"
#include "tools/rs2/Commands.hpp"
#include "tools/rs2/DatasetChoice.hpp"
#include "tools/rs2/DecibelStretch.hpp"
#include "tools/rs2/PartFile.hpp"
#include "tools/rs2/PngWriter.hpp"
#include "tools/rs2/ProgressBar.hpp"

#include "host/Raster.hpp"
#include "host/RasterServices.hpp"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <limits>
#include <string>
#include <utility>
#include <vector>

namespace {

constexpr int32_t kDefaultMaxSize = 1024;

// Each read fills about this many values (1 MiB of floats or words): a
// 1024-row preview takes a few reads, and the band stays small beside the
// preview itself.
constexpr size_t kBandValues = size_t{256} << 10;

struct QuicklookOptions {
    std::string name;
    std::string output;
    std::string calibration;
    int32_t maxSize = kDefaultMaxSize;
    int32_t channel = 0; // 0: none chosen
};

struct PreviewSize {
    int32_t width = 0; // pixels
    int32_t height = 0;
};

// The raster scaled to fit maxSize x maxSize with its aspect ratio, never
// enlarged: the longer side becomes maxSize, the shorter one is rounded
// and at least 1.
PreviewSize FittedSize(int32_t width, int32_t height, int32_t maxSize) {
    const int32_t longer = std::max(width, height);
    if (longer <= maxSize)
        return {width, height};
    const auto scaled = [&](int32_t side) {
        const int64_t side64 = side;
        return static_cast<int32_t>(
            std::max<int64_t>(1, (side64 * maxSize + longer / 2) / longer));
    };
    return {scaled(width), scaled(height)};
}

// A channel number as a metadata entry gives it; 0 when the text is not one
// of the dataset's channels.
int32_t EntryChannel(const std::string &text, int32_t channelCount) {
    char *end = nullptr;
    const long value = std::strtol(text.c_str(), &end, 10);
    if (text.empty() || *end != '\0' || value < 1 || value > channelCount)
        return 0;
    return static_cast<int32_t>(value);
}

// The red, green and blue channels the dataset names (DefaultRed,
// DefaultGreen, DefaultBlue); empty unless it names all three well.
std::vector<int32_t> DefaultComposite(const host::Raster &raster) {
    std::vector<int32_t> colours;
    const host::Entries entries = raster.Metadata(1);
    for (const char *key : {"DefaultRed", "DefaultGreen", "DefaultBlue"}) {
        const auto found =
            std::find_if(entries.begin(), entries.end(),
                         [&](const auto &entry) { return entry.first == key; });
        const int32_t channel =
            found == entries.end()
                ? 0
                : EntryChannel(found->second, raster.ChannelCount());
        if (channel == 0)
            return {};
        colours.push_back(channel);
    }
    return colours;
}

// One channel per colour: the chosen channel alone, else the dataset's
// default composite, else channel 1.
std::vector<int32_t> ShownChannels(const host::Raster &raster,
                                   const QuicklookOptions &options) {
    if (options.channel != 0)
        return ChosenChannels(raster, {options.channel}, "--channel");
    std::vector<int32_t> colours = DefaultComposite(raster);
    return colours.empty() ? ChosenChannels(raster, {1}, "--channel") : colours;
}

// How the samples a read serves become power: calibrated detected samples
// are power already, uncalibrated detected ones amplitude; complex samples
// come as in-phase and quadrature, a float pair or a packed word.
PowerRule PowerRuleOf(int32_t channelType) {
    switch (channelType) {
    case kChanComplexInt16:
    case kChanComplexFloat32:
        return PowerRule::ComplexPair;
    case kChanFloat32:
        return PowerRule::AsIs;
    default:
        return PowerRule::Squared;
    }
}

// Reads one channel band of preview rows by band, as power. Calibrated
// (float) channels take the real read; uncalibrated ones the integer read,
// which the host decimates as it reads the image file.
class BandReader {
  public:
    BandReader(const host::Raster &rasterIn, int32_t channelIn, int32_t widthIn)
        : raster(rasterIn), channel(channelIn), width(widthIn) {
        const int32_t type = raster.ChannelType(channel);
        reals = type == kChanFloat32 || type == kChanComplexFloat32;
        rule = PowerRuleOf(type);
        const size_t valuesPerPixel = type == kChanComplexFloat32 ? 2 : 1;
        rowValues = static_cast<size_t>(width) * valuesPerPixel;
    }

    // Preview rows a band of about kBandValues read values holds.
    int32_t BandRows(int32_t height) const {
        return static_cast<int32_t>(std::clamp<size_t>(
            kBandValues / rowValues, 1, static_cast<size_t>(height)));
    }

    // Reads the raster rows in window to `rows` preview rows of power.
    void ReadPower(const host::Window &window, int32_t rows, float *power) {
        const size_t count = rowValues * static_cast<size_t>(rows);
        const size_t pixels =
            static_cast<size_t>(width) * static_cast<size_t>(rows);
        if (reals) {
            realValues.resize(count);
            raster.ReadReal32Into(window, width, rows, {channel},
                                  realValues.data(), count);
            PowerFromReals(realValues.data(), pixels, 1, rule, power);
        } else {
            words.resize(count);
            raster.ReadInt32Into(window, width, rows, {channel}, words.data(),
                                 count);
            PowerFromWords(words.data(), pixels, 1, rule, power);
        }
        RequireCompleteReads();
    }

  private:
    const host::Raster &raster;
    int32_t channel;
    int32_t width; // preview pixels
    bool reals = false;
    PowerRule rule = PowerRule::AsIs;
    size_t rowValues = 0; // values a read gives for one preview row
    std::vector<float> realValues;
    std::vector<int32_t> words;
};

// The raster row preview row `row` samples: floor(row * height / preview
// height), the host's nearest-neighbour rule.
int32_t SourceRow(int32_t row, int32_t height, const PreviewSize &size) {
    return static_cast<int32_t>(static_cast<int64_t>(row) * height /
                                size.height);
}

// The preview of one channel in dB, row by row (NaN where there is no
// data). Each band of preview rows is one decimated read of the raster rows
// it covers.
std::vector<float> DecibelPlane(const host::Raster &raster, int32_t channel,
                                const PreviewSize &size, ProgressBar &progress,
                                int64_t &rowsDone) {
    BandReader reader(raster, channel, size.width);
    const int32_t bandRows = reader.BandRows(size.height);
    const auto width = static_cast<size_t>(size.width);
    std::vector<float> plane(width * static_cast<size_t>(size.height));
    for (int32_t row = 0; row < size.height; row += bandRows) {
        const int32_t rows = std::min(bandRows, size.height - row);
        const int32_t first = SourceRow(row, raster.Height(), size);
        const int32_t last = SourceRow(row + rows, raster.Height(), size);
        reader.ReadPower({0, first, raster.Width(), last - first}, rows,
                         plane.data() + width * static_cast<size_t>(row));
        rowsDone += rows;
        progress.Update(rowsDone);
    }
    ToDecibels(plane.data(), plane.size());
    return plane;
}

// One channel of the preview: its dB values and their stretch.
struct ChannelPreview {
    int32_t channel = 0;
    std::vector<float> decibels;
    DecibelRange range;
};

// No data (zero, negative or missing power) is black, the level of the
// lowest power: transparency would punch see-through holes wherever a dark
// single-look sample happens to be zero, and a quicklook is read against
// any background.
Image8 Composite(const std::vector<const ChannelPreview *> &colours,
                 const PreviewSize &size) {
    Image8 image;
    image.width = size.width;
    image.height = size.height;
    image.samplesPerPixel = static_cast<int32_t>(colours.size());
    const size_t pixels =
        static_cast<size_t>(size.width) * static_cast<size_t>(size.height);
    image.samples.resize(pixels * colours.size());
    uint8_t *out = image.samples.data();
    for (size_t p = 0; p < pixels; ++p)
        for (const ChannelPreview *colour : colours)
            *out++ = StretchedLevel(colour->decibels[p], colour->range);
    return image;
}

// "OUT: W x H pixels, grey from channel 1, dB stretch -21.3..-4.0", or
// "RGB from channels 1, 2, 1" with a stretch per colour.
void PrintSummary(const std::string &output, const PreviewSize &size,
                  const std::vector<const ChannelPreview *> &colours) {
    std::string channels, stretches;
    for (const ChannelPreview *colour : colours) {
        const bool first = channels.empty();
        channels += (first ? "" : ", ") + std::to_string(colour->channel);
        char range[64] = "no data";
        if (!colour->range.empty)
            std::snprintf(range, sizeof range, "%.1f..%.1f", colour->range.low,
                          colour->range.high);
        stretches += (first ? "" : " / ") + std::string(range);
    }
    const bool grey = colours.size() == 1;
    std::printf("%s: %d x %d pixels, %s from channel%s %s, dB stretch %s\n",
                output.c_str(), size.width, size.height, grey ? "grey" : "RGB",
                grey ? "" : "s", channels.c_str(), stretches.c_str());
}

// The previews of the channels shown, each read once however many colours
// show it.
std::vector<ChannelPreview> ReadPreviews(const host::Raster &raster,
                                         const std::vector<int32_t> &shown,
                                         const PreviewSize &size) {
    std::vector<int32_t> distinct;
    for (int32_t channel : shown)
        if (std::find(distinct.begin(), distinct.end(), channel) ==
            distinct.end())
            distinct.push_back(channel);
    ProgressBar progress("quicklook",
                         int64_t{size.height} *
                             static_cast<int64_t>(distinct.size()));
    int64_t rowsDone = 0;
    std::vector<ChannelPreview> previews;
    for (int32_t channel : distinct) {
        ChannelPreview preview;
        preview.channel = channel;
        preview.decibels =
            DecibelPlane(raster, channel, size, progress, rowsDone);
        preview.range = PercentileRange(preview.decibels);
        previews.push_back(std::move(preview));
    }
    return previews;
}

const ChannelPreview &PreviewOf(const std::vector<ChannelPreview> &previews,
                                int32_t channel) {
    return *std::find_if(
        previews.begin(), previews.end(),
        [&](const ChannelPreview &p) { return p.channel == channel; });
}

void RunQuicklook(const QuicklookOptions &options) {
    RequireReplaceableTarget(options.output, {});
    host::Raster raster =
        OpenDataset(NameWithCalibration(options.name, options.calibration));
    PartFile part(options.output, DatasetFiles(raster));
    RequirePixels(raster, "preview");
    RequireAppliedCalibration(raster);
    ForgetOpenWarnings();
    const std::vector<int32_t> shown = ShownChannels(raster, options);
    const PreviewSize size =
        FittedSize(raster.Width(), raster.Height(), options.maxSize);
    const std::vector<ChannelPreview> previews =
        ReadPreviews(raster, shown, size);

    std::vector<const ChannelPreview *> colours;
    for (int32_t channel : shown)
        colours.push_back(&PreviewOf(previews, channel));
    const Image8 image = Composite(colours, size);

    WritePng(part.Path(), image);
    part.Commit();
    PrintSummary(options.output, size, colours);
}

} // namespace

void AddQuicklookCommand(CLI::App &app) {
    static QuicklookOptions options;
    const CLI::Range kPositive(1, std::numeric_limits<int32_t>::max());
    CLI::App *command = app.add_subcommand(
        "quicklook", "Write a small PNG preview of the dataset: power in dB, "
                     "grey or a colour composite");
    command->add_option("NAME", options.name, "dataset name")->required();
    command->add_option("OUT", options.output, "PNG file to write")->required();
    command
        ->add_option("--max-size", options.maxSize,
                     "N: the preview fits N x N pixels (default 1024)")
        ->check(kPositive);
    AddCalibrationOption(command, options.calibration);
    command
        ->add_option("--channel", options.channel,
                     "K: grey from channel K (default: the dataset's colour "
                     "composite, else channel 1)")
        ->check(kPositive);
    command->footer(
        "The raster is decimated (nearest neighbour) to fit N x N with its "
        "aspect ratio kept; it is never enlarged. Each sample becomes power "
        "(the square of an uncalibrated detected amplitude, |I + jQ|^2 of a "
        "complex sample, a calibrated detected value as it is) and then "
        "10 log10(power); zero, negative or missing power is no data and "
        "shown black. Each colour is stretched on its own, linearly in dB: "
        "the 2nd percentile of its values with data is black (0), the 98th "
        "percentile white (255), values beyond are clamped; a constant "
        "channel is mid-grey. Datasets that name DefaultRed, "
        "DefaultGreen and DefaultBlue are shown as that RGB composite "
        "unless --channel is given. The file is written as OUT.part-XXXXXX "
        "beside OUT and renamed when complete; OUT is replaced only when it "
        "is a regular file with write permission (for root: any write bit "
        "in its mode) and none of the dataset's own files, and a symbolic "
        "link is refused, not followed. A calibration that was asked for and "
        "cannot be applied fails the preview.\n"
        "Prints one line: OUT, its size, the channels shown and the dB "
        "range of each colour's stretch.\nExamples:\n  rs2 quicklook dir "
        "preview.png\n  rs2 quicklook dir hv.png --channel 2 --calibration "
        "sigma --max-size 512");
    command->callback([] { RunQuicklook(options); });
}
