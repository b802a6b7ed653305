#include "tools/generator/SideFileWriter.hpp"

#include "tools/generator/SceneGeometry.hpp"
#include "tools/generator/TextFile.hpp"
#include "tools/generator/XmlWriter.hpp"

#include <ostream>

namespace rs2gen {

void WriteSideFile(const std::string &path, const ProductOptions &options) {
    const SceneGeometry geometry(options);
    WriteTextFile(path, [&](std::ostream &out) {
        auto entry = [&out](const std::string &key, const std::string &value) {
            out << "    " << key << " = " << value << ";\n";
        };
        out << "productInfo=\n";
        entry("productType", options.productType);
        entry("productFormat", "GeoTIFF");
        out << "sourceInfo=\n";
        entry("satellite", "RADARSAT-2");
        entry("beamModeMnemonic", geometry.Beam().mnemonic);
        entry("acquisitionType", AcquisitionTypeText(options));
        entry("startTime", DateTimeText(geometry.EarliestLineTime()));
        entry("endTime", DateTimeText(geometry.LatestLineTime()));
        entry("passDirection", "Ascending");
        out << "imageInfo=\n";
        entry("numberOfLines", std::to_string(options.height));
        entry("numberOfSamplesPerLine", std::to_string(options.width));
        // Archive bookkeeping that readers of the file skip.
        entry("bandsInArchive", std::to_string(options.polarizations.size()));
        entry("bands", JoinedBySpaces(options.polarizations));
    });
}

} // namespace rs2gen
