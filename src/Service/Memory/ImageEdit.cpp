#include "Service/Memory/ImageEdit.h"

#include <fmt/format.h>

#include <algorithm>

#include "DeviceDriver/Ostra/LowLevel/ConfigurationDataConverter.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/EepromMap.h"
#include "Protocol/PropertyIdentifiers.h"
#include "Service/Failure.h"
#include "Service/Memory/ImageModel.h"

namespace Varnholt::Service {
namespace {

using DeviceDriver::Generic::Configuration::Properties;
using DeviceDriver::Ostra::LowLevel::ConfigurationDataConverter;
namespace Map = Protocol::EepromMap;
namespace Ids = Protocol::PropertyIds;

static_assert(Map::RawWords + (LastWritableRawWord + 1U - Ids::FirstRawWord) * Map::RawWordSize ==
              Map::EndOfLogArea);

[[noreturn]] void RefuseOddTable() {
    throw Failure(FailureKind::BadData,
                  "the allocation table puts values where the change would reach others; nothing was changed",
                  "`ostra eeprom check` shows what is wrong with the image");
}

std::uint32_t AddressOfWord(std::uint16_t id, std::uint16_t last) {
    if (id < Ids::FirstRawWord || id > last) {
        throw Failure(FailureKind::BadArgument, fmt::format("{} is no raw word", id),
                      fmt::format("raw words are {} to {}", Ids::FirstRawWord, last));
    }
    return Map::RawWords + (std::uint32_t{id} - Ids::FirstRawWord) * Map::RawWordSize;
}

}  // namespace

EditedImage WithCalibration(const EepromImage& image, const std::vector<Assignment>& assignments) {
    ImageModel model(image);
    EditedImage edited{image, {}};
    for (const Assignment& assignment : assignments) {
        if (!ConfigurationDataConverter::IsCalibrationParameter(assignment.id)) {
            throw Failure(FailureKind::BadArgument, fmt::format("{} is no calibration value", assignment.id),
                          "`ostra calibration show` lists them");
        }
        const Property before = model.Get().GetProperty(assignment.id);
        const Property after = ParseValue(assignment, before);
        model.Get().SetProperty(assignment.id, after);
        edited.changes.push_back({assignment.id, before, after});
    }
    const Properties wanted = model.Calibration();
    // The values keep their sizes and with them their places, which the table must have as the driver does.
    if (!TableOf(image).Locates(wanted, Map::Calibration, 0)) {
        RefuseOddTable();
    }
    wanted.Dump(edited.image.begin() + Map::Calibration, edited.image.end(), true, true);
    ImageModel proof(edited.image);
    if (!HaveSameBytes(proof.Calibration(), wanted) || !HaveSameBytes(proof.Log(), ImageModel(image).Log())) {
        RefuseOddTable();
    }
    return edited;
}

EepromImage WithEmptyLog(const EepromImage& image) {
    ImageModel model(image);
    const Properties items = model.Log();
    if (items.SizeOf(true) > Map::LogSize) {
        RefuseOddTable();  // it would reach into the binary block
    }
    for (const auto& [id, value] : items.GetDatastore()) {
        model.Get().GetLog().SetItem(id, ConfigurationDataConverter::GetDefaultProperty(id));
    }
    // The model writes both copies where it has them, and with the values' usual sizes.
    const LogPlaces places = PlacesOf(TableOf(image), model.Log());
    if (!places.main || !places.second) {
        RefuseOddTable();
    }
    model.Get().DumpLog();
    EepromImage edited = model.Contents();
    ImageModel proof(edited);
    const LogCopies copies = ReadLogCopies(edited);
    const Properties& wanted = model.Log();
    if (!copies.main.isValid || !HaveSameBytes(copies.main.items, wanted) ||
        (copies.second.isReadable && !HaveSameBytes(copies.second.items, wanted)) ||
        !HaveSameBytes(proof.Calibration(), ImageModel(image).Calibration())) {
        RefuseOddTable();
    }
    return edited;
}

std::vector<std::uint8_t> BinaryBlockOf(const EepromImage& image) {
    const std::span<const std::uint8_t> bytes(image);
    const auto first = bytes.subspan(Map::BinaryFirst, Map::BinaryFirstSize);
    const auto second = bytes.subspan(Map::BinarySecond, Map::BinarySecondSize);
    std::vector<std::uint8_t> block(first.begin(), first.end());
    block.insert(block.end(), second.begin(), second.end());
    return block;
}

EepromImage WithBinaryBlock(const EepromImage& image, std::span<const std::uint8_t> block) {
    if (block.size() != Map::BinarySize) {
        throw Failure(FailureKind::BadData,
                      fmt::format("the binary block has {} bytes, not {}{}", Map::BinarySize,
                                  block.size() > Map::BinarySize ? "more than " : "",
                                  std::min<std::size_t>(block.size(), Map::BinarySize)));
    }
    EepromImage edited = image;
    std::ranges::copy(block.first(Map::BinaryFirstSize), edited.begin() + Map::BinaryFirst);
    std::ranges::copy(block.subspan(Map::BinaryFirstSize), edited.begin() + Map::BinarySecond);
    return edited;
}

std::uint32_t RawWordOf(const EepromImage& image, std::uint16_t id) {
    return Protocol::LoadBig32(&image[AddressOfWord(id, Ids::LastRawWord)]);
}

void SetRawWord(EepromImage& image, std::uint16_t id, std::uint32_t word) {
    Protocol::StoreBig32(&image[AddressOfWord(id, LastWritableRawWord)], word);
}

}  // namespace Varnholt::Service
