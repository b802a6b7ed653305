#include "tools/rs2/DatasetJson.hpp"

#include "host/ErrorReports.hpp"
#include "host/ModelSegments.hpp"
#include "tools/rs2/TiePointGrid.hpp"

#include <memory>

using nlohmann::json;

namespace {

json EntriesJson(const host::Entries &entries) {
    json list = json::array();
    for (const auto &[key, value] : entries)
        list.push_back({key, value});
    return list;
}

json ChannelsJson(const host::Raster &raster) {
    json channels = json::array();
    for (int32_t number = 1; number <= raster.ChannelCount(); ++number)
        channels.push_back(
            {{"number", number},
             {"type", raster.ChannelType(number)},
             {"description", raster.ChannelDescription(number)},
             {"metadata", EntriesJson(raster.Metadata(2, number))}});
    return channels;
}

json ProjectionJson(const ProjInfo_t &projection) {
    const double *t = projection.transform;
    return {{"geosys", projection.geosys},
            {"code", DecodeGeosys(projection.geosys, nullptr)},
            {"transform", {t[0], t[1], t[2], t[3], t[4], t[5]}}};
}

// How far the dataset's affine UTM transform is from its geolocation grid,
// in metres; null without a UTM transform or a grid to measure it against.
json AffineMisfitJson(const ProjInfo_t &projection,
                      const host::Entries &metadata) {
    if (DecodeGeosys(projection.geosys, nullptr) != kGeosysUTM)
        return nullptr;
    const AffineMisfit misfit =
        MeasureAffineMisfit(projection, GeolocationGrid(metadata));
    if (misfit.mapDistance.empty())
        return nullptr;
    return {{"max_m", misfit.MaxMapDistance()},
            {"rms_m", misfit.RmsMapDistance()},
            {"tie_points", misfit.mapDistance.size()}};
}

json GcpsJson(const host::Raster &raster) {
    host::GcpSet set = raster.GroundControlPoints();
    json points = json::array();
    for (const host::GroundControlPoint &point : set.points)
        points.push_back({{"id", point.id},
                          {"pixel", point.pixel},
                          {"line", point.line},
                          {"x", point.x},
                          {"y", point.y},
                          {"z", point.z}});
    return {{"pixel_units", set.pixelUnits},
            {"ground_units", set.groundGeosys},
            {"points", points}};
}

json SegmentsJson(const host::Raster &raster) {
    json segments = json::array();
    for (const host::Segment &segment : raster.Segments())
        segments.push_back({{"type", segment.type},
                            {"number", segment.number},
                            {"description", segment.description}});
    return segments;
}

json IncidenceJson(const host::Raster &raster) {
    host::IncidenceArray incidence = raster.Incidence();
    if (incidence.name.empty() && incidence.values.empty())
        return nullptr;
    return {{"name", incidence.name}, {"values", incidence.values}};
}

json OrbitJson(const host::Raster &raster) {
    if (!raster.HasOrbit())
        return nullptr;
    host::OrbitRecord orbit = raster.Orbit();
    json vectors = json::array();
    for (const StateVector_t &v : orbit.stateVectors)
        vectors.push_back(
            {{"time", v.time},
             {"position", {v.position[0], v.position[1], v.position[2]}},
             {"velocity", {v.velocity[0], v.velocity[1], v.velocity[2]}}});
    json attitudes = json::array();
    for (const AttitudeSample_t &a : orbit.attitudes)
        attitudes.push_back({{"seconds", a.seconds},
                             {"yaw", a.yaw},
                             {"roll", a.roll},
                             {"pitch", a.pitch}});
    return {{"state_vectors", vectors}, {"attitudes", attitudes}};
}

json Coefficients(const double *values, int32_t count) {
    return json(std::vector<double>(values, values + count));
}

json RpcJson(const host::Raster &raster) {
    std::vector<unsigned char> block = raster.BinarySegment();
    std::unique_ptr<RFInfo_t, decltype(&RFDeallocate)> rpc(
        VXBBinaryToRFInfo(block.data(), static_cast<int32_t>(block.size())),
        &RFDeallocate);
    if (!rpc)
        return nullptr;
    const RFInfo_t &r = *rpc;
    return {{"width", r.width},
            {"height", r.height},
            {"sensor", r.sensorName},
            {"geosys", r.geosys},
            {"line_offset", r.lineOffset},
            {"line_scale", r.lineScale},
            {"pixel_offset", r.pixelOffset},
            {"pixel_scale", r.pixelScale},
            {"latitude_offset", r.latitudeOffset},
            {"latitude_scale", r.latitudeScale},
            {"longitude_offset", r.longitudeOffset},
            {"longitude_scale", r.longitudeScale},
            {"height_offset", r.heightOffset},
            {"height_scale", r.heightScale},
            {"line_numerator",
             Coefficients(r.lineNumeratorCoefficients, r.coefficientCount)},
            {"line_denominator",
             Coefficients(r.lineDenominatorCoefficients, r.coefficientCount)},
            {"pixel_numerator",
             Coefficients(r.pixelNumeratorCoefficients, r.coefficientCount)},
            {"pixel_denominator",
             Coefficients(r.pixelDenominatorCoefficients, r.coefficientCount)}};
}

json FilesJson(const host::Raster &raster) {
    host::FileLists files = raster.Files();
    return {{"images", files.images},
            {"browse", files.browse},
            {"auxiliary", files.auxiliary}};
}

} // namespace

json DescribeDataset(const host::Raster &raster) {
    json info;
    info["name"] = raster.Name();
    info["width"] = raster.Width();
    info["height"] = raster.Height();
    info["object_name"] = raster.ObjectName();
    info["channels"] = ChannelsJson(raster);
    // Both are built anew on every request; the misfit reuses them.
    const host::Entries metadata = raster.Metadata(1);
    const ProjInfo_t projection = raster.Projection();
    info["metadata"] = EntriesJson(metadata);
    info["projection"] = ProjectionJson(projection);
    info["affine_misfit"] = AffineMisfitJson(projection, metadata);
    info["gcps"] = GcpsJson(raster);
    info["segments"] = SegmentsJson(raster);
    info["calibration_types"] = raster.CalibrationTypes();
    info["files"] = FilesJson(raster);
    info["incidence"] = IncidenceJson(raster);
    info["orbit"] = OrbitJson(raster);
    info["rpc"] = RpcJson(raster);
    info["warnings"] = host::Warnings();
    return info;
}
