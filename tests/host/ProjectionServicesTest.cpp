#include "host/ProjectionServices.hpp"

#include "host/HostMemory.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

namespace {

constexpr double kPi = 3.14159265358979323846;

// Length of the WGS84 meridian from the equator to a latitude (series in
// the eccentricity, millimetre accurate): the northing of a point on a
// central meridian is this times the UTM scale 0.9996.
double MeridianArc(double latitudeDegrees) {
    const double a = 6378137.0;
    const double f = 1.0 / 298.257223563;
    const double e2 = f * (2.0 - f);
    const double e4 = e2 * e2;
    const double e6 = e4 * e2;
    const double phi = latitudeDegrees * kPi / 180.0;
    return a *
           ((1 - e2 / 4 - 3 * e4 / 64 - 5 * e6 / 256) * phi -
            (3 * e2 / 8 + 3 * e4 / 32 + 45 * e6 / 1024) * std::sin(2 * phi) +
            (15 * e4 / 256 + 45 * e6 / 1024) * std::sin(4 * phi) -
            (35 * e6 / 3072) * std::sin(6 * phi));
}

struct Sample {
    double pixel, line, x, y;
};

// Points of a grid of columns x rows over a 2000 x 1500 image, mapped by f.
template <typename Map>
std::vector<Sample> GridSamples(int columns, int rows, Map f) {
    std::vector<Sample> samples;
    for (int r = 0; r < rows; ++r)
        for (int c = 0; c < columns; ++c) {
            const double pixel = c * 2000.0 / std::max(1, columns - 1);
            const double line = r * 1500.0 / std::max(1, rows - 1) + 0.37 * c;
            double x = 0.0;
            double y = 0.0;
            f(pixel, line, &x, &y);
            samples.push_back({pixel, line, x, y});
        }
    return samples;
}

struct Fit {
    GEOInfo_t geo{};
    int32_t order = 0;
    int32_t result = -1;
    double rmsX = -1.0;
    double rmsY = -1.0;
};

Fit FitSamples(const std::vector<Sample> &samples, int32_t requestedOrder) {
    std::vector<double> pixels, lines, xs, ys;
    for (const Sample &s : samples) {
        pixels.push_back(s.pixel);
        lines.push_back(s.line);
        xs.push_back(s.x);
        ys.push_back(s.y);
    }
    Fit fit;
    fit.order = requestedOrder;
    fit.result = GCPRegression2(&fit.geo, "PIXEL", pixels.data(), lines.data(),
                                "UTM 10 U D000", xs.data(), ys.data(),
                                static_cast<int32_t>(samples.size()),
                                &fit.order, 0, &fit.rmsX, &fit.rmsY);
    return fit;
}

void Affine(double p, double l, double *x, double *y) {
    *x = 300000.0 + 12.5 * p - 0.3 * l;
    *y = 5400000.0 + 0.2 * p - 12.5 * l;
}

void Quadratic(double p, double l, double *x, double *y) {
    *x = 1000.0 + 2.0 * p + 0.5 * l + 1e-3 * p * p - 2e-3 * p * l;
    *y = -500.0 - 1.5 * l + 3e-4 * l * l + 1e-4 * p * p;
}

} // namespace

TEST(UTMZone,
     gives_standard_zones_bands_and_the_norway_and_svalbard_exceptions) {
    struct Case {
        double longitude, latitude;
        int32_t zone;
        char band;
    } cases[] = {
        {-123.5, 49.2, 10, 'U'}, {-123.0, 49.0, 10, 'U'},
        {0.0, 0.0, 31, 'N'},     {-0.1, -0.1, 30, 'M'},
        {179.9, -79.9, 60, 'C'}, {180.0, 10.0, 1, 'P'},
        {-180.0, 10.0, 1, 'P'},  {186.0, 10.0, 2, 'P'},
        {5.0, 60.0, 32, 'V'},    {3.0, 56.0, 32, 'V'},
        {2.9, 60.0, 31, 'V'},    {5.0, 55.9, 31, 'U'},
        {5.0, 64.1, 31, 'W'},    {11.9, 63.9, 32, 'V'},
        {5.0, 78.0, 31, 'X'},    {8.9, 72.0, 31, 'X'},
        {9.0, 78.0, 33, 'X'},    {20.9, 83.9, 33, 'X'},
        {21.0, 78.0, 35, 'X'},   {33.0, 78.0, 37, 'X'},
        {41.9, 78.0, 37, 'X'},   {42.0, 78.0, 38, 'X'},
        {9.0, 71.9, 32, 'W'},    {18.4, -33.9, 34, 'H'},
        {0.0, -85.0, 31, 'C'},   {0.0, 88.0, 31, 'X'},
    };
    for (const Case &c : cases) {
        int32_t zone = -1;
        char band = '?';
        UTMZone(c.longitude, c.latitude, &zone, &band);
        EXPECT_EQ(zone, c.zone) << c.longitude << ", " << c.latitude;
        EXPECT_EQ(band, c.band) << c.longitude << ", " << c.latitude;
    }
    // Every band from C to X, without I and O, in the middle of its 8 degrees.
    const std::string letters = "CDEFGHJKLMNPQRSTUVWX";
    for (size_t i = 0; i < letters.size(); ++i) {
        int32_t zone = 0;
        char band = '?';
        UTMZone(-100.0, -76.0 + 8.0 * i, &zone, &band);
        EXPECT_EQ(band, letters[i]) << i;
    }
    // No zone for a point that is not finite.
    int32_t zone = -1;
    char band = '?';
    UTMZone(std::nan(""), 10.0, &zone, &band);
    EXPECT_EQ(zone, 0);
    EXPECT_EQ(band, '\0');
}

