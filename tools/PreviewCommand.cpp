#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <stdexcept>

#include "host/build/BuildFile.h"
#include "platform/File.h"
#include "platform/FileSystem.h"
#include "render/Codec.h"
#include "render/DatasetFacts.h"
#include "render/Legend.h"
#include "render/PictureSize.h"
#include "render/Renderer.h"
#include "tools/Arguments.h"
#include "tools/Command.h"
#include "tools/GdalWorld.h"
#include "tools/Interrupt.h"
#include "tools/RasterView.h"

namespace zmctools {
namespace {

namespace fs = std::filesystem;

constexpr std::uint32_t kUsualSize = 1024;
constexpr std::uint32_t kLongestSize = 16384;

// A view as the renderer reads it, hidden by the dataset's mask where it has one.
class ViewPixels final : public zmcrender::PixelSource {
public:
    ViewPixels(RasterView& shown, const zmcrender::DatasetMask* maskOrNull)
        : view(shown), mask(maskOrNull) {}
    std::string Name() const override { return view.Name(); }
    std::uint32_t PixelType() const override { return view.PixelType(); }
    std::uint32_t Bands() const override { return view.Bands(); }
    std::uint32_t MinLevel() const override { return view.MinLevel(); }
    std::uint32_t MaxLevel() const override { return view.MaxLevel(); }
    std::uint32_t Width(std::uint32_t level) const override { return view.Width(level); }
    std::uint32_t Height(std::uint32_t level) const override { return view.Height(level); }
    std::uint32_t TileSide() const override { return view.TileSide(); }
    void Read(std::uint32_t level, const zmchost::Window& window,
              std::span<const std::uint32_t> bands, void* pixels) override {
        CheckInterrupt(view.Name());
        view.Read(level, window, bands, pixels);
    }
    bool HasMask() const override { return mask != nullptr; }
    void ReadMask(std::uint32_t level, const zmchost::Window& window,
                  unsigned char* shown) override {
        mask->Read(level - view.MinLevel(), window, shown);
    }

private:
    RasterView& view;
    const zmcrender::DatasetMask* mask;
};

// An option of the command line for each key of a style.
struct StyleOption {
    const char* key;
    const char* value;
    const char* help;
};

constexpr StyleOption kStyleOptions[] = {
    {"bands", "3,2,1",
     "One to four bands, counted from 1: grey, grey and alpha, colours, colours and alpha (default "
     "what the raster says of them)"},
    {"stretch", "auto|none|MIN,MAX|pLOW,HIGH|sN",
     "Values that become the darkest and the brightest: a pair, or one for each band (0,9;0,5), "
     "per "
     "cents of the histogram, N standard deviations around the mean (default auto)"},
    {"gamma", "G", "Exponent 1/G of brightness (default 1)"},
    {"colormap", "NAME|-NAME|palette",
     "Colours of one band: grey, viridis, magma, inferno, plasma, cividis, turbo or coolwarm, "
     "reversed with a minus; palette: the file's own (default of one band of integers that has "
     "one)"},
    {"nodata", "auto|none|V",
     "Values that are transparent (default auto: the raster's no-data value)"},
    {"expression", "E", "Arithmetic of bands in place of bands: (b4-b3)/(b4+b3)"},
    {"complex", "PART",
     "Of complex samples: magnitude, real, imaginary or phase (default magnitude)"},
    {"azimuth", "DEGREES",
     "Where the light of --hillshade comes from, clockwise from the top (default 315)"},
    {"altitude", "DEGREES", "Of that light above the horizon (default 45)"},
    {"zfactor", "auto|Z",
     "What heights are multiplied by for --hillshade (default auto: what suits them)"},
    {"depth", "8|16", "Bits of a channel; 16 only of PNG (default 8)"},
};

class PreviewCommand final : public Command {
public:
    const char* Name() const override { return "preview"; }
    const char* Summary() const override { return "Make a picture of a raster: JPEG, PNG or WebP"; }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    std::string file;
    std::string target;
    std::string size;
    std::string window;
    std::string quality;
    std::string values[std::size(kStyleOptions)];
    bool hillshade = false;
    bool legend = false;
    bool overwrite = false;

