#include "host/HostMemory.hpp"
#include "host/ProjectionServices.hpp"
#include "host/RasterServices.hpp"
#include "model/ProductVariants.hpp"
#include "tests/support/LoadedProduct.hpp"
#include "tools/generator/ProductGenerator.hpp"
#include "tools/generator/SceneGeometry.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

namespace {

using ImageKeeper = std::unique_ptr<FILE, decltype(&VXBClose)>;

// Tie points as the metadata reader hands them to the model.
struct TieGrid {
    std::vector<double> pixels, lines, latitudes, longitudes, heights;

    void Add(double pixel, double line, double longitude, double latitude,
             double height) {
        pixels.push_back(pixel);
        lines.push_back(line);
        longitudes.push_back(longitude);
        latitudes.push_back(latitude);
        heights.push_back(height);
    }
    int32_t Count() const { return static_cast<int32_t>(pixels.size()); }

    void StoreIn(ZirOdi2CalibImage &model) const {
        model.SetTiePointCount(Count());
        model.SetTiePixels(pixels.data());
        model.SetTieLines(lines.data());
        model.SetTieLatitudes(latitudes.data());
        model.SetTieLongitudes(longitudes.data());
        model.SetTieHeights(heights.data());
    }
};

// A grid that is exactly affine in the UTM zone: easting = east0 +
// eastStep * pixel, northing = north0 - northStep * line.
TieGrid UtmGrid(const char *utm, double east0, double eastStep, double north0,
                double northStep, int columns, int rows, double width,
                double height) {
    TieGrid grid;
    for (int r = 0; r < rows; ++r)
        for (int c = 0; c < columns; ++c) {
            const double pixel = c * width / (columns - 1);
            const double line = r * height / (rows - 1);
            double longitude = 0.0;
            double latitude = 0.0;
            EXPECT_EQ(GCTPSimpleTransform(utm, east0 + eastStep * pixel,
                                          north0 - northStep * line,
                                          "LONG D000", &longitude, &latitude),
                      0);
            grid.Add(pixel, line, longitude, latitude, 10.0 * r + c);
        }
    return grid;
}

void SetImageSize(ZirOdi2CalibImage &model, const char *columns,
                  const char *rows) {
    host::HostList list;
    if (columns)
        list.reset(SetAuxEntry(list.release(), "ColumnCount", columns));
    if (rows)
        list.reset(SetAuxEntry(list.release(), "RowCount", rows));
    list.reset(SetAuxEntry(list.release(), "SatelliteName", "RADARSAT-2"));
    model.SetMetadata(list.get());
}

constexpr double kUntouched = -999.0;
constexpr int32_t kUntouchedId = -7;

// The caller's side of a GCP segment request: 256 entries per array, plus
// one guard entry that must never be written.
struct GcpOutput {
    static constexpr size_t kRoom = kMaxGcpSegmentPoints;
    int32_t count = -1;
    char pixelUnits[8] = "?";
    char groundGeosys[kGeosysTextSize] = "?";
    char elevationUnits[8] = "?";
    char groundUnits[8] = "?";
    std::vector<int32_t> ids = std::vector<int32_t>(kRoom + 1, kUntouchedId);
    std::vector<double> pixels = Fresh(), lines = Fresh(),
                        pixelHeights = Fresh(), longitudes = Fresh(),
                        latitudes = Fresh(), heights = Fresh();

    static std::vector<double> Fresh() {
        return std::vector<double>(kRoom + 1, kUntouched);
    }
    void ReadFrom(ZirOdi2CalibImage &model) {
        model.GcpSegment(&count, pixelUnits, groundGeosys, elevationUnits,
                         groundUnits, ids.data(), pixels.data(), lines.data(),
                         pixelHeights.data(), longitudes.data(),
                         latitudes.data(), heights.data());
    }
    void ReadFrom(FILE *image) {
        VXBGcpIO(image, 0, 1, 1, &count, pixelUnits, groundGeosys,
                 elevationUnits, groundUnits, ids.data(), pixels.data(),
                 lines.data(), pixelHeights.data(), longitudes.data(),
                 latitudes.data(), heights.data());
    }
    bool GuardsUntouched() const {
        bool untouched = ids[kRoom] == kUntouchedId;
        for (const auto *values : {&pixels, &lines, &pixelHeights, &longitudes,
                                   &latitudes, &heights})
            untouched &= (*values)[kRoom] == kUntouched;
        return untouched;
    }
};

void ExpectProductTexts(const GcpOutput &out) {
    EXPECT_STREQ(out.pixelUnits, "PIXEL");
    EXPECT_STREQ(out.groundGeosys, "LONG      WGS84");
    EXPECT_STREQ(out.elevationUnits, "METER");
    EXPECT_STREQ(out.groundUnits, "METER");
}

using rs2test::LoadedProduct;

struct MapXY {
    double x = 0.0;
    double y = 0.0;
};

ProjInfo_t InitialRecord() {
    ProjInfo_t record;
    std::memset(&record, 0x5A, sizeof record);
    InitProjInfo(&record, 0);
    return record;
}

} // namespace