TEST(GCTPSimpleTransform, carries_points_on_a_central_meridian_to_its_arc) {
    struct Case {
        const char *source;
        double longitude, latitude;
        const char *utm;
    } cases[] = {{"LONG D000", -123.0, 49.0, "UTM 10 U D000"},
                 {"LONG D000", -123.0, 49.0, "UTM 10 D000"},
                 {"LON D000", -123.0, 49.0, "UTM 10 U D000"},
                 {"LONG D000", 9.0, 60.5, "UTM 32 V D000"},
                 {"LONG D000", -75.0, 1.0, "UTM 18 N D000"},
                 {"LONG D000", -75.0, -1.0, "UTM 18 M D000"},
                 // Bands C to M take the southern false northing.
                 {"LONG D000", 21.0, -30.0, "UTM 34 J D000"}};
    for (const Case &c : cases) {
        SCOPED_TRACE(std::string(c.source) + " to " + c.utm);
        double easting = 0.0;
        double northing = 0.0;
        ASSERT_EQ(GCTPSimpleTransform(c.source, c.longitude, c.latitude, c.utm,
                                      &easting, &northing),
                  0);
        const double arc = 0.9996 * MeridianArc(c.latitude);
        EXPECT_NEAR(easting, 500000.0, 1e-3);
        EXPECT_NEAR(northing, c.latitude < 0 ? 10000000.0 + arc : arc, 0.01);
    }
}

TEST(GCTPSimpleTransform, round_trips_between_geographic_and_utm) {
    const double points[][2] = {
        {-123.5, 49.2}, {-121.2, 48.1}, {-125.9, 50.3}, {-123.0, 49.0}};
    for (const auto &point : points) {
        double easting = 0.0, northing = 0.0, longitude = 0.0, latitude = 0.0;
        ASSERT_EQ(GCTPSimpleTransform("LONG D000", point[0], point[1],
                                      "UTM 10 U D000", &easting, &northing),
                  0);
        ASSERT_EQ(GCTPSimpleTransform("UTM 10 U D000", easting, northing,
                                      "LONG D000", &longitude, &latitude),
                  0);
        EXPECT_NEAR(longitude, point[0], 1e-9);
        EXPECT_NEAR(latitude, point[1], 1e-9);
    }
}

TEST(GCTPSimpleTransform,
     refuses_systems_without_ground_meaning_and_bad_points) {
    struct Case {
        const char *source;
        double x, y;
        const char *destination;
    } cases[] = {{"PIXEL", 1.0, 2.0, "UTM 10 U D000"},
                 {"LONG D000", 1.0, 2.0, "METER"},
                 {"LONG D000", 1.0, 2.0, "nonsense"},
                 {"UTM 61 U D000", 1.0, 2.0, "LONG D000"},
                 {"LONG D000", -123.0, 95.0, "UTM 10 U D000"}};
    for (const Case &c : cases) {
        double x = 7.0;
        double y = 8.0;
        EXPECT_NE(
            GCTPSimpleTransform(c.source, c.x, c.y, c.destination, &x, &y), 0)
            << c.source << " -> " << c.destination << " " << c.y;
        EXPECT_EQ(x, 7.0);
        EXPECT_EQ(y, 8.0);
    }
}

TEST(GCPRegression2, recovers_an_affine_or_quadratic_map) {
    struct Case {
        void (*map)(double, double, double *, double *);
        int columns, rows;
        int32_t order;
        double tolerance;
    } cases[] = {{Affine, 5, 4, 1, 1e-6}, {Quadratic, 6, 5, 5, 1e-5}};
    for (const Case &c : cases) {
        SCOPED_TRACE(c.order);
        const Fit fit =
            FitSamples(GridSamples(c.columns, c.rows, c.map), c.order);
        ASSERT_EQ(fit.result, 0);
        EXPECT_EQ(fit.order, c.order);
        EXPECT_NEAR(fit.rmsX, 0.0, c.tolerance);
        EXPECT_NEAR(fit.rmsY, 0.0, c.tolerance);
        const double probes[][2] = {
            {0, 0}, {2000, 0}, {0, 1500}, {123.4, 987.6}, {1999, 1}};
        for (const auto &probe : probes) {
            double x = 0.0, y = 0.0, expectedX = 0.0, expectedY = 0.0;
            GCPTransform(&fit.geo, probe[0], probe[1], &x, &y);
            c.map(probe[0], probe[1], &expectedX, &expectedY);
            EXPECT_NEAR(x, expectedX, c.tolerance);
            EXPECT_NEAR(y, expectedY, c.tolerance);
        }
    }
}

