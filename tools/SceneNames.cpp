#include "tools/SceneNames.h"

#include <algorithm>
#include <filesystem>
#include <string_view>

#include "files/FileSource.h"
#include "gdal/MosaicLayout.h"
#include "host/base/Error.h"
#include "host/base/Text.h"
#include "platform/FileSystem.h"
#include "platform/Program.h"
#include "tools/Message.h"

namespace zmctools {
namespace {

namespace fs = std::filesystem;
using zelm::files::FileSource;

constexpr std::uint64_t kMostListBytes = std::uint64_t{256} << 20;

bool IsList(const std::string& source) { return source.starts_with('@'); }

// Names of databases and services have a colon in front of any slash, and stars of their own.
bool IsPattern(const std::string& source) {
    const std::string name = platform::NameOf(source);
    return name.find_first_of("*?") != name.npos && source.find(':') >= source.find('/') &&
           platform::StatusOf(platform::FolderOf(source)).isFolder;
}

// One star at a time: what the last one stands for grows until the rest fits.
bool Fits(std::string_view name, std::string_view pattern) {
    std::size_t at = 0, in = 0, star = pattern.npos, since = 0;
    while (at < name.size()) {
        if (in < pattern.size() && pattern[in] == '*') {
            star = in++;
            since = at;
        } else if (in < pattern.size() && (pattern[in] == '?' || pattern[in] == name[at])) {
            ++in;
            ++at;
        } else if (star != pattern.npos) {
            in = star + 1;
            at = ++since;
        } else {
            return false;
        }
    }
    return pattern.find_first_not_of('*', in) == pattern.npos;
}

std::string ReadList(const std::string& source, const std::string& file) {
    const platform::FileStatus status = platform::StatusOf(file);
    if (!status.exists) throw Failure(source, "there is no such list");
    if (!status.isRegular) throw Failure(source, "the list is not a regular file");
    int error = 0;
    const auto opened =
        FileSource::Open(zmchost::WideFileName(file), zelm::files::OpenMode::Read, &error);
    if (!opened) throw Failure(source, "it cannot be read: " + platform::ErrorText(error));
    if (opened->Size() > kMostListBytes) throw Failure(source, "it is too long for a list");
    std::string text(static_cast<std::size_t>(opened->Size()), '\0');
    if (opened->ReadAt(0, text.data(), text.size(), &error) != text.size())
        throw Failure(source, "it cannot be read: " + platform::ErrorText(error));
    return text;
}

// A name that stands in a list. One without a folder may be GDAL's own, as those of databases are.
std::string Found(const std::string& folder, const std::string& line) {
    if (platform::IsAbsolutePath(line)) return line;
    const std::string beside = platform::JoinPath(folder, line);
    const bool looksForeign = line.find(':') < line.find('/');
    return looksForeign && !platform::StatusOf(beside).exists ? line : beside;
}

std::vector<std::string> NamesInList(const std::string& source) {
    const std::string file = source.substr(1);
    const std::string text = ReadList(source, file);
    if (text.find('\0') != text.npos) throw Failure(source, "it is no list of names");
    const std::string folder = Absolute(platform::FolderOf(file));
    std::vector<std::string> names;
    std::size_t number = 0;
    for (std::size_t start = 0; start < text.size();) {
        const std::size_t end = std::min(text.find('\n', start), text.size());
        std::string line = text.substr(start, end - start);
        start = end + 1;
        ++number;
        if (line.ends_with('\r')) line.pop_back();
        if (line.starts_with('#') || line.find_first_not_of(" \t") == line.npos) continue;
        if (names.size() == zmcgdal::kMostScenes)
            throw Failure(
                source, "it names more than " + std::to_string(zmcgdal::kMostScenes) + " rasters");
        std::string name = Found(folder, line);
        if (IsList(line) && !platform::StatusOf(name).exists)
            throw Failure(source,
                          "line " + std::to_string(number) + " names a list; a list names rasters");
        names.push_back(std::move(name));
    }
    if (names.empty()) throw Failure(source, "the list names no raster");
    return names;
}

std::vector<std::string> NamesThatFit(const std::string& source) {
    const std::string folder = Absolute(platform::FolderOf(source));
    const std::string pattern = platform::NameOf(source);
    std::vector<std::string> names;
    for (const std::string& name : platform::ListFolder(folder))
        if (name.starts_with('.') == pattern.starts_with('.') && Fits(name, pattern))
            names.push_back(platform::JoinPath(folder, name));
    if (names.empty()) throw Failure(source, "no file fits this pattern");
    std::sort(names.begin(), names.end());
    return names;
}

}  // namespace

std::string Absolute(const std::string& path) {
    std::error_code error;
    const fs::path whole = fs::absolute(path, error);
    return error ? path : whole.lexically_normal().string();
}

std::optional<std::vector<std::string>> SceneNames(const std::string& source) {
    if (platform::StatusOf(source).exists) return std::nullopt;
    if (IsList(source)) return NamesInList(source);
    if (IsPattern(source)) return NamesThatFit(source);
    return std::nullopt;
}

std::string FromAnywhere(const std::string& source) {
    if (platform::IsAbsolutePath(source)) return source;
    if (platform::StatusOf(source).exists) return Absolute(source);
    if (IsList(source)) return '@' + Absolute(source.substr(1));
    return IsPattern(source) ? Absolute(source) : source;
}

}  // namespace zmctools
