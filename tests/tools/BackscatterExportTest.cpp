#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TiffContents.hpp"
#include "tools/generator/Calibration.hpp"
#include "tools/generator/ProductGenerator.hpp"
#include "tools/rs2/Backscatter.hpp"
#include "tools/rs2/NoiseLevels.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <fstream>
#include <regex>
#include <string>
#include <vector>

namespace {

using rs2test::Quoted;
using rs2test::ReadTiff;
using rs2test::RunShell;
using rs2test::TiffContents;

std::string Rs2() { return Quoted(RS2_TOOL); }

// Noise power at a column as the levels define it, worked out here from the
// generator's own profile: linear in dB between the given columns.
double NoisePower(const rs2gen::NoiseProfile &profile, int column) {
    const double position =
        std::fmin(std::fmax((column - profile.firstPixel) /
                                static_cast<double>(profile.stepSize),
                            0.0),
                  static_cast<double>(profile.levels.size() - 1));
    const int below = static_cast<int>(position);
    const int above =
        std::min(below + 1, static_cast<int>(profile.levels.size()) - 1);
    const double db =
        profile.levels[below] +
        (position - below) * (profile.levels[above] - profile.levels[below]);
    return std::pow(10.0, db / 10.0);
}

struct Product {
    explicit Product(const std::string &type, int width, int height) {
        options.productType = type;
        options.polarizations = {"HH", "HV"};
        options.width = width;
        options.height = height;
        options.lutOffset = 3.5f;
        generated = rs2gen::GenerateProduct(folder.Path(), options);
    }
    std::string Xml() const { return Quoted(generated.productXml); }
    // Runs rs2 export with arguments into out/name and reads the file back.
    TiffContents Export(const std::string &arguments,
                        const std::string &name = "out.tif") const {
        const std::string path = out.File(name);
        const rs2test::CommandResult result = RunShell(
            Rs2() + " export " + Xml() + " " + Quoted(path) + " " + arguments);
        EXPECT_EQ(result.exitCode, 0) << arguments << ": " << result.errors;
        return ReadTiff(path);
    }
    rs2test::TempDir folder;
    rs2test::TempDir out;
    rs2gen::ProductOptions options;
    rs2gen::GeneratedProduct generated;
};

double SigmaNought(const rs2gen::ProductOptions &options, int channel, int x,
                   int y) {
    const double dn = rs2gen::DetectedSample(options, channel, x, y);
    return (dn * dn + rs2gen::LookupTableOffset(options, "Sigma Nought")) /
           rs2gen::LookupTableGains(options, "Sigma Nought")[x];
}

} // namespace

TEST(BackscatterSteps, power_of_each_sample_layout) {
    // A complex word packs I in its low half and Q in its high half, both
    // signed.
    const int32_t words[] = {static_cast<int32_t>(0x0004FFFDu), 7};
    float power[2];
    PowerFromWords(words, 1, 1, PowerRule::ComplexPair, power);
    EXPECT_FLOAT_EQ(power[0], 25.0f); // (-3)^2 + 4^2
    PowerFromWords(words + 1, 1, 1, PowerRule::Squared, power);
    EXPECT_FLOAT_EQ(power[0], 49.0f);
    const float pairs[] = {1.5f, -2.0f, 0.5f, 0.5f};
    PowerFromReals(pairs, 1, 2, PowerRule::ComplexPair, power);
    EXPECT_FLOAT_EQ(power[0], 6.25f);
    EXPECT_FLOAT_EQ(power[1], 0.5f);
}

TEST(BackscatterSteps, noise_is_kept_below_zero_unless_clamped) {
    const std::vector<float> noise = {1.0f, 3.0f};
    float kept[] = {2.0f, 2.0f, 2.0f, 2.0f}; // 2 x 1 pixels, 2 channels
    SubtractNoise(kept, 2, 1, 2, noise, false);
    EXPECT_EQ(std::vector<float>(kept, kept + 4),
              (std::vector<float>{1.0f, 1.0f, -1.0f, -1.0f}));
    float clamped[] = {2.0f, 2.0f, 2.0f, 5.0f};
    SubtractNoise(clamped, 2, 1, 2, noise, true);
    EXPECT_EQ(std::vector<float>(clamped, clamped + 4),
              (std::vector<float>{1.0f, 1.0f, 0.0f, 2.0f}));
}

TEST(BackscatterSteps, multilook_means_whole_and_edge_blocks) {
    // 5 x 3 pixels, values x + 10 y, looked 2 lines by 2 columns: 3 x 2.
    std::vector<float> power;
    for (int y = 0; y < 3; ++y)
        for (int x = 0; x < 5; ++x)
            power.push_back(static_cast<float>(x + 10 * y));
    ASSERT_EQ(LookedSize(5, 2), 3);
    ASSERT_EQ(LookedSize(4, 2), 2);
    std::vector<float> looked(6);
    Multilook(power.data(), 5, 3, 1, {2, 2}, looked.data());
    EXPECT_EQ(looked, (std::vector<float>{5.5f, 7.5f, 9.0f, // rows 0-1
                                          20.5f, 22.5f, 24.0f}));
}

