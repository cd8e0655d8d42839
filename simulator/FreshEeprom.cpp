#include "FreshEeprom.h"

#include <algorithm>
#include <span>

#include "Protocol/ByteOrder.h"
#include "Protocol/EepromMap.h"

namespace Varnholt::Simulator {
namespace {

namespace Map = Protocol::EepromMap;

/// A stored value: `words` 32-bit numbers, each `initially` this pattern.
struct Value {
    std::uint16_t id;
    std::uint32_t words;
    std::uint32_t initially;
};

constexpr std::uint32_t MinusOne = 0xFFFFFFFF;
constexpr std::uint32_t MinusOneFloat = 0xBF800000;

/// All zero, so that the sum of the values, which is the first, is zero as well.
constexpr Value Log[] = {
    {10000, 1, 0},   {10001, 1, 0},   {10002, 1, 0}, {10003, 1, 0}, {10004, 1, 0}, {10005, 1, 0},
    {10010, 128, 0}, {10011, 128, 0}, {10012, 1, 0}, {10013, 1, 0}, {10020, 1, 0}, {10021, 1, 0},
};

constexpr Value Calibration[] = {
    {1000, 2, MinusOneFloat}, {1001, 2, MinusOneFloat}, {1002, 2, MinusOne},      {1003, 2, MinusOne},
    {1004, 2, MinusOneFloat}, {3001, 1, MinusOne},      {1100, 2, MinusOneFloat}, {1101, 2, MinusOneFloat},
    {3002, 1, MinusOne},      {1102, 2, MinusOneFloat}, {1221, 1, MinusOneFloat}, {1222, 1, MinusOneFloat},
    {1204, 1, MinusOne},      {1205, 1, MinusOne},      {1207, 1, MinusOne},      {1208, 1, MinusOne},
    {1213, 1, MinusOneFloat}, {1211, 1, MinusOne},      {4000, 1, MinusOne},      {1212, 1, MinusOne},
    {3007, 1, MinusOne},      {3014, 1, MinusOneFloat}, {3008, 1, MinusOne},      {3009, 2, MinusOne},
    {3010, 1, MinusOne},      {3011, 1, MinusOne},      {3012, 1, MinusOne},      {3013, 1, MinusOne},
};

class Writer final {
  public:
    explicit Writer(std::vector<std::uint8_t>& bytes) : image_(bytes) {}

    void Section(std::span<const Value> values, std::uint32_t start, std::uint16_t idOffset,
                 std::uint16_t endId) {
        std::uint32_t address = start;
        for (const Value& value : values) {
            Entry(static_cast<std::uint16_t>(value.id + idOffset), address);
            for (std::uint32_t i = 0; i < value.words; ++i, address += 4) {
                Protocol::StoreBig32(&image_[address], value.initially);
            }
        }
        Entry(endId, address);
    }

    void Header() {
        Protocol::StoreBig16(&image_[Map::Table + Map::TableLayout::Version], Map::TableLayout::KnownVersion);
        Protocol::StoreBig16(&image_[Map::Table + Map::TableLayout::Length],
                             static_cast<std::uint16_t>(next_ - Map::Table));
    }

  private:
    void Entry(std::uint16_t id, std::uint32_t address) {
        Protocol::StoreBig16(&image_[next_ + Map::TableLayout::EntryIdentifier], id);
        Protocol::StoreBig32(&image_[next_ + Map::TableLayout::EntryAddress], address);
        next_ += Map::TableLayout::EntrySize;
    }

    std::vector<std::uint8_t>& image_;
    std::uint32_t next_ = Map::Table + Map::TableLayout::FirstEntry;
};

}  // namespace

std::vector<std::uint8_t> FreshEeprom() {
    std::vector<std::uint8_t> image(Protocol::EepromSize, 0xFF);
    Writer writer(image);
    writer.Section(Log, Map::MainLog, 0, Map::EndOfMainLog);
    writer.Section(Log, Map::LogCopy, Map::LogCopyIdOffset, Map::EndOfLogCopy);
    writer.Section(Calibration, Map::Calibration, 0, Map::EndOfCalibration);
    writer.Header();
    return image;
}

}  // namespace Varnholt::Simulator
