#include "SensorModel.h"

#include <algorithm>
#include <cmath>

#include "Protocol/ByteOrder.h"

namespace Varnholt::Simulator {
namespace {

constexpr double PeakCountsPerSecond = 1.6e6;
/// Well below 0xF800, from where readings count as negative.
constexpr std::int64_t FullScale = 60000;
constexpr std::int64_t MostNegative = -2047;
constexpr std::int64_t Offset = 8;
constexpr std::uint64_t DarkCountsPerSecond = 150;
constexpr std::uint64_t ReadoutNoiseSquared = 36;
constexpr std::uint64_t CountsPerPhotonVariance = 8;

struct Line {
    double pixel, width, height;
};
/// A lamp: a broad glow and a few lines.
constexpr std::array Lines{Line{70, 34, 0.45},  Line{22, 1.6, 0.55}, Line{41, 2.2, 0.35},
                           Line{63, 1.8, 0.52}, Line{88, 2.6, 0.28}, Line{105, 1.5, 0.4}};

double Spectrum(double pixel) {
    double sum = 0;
    for (const Line& line : Lines) {
        const double distance = (pixel - line.pixel) / line.width;
        sum += line.height * std::exp(-distance * distance / 2);
    }
    return sum;
}

std::uint64_t Mix(std::uint64_t number) {
    number += 0x9E3779B97F4A7C15U;
    number = (number ^ (number >> 30)) * 0xBF58476D1CE4E5B9U;
    number = (number ^ (number >> 27)) * 0x94D049BB133111EBU;
    return number ^ (number >> 31);
}

/// About normally distributed around 0; the unit is 1/37837 of the standard deviation.
std::int64_t Noise(std::uint64_t random) {
    std::int64_t sum = std::int64_t{-2} * 65535;
    for (int i = 0; i < 4; ++i) {
        sum += static_cast<std::int64_t>(random >> (16 * i) & 0xFFFF);
    }
    return sum;
}
constexpr std::int64_t NoiseUnit = 37837;

std::int64_t SquareRoot(std::uint64_t number) {
    return static_cast<std::int64_t>(std::sqrt(static_cast<double>(number)));
}

}  // namespace

SensorModel::SensorModel(std::uint64_t noiseSeed, double light, double gain) : seed_(Mix(noiseSeed)) {
    double highest = 0;
    for (std::size_t i = 0; i < sensitivity_.size(); ++i) {
        highest = std::max(highest, Spectrum(static_cast<double>(i)));
    }
    const double strength = std::clamp(light * gain, 0.0, 1e6) * PeakCountsPerSecond / highest;
    for (std::size_t i = 1; i < sensitivity_.size(); ++i) {
        sensitivity_[i] = static_cast<std::uint64_t>(strength * Spectrum(static_cast<double>(i)));
    }
}

void SensorModel::Read(const Exposure& exposure, std::uint64_t measurement, std::uint32_t record,
                       Record bytes) const {
    constexpr std::uint64_t second = 1'000'000;
    // Longer exposures saturate every pixel anyhow; the limit keeps the products in range.
    const std::uint64_t microseconds = std::min(exposure.microseconds, 1000 * second);
    const auto averages = static_cast<std::int64_t>(std::max(exposure.averages, 1U));
    const std::uint64_t start = Mix(seed_ ^ Mix(measurement * 0x100000000U + record));
    for (std::uint32_t i = 0; i < Protocol::ReadoutValues - 1; ++i) {
        const std::uint64_t brightness =
            std::min<std::uint64_t>(sensitivity_[i] * microseconds / second, std::uint64_t{2} * FullScale);
        const std::uint64_t dark = DarkCountsPerSecond * microseconds / second;
        const std::int64_t deviation =
            SquareRoot((ReadoutNoiseSquared + (brightness + dark) / CountsPerPhotonVariance) * 256);
        const std::int64_t noise = Noise(Mix(start + i)) * deviation / NoiseUnit /
                                   SquareRoot(static_cast<std::uint64_t>(averages) * 256);
        const std::int64_t value = std::clamp(Offset + static_cast<std::int64_t>(brightness + dark) + noise,
                                              MostNegative, FullScale);
        Protocol::StoreBig16(&bytes[std::size_t{2} * i], static_cast<std::uint16_t>(value));
    }
    Protocol::StoreBig16(&bytes[Protocol::ReadoutBytes - 2], static_cast<std::uint16_t>(record));
}

}  // namespace Varnholt::Simulator