TEST(BackscatterSteps, decibels_of_positive_power_only) {
    float values[] = {100.0f, 0.001f, 0.0f, -2.0f, NAN};
    ToDecibels(values, 5);
    EXPECT_FLOAT_EQ(values[0], 20.0f);
    EXPECT_FLOAT_EQ(values[1], -30.0f);
    EXPECT_TRUE(std::isnan(values[2]) && std::isnan(values[3]) &&
                std::isnan(values[4]));
}

TEST(NoiseLevelsReading, interpolates_in_db_and_holds_the_ends) {
    const std::string annotation =
        "<product xmlns='urn:x'><referenceNoiseLevel "
        "incidenceAngleCorrection='Beta Nought'><pixelFirstNoiseValue>10"
        "</pixelFirstNoiseValue><stepSize>4</stepSize>"
        "<numberOfNoiseLevelValues>3</numberOfNoiseLevelValues>"
        "<noiseLevelValues units='dB'>-20 -30 -10</noiseLevelValues>"
        "</referenceNoiseLevel></product>";
    const NoiseLevels levels = ReadNoiseLevels(annotation, "beta nought");
    EXPECT_DOUBLE_EQ(levels.PowerAt(0), 0.01); // held before column 10
    EXPECT_DOUBLE_EQ(levels.PowerAt(12), std::pow(10.0, -2.5)); // halfway in dB
    EXPECT_DOUBLE_EQ(levels.PowerAt(16), 1e-2); // between -30 and -10
    EXPECT_DOUBLE_EQ(levels.PowerAt(99), 0.1);  // held after column 18
    EXPECT_THROW(ReadNoiseLevels(annotation, "Gamma"), std::runtime_error);
}

TEST(NoiseLevelsReading, refuses_inconsistent_levels) {
    const auto annotation = [](const std::string &step,
                               const std::string &count,
                               const std::string &values) {
        return "<product><referenceNoiseLevel incidenceAngleCorrection="
               "'Gamma'><pixelFirstNoiseValue>0</pixelFirstNoiseValue>"
               "<stepSize>" +
               step + "</stepSize><numberOfNoiseLevelValues>" + count +
               "</numberOfNoiseLevelValues><noiseLevelValues>" + values +
               "</noiseLevelValues></referenceNoiseLevel></product>";
    };
    EXPECT_NO_THROW(ReadNoiseLevels(annotation("2", "2", "-1 -2"), "Gamma"));
    for (const std::string &bad :
         {annotation("0", "2", "-1 -2"), annotation("2", "3", "-1 -2"),
          annotation("2", "2", "-1 x"), annotation("2", "2", "-1 inf"),
          annotation("2", "0", ""), std::string("<product>")})
        EXPECT_THROW(ReadNoiseLevels(bad, "Gamma"), std::runtime_error) << bad;
}

TEST(BackscatterExport, denoised_sigma_nought_in_db) {
    const Product sgf("SGF", 40, 6);
    const rs2gen::NoiseProfile noise =
        rs2gen::ReferenceNoiseLevels(sgf.options, "Sigma Nought");
    const TiffContents db =
        sgf.Export("--calibration sigma --denoise --db", "db.tif");
    const TiffContents clamped =
        sgf.Export("--calibration sigma --denoise --clamp", "clamped.tif");
    ASSERT_EQ(db.width, 40u);
    ASSERT_EQ(db.samples, 2);
    ASSERT_EQ(db.bits, 32);
    int belowNoise = 0;
    for (int y = 0; y < 6; ++y)
        for (int x = 0; x < 40; ++x)
            for (int c = 0; c < 2; ++c) {
                const size_t s = (static_cast<size_t>(y) * 40 + x) * 2 + c;
                const double power =
                    SigmaNought(sgf.options, c, x, y) - NoisePower(noise, x);
                if (power > 0) {
                    EXPECT_NEAR(db.Sample<float>(s), 10 * std::log10(power),
                                1e-3)
                        << x << "," << y;
                } else {
                    ++belowNoise;
                    EXPECT_TRUE(std::isnan(db.Sample<float>(s)));
                }
                EXPECT_NEAR(clamped.Sample<float>(s), std::fmax(power, 0.0),
                            1e-5 * std::fabs(power) + 1e-9);
            }
    // The generated speckle reaches below the noise floor somewhere.
    EXPECT_GT(belowNoise, 0);
}