    zmcrender::PictureFormat Format() const;
    zmcrender::Style Styled() const;
    int Quality() const;
    std::uint32_t LongerSide(const zmchost::Window& area, zmcrender::PictureFormat format) const;
    void CheckTarget() const;
    void Write(zmchost::BuildFile& draft, const std::vector<unsigned char>& bytes) const;
    void Report(const zmcrender::Picture& picture, const zmchost::Window& area,
                const zmcrender::Renderer& renderer) const;
};

void PreviewCommand::Describe(OptionTable& table) {
    table.Text("FILE", file, "Pyramid, or any other raster that GDAL reads").Required();
    table
        .Text("PICTURE", target,
              "Picture to write; its ending tells the format: jpg, jpeg, png, webp")
        .Required();
    table
        .Text("--size", size,
              "Pixels of the longer side, up to 16384 (default 1024, and no more than the window "
              "has)")
        .Named("N");
    table.Text("--window", window, "Part of the finest level, in its pixels (default all)")
        .Named("X,Y,W,H");
    for (std::size_t i = 0; i < std::size(kStyleOptions); ++i) {
        const StyleOption& option = kStyleOptions[i];
        table.Text((std::string("--") + option.key).c_str(), values[i], option.help)
            .Named(option.value)
            .Filled("it has no value");
    }
    table.Flag("--hillshade", hillshade, "Show one band as heights with light on them");
    table.Flag("--legend", legend, "Draw the colours with their least and greatest value below");
    table
        .Text("--quality", quality,
              "Of JPEG and WebP, 1 to 100; WebP of 100 loses nothing (default 85)")
        .Named("N");
    table.Flag("--overwrite", overwrite, "Replace PICTURE if it exists");
    table.Footer(
        "Examples:\n"
        "  zmcraster preview scene.pyr scene.jpg\n"
        "  zmcraster preview scene.pyr red.png --bands 4,3,2 --stretch p2,98 --window "
        "1000,2000,512,512\n"
        "  zmcraster preview heights.pyr heights.png --colormap turbo --hillshade --legend\n"
        "  zmcraster preview scene.pyr green.webp --expression \"(b4-b3)/(b4+b3)\" --stretch -1,1 "
        "--colormap -coolwarm");
}

zmcrender::PictureFormat PreviewCommand::Format() const {
    const std::string ending = fs::path(target).extension().string();
    const auto format = zmcrender::PictureFormatOfName(ending.empty() ? ending : ending.substr(1));
    if (!format) throw UsageError(target, "its ending is none of jpg, jpeg, png, webp");
    return *format;
}

zmcrender::Style PreviewCommand::Styled() const {
    zmcrender::Style style;
    style.hillshade = hillshade;
    for (std::size_t i = 0; i < std::size(kStyleOptions); ++i)
        if (!values[i].empty()) style.Set(kStyleOptions[i].key, values[i]);
    return style;
}

int PreviewCommand::Quality() const {
    if (quality.empty()) return zmcrender::kDefaultQuality;
    const auto wanted = static_cast<int>(ParseCount("--quality", quality, 100));
    if (wanted == 0) throw UsageError("--quality", "it is a number from 1 to 100");
    return wanted;
}

std::uint32_t PreviewCommand::LongerSide(const zmchost::Window& area,
                                         zmcrender::PictureFormat format) const {
    const std::uint32_t most = std::min(kLongestSize, zmcrender::LongestSide(format));
    if (size.empty()) return std::min({kUsualSize, std::max(area.width, area.height), most});
    const auto wanted = static_cast<std::uint32_t>(ParseCount("--size", size, most));
    if (wanted == 0) throw UsageError("--size", "a picture has a pixel at least");
    return wanted;
}

void PreviewCommand::CheckTarget() const {
    CheckIsNoDevice(target);
    std::error_code ignored;
    if (fs::exists(target, ignored) && fs::equivalent(file, target, ignored))
        throw Failure(target, "it is the raster itself; name another file");
}

void PreviewCommand::Write(zmchost::BuildFile& draft,
                           const std::vector<unsigned char>& bytes) const {
    const zelm::String path(draft.Path().c_str());
    int error = 0;
    {
        const auto out = platform::File::Open(path.wide, platform::File::Mode::Update, &error);
        if (!out || out->WriteAt(0, bytes.data(), bytes.size(), &error) != bytes.size())
            throw Failure(target, "it cannot be written: " + platform::ErrorText(error));
    }
    draft.Flush();
    draft.Commit();
}

// What GDAL shows of the raster; null where it shows nothing, as of a pyramid with more levels or
// bands than it can hold.
DatasetPtr OpenIfShown(const std::string& name) {
    SetSubject(name);
    try {
        return OpenDataset(name);
    } catch (const Failure&) {
        return nullptr;
    }
}

void PreviewCommand::Report(const zmcrender::Picture& picture, const zmchost::Window& area,
                            const zmcrender::Renderer& renderer) const {
    if (json) {
        Json ranges = Json::array();
        const auto value = [](const zmcrender::Number& number) {
            if (!number.whole) return JsonNumber(number.real);
            if (!number.negative) return JsonNumber(number.magnitude);
            return Json::parse(number.Text());
        };
        for (const zmcrender::Range& range : renderer.Bounds())
            ranges.push_back({value(range.minimum), value(range.maximum)});
        PrintDocument({{"schema", kSchema},
                       {"file", file},
                       {"picture", target},
                       {"width", picture.width},
                       {"height", picture.height},
                       {"channels", picture.channels},
                       {"window", {area.x, area.y, area.width, area.height}},
                       {"stretch", ranges}});
    } else if (!quiet) {
        std::printf("%s: %u x %u pixels of %s\n", Visible(target).c_str(), picture.width,
                    picture.height, Visible(file).c_str());
    }
}

ExitStatus PreviewCommand::Run() try {
    const zmcrender::PictureFormat format = Format();
    const zmcrender::Style style = Styled();
    const int kept = Quality();
    const auto view = OpenView(file);
    CheckTarget();
    const DatasetPtr dataset = OpenIfShown(file);
    zmcrender::RasterFacts facts = view->Facts();
    std::optional<zmcrender::DatasetMask> mask;
    if (dataset) {
        zmcrender::AddDatasetFacts(*dataset, facts);
        mask.emplace(*dataset);
        if (!mask->Exists(view->MinLevel(), view->MaxLevel())) mask.reset();
    }
    ViewPixels pixels(*view, mask ? &*mask : nullptr);
    const zmchost::Window whole = zmcrender::WholeOf(pixels);
    if (whole.IsEmpty()) throw Failure(file, "none of its levels has a pixel to show");
    const zmchost::Window area = ParseWindow(window, whole.width, whole.height);
    const auto shape = zmcrender::SizeOfPicture(area, LongerSide(area, format));
    zmchost::BuildFile draft(target, overwrite);
    const zmcrender::Renderer renderer(facts, style, pixels);
    zmcrender::Picture picture =
        zmcrender::RenderWindow(renderer, pixels, area, shape.width, shape.height);
    if (legend) picture = zmcrender::WithLegend(std::move(picture), renderer);
    view->CheckUnchanged();
    const auto bytes = zmcrender::Encode(picture, format, kept);
    CheckInterrupt(target);
    Write(draft, bytes);
    Report(picture, area, renderer);
    return ExitStatus::Done;
} catch (const zmcrender::StyleError& error) {
    throw UsageError("--" + error.Key(), error.Reason());
} catch (const std::invalid_argument& error) {
    throw Failure(target, error.what());
}

}  // namespace

std::unique_ptr<Command> MakePreviewCommand() { return std::make_unique<PreviewCommand>(); }

}  // namespace zmctools