TEST(GCPRegression2, lowers_the_order_to_what_the_points_determine) {
    struct Case {
        int columns, rows;
        int32_t requested, fitted;
    } cases[] = {
        {1, 1, 5, 0},    {2, 1, 5, 0},   {3, 1, 5, 1},   {5, 1, 5, 1},
        {3, 2, 5, 2},    {3, 3, 5, 2},   {5, 2, 5, 3},   {5, 3, 5, 4},
        {7, 3, 5, 5},    {10, 10, 5, 5}, {10, 10, 1, 1}, {10, 10, 9, 5},
        {10, 10, -2, 0},
    };
    for (const Case &c : cases) {
        const Fit fit =
            FitSamples(GridSamples(c.columns, c.rows, Quadratic), c.requested);
        ASSERT_EQ(fit.result, 0) << c.columns << " x " << c.rows;
        EXPECT_EQ(fit.order, c.fitted) << c.columns << " x " << c.rows;
        EXPECT_EQ(fit.geo.termCount, (c.fitted + 1) * (c.fitted + 2) / 2);
    }
}

TEST(GCPRegression2, fits_points_on_one_line_without_failing) {
    // Every point on line 0: nothing determines how the map varies with line.
    std::vector<Sample> samples;
    for (int i = 0; i < 10; ++i) {
        double x = 0.0, y = 0.0;
        Affine(100.0 * i, 0.0, &x, &y);
        samples.push_back({100.0 * i, 0.0, x, y});
    }
    const Fit fit = FitSamples(samples, 5);
    ASSERT_EQ(fit.result, 0);
    double x = 0.0, y = 0.0, expectedX = 0.0, expectedY = 0.0;
    GCPTransform(&fit.geo, 450.0, 0.0, &x, &y);
    Affine(450.0, 0.0, &expectedX, &expectedY);
    EXPECT_NEAR(x, expectedX, 1e-6);
    EXPECT_NEAR(y, expectedY, 1e-6);
}

TEST(GCPRegression2, refuses_an_empty_or_non_finite_set_of_points) {
    GEOInfo_t geo{};
    int32_t order = 3;
    const double one = 1.0;
    EXPECT_NE(GCPRegression2(&geo, "PIXEL", &one, &one, "METER", &one, &one, 0,
                             &order, 0, nullptr, nullptr),
              0);
    EXPECT_EQ(order, 3);
    const double bad = std::nan("");
    EXPECT_NE(GCPRegression2(&geo, "PIXEL", &one, &one, "METER", &bad, &one, 1,
                             &order, 0, nullptr, nullptr),
              0);
}

TEST(ProjInfo2Parms, round_trips_every_parameter_and_reads_missing_as_zero) {
    ProjInfo_t source;
    InitProjInfo(&source, 0);
    for (int i = 0; i < kProjParmCount; ++i)
        source.parms[i] = (i % 2 ? -1.0 : 1.0) / (i + 3.0) * std::pow(10.0, i);
    source.parms[5] = 1e-300;
    host::HostText text(ProjInfo2Parms(&source));
    ASSERT_NE(text, nullptr);
    ProjInfo_t copy;
    InitProjInfo(&copy, 0);
    ProjParms2Info(text.get(), &copy);
    for (int i = 0; i < kProjParmCount; ++i)
        EXPECT_EQ(copy.parms[i], source.parms[i]) << i;

    ProjParms2Info("10 -1", &copy);
    for (int i = 0; i < kProjParmCount; ++i)
        EXPECT_EQ(copy.parms[i], i == 0 ? 10.0 : i == 1 ? -1.0 : 0.0) << i;
}

TEST(Geosys2ProjInfo2,
     stores_the_transform_in_gdal_order_and_the_utm_parameters) {
    ProjInfo_t record;
    InitProjInfo(&record, 0);
    Geosys2ProjInfo2(&record, "utm 34 j", 1.0, 2.0, 3.0, 4.0, 5.0, 6.0);
    EXPECT_STREQ(record.geosys, "UTM 34 J D000");
    const double expected[6] = {1.0, 3.0, 5.0, 2.0, 6.0, 4.0};
    for (int i = 0; i < 6; ++i)
        EXPECT_EQ(record.transform[i], expected[i]) << i;
    EXPECT_EQ(record.parms[0], 34.0);
    EXPECT_EQ(record.parms[1], -1.0);

    Geosys2ProjInfo(&record, "LONG D000", 7.0, 8.0, 0.5, -0.25);
    EXPECT_STREQ(record.geosys, "LONG D000");
    const double unrotated[6] = {7.0, 0.5, 0.0, 8.0, 0.0, -0.25};
    for (int i = 0; i < 6; ++i)
        EXPECT_EQ(record.transform[i], unrotated[i]) << i;
    EXPECT_EQ(record.parms[0], 0.0);
}