TEST(GeoReference, fits_a_north_up_grid_with_no_rotation) {
    RUZ2GrpcCR model;
    SetImageSize(model, "1000", "800");
    UtmGrid("UTM 10 U D000", 480000.0, 10.0, 5450000.0, 12.0, 5, 5, 1000.0,
            800.0)
        .StoreIn(model);

    ProjInfo_t record = InitialRecord();
    EXPECT_EQ(model.GeoReference(&record), kGeosysUTM);
    EXPECT_STREQ(record.geosys, "UTM 10 U D000");
    // The upper-left corner lies half a pixel before the centre of pixel 0,
    // which the grid puts at (480000, 5450000).
    const double expected[6] = {480000.0 - 5.0,  10.0, 0.0,
                                5450000.0 + 6.0, 0.0,  -12.0};
    for (int i = 0; i < 6; ++i)
        EXPECT_NEAR(record.transform[i], expected[i], i % 3 ? 1e-6 : 1e-3) << i;
    EXPECT_EQ(record.parms[0], 10.0);
    EXPECT_EQ(record.parms[1], 1.0);
}

TEST(GeoReference, takes_the_zone_of_the_first_tie_point_for_the_whole_grid) {
    // 300 km wide: the grid starts at 123.5 W (zone 10) and ends in zone 11.
    RUZ2GrpcCR model;
    SetImageSize(model, "1000", "100");
    const TieGrid grid = UtmGrid("UTM 10 U D000", 463500.0, 300.0, 5450000.0,
                                 10.0, 6, 3, 1000.0, 100.0);
    grid.StoreIn(model);
    ASSERT_NEAR(grid.longitudes.front(), -123.5, 0.01);
    int32_t lastZone = 0;
    char lastBand = '\0';
    UTMZone(grid.longitudes.back(), grid.latitudes.back(), &lastZone,
            &lastBand);
    ASSERT_EQ(lastZone, 11);

    ProjInfo_t record = InitialRecord();
    EXPECT_EQ(model.GeoReference(&record), kGeosysUTM);
    EXPECT_STREQ(record.geosys, "UTM 10 U D000");
    EXPECT_NEAR(record.transform[0], 463500.0 - 150.0, 1e-3);
    EXPECT_NEAR(record.transform[1], 300.0, 1e-6);
}

TEST(GeoReference,
     leaves_the_record_as_initialised_without_grid_or_image_size) {
    enum class Ties { Grid, None, LastOffTheGlobe };
    struct Case {
        const char *what;
        const char *columns;
        const char *rows;
        Ties ties;
    } cases[] = {
        {"no ColumnCount", nullptr, "800", Ties::Grid},
        {"no RowCount", "1000", nullptr, Ties::Grid},
        {"zero ColumnCount", "0", "800", Ties::Grid},
        {"negative RowCount", "1000", "-3", Ties::Grid},
        {"no tie points", "1000", "800", Ties::None},
        {"a tie point UTM cannot carry", "1000", "800", Ties::LastOffTheGlobe},
    };
    for (const Case &c : cases) {
        RUZ2GrpcCR model;
        SetImageSize(model, c.columns, c.rows);
        if (c.ties != Ties::None) {
            TieGrid grid = UtmGrid("UTM 10 U D000", 480000.0, 10.0, 5450000.0,
                                   12.0, 3, 3, 1000.0, 800.0);
            if (c.ties == Ties::LastOffTheGlobe)
                grid.latitudes.back() = 95.0;
            grid.StoreIn(model);
        }
        const ProjInfo_t initial = InitialRecord();
        ProjInfo_t record = initial;
        EXPECT_EQ(model.GeoReference(&record), kGeosysPixel) << c.what;
        EXPECT_EQ(std::memcmp(&record, &initial, sizeof record), 0) << c.what;
    }
}

