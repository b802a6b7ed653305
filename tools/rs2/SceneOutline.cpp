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

// Longitudes may come from -180 to 180 or from 0 to 360; latitudes end at
// the poles.
bool OnTheGlobe(const GridTiePoint &point) {
    return std::isfinite(point.line) && std::isfinite(point.pixel) &&
           std::fabs(point.longitude) <= 360.0 &&
           std::fabs(point.latitude) <= 90.0;
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

// The ring with each longitude moved by whole turns to within half a turn
// of the one before it, the first one into [-180, 180).
std::vector<GroundPoint> Continuous(std::vector<GroundPoint> ring) {
    double previous = ring.front().longitude;
    previous -= 360.0 * std::floor((previous + 180.0) / 360.0);
    for (GroundPoint &point : ring) {
        point.longitude -=
            360.0 * std::round((point.longitude - previous) / 360.0);
        previous = point.longitude;
    }
    return ring;
}

// Twice the area the closed ring encloses, positive when it runs
// counter-clockwise.
double SignedDoubleArea(const std::vector<GroundPoint> &ring) {
    double area = 0.0;
    for (size_t i = 1; i < ring.size(); ++i)
        area += (ring[i - 1].longitude - ring[i].longitude) *
                (ring[i - 1].latitude + ring[i].latitude);
    return area;
}

// The part of a closed ring west (or east) of a meridian, closed, with the
// points where its edges cross the meridian; edges are straight in
// longitude and latitude. A scene's border, close to a quadrilateral,
// crosses the meridian twice, so each side is one piece.
std::vector<GroundPoint> PartBeside(const std::vector<GroundPoint> &ring,
                                    double meridian, bool west) {
    const auto inside = [&](const GroundPoint &point) {
        return west ? point.longitude <= meridian : point.longitude >= meridian;
    };
    std::vector<GroundPoint> part;
    const auto add = [&](const GroundPoint &point) {
        if (part.empty() || part.back().longitude != point.longitude ||
            part.back().latitude != point.latitude)
            part.push_back(point);
    };
    for (size_t i = 0; i + 1 < ring.size(); ++i) {
        const GroundPoint &from = ring[i], &to = ring[i + 1];
        if (inside(from))
            add(from);
        if (inside(from) != inside(to)) {
            const double t =
                (meridian - from.longitude) / (to.longitude - from.longitude);
            add({meridian, from.latitude + t * (to.latitude - from.latitude)});
        }
    }
    add(part.front());
    return part;
}

std::vector<GroundPoint> ShiftedBy(std::vector<GroundPoint> ring,
                                   double degrees) {
    for (GroundPoint &point : ring)
        point.longitude += degrees;
    return ring;
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
    std::vector<GroundPoint> ring =
        Continuous(RingInImageOrder(LinesOf(points)));
    // A border that comes back one turn east or west of where it began has
    // gone round a pole: no polygon of longitude and latitude holds it.
    if (ring.back().longitude != ring.front().longitude)
        throw std::runtime_error("the geolocation grid's border goes round a "
                                 "pole, which this outline cannot show");
    const double area = SignedDoubleArea(ring);
    if (area == 0.0)
        throw std::runtime_error(
            "the geolocation grid's border encloses no area");
    if (area < 0.0)
        std::reverse(ring.begin(), ring.end());
    return ring;
}

std::vector<std::vector<GroundPoint>>
OutlineParts(const std::vector<GroundPoint> &ring) {
    const auto [west, east] =
        std::minmax_element(ring.begin(), ring.end(),
                            [](const GroundPoint &a, const GroundPoint &b) {
                                return a.longitude < b.longitude;
                            });
    if (east->longitude > 180.0)
        return {PartBeside(ring, 180.0, true),
                ShiftedBy(PartBeside(ring, 180.0, false), -360.0)};
    if (west->longitude < -180.0)
        return {ShiftedBy(PartBeside(ring, -180.0, true), 360.0),
                PartBeside(ring, -180.0, false)};
    return {ring};
}
