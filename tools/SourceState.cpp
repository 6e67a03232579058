#include "tools/SourceState.h"

#include <cpl_string.h>

#include <cinttypes>
#include <cstdio>

#include "files/FileSource.h"
#include "gdal/FileState.h"
#include "host/base/Checksum.h"
#include "host/base/Error.h"
#include "host/base/Text.h"
#include "platform/FileSystem.h"

namespace zmctools {
namespace {

using zelm::files::FileSource;
using zelm::files::Identity;

Identity FileIdentity(const std::string& path) {
    try {
        return FileSource::IdentifyName(zmchost::WideFileName(path));
    } catch (const zmchost::Error&) {
        return {};
    }
}

}  // namespace

std::string HexText(std::uint64_t number) {
    char text[24];
    static_cast<void>(std::snprintf(text, sizeof text, "%016" PRIx64, number));
    return text;
}

std::string SourceState(GDALDataset& dataset) {
    std::string all = platform::NameOf(dataset.GetDescription()) + '\n';
    const CPLStringList files(dataset.GetFileList());
    for (int i = 0; i < files.Count(); ++i)
        all += platform::NameOf(files[i]) + '\n' + zmcgdal::FileState(files[i]) + '\n';
    return HexText(zmchost::Checksum(all));
}

std::string FileState(const std::string& path) {
    const Identity identity = FileIdentity(path);
    if (!identity.known) return "";
    return HexText(zmchost::Checksum(std::to_string(identity.number) + ' ' +
                                     std::to_string(identity.size) + '@' +
                                     std::to_string(identity.modified)));
}

}  // namespace zmctools
