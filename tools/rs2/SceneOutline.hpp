#pragma once

#include <string>
#include <vector>

// A scene's outline on the ground, as its geolocation grid gives it: the tie
// points on the border of the grid, in order around it. Catalogues index
// products by this outline, so it follows the conventions of geographic
// polygons: WGS 84 longitude and latitude in degrees, the ring closed (its
// last point repeats its first) and counter-clockwise seen from above.

/// One tie point of the grid, fields as the driver lists them.
struct GridTiePoint {
    double latitude = 0.0;  // degrees north
    double longitude = 0.0; // degrees east
    double height = 0.0;    // metres above the ellipsoid
    double line = 0.0;      // image line
    double pixel = 0.0;     // image column
};

struct GroundPoint {
    double longitude = 0.0; // degrees east
    double latitude = 0.0;  // degrees north
};

/// The tie points of a "GeolocationGrid" metadata value: five fields per tie
/// point (latitude; longitude; height; line; pixel;). Throws
/// std::runtime_error when the text is not whole tie points of numbers.
std::vector<GridTiePoint> ParseGeolocationGrid(const std::string &text);

/// The grid's outer ring: its first line left to right, its last column top
/// to bottom, its last line right to left and its first column bottom to
/// top, closed, and reversed when that way round is clockwise on the ground.
/// The grid's lines are the tie points of one line value, in any order.
/// Longitudes run on without a jump (179, 181 rather than 179, -179), so the
/// ring may leave [-180, 180]. Throws std::runtime_error when the points
/// enclose no area: fewer than two lines, a line of fewer than two points,
/// coordinates that are not on the globe, a border around a pole.
std::vector<GroundPoint> OuterRing(const std::vector<GridTiePoint> &points);

/// The outer ring as polygons with longitudes within [-180, 180]: the ring
/// itself, or, for a scene across the antimeridian, its parts west and east
/// of it, so that no edge runs the long way round the globe. Each part is
/// closed and counter-clockwise.
std::vector<std::vector<GroundPoint>>
OutlineParts(const std::vector<GroundPoint> &ring);