TEST(GcpSegment, thins_the_tie_points_to_at_most_256_by_an_even_stride) {
    struct Case {
        int32_t tiePoints, count, step;
    } cases[] = {{1, 1, 1},     {255, 255, 1}, {256, 256, 1}, {257, 129, 2},
                 {512, 256, 2}, {513, 171, 3}, {1000, 250, 4}};
    for (const Case &c : cases) {
        RUZ2GrpcCR model;
        TieGrid grid;
        for (int32_t i = 0; i < c.tiePoints; ++i)
            grid.Add(i, 2.0 * i, -123.0 + 1e-3 * i, 49.0 - 1e-3 * i, 5.0 * i);
        grid.StoreIn(model);

        GcpOutput out;
        out.ReadFrom(model);
        ASSERT_EQ(out.count, c.count) << c.tiePoints;
        EXPECT_TRUE(out.GuardsUntouched()) << c.tiePoints;
        for (int32_t k = 0; k < out.count; ++k) {
            const int32_t i = k * c.step;
            EXPECT_EQ(out.ids[k], k + 1);
            // Raster positions: the pixel centre at + 0.5.
            EXPECT_EQ(out.pixels[k], grid.pixels[i] + 0.5);
            EXPECT_EQ(out.lines[k], grid.lines[i] + 0.5);
            EXPECT_EQ(out.pixelHeights[k], 0.0);
            EXPECT_EQ(out.longitudes[k], grid.longitudes[i]);
            EXPECT_EQ(out.latitudes[k], grid.latitudes[i]);
            EXPECT_EQ(out.heights[k], grid.heights[i]);
        }
        ExpectProductTexts(out);
    }
}

TEST(GcpSegment, writes_the_texts_and_no_point_without_tie_points_or_image) {
    RUZ2GrpcCR bare;
    rs2gen::ProductOptions options;
    options.images = false; // so the image file cannot be opened
    options.geolocationGrid = false;
    LoadedProduct loaded(options);
    ASSERT_NE(loaded.model, nullptr);
    for (ZirOdi2CalibImage *model :
         {static_cast<ZirOdi2CalibImage *>(&bare), loaded.model.get()}) {
        GcpOutput out;
        out.ReadFrom(*model);
        EXPECT_EQ(out.count, 0);
        EXPECT_EQ(out.ids[0], kUntouchedId);
        ExpectProductTexts(out);
    }
}

TEST(GcpSegment, hands_out_the_points_the_image_file_gives) {
    // The generator writes the same grid into product.xml (pixel centres at
    // integers) and into the GeoTIFF (raster positions): both must come out
    // of the host alike. Without a grid in product.xml the model hands out
    // the GeoTIFF's own points.
    for (bool grid : {true, false}) {
        SCOPED_TRACE(grid ? "grid" : "no grid");
        rs2gen::ProductOptions options;
        options.geolocationGrid = grid;
        options.tieGridColumns = 5;
        options.tieGridRows = 4;
        LoadedProduct loaded(options);
        ASSERT_NE(loaded.model, nullptr);
        ASSERT_EQ(loaded.model->GetTiePointCount(), grid ? 20 : 0);
        GcpOutput fromModel;
        fromModel.ReadFrom(*loaded.model);
        ImageKeeper image(VXBOpen(loaded.product.imageFiles[0].c_str(), "r"),
                          &VXBClose);
        ASSERT_NE(image, nullptr);
        GcpOutput fromImage;
        fromImage.ReadFrom(image.get());

        ASSERT_EQ(fromModel.count, 20);
        ASSERT_EQ(fromModel.count, fromImage.count);
        // The product's own points keep the product's name of the system.
        EXPECT_STREQ(fromModel.groundGeosys,
                     grid ? "LONG      WGS84" : fromImage.groundGeosys);
        for (int32_t k = 0; k < fromModel.count; ++k) {
            EXPECT_EQ(fromModel.ids[k], fromImage.ids[k]);
            EXPECT_NEAR(fromModel.pixels[k], fromImage.pixels[k], 1e-9) << k;
            EXPECT_NEAR(fromModel.lines[k], fromImage.lines[k], 1e-9) << k;
            EXPECT_NEAR(fromModel.longitudes[k], fromImage.longitudes[k], 1e-9)
                << k;
            EXPECT_NEAR(fromModel.latitudes[k], fromImage.latitudes[k], 1e-9)
                << k;
        }
    }
}

