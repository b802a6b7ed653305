#include "tools/rs2/SceneOutline.hpp"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <iterator>
#include <map>
#include <stdexcept>

namespace {

constexpr size_t kFieldsPerTiePoint = 5;

double FieldNumber(const std::string &field) {
    char *end = nullptr;
    const double value = std::strtod(field.c_str(), &end);
    if (field.empty() || *end != '\0')
        throw std::runtime_error(
            "the geolocation grid holds a field that is not a number: \"" +
            field + "\"");
    return value;
}

// Every field is followed by ';', the last one too.
std::vector<double> GridNumbers(const std::string &text) {
    std::vector<double> numbers;
    size_t start = 0;
    for (size_t end = text.find(';'); end != std::string::npos;
         start = end + 1, end = text.find(';', start))
        numbers.push_back(FieldNumber(text.substr(start, end - start)));
    if (start != text.size())
        numbers.push_back(FieldNumber(text.substr(start)));
    return numbers;
}

bool OnTheGlobe(const GridTiePoint &point) {
    return std::isfinite(point.line) && std::isfinite(point.pixel) &&
           std::fabs(point.latitude) <= 90.0 &&
           std::fabs(point.longitude) <= 180.0;
}

// The grid's lines from the first to the last, each left to right.
using GridLines = std::map<double, std::vector<GridTiePoint>>;

GridLines LinesOf(const std::vector<GridTiePoint> &points) {
    GridLines lines;
    for (const GridTiePoint &point : points) {
        if (!OnTheGlobe(point))
            throw std::runtime_error(
                "the geolocation grid holds a tie point that is not on the "
                "globe");
        lines[point.line].push_back(point);
    }
    for (auto &[line, row] : lines)
        std::stable_sort(row.begin(), row.end(),
                         [](const GridTiePoint &a, const GridTiePoint &b) {
                             return a.pixel < b.pixel;
                         });
    const bool narrow =
        std::any_of(lines.begin(), lines.end(),
                    [](const auto &line) { return line.second.size() < 2; });
    if (lines.size() < 2 || narrow)
        throw std::runtime_error("the geolocation grid needs at least two "
                                 "lines of two tie points for an outline");
    return lines;
}

GroundPoint Ground(const GridTiePoint &point) {
    return {point.longitude, point.latitude};
}

std::vector<GroundPoint> RingInImageOrder(const GridLines &lines) {
    std::vector<GroundPoint> ring;
    const std::vector<GridTiePoint> &first = lines.begin()->second;
    const std::vector<GridTiePoint> &last = lines.rbegin()->second;
    for (const GridTiePoint &point : first)
        ring.push_back(Ground(point));
    for (auto line = std::next(lines.begin()); line != std::prev(lines.end());
         ++line)
        ring.push_back(Ground(line->second.back()));
    for (auto point = last.rbegin(); point != last.rend(); ++point)
        ring.push_back(Ground(*point));
    for (auto line = std::next(lines.rbegin()); line != std::prev(lines.rend());
         ++line)
        ring.push_back(Ground(line->second.front()));
    ring.push_back(ring.front());
    return ring;
}

// Twice the area the closed ring encloses, positive when it runs
// counter-clockwise. Each longitude is taken on the side of the previous
// point nearer to it, so that a scene across the antimeridian keeps its
// true shape.
double SignedDoubleArea(const std::vector<GroundPoint> &ring) {
    double area = 0.0;
    double previous = ring.front().longitude;
    for (size_t i = 1; i < ring.size(); ++i) {
        double longitude = ring[i].longitude;
        longitude -= 360.0 * std::round((longitude - previous) / 360.0);
        area +=
            (previous - longitude) * (ring[i - 1].latitude + ring[i].latitude);
        previous = longitude;
    }
    return area;
}

} // namespace

std::vector<GridTiePoint> ParseGeolocationGrid(const std::string &text) {
    const std::vector<double> numbers = GridNumbers(text);
    if (numbers.size() % kFieldsPerTiePoint != 0)
        throw std::runtime_error(
            "the geolocation grid ends inside a tie point");
    std::vector<GridTiePoint> points;
    for (size_t i = 0; i < numbers.size(); i += kFieldsPerTiePoint)
        points.push_back({numbers[i], numbers[i + 1], numbers[i + 2],
                          numbers[i + 3], numbers[i + 4]});
    return points;
}

std::vector<GroundPoint> OuterRing(const std::vector<GridTiePoint> &points) {
    std::vector<GroundPoint> ring = RingInImageOrder(LinesOf(points));
    const double area = SignedDoubleArea(ring);
    if (area == 0.0)
        throw std::runtime_error(
            "the geolocation grid's border encloses no area");
    if (area < 0.0)
        std::reverse(ring.begin(), ring.end());
    return ring;
}