TEST(BackscatterExport, complex_channels_become_power) {
    const Product slc("SLC", 12, 4);
    const TiffContents db = slc.Export("--calibration beta --db");
    const std::vector<float> gains =
        rs2gen::LookupTableGains(slc.options, "Beta Nought");
    ASSERT_EQ(db.samples, 2);
    for (int x = 0; x < 12; ++x) {
        const auto [i, q] = rs2gen::ComplexSample(slc.options, 1, x, 3);
        const double power =
            (static_cast<double>(i) * i + static_cast<double>(q) * q) /
            (static_cast<double>(gains[x]) * gains[x]);
        EXPECT_NEAR(db.Sample<float>((3 * 12 + x) * 2 + 1),
                    10 * std::log10(power), 1e-3);
    }
}

TEST(BackscatterExport, looks_average_power_and_scale_the_georeferencing) {
    const Product sgf("SGF", 40, 13);
    const TiffContents full = sgf.Export("--channels 2", "full.tif");
    const TiffContents looked =
        sgf.Export("--channels 2 --looks 3x2", "looked.tif");
    ASSERT_EQ(looked.width, 20u);
    ASSERT_EQ(looked.height, 5u); // 13 lines: 4 blocks of 3 and one of 1
    const auto mean = [&](int x0, int y0, int lines) {
        double sum = 0;
        for (int y = y0; y < y0 + lines; ++y)
            for (int x = x0; x < x0 + 2; ++x) {
                const double dn = rs2gen::DetectedSample(sgf.options, 1, x, y);
                sum += dn * dn;
            }
        return sum / (2 * lines);
    };
    EXPECT_NEAR(looked.Sample<float>(0), mean(0, 0, 3), 1e-3);
    EXPECT_NEAR(looked.Sample<float>(2 * 20 + 7), mean(14, 6, 3), 1e-3);
    EXPECT_NEAR(looked.Sample<float>(4 * 20 + 19), mean(38, 12, 1), 1e-3);
    // Same origin, steps of 2 columns and 3 lines; tie points at a half and
    // a third of their pixel and line.
    ASSERT_EQ(full.matrix.size(), 16u);
    ASSERT_EQ(looked.matrix.size(), 16u);
    for (int k : {3, 7})
        EXPECT_DOUBLE_EQ(looked.matrix[k], full.matrix[k]);
    for (int k : {0, 4})
        EXPECT_DOUBLE_EQ(looked.matrix[k], 2 * full.matrix[k]);
    for (int k : {1, 5})
        EXPECT_DOUBLE_EQ(looked.matrix[k], 3 * full.matrix[k]);
    ASSERT_EQ(looked.ties.size(), full.ties.size());
    ASSERT_FALSE(full.ties.empty());
    for (size_t i = 0; i < full.ties.size(); i += 6) {
        EXPECT_NEAR(looked.ties[i], full.ties[i] / 2, 1e-9);
        EXPECT_NEAR(looked.ties[i + 1], full.ties[i + 1] / 3, 1e-9);
        EXPECT_DOUBLE_EQ(looked.ties[i + 3], full.ties[i + 3]);
    }
}

TEST(BackscatterExport, options_that_do_not_fit_exit_2_and_write_nothing) {
    const Product sgf("SGF", 16, 8);
    // The same product without noise levels.
    std::string xml = rs2test::FileText(sgf.generated.productXml);
    xml = std::regex_replace(
        xml, std::regex("<referenceNoiseLevel[^]*?</referenceNoiseLevel>"), "");
    std::ofstream(sgf.generated.productXml) << xml;
    const std::string out = Quoted(sgf.out.File("out.tif"));
    struct Case {
        std::string arguments;
        int exitCode;
        std::string message;
    };
    const Case cases[] = {
        {"--denoise", 2, "choose a calibration"},
        {"--calibration sigma --denoise", 2, "no noise level for Sigma Nought"},
        {"--clamp", 2, "--clamp: only applies with --denoise"},
        {"--looks 0x1", 2, "\"0x1\" is not AxR"},
        {"--looks 4", 2, "is not AxR"},
        {"--looks 2x2 --size 4 4", 2, "give one of them"},
        {"--calibration delta", 2, "--calibration"},
        {"--db --channels 3", 2, "channel 3 does not exist"},
    };
    for (const Case &c : cases) {
        const rs2test::CommandResult result = RunShell(
            Rs2() + " export " + sgf.Xml() + " " + out + " " + c.arguments);
        EXPECT_EQ(result.exitCode, c.exitCode) << c.arguments;
        EXPECT_NE(result.errors.find(c.message), std::string::npos)
            << c.arguments << ": " << result.errors;
        EXPECT_EQ(std::count(result.errors.begin(), result.errors.end(), '\n'),
                  1)
            << result.errors;
        EXPECT_TRUE(rs2test::FolderEntries(sgf.out.Path()).empty());
    }
    const rs2test::CommandResult named = RunShell(
        Rs2() + " export " + Quoted(sgf.generated.productXml + "?c=beta") +
        " " + out + " --calibration sigma --db");
    EXPECT_EQ(named.exitCode, 2);
    EXPECT_NE(named.errors.find("already chooses a calibration"),
              std::string::npos);
}
