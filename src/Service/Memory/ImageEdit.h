#pragma once

#include <cstdint>
#include <span>
#include <vector>

#include "Service/Memory/EepromImage.h"
#include "Service/Memory/PropertyText.h"

namespace Varnholt::Service {

/// Changes to a whole image. Each answers the changed image, in which every byte that the change does not
/// mean is as it was; and each is proven before it is answered: the result is read back, and must hold the
/// new values and all old ones. A change that cannot be made so is refused with `Failure`, or with the
/// exception of the memory model that cannot use the image.

/// A value before and after.
struct ValueChange {
    std::uint16_t id;
    Property before;
    Property after;
};
struct EditedImage {
    EepromImage image;
    std::vector<ValueChange> changes;
};
EditedImage WithCalibration(const EepromImage& image, const std::vector<Assignment>& assignments);

/// Both copies of the log empty.
EepromImage WithEmptyLog(const EepromImage& image);

/// The binary block, 1904 bytes that lie in two places.
std::vector<std::uint8_t> BinaryBlockOf(const EepromImage& image);
EepromImage WithBinaryBlock(const EepromImage& image, std::span<const std::uint8_t> block);

/// The raw words 10200 to 10239 can be read; those up to 10215 lie outside the table and can be changed.
std::uint32_t RawWordOf(const EepromImage& image, std::uint16_t id);
void SetRawWord(EepromImage& image, std::uint16_t id, std::uint32_t word);
inline constexpr std::uint16_t LastWritableRawWord = 10215;

}  // namespace Varnholt::Service
