#include "Service/Memory/ImageDiff.h"

#include <array>
#include <memory>

#include "Protocol/EepromMap.h"
#include "Protocol/Instrument.h"
#include "Protocol/PropertyIdentifiers.h"
#include "Service/Memory/ImageEdit.h"
#include "Service/Memory/ImageModel.h"

namespace Varnholt::Service {
namespace {

using DeviceDriver::Generic::Configuration::Properties;
namespace Map = Protocol::EepromMap;
namespace Ids = Protocol::PropertyIds;

struct AreaOfMap {
    const char* name;
    std::uint32_t first;
    std::uint32_t end;
};
constexpr std::array Areas{
    AreaOfMap{"log, main copy", Map::MainLog, Map::BinaryFirst},
    AreaOfMap{"binary block, first part", Map::BinaryFirst, Map::LogCopy},
    AreaOfMap{"log, second copy", Map::LogCopy, Map::BinarySecond},
    AreaOfMap{"binary block, second part", Map::BinarySecond, Map::RawWords},
    AreaOfMap{"raw words", Map::RawWords, Map::EndOfLogArea},
    AreaOfMap{"allocation table", Map::Table, Map::Calibration},
    AreaOfMap{"calibration", Map::Calibration, Map::Calibration + Map::CalibrationSize},
    AreaOfMap{"rest", Map::Calibration + Map::CalibrationSize, Protocol::EepromSize},
};

void CompareSets(ImageDiff& diff, const char* kind, const Properties& a, const Properties& b) {
    for (const auto& [id, value] : a.GetDatastore()) {
        if (!b.Contains(id)) {
            diff.values.push_back({kind, id, value, std::nullopt});
        } else if (value.AsByteVector(true) != b.GetProperty(id).AsByteVector(true)) {
            diff.values.push_back({kind, id, value, b.GetProperty(id)});
        }
    }
    for (const auto& [id, value] : b.GetDatastore()) {
        if (!a.Contains(id)) {
            diff.values.push_back({kind, id, std::nullopt, value});
        }
    }
}

void CompareWords(ImageDiff& diff, const EepromImage& a, const EepromImage& b) {
    for (std::uint16_t id = Ids::FirstRawWord; id <= LastWritableRawWord; ++id) {
        const std::uint32_t left = RawWordOf(a, id);
        const std::uint32_t right = RawWordOf(b, id);
        if (left != right) {
            diff.values.push_back({"word", id, Property(static_cast<std::int32_t>(left)),
                                   Property(static_cast<std::int32_t>(right))});
        }
    }
}

std::unique_ptr<ImageModel> ModelOf(const EepromImage& image, std::string& whyNot) {
    try {
        return std::make_unique<ImageModel>(image);
    } catch (const Utilities::Exceptions::RuntimeException& exception) {
        whyNot = exception.what();
        return nullptr;
    }
}

void CompareValues(ImageDiff& diff, const EepromImage& a, const EepromImage& b) {
    const auto left = ModelOf(a, diff.unreadableA);
    const auto right = ModelOf(b, diff.unreadableB);
    if (left && right) {
        CompareSets(diff, "calibration", left->Calibration(), right->Calibration());
        CompareSets(diff, "log", left->Log(), right->Log());
        CompareSets(diff, "table", left->Table(), right->Table());
    }
    CompareWords(diff, a, b);
}

}  // namespace

ImageDiff Compare(const EepromImage& a, const EepromImage& b) {
    ImageDiff diff;
    CompareValues(diff, a, b);
    for (const AreaOfMap& area : Areas) {
        ImageDiff::Area found{area.name, area.first, area.end - 1, 0, 0};
        for (std::uint32_t at = area.first; at < area.end; ++at) {
            if (a[at] != b[at]) {
                found.firstDifference = found.different == 0 ? at : found.firstDifference;
                ++found.different;
            }
        }
        if (found.different > 0) {
            diff.areas.push_back(found);
        }
    }
    return diff;
}

}  // namespace Varnholt::Service
