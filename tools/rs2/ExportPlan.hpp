#pragma once

#include "host/GeoTiffWriter.hpp"
#include "host/Raster.hpp"
#include "tools/rs2/Backscatter.hpp"

#include <cstdint>
#include <string>
#include <vector>

struct ExportOptions {
    std::string name;
    std::string output;
    std::string calibration;
    std::vector<int32_t> window;     // x y w h
    std::vector<int32_t> bufferSize; // bw bh
    std::vector<int32_t> channels;
    std::string looks;                // "AxR"
    std::string compression = "none"; // a CompressionName
    bool decibels = false;
    bool denoise = false;
    bool clamp = false;
};

// What is written: a window of the dataset read on a grid (the window
// resampled to --size, nearest neighbour), the channels, and, for a
// backscatter export (--db, --denoise, --looks), how the grid's samples
// become the float32 power or dB the file holds.
struct ExportPlan {
    host::Window window;
    int32_t gridWidth = 0; // the grid the channels are read on
    int32_t gridHeight = 0;
    std::vector<int32_t> channels;
    // The layout channels are read in: floats for real and complex float
    // channels, 32-bit words for integer and complex integer ones.
    host::SampleType readType = host::SampleType::Float32;

    bool backscatter = false;
    PowerRule powerRule = PowerRule::AsIs;
    std::vector<float> noise; // noise power per grid column; empty: none
    bool clamp = false;
    bool decibels = false;
    Looks looks;

    int32_t width = 0; // the file: the grid, multilooked
    int32_t height = 0;
    host::SampleType sampleType = host::SampleType::Float32;

    // Window pixels and lines one output sample spans.
    double ColumnStep() const {
        return static_cast<double>(window.width) / gridWidth * looks.columns;
    }
    double LineStep() const {
        return static_cast<double>(window.height) / gridHeight * looks.lines;
    }
    bool ReadsReals() const {
        return readType == host::SampleType::Float32 ||
               readType == host::SampleType::ComplexFloat32;
    }
    // Values of one pixel of the grid, as read.
    size_t ReadValuesPerPixel() const {
        return channels.size() *
               (readType == host::SampleType::ComplexFloat32 ? 2 : 1);
    }
};

// Checks the options against the dataset (CLI::ValidationError for options
// that conflict or do not fit it) and plans the export.
ExportPlan PlanExport(const host::Raster &raster, const ExportOptions &options);
