#include "render/Channel.h"

#include <cmath>
#include <limits>
#include <vector>

#include "core/ElementTypes.h"
#include "host/raster/NoData.h"

namespace zmcrender {
namespace {

template <class T>
zelm::NoDataRule<T> RuleOf(const std::optional<Number>& noData) {
    if (!noData) return {};
    if constexpr (std::is_integral_v<T>) {
        const auto value = AsWhole<T>(*noData);
        return value ? zelm::NoDataRule<T>{true, *value} : zelm::NoDataRule<T>{};
    } else {
        if (!zmchost::HoldsValue<T>(noData->real)) return {};
        return {true, zelm::FromDouble<T>(noData->real)};
    }
}

// All types but complex ones are shown as they are.
template <class T>
auto Shown(const T& sample, ComplexPart part) {
    if constexpr (!zelm::kIsComplex<T>) {
        static_cast<void>(part);
        if constexpr (kIsWide<T>)
            return sample;
        else
            return static_cast<double>(sample);
    } else {
        const auto real = static_cast<double>(sample.re),
                   imaginary = static_cast<double>(sample.im);
        switch (part) {
            case ComplexPart::Real:
                return real;
            case ComplexPart::Imaginary:
                return imaginary;
            case ComplexPart::Phase:
                return std::atan2(imaginary, real);
            case ComplexPart::Magnitude:
                break;
        }
        return std::hypot(real, imaginary);
    }
}

template <class T>
class TypedChannel final : public Channel {
public:
    explicit TypedChannel(const ChannelSettings& settings)
        : rule(RuleOf<T>(settings.noData)),
          part(settings.part),
          ramp(settings.range),
          tone(settings.tone) {
        if constexpr (kTabled)
            if (tone) settings.depth == 8 ? Tabulate(narrow) : Tabulate(wide);
        plain = std::is_same_v<T, unsigned char> && !MayMissSamples() && LeavesSamples();
    }

    bool MayMiss() const override { return MayMissSamples(); }
    bool IsPlain() const override { return plain; }
    void Levels(const SampleLine& line, std::uint8_t* levels, std::size_t step) const override {
        Fill(line, levels, step, narrow);
    }
    void Levels(const SampleLine& line, std::uint16_t* levels, std::size_t step) const override {
        Fill(line, levels, step, wide);
    }
    void MarkPresent(const SampleLine& line, unsigned char* present) const override {
        Each(line, [present, marks = rule](std::size_t i, const T& sample) {
            const unsigned there = marks.Marks(sample) ? 0u : 255u;
            present[i] = static_cast<unsigned char>(present[i] | there);
        });
    }
    void Values(const SampleLine& line, double* values) const override {
        constexpr double none = std::numeric_limits<double>::quiet_NaN();
        Each(line, [&](std::size_t i, const T& sample) {
            values[i] = rule.Marks(sample) ? none : static_cast<double>(Shown(sample, part));
        });
    }
    void Widen(const SampleLine& line, const unsigned char* shown,
               std::optional<Range>& range) const override {
        std::optional<Value> least, most;
        Each(line, [&](std::size_t i, const T& sample) {
            if (rule.Marks(sample) || (shown && shown[i] == 0)) return;
            const auto value = Shown(sample, part);
            if (!least || value < *least) least = value;
            if (!most || value > *most) most = value;
        });
        if (!least) return;
        if (!range) range = Range{Number(*least), Number(*most)};
        if (IsAbove(range->minimum, *least)) range->minimum = Number(*least);
        if (!IsAbove(range->maximum, *most)) range->maximum = Number(*most);
    }

private:
    static constexpr bool kTabled = std::is_integral_v<T> && sizeof(T) <= 2;
    using Value = decltype(Shown(T(), ComplexPart()));

    zelm::NoDataRule<T> rule;
    ComplexPart part;
    Ramp<T> ramp;
    std::shared_ptr<const Tone> tone;
    std::vector<std::uint8_t> narrow;  // by sample, of the types that have few
    std::vector<std::uint16_t> wide;
    bool plain = false;

    bool MayMissSamples() const { return rule.hasValue || !std::is_integral_v<T>; }

    bool LeavesSamples() const {
        for (std::size_t i = 0; i < narrow.size(); ++i)
            if (narrow[i] != i) return false;
        return !narrow.empty();
    }

    static bool IsAbove(const Number& number, Value value) {
        if constexpr (kIsWide<T>) return Bound<T>(number).Below(value) < 0;
        return number.real > static_cast<double>(value);
    }

    static std::size_t Place(T sample) {
        if constexpr (kTabled) return static_cast<std::make_unsigned_t<T>>(sample);
        return 0;
    }

    // Usual distances are told to the compiler, which makes vector code of some.
    template <class Take>
    static void Each(const SampleLine& line, Take&& take) {
        const auto* const samples = reinterpret_cast<const T*>(line.at);
        const std::size_t stride = line.stride / sizeof(T), count = line.count;
        if (stride == 1)
            for (std::size_t i = 0; i < count; ++i) take(i, samples[i]);
        else if (stride == 3)
            for (std::size_t i = 0; i < count; ++i) take(i, samples[3 * i]);
        else
            for (std::size_t i = 0; i < count; ++i) take(i, samples[i * stride]);
    }

    template <class Level>
    Level LevelOf(const T& sample) const {
        Level level = 0;
        if (!rule.Marks(sample)) tone->Level(ramp(Shown(sample, part)), level);
        return level;
    }

    template <class Level>
    void Tabulate(std::vector<Level>& table) const {
        table.resize(std::size_t{1} << (8 * sizeof(T)));
        for (std::size_t i = 0; i < table.size(); ++i) table[i] = LevelOf<Level>(static_cast<T>(i));
    }

    template <class Level>
    void Fill(const SampleLine& line, Level* levels, std::size_t step,
              const std::vector<Level>& table) const {
        const Level* const entries = table.data();
        if constexpr (kTabled)
            Each(line, [&](std::size_t i, T sample) { levels[i * step] = entries[Place(sample)]; });
        else if (tone->IsLinear())
            Each(line, [levels, step, as = part, marks = rule, place = ramp](std::size_t i,
                                                                             const T& sample) {
                const auto level = Tone::Straight<Level>(place(Shown(sample, as)));
                levels[i * step] = marks.Marks(sample) ? Level{0} : level;
            });
        else
            Each(line, [&](std::size_t i, const T& sample) {
                levels[i * step] = LevelOf<Level>(sample);
            });
    }
};

template <class Level>
void FillLevels(const double* values, std::size_t count, const RealRamp& ramp, const Tone& tone,
                Level* levels) {
    for (std::size_t i = 0; i < count; ++i) tone.Level(ramp(values[i]), levels[i]);
}

}  // namespace

std::unique_ptr<const Channel> MakeChannel(const ChannelSettings& settings) {
    std::unique_ptr<const Channel> made;
    zelm::VisitElementType(settings.pixelType, [&]<class T>(std::type_identity<T>) {
        made = std::make_unique<TypedChannel<T>>(settings);
    });
    return made;
}

void LevelsOf(const double* values, std::size_t count, const RealRamp& ramp, const Tone& tone,
              std::uint8_t* levels) {
    FillLevels(values, count, ramp, tone, levels);
}

void LevelsOf(const double* values, std::size_t count, const RealRamp& ramp, const Tone& tone,
              std::uint16_t* levels) {
    FillLevels(values, count, ramp, tone, levels);
}

}  // namespace zmcrender