namespace {

// Easting and northing in zone 10 of a ground point of the generated scene.
MapXY ZoneTen(const rs2gen::GroundPoint &ground) {
    MapXY point;
    EXPECT_EQ(GCTPSimpleTransform("LONG D000", ground.longitude,
                                  ground.latitude, "UTM 10 U D000", &point.x,
                                  &point.y),
              0);
    return point;
}

MapXY Apply(const double *t, double column, double line) {
    return {t[0] + column * t[1] + line * t[2],
            t[3] + column * t[4] + line * t[5]};
}

} // namespace

TEST(GeoReference, puts_the_corners_of_a_generated_product_where_they_lie) {
    rs2gen::ProductOptions options;
    options.width = 200;
    options.height = 150;
    LoadedProduct loaded(options);
    ASSERT_NE(loaded.model, nullptr);

    ProjInfo_t record = InitialRecord();
    ASSERT_EQ(loaded.model->GeoReference(&record), kGeosysUTM);
    EXPECT_STREQ(record.geosys, "UTM 10 U D000");

    // The transform takes raster positions, the scene product coordinates
    // (pixel centres at integers). It goes through three outer image corners
    // exactly (up to the polynomial fit), and elsewhere misses the map,
    // which UTM bends slightly, by a small fraction of a pixel.
    const rs2gen::SceneGeometry scene(options);
    const double *t = record.transform;
    const double pixelSize = std::hypot(t[1], t[4]);
    struct Case {
        double column, line, tolerance; // raster position
    } cases[] = {
        {0.0, 0.0, 1e-3},
        {200.0, 0.0, 1e-3},
        {0.0, 150.0, 1e-3},
        {100.5, 75.5, 0.05 * pixelSize},
        {199.5, 149.5, 0.05 * pixelSize},
    };
    for (const Case &c : cases) {
        const MapXY expected =
            ZoneTen(scene.Ground(c.column - 0.5, c.line - 0.5));
        const MapXY mapped = Apply(t, c.column, c.line);
        EXPECT_NEAR(mapped.x, expected.x, c.tolerance)
            << c.column << ", " << c.line;
        EXPECT_NEAR(mapped.y, expected.y, c.tolerance)
            << c.column << ", " << c.line;
    }
}

TEST(GeoReference, maps_each_pixel_centre_to_its_tie_point) {
    // A scene near the equator on the zone's central meridian, where UTM is
    // as good as affine over a small scene, so the plane reproduces every
    // tie point and not only the corners.
    rs2gen::ProductOptions options;
    options.centerLatitude = 0.1;
    options.centerLongitude = -123.0;
    LoadedProduct loaded(options);
    ASSERT_NE(loaded.model, nullptr);
    ProjInfo_t record = InitialRecord();
    ASSERT_EQ(loaded.model->GeoReference(&record), kGeosysUTM);
    ASSERT_STREQ(record.geosys, "UTM 10 N D000");

    const rs2gen::SceneGeometry scene(options);
    const std::vector<rs2gen::TiePoint> ties =
        scene.TieGrid(options.tieGridColumns, options.tieGridRows);
    ASSERT_EQ(loaded.model->GetTiePointCount(),
              static_cast<int32_t>(ties.size()));
    for (const rs2gen::TiePoint &tie : ties) {
        const MapXY expected = ZoneTen(tie.ground);
        const MapXY mapped =
            Apply(record.transform, tie.pixel + 0.5, tie.line + 0.5);
        EXPECT_NEAR(mapped.x, expected.x, 1e-3) << tie.pixel << "," << tie.line;
        EXPECT_NEAR(mapped.y, expected.y, 1e-3) << tie.pixel << "," << tie.line;
    }
}
