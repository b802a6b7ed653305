#include "tools/rs2/SampleCommand.hpp"

#include "tools/generator/ProductGenerator.hpp"

#include <charconv>
#include <filesystem>
#include <iostream>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string_view>
#include <utility>

namespace {

namespace fs = std::filesystem;

struct SampleArguments {
    std::string directory;
    std::string size = "64x48";
    bool noLuts = false;
    bool noImages = false;
    bool noRpc = false;
    bool noTiePoints = false;
    bool force = false;
    rs2gen::ProductOptions options;
};

std::optional<int> PositiveNumber(std::string_view text) {
    int value = 0;
    const auto [end, error] =
        std::from_chars(text.data(), text.data() + text.size(), value);
    if (error != std::errc() || end != text.data() + text.size() || value < 1)
        return std::nullopt;
    return value;
}

// "WIDTHxHEIGHT", both whole numbers of at least 1.
std::optional<std::pair<int, int>> ParseSize(std::string_view text) {
    const size_t separator = text.find_first_of("xX");
    if (separator == std::string_view::npos)
        return std::nullopt;
    const std::optional<int> width = PositiveNumber(text.substr(0, separator));
    const std::optional<int> height =
        PositiveNumber(text.substr(separator + 1));
    if (!width || !height)
        return std::nullopt;
    return std::make_pair(*width, *height);
}

CLI::Validator SizeText() {
    return CLI::Validator(
        [](const std::string &text) {
            return ParseSize(text) ? std::string()
                                   : "expected WIDTHxHEIGHT in whole pixels "
                                     "of at least 1, e.g. 64x48";
        },
        "WxH");
}

// Writing a product into a folder that holds files replaces any of them
// with the product's names, a product perhaps: only on request.
void RequireEmptyFolder(const std::string &directory) {
    std::error_code error;
    const fs::file_status status = fs::status(directory, error);
    if (status.type() == fs::file_type::not_found)
        return;
    if (error)
        throw std::runtime_error("cannot write " + directory + ": " +
                                 error.message());
    if (status.type() != fs::file_type::directory)
        throw std::runtime_error(directory + " exists and is not a folder");
    if (!fs::is_empty(directory, error) || error)
        throw std::runtime_error(
            directory + " is not empty; give --force to write the product "
                        "into it, replacing files of the same names");
}

void RunSample(SampleArguments arguments) {
    if (!arguments.force)
        RequireEmptyFolder(arguments.directory);
    rs2gen::ProductOptions &options = arguments.options;
    std::tie(options.width, options.height) = *ParseSize(arguments.size);
    options.lookupTables = !arguments.noLuts;
    options.images = !arguments.noImages;
    options.rationalFunctions = !arguments.noRpc;
    options.tiePoints = !arguments.noTiePoints;
    std::cout
        << rs2gen::GenerateProduct(arguments.directory, options).productXml
        << '\n';
}

} // namespace

void AddSampleCommand(CLI::App &app) {
    // The subcommand's options write into this record, which its callback
    // keeps alive as long as the application.
    const auto arguments = std::make_shared<SampleArguments>();
    rs2gen::ProductOptions &options = arguments->options;
    CLI::App *sample = app.add_subcommand(
        "sample", "Write a synthetic product folder (product.xml, look-up "
                  "tables, GeoTIFFs) and print the path of its product.xml");
    sample->footer("DIR is created when missing; a folder that is not "
                   "empty is refused unless --force.\nExamples:\n  rs2 sample "
                   "/tmp/sgf --type SGF --pols HH,HV "
                   "--size 800x600\n  rs2 sample /tmp/slc --type SLC --pols "
                   "HH,HV,VH,VV --seed 3");
    sample->add_option("DIR", arguments->directory, "Product folder to write")
        ->required();
    sample->add_option("--type", options.productType, "Product type")
        ->transform(CLI::IsMember(
            {"SLC", "SGX", "SGF", "SGC", "SCN", "SCW", "SSG", "SPG"},
            CLI::ignore_case))
        ->capture_default_str();
    sample
        ->add_option("--pols", options.polarizations,
                     "Polarizations, comma-separated, one image each")
        ->delimiter(',')
        ->transform(CLI::IsMember({"HH", "HV", "VH", "VV"}, CLI::ignore_case))
        ->capture_default_str();
    sample->add_option("--size", arguments->size, "Image size in pixels")
        ->check(SizeText())
        ->capture_default_str();
    sample->add_option("--seed", options.seed, "Seed of the image content")
        ->capture_default_str();
    sample->add_option("--acquisition", options.acquisitionType,
                       "acquisitionType text (default: from type and "
                       "polarizations)");
    sample
        ->add_option("--lut-offset", options.lutOffset,
                     "Offset of the look-up tables")
        ->capture_default_str();
    sample->add_flag("--force", arguments->force,
                     "Write into a folder that is not empty, replacing files "
                     "of the product's names (other files stay)");
    sample->add_flag("--no-luts", arguments->noLuts,
                     "Leave out the look-up table files");
    sample->add_flag("--no-images", arguments->noImages,
                     "Leave out the GeoTIFF image files");
    sample->add_flag("--no-rpc", arguments->noRpc,
                     "Leave out the rational functions");
    sample->add_flag("--no-tie-points", arguments->noTiePoints,
                     "Leave out the geolocation grid and the image tie "
                     "points");
    sample->add_flag("--side-file", options.sideFile,
                     "Write ProductDescription.self");
    sample->add_flag("--line-time-decreasing", options.lineTimeDecreasing,
                     "Make line 0 the latest line");
    sample->add_flag("--pixel-time-decreasing", options.pixelTimeDecreasing,
                     "Put far range at pixel 0");
    sample->add_flag("--packbits", options.packBits,
                     "Compress the GeoTIFFs with PackBits");
    sample->callback([arguments] { RunSample(*arguments); });
}
